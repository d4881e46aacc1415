#pragma once

#include "Recorder.h"
#include "module/Host.h"
#include "options/Options.h"
#include "output/OutputPlace.h"
#include "source/SourceInterface.h"

namespace receiver {

/// Throws `ReceiverError` with `kUsage` for a user without a share to log on to.
void CheckUser(const Options& options, const OutputPlace& place);

/// What the module is started with for such a source.
StartParameters ParametersOf(const Options& options, const OutputPlace& place,
                             const SourceDescription& description);

/// The recorder of a run whose source has that rate. Throws `ReceiverError` with `kUsage` for a timecode that
/// does not exist at the rate.
Recorder::Settings RecorderSettingsOf(const Options& options, const FrameRate& rate);

}  // namespace receiver
