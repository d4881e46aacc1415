#pragma once

#include <string>

#include "source/Libav.h"
#include "source/SourceInterface.h"

namespace receiver {

/// What of an opened source is recorded.
struct StreamChoice {
    int video = -1;
    /// -1: there is none.
    int audio = -1;
    /// What is recorded and what is left out, in one sentence; empty where there was nothing to choose.
    std::string notice;
};

/// Chooses what `options` ask for, else the largest video and the first audio of its program. Throws
/// `ReceiverError`
/// (`kSourceUnsuitable`) when there is no video, or not what was asked for.
StreamChoice ChooseStreams(AVFormatContext& format, const SourceOptions& options);

}  // namespace receiver
