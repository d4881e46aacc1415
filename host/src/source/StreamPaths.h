#pragma once

#include <memory>
#include <string>
#include <vector>

#include "source/AudioPath.h"
#include "source/LookAhead.h"
#include "source/SourceInterface.h"
#include "source/VideoPath.h"

namespace receiver {

/// What becomes of the streams of a connection, and what they are then.
struct StreamPaths {
    SourceDescription description;
    /// Sentences about what is converted.
    std::vector<std::string> notices;
    std::unique_ptr<VideoPathInterface> video;
    /// Of the pictures as they come.
    AVRational sourceRate{0, 1};
    /// The video is recorded as it comes.
    bool passes = true;
    /// Null: there is no audio.
    std::unique_ptr<AudioPathInterface> audio;
};

/// Decides what passes and what is converted by what `ahead` shows. `audio` may be null. `before`: what the
/// source was in an earlier connection and may be again, or null. Throws `ReceiverError`
/// (`kSourceUnsuitable`) when it cannot be recorded.
StreamPaths DecidePaths(AVFormatContext& format, AVStream& video, const AVStream* audio, const Packets& ahead,
                        const SourceOptions& options, const SourceDescription* before);

}  // namespace receiver
