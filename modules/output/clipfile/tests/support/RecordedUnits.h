#pragma once

#include <cstddef>
#include <cstdint>
#include <vector>

#include "support/BufferHarness.h"
#include "support/StreamUnits.h"

/// The rates that hosts deliver most.
inline constexpr stream_units::FrameRate kCommonRates[] = {stream_units::kRate25, stream_units::kRate2997,
                                                           stream_units::kFrameRates[5],
                                                           stream_units::kFrameRates[6]};

/// The units of a whole record, by medium.
struct Recorded {
    std::vector<std::uint64_t> video;
    std::vector<std::uint64_t> audio;
    std::vector<std::uint64_t> meta;
    /// Pictures in each chunk.
    std::vector<std::size_t> chunks;
};

inline Recorded recordedBy(const BufferHarness& harness, std::size_t output = 0) {
    Recorded all;
    const auto append = [](std::vector<std::uint64_t>& to, const std::vector<std::uint64_t>& more) {
        to.insert(to.end(), more.begin(), more.end());
    };
    for (const auto& chunk : harness.Chunks(output)) {
        append(all.video, NumbersOf('V', chunk->video));
        append(all.audio, NumbersOf('A', chunk->audio));
        append(all.meta, NumbersOf('M', chunk->meta));
        all.chunks.push_back(chunk->video.size());
    }
    return all;
}

inline stream_units::StreamClock clockOf(const stream_units::FrameRate& rate) {
    stream_units::StreamClock clock;
    clock.rate = rate;
    return clock;
}

/// Audio frames in so many pictures, to the nearest.
inline std::uint64_t audioIn(const stream_units::FrameRate& rate, std::uint64_t pictures) {
    const std::uint64_t numerator = pictures * rate.duration * 48000;
    const std::uint64_t denominator = rate.timescale * 1024;
    return (2 * numerator + denominator) / (2 * denominator);
}

inline void makeExact(BufferHarness& harness) {
    harness.settings.recordRules = clipfileModule::RecordRules::kExact;
}
