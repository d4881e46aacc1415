#pragma once

#include <filesystem>
#include <nlohmann/json.hpp>
#include <string>
#include <vector>

namespace endtoend {

/// What ffprobe says of a file: "streams" and "format", with the packets counted. Its messages are in
/// "messages", one line each, without the one for tracks of no codec.
nlohmann::json AskFfprobe(const std::filesystem::path& file);

/// MediaInfo's track of that type ("General", "Video", "Audio"), null when there is none.
nlohmann::json AskMediaInfo(const std::filesystem::path& file, const std::string& trackType);

/// The stream of ffprobe's answer of that type ("video") or with that four-character code ("tmcd").
nlohmann::json StreamOf(const nlohmann::json& answer, const std::string& typeOrTag);

/// Checksums of the pictures or sounds that ffmpeg's decoder makes of a file, in order.
struct Decoded {
    std::vector<std::string> checksums;
    /// Whatever the decoder had to say.
    std::string messages;
};
Decoded DecodeVideo(const std::filesystem::path& file);
Decoded DecodeAudio(const std::filesystem::path& file);

}  // namespace endtoend
