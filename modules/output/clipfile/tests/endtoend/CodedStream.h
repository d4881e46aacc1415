#pragma once

#include <cstdint>
#include <filesystem>
#include <memory>
#include <vector>

#include "endtoend/NumberedStream.h"
#include "support/ElementaryStreams.h"

/// An endless stream at 25 frames a second of a few coded pictures and frames of sound, over and over, with
/// numbered metadata.
class CodedStream {
 public:
    /// From "coded.h264" and "coded.aac" in `directory`.
    explicit CodedStream(const std::filesystem::path& directory)
        : video_(elementary_streams::ReadAccessUnits(directory / "coded.h264")),
          audio_(elementary_streams::ReadAudioFrames(directory / "coded.aac")) {}

    /// Pushes frame `n` of all media, the picture last.
    template <typename Push>
    void PushFrame(Push& push, std::uint64_t n) const {
        const stream_units::StreamClock& clock = numbers_.clock;
        for (std::uint64_t k = clock.AudioBefore(n); k < clock.AudioBefore(n + 1); ++k) {
            push.Audio(at(audio_, k, clock.AudioRtp(k), clock.AudioMilliSec(k)));
        }
        push.Meta(*numbers_.Meta(n, true));
        push.Video(at(video_, n, clock.VideoRtp(n), clock.VideoMilliSec(n)));
    }
    /// What metadata the samples hold, and names of files.
    const NumberedStream& Numbers() const { return numbers_; }

 private:
    static StreamData at(const std::vector<std::shared_ptr<StreamData>>& units, std::uint64_t n,
                         std::uint64_t rtp, std::uint64_t milliSec) {
        StreamData unit = *units[n % units.size()];
        unit.rtp_timestamp = rtp;
        unit.timestamp = milliSec;
        return unit;
    }

    const NumberedStream numbers_{stream_units::kRate25};
    const std::vector<std::shared_ptr<StreamData>> video_;
    const std::vector<std::shared_ptr<StreamData>> audio_;
};
