#pragma once

#include <cstdint>
#include <string>

#include "StreamAnalyzer.h"

namespace clipfileModule {

/// The rules by which a recording is made. Both are told, difference by difference, in docs/compatibility.md.
enum class RecordRules {
    /// As hosts have always known them: the default.
    kKept,
    /// Exact to the frame, where the kept ones lose material or step. Asked for by the host.
    kExact,
};

/// The order in which the host pushes video.
enum class PictureOrder {
    /// The order in which pictures are shown: the default. None is decoded in another order.
    kPresentation,
    /// The order in which they are decoded. Each tells when it is shown.
    kDecoding,
};

/// Values of the output mode: where record commands come from. With any other value nothing is recorded.
constexpr const char* kOutputModeOn = "on";
constexpr const char* kOutputModeSync = "sync";

/// Everything that a recording needs to know. `Controller` holds the master copy; each recording works on its
/// own.
struct OutputSettings {
    std::string filePrefix;
    /// Where the dated directories are made. Separated by backslashes when it came as start parameter; a path
    /// of the settings store stands as it was written.
    std::string outputPath;
    /// Credentials for a network share.
    std::string userName;
    std::string password;
    /// "normal" or "fragment".
    std::string fileType;
    /// "direct" lets a connected input set bit rate and picture size as well as frame rate.
    std::string naluType;
    /// Where record commands come from: "on" or "sync".
    std::string outputMode;
    RecordRules recordRules = RecordRules::kKept;
    PictureOrder pictureOrder = PictureOrder::kPresentation;
    std::uint64_t streamStart = 0;
    std::uint32_t bitrate = 0;
    /// Frames per 1000 seconds.
    std::uint32_t framerate = 0;
    /// Picture size in pixels.
    std::uint32_t width = 0;
    std::uint32_t height = 0;
    /// Length of a file in minutes.
    std::uint64_t maxFileSize = 0;
    /// Parameter sets of the recording's first IDR frame; empty until then.
    nal_access::NalUnit sps;
    nal_access::NalUnit pps;
};

}  // namespace clipfileModule
