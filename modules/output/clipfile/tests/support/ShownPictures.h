#pragma once

// What a file shows, before a reader of the standard (ISO/IEC 14496-12 8.6.1.3, 8.6.6).

#include <gtest/gtest.h>

#include <cmath>
#include <cstddef>
#include <cstdint>
#include <vector>

#include "boxlib/support/IsoReader.h"

/// The samples of the video in the order in which they are shown, as numbers in the order of the file. Checks
/// that their times are those of a grid of `duration` ticks without a gap, none twice and none negative, from
/// the beginning of the edit to its end; samples that are shown behind that are left out.
inline std::vector<std::size_t> ShownSamples(const iso::Movie& movie, std::uint32_t duration) {
    const iso::Track& track = movie.track(1);
    EXPECT_EQ(track.edits.size(), 1U);
    const iso::Edit edit = track.edits.empty() ? iso::Edit() : track.edits[0];
    EXPECT_EQ(edit.segmentDuration % duration, 0U);
    constexpr std::size_t kNone = ~std::size_t{0};
    std::vector<std::size_t> shown(edit.segmentDuration / duration, kNone);
    for (std::size_t i = 0; i < track.samples.size(); ++i) {
        const iso::Sample& sample = track.samples[i];
        EXPECT_GE(sample.compositionOffset, 0);
        const std::int64_t time =
            static_cast<std::int64_t>(sample.decodeTime) + sample.compositionOffset - edit.mediaTime;
        EXPECT_GE(time, 0) << i;
        EXPECT_EQ(time % duration, 0) << i;
        const auto place = static_cast<std::size_t>(time) / duration;
        if (place < shown.size()) {
            EXPECT_EQ(shown[place], kNone) << place << " is doubled";
            shown[place] = i;
        }
    }
    for (std::size_t place = 0; place < shown.size(); ++place) {
        EXPECT_NE(shown[place], kNone) << place << " is empty";
    }
    return shown;
}

/// The other media last as long as the pictures that are shown.
inline void ExpectOthersAsLong(const iso::Movie& movie, std::size_t shown, std::uint32_t duration,
                               std::uint64_t timescale, double audioMilliSec) {
    EXPECT_EQ(movie.track(4).samples.size(), shown);
    ASSERT_EQ(movie.track(3).samples.size(), 1U);
    EXPECT_EQ(movie.track(3).samples[0].duration, shown * duration);
    const auto audio = static_cast<double>(movie.track(2).samples.size()) * 1024 / 48;
    const double pictures = 1000.0 * static_cast<double>(shown * duration) / static_cast<double>(timescale);
    EXPECT_LE(std::abs(audio - pictures), audioMilliSec) << "milliseconds";
}
