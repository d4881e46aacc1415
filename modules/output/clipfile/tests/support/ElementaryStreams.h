#pragma once

// Coded streams as encoders write them to files, cut into the units that a host pushes.

#include <algorithm>
#include <cstddef>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <memory>
#include <vector>

#include "support/StreamUnits.h"

namespace elementary_streams {

inline stream_units::Bytes ReadBytes(const std::filesystem::path& path) {
    std::ifstream in(path, std::ios::binary);
    return {std::istreambuf_iterator<char>(in), std::istreambuf_iterator<char>()};
}

/// Access units of a byte stream (ITU-T H.264 annex B) in which each begins with a delimiter behind a 4-byte
/// start code.
inline std::vector<std::shared_ptr<StreamData>> ReadAccessUnits(const std::filesystem::path& path) {
    static constexpr unsigned char kDelimiter[] = {0, 0, 0, 1, 9};
    const stream_units::Bytes bytes = ReadBytes(path);
    std::vector<std::shared_ptr<StreamData>> units;
    auto begin = bytes.begin();
    while (begin != bytes.end()) {
        const auto end = std::search(begin + 5, bytes.end(), std::begin(kDelimiter), std::end(kDelimiter));
        units.push_back(stream_units::MakeUnit(stream_units::Bytes(begin, end), 0, 0));
        begin = end;
    }
    return units;
}

/// Frames with their ADTS headers (ISO/IEC 14496-3 1.A.2.2.1).
inline std::vector<std::shared_ptr<StreamData>> ReadAudioFrames(const std::filesystem::path& path) {
    const stream_units::Bytes bytes = ReadBytes(path);
    std::vector<std::shared_ptr<StreamData>> units;
    for (std::size_t at = 0; at + 7 <= bytes.size();) {
        const std::size_t length = static_cast<std::size_t>(bytes[at + 3] & 3) << 11 |
                                   static_cast<std::size_t>(bytes[at + 4]) << 3 | bytes[at + 5] >> 5;
        const auto begin = bytes.begin() + static_cast<std::ptrdiff_t>(at);
        units.push_back(stream_units::MakeUnit(
            stream_units::Bytes(begin, begin + static_cast<std::ptrdiff_t>(length)), 0, 0));
        at += length;
    }
    return units;
}

}  // namespace elementary_streams
