#include "StreamRates.h"

#include <gtest/gtest.h>

#include "fakes/FakeSource.h"

namespace receiver {
namespace {

TEST(StreamRates, AreThoseOfTheLastWholeSecondOfStream) {
    StreamRates rates;
    EXPECT_EQ(rates.FramesPerSecond(), 0);
    for (std::int64_t frame = 0; frame <= 25; ++frame) {
        rates.Count(MakeSourceUnit(Medium::kVideo, frame * 3600, std::vector<unsigned char>(1000)));
        rates.Count(MakeSourceUnit(Medium::kAudio, frame * 1920, std::vector<unsigned char>(100)));
    }
    EXPECT_DOUBLE_EQ(rates.FramesPerSecond(), 25);
    EXPECT_DOUBLE_EQ(rates.VideoKilobits(), 200);
    EXPECT_DOUBLE_EQ(rates.AudioKilobits(), 20);
    EXPECT_EQ(rates.KlvPackets(), 0u);
}

TEST(StreamRates, CountsKlvPacketsFromTheBeginning) {
    StreamRates rates;
    rates.Count(MakeSourceUnit(Medium::kKlv, 0, {1}));
    rates.Count(MakeSourceUnit(Medium::kKlv, 1, {1}));
    EXPECT_EQ(rates.KlvPackets(), 2u);
}

}  // namespace
}  // namespace receiver
