#pragma once

#include <string>

#include "source/SourceInterface.h"
#include "source/VideoEncoder.h"

namespace receiver {

/// "H.264 High 1280x720 25 fps".
std::string VideoSummary(const std::string& codec, const SourceDescription& description);

/// What audio is, in the end.
inline constexpr const char* kRecordedAudioSummary = "AAC LC 48 kHz stereo";

/// What `options` asks for, else what `source` has, picture group and bit rate as `options` tells.
VideoEncoding EncodingOf(const SourceOptions& options, const SourceDescription& source);

}  // namespace receiver
