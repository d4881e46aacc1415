#pragma once

#include <functional>
#include <memory>

#include "common/ReceiverError.h"
#include "display/DisplayInterface.h"
#include "operator/Signals.h"
#include "options/Options.h"
#include "source/SourceInterface.h"

namespace receiver {

/// Opens a source, as `OpenSource` does.
using SourceOpener = std::function<std::unique_ptr<SourceInterface>(
    const SourceOptions& options, SourceListenerInterface& listener, const StopCheck& stop)>;

/// One run: opens source and module, records until the stream or the operator ends it, and closes every file.
/// Everything that happens is said through `display`, failures included. Returns how the program ends.
///
/// Sets the environment variables of the module's log and settings, so it must be called before anything has
/// been logged. `keyboard` is the descriptor of a terminal, or anything else where there are no keys.
ExitCode RunReceiver(const Options& options, const SourceOpener& open, Signals& signals,
                     DisplayInterface& display, int keyboard);

}  // namespace receiver
