#pragma once

#include <cstdint>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <stdexcept>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "LogCapture.h"
#include "boxlib/support/IsoReader.h"

/// Numbers of the tracks in a recording.
enum RecordedTrack : std::uint32_t { kRecordedVideo = 1, kRecordedAudio, kRecordedTimecode, kRecordedMeta };

inline std::vector<std::uint8_t> ReadWholeFile(const std::filesystem::path& path) {
    std::ifstream in(path, std::ios::binary);
    if (!in) {
        throw std::runtime_error("cannot read " + path.string());
    }
    return {std::istreambuf_iterator<char>(in), std::istreambuf_iterator<char>()};
}

/// Names of the files that were opened, in order, from the lines of the log.
inline std::vector<std::string> RecordedNames(const LogCapture& log) {
    static constexpr std::string_view kOpened = "ST: out_filename = \"";
    std::vector<std::string> names;
    for (const std::string& line : log.Texts()) {
        if (line.starts_with(kOpened)) {
            names.push_back(line.substr(kOpened.size(), line.size() - kOpened.size() - 1));
        }
    }
    return names;
}

/// The only file of that name under `root`.
inline std::filesystem::path FindRecording(const std::filesystem::path& root, const std::string& name) {
    std::filesystem::path found;
    for (const auto& entry : std::filesystem::recursive_directory_iterator(root)) {
        if (entry.path().filename() == name) {
            if (!found.empty()) {
                throw std::runtime_error("two files " + name);
            }
            found = entry.path();
        }
    }
    if (found.empty()) {
        throw std::runtime_error("no file " + name);
    }
    return found;
}

/// A recording read back by a reader that shares nothing with the module. Throws `iso::IsoError` for what
/// breaks the standard.
class RecordedFile {
 public:
    explicit RecordedFile(const std::filesystem::path& path) : RecordedFile(ReadWholeFile(path)) {}
    explicit RecordedFile(std::vector<std::uint8_t> bytes)
        : bytes_(std::move(bytes)), movie_(iso::ReadMovie(bytes_)) {}

    const iso::Movie& Movie() const { return movie_; }
    const std::vector<std::uint8_t>& Bytes() const { return bytes_; }
    const std::vector<iso::Sample>& Samples(RecordedTrack track) const { return movie_.track(track).samples; }
    std::vector<std::uint8_t> BytesOf(const iso::Sample& sample) const {
        if (sample.offset > bytes_.size() || sample.size > bytes_.size() - sample.offset) {
            throw std::runtime_error("sample outside its file");
        }
        const auto begin = bytes_.begin() + static_cast<std::ptrdiff_t>(sample.offset);
        return {begin, begin + static_cast<std::ptrdiff_t>(sample.size)};
    }

 private:
    std::vector<std::uint8_t> bytes_;
    iso::Movie movie_;
};
