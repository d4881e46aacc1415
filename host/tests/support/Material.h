#pragma once

#include <filesystem>
#include <string>
#include <vector>

#include "support/TemporaryFolder.h"

namespace endtoend {

/// What ffmpeg is asked to make: a moving picture and a tone, H.264 without reordered pictures, AAC LC.
struct MaterialOptions {
    /// As ffmpeg writes it: "25", "30000/1001".
    std::string rate = "25";
    std::string size = "320x180";
    /// A source of sound, as ffmpeg writes it.
    std::string sound = "sine=frequency=440:sample_rate=48000";
    double seconds = 4;
    /// Pictures from one IDR frame to the next.
    int pictureGroup = 10;
    /// The extension chooses the container: "ts", "mp4", "mov", "mkv".
    std::string container = "ts";
    /// Pictures for a KLV packet; 0 is none. Transport streams alone.
    std::size_t picturesPerKlv = 0;
    /// Given to ffmpeg behind everything else ("-timecode", "10:00:00:00").
    std::vector<std::string> more;
};

/// Makes the file in `folder`, a copy of what an earlier test of this build has asked for, and returns its
/// path. Throws std::runtime_error with ffmpeg's words when that fails.
std::filesystem::path MakeMaterial(const TemporaryFolder& folder, const MaterialOptions& options = {});

}  // namespace endtoend
