#include "support/Judges.h"

#include <sstream>

#include "support/Process.h"

namespace endtoend {
namespace {

Decoded decode(const std::filesystem::path& file, const std::string& medium) {
    const Outcome outcome =
        RunProgram({"ffmpeg", "-v", "warning", "-nostdin", "-threads", "1", "-i", file.string(), "-map",
                    "0:" + medium, "-fps_mode", "passthrough", "-f", "framemd5", "-"});
    Decoded decoded;
    decoded.messages = outcome.errors;
    std::istringstream lines(outcome.output);
    for (std::string line; std::getline(lines, line);) {
        if (!line.empty() && line.front() != '#') {
            decoded.checksums.push_back(line.substr(line.rfind(' ') + 1));
        }
    }
    return decoded;
}

}  // namespace

nlohmann::json AskFfprobe(const std::filesystem::path& file) {
    const Outcome outcome = RunProgram({"ffprobe", "-v", "warning", "-show_format", "-show_streams",
                                        "-count_packets", "-of", "json", file.string()});
    auto answer = nlohmann::json::parse(outcome.output, nullptr, false);
    if (!answer.is_object()) {
        answer = nlohmann::json::object();
    }
    auto messages = nlohmann::json::array();
    std::istringstream lines(outcome.errors);
    for (std::string line; std::getline(lines, line);) {
        // The timecode and the metadata track have no codec, and ffprobe says so.
        if (line.find("Unsupported codec with id 0") == std::string::npos) {
            messages.push_back(line);
        }
    }
    answer["messages"] = messages;
    return answer;
}

nlohmann::json AskMediaInfo(const std::filesystem::path& file, const std::string& trackType) {
    const Outcome outcome = RunProgram({"mediainfo", "--Output=JSON", file.string()});
    const auto answer = nlohmann::json::parse(outcome.output, nullptr, false);
    if (answer.is_object() && answer.contains("media") && answer["media"].contains("track")) {
        for (const auto& track : answer["media"]["track"]) {
            if (track.value("@type", "") == trackType) {
                return track;
            }
        }
    }
    return nullptr;
}

nlohmann::json StreamOf(const nlohmann::json& answer, const std::string& typeOrTag) {
    if (answer.contains("streams")) {
        for (const auto& stream : answer["streams"]) {
            if (stream.value("codec_type", "") == typeOrTag ||
                stream.value("codec_tag_string", "") == typeOrTag) {
                return stream;
            }
        }
    }
    return nlohmann::json::object();
}

Decoded DecodeVideo(const std::filesystem::path& file) {
    return decode(file, "v");
}
Decoded DecodeAudio(const std::filesystem::path& file) {
    return decode(file, "a");
}

}  // namespace endtoend
