#pragma once

#include <cstdint>
#include <filesystem>
#include <string>
#include <vector>

#include "support/Klv.h"

namespace endtoend {

/// One picture of a file, without what belongs to the transport alone: delimiters, parameter sets, filler
/// data (ISO/IEC 14496-10 table 7-1).
struct CodedPicture {
    std::vector<Bytes> nalUnits;
    bool idr = false;

    friend bool operator==(const CodedPicture&, const CodedPicture&) = default;
};

/// What a file holds, read by libavformat.
struct CodedMedia {
    std::vector<CodedPicture> video;
    /// AAC frames without ADTS header.
    std::vector<Bytes> audio;
    /// Samples of the last data stream: KLV packets of a source, metadata units of a recording.
    std::vector<Bytes> data;
    /// When pictures and AAC frames are presented, in seconds.
    std::vector<double> videoTimes;
    std::vector<double> audioTimes;
};

/// Throws std::runtime_error when the file cannot be opened.
CodedMedia ReadCodedMedia(const std::filesystem::path& file);

/// Copies `source` to the MPEG transport stream `target` and adds a KLV stream of a packet for each
/// `picturesPerPacket` pictures, at the time of the first of them.
void AddKlvStream(const std::filesystem::path& source, const std::filesystem::path& target,
                  std::size_t picturesPerPacket);

/// Writes the MPEG transport stream `target`: the `pictures` pictures and the first `sounds` AAC frames of
/// `source`, `times` times over, at times that go on without a gap: pictures at `rate` a second, AAC frames
/// of 1024 samples at 48 kHz.
void RepeatMaterial(const std::filesystem::path& source, const std::filesystem::path& target,
                    std::size_t pictures, std::size_t sounds, std::size_t times, int rate);

/// Where `part` stands in `whole` as one unbroken run; `whole.size()` when it does not.
template <typename Item>
std::size_t FindRun(const std::vector<Item>& whole, const std::vector<Item>& part) {
    for (std::size_t at = 0; at + part.size() <= whole.size(); ++at) {
        std::size_t same = 0;
        while (same < part.size() && whole[at + same] == part[same]) {
            ++same;
        }
        if (same == part.size()) {
            return at;
        }
    }
    return whole.size();
}

}  // namespace endtoend
