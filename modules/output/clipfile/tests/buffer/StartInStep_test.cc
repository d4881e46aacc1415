#include "buffer/StartInStep.h"

#include <gtest/gtest.h>

#include <cstdint>
#include <memory>
#include <string>
#include <vector>

#include "support/StreamUnits.h"

namespace clipfileModule {
namespace {

using UnitList = std::vector<std::shared_ptr<StreamData>>;

constexpr std::uint32_t kAudioClock = 48000;
constexpr std::uint32_t kVideoClock = 90000;
/// Half of 1024 samples at 48 kHz.
constexpr std::int64_t kHalf = 7680;

/// The picture is at 1 s.
const std::shared_ptr<StreamData> kVideoUnit = stream_units::VideoUnit(0, 90000, 1000);

/// Audio that begins so many samples after the picture.
std::shared_ptr<StreamData> audioAt(std::int64_t samples) {
    const auto rtp = static_cast<std::uint64_t>(48000 + samples);
    return stream_units::AudioUnit(0, rtp, rtp / 48);
}
/// The same with an RTP clock that begins anywhere.
std::shared_ptr<StreamData> foreignAudioAt(std::int64_t samples) {
    auto unit = audioAt(samples);
    unit->rtp_timestamp += 123456789;
    return unit;
}
std::shared_ptr<StreamData> metaAt(std::int64_t ticks) {
    const auto rtp = static_cast<std::uint64_t>(90000 + ticks);
    return stream_units::MetaUnit(0, rtp, rtp / 90);
}
StartInStep find(const UnitList& cache, std::uint32_t clock = kAudioClock) {
    return FindStart(cache, clock, {*kVideoUnit, kVideoClock}, kHalf);
}

TEST(TicksBetween, TakesTheRtpTimestampsThatTellTheSameInstant) {
    // 1 sample is 15 ticks of 1/720000 s, and a tick of 90 kHz 8.
    EXPECT_EQ(TicksBetween({*kVideoUnit, kVideoClock}, {*audioAt(1), kAudioClock}), 15);
    EXPECT_EQ(TicksBetween({*kVideoUnit, kVideoClock}, {*audioAt(-1), kAudioClock}), -15);
    EXPECT_EQ(TicksBetween({*metaAt(-7), kVideoClock}, {*kVideoUnit, kVideoClock}), 56);
}

TEST(TicksBetween, TakesTimestampsThatWereRoundedUpAsWell) {
    const auto unit = stream_units::AudioUnit(0, 48047, 1001);  // 1000.98 ms
    EXPECT_EQ(TicksBetween({*kVideoUnit, kVideoClock}, {*unit, kAudioClock}), 47 * 15);
}

TEST(TicksBetween, TakesTheMillisecondsWhenARtpClockTellsSomethingElse) {
    EXPECT_EQ(TicksBetween({*kVideoUnit, kVideoClock}, {*foreignAudioAt(511), kAudioClock}), 10 * 720);
    EXPECT_EQ(TicksBetween({*kVideoUnit, kVideoClock}, {*foreignAudioAt(-1), kAudioClock}), -720);
    const auto far = stream_units::AudioUnit(0, 48000, 1002);
    EXPECT_EQ(TicksBetween({*kVideoUnit, kVideoClock}, {*far, kAudioClock}), 2 * 720);
}

TEST(FindStart, TakesTheAudioFrameThatIsNearestToThePicture) {
    struct Case {
        std::int64_t first;  // samples from the picture
        std::size_t early;
    };
    // Frames of 1024 samples from `first` on; the nearest one begins within 512 samples.
    const Case cases[] = {{0, 0},     {-1, 0},    {-512, 0},  {-513, 1},   {-1024, 1}, {-1536, 1},
                          {-1537, 2}, {-2048, 2}, {-9728, 9}, {-9729, 10}, {511, 0},   {700, 0}};
    for (const Case& one : cases) {
        UnitList cache;
        for (std::int64_t k = 0; k < 12; ++k) {
            cache.push_back(audioAt(one.first + 1024 * k));
        }
        EXPECT_EQ(find(cache).early, one.early) << one.first;
        EXPECT_TRUE(find(cache).settled) << one.first;
    }
}

TEST(FindStart, WithMillisecondsAloneTheFrameIsNearestToTheMillisecond) {
    for (std::int64_t first = -1600; first <= -400; ++first) {
        UnitList cache;
        for (std::int64_t k = 0; k < 4; ++k) {
            cache.push_back(foreignAudioAt(first + 1024 * k));
        }
        const std::int64_t start = first + 1024 * static_cast<std::int64_t>(find(cache).early);
        EXPECT_LE(std::abs(start), 512 + 48) << first;
    }
}

TEST(FindStart, MetadataOfTheFrameBeforeIsTooEarlyAtEveryRate) {
    for (const std::int64_t frame : {3600, 3003, 1800, 1501}) {
        EXPECT_EQ(find({metaAt(-2 * frame), metaAt(-frame), metaAt(0), metaAt(frame)}, kVideoClock).early, 2u)
            << frame;
    }
}

TEST(FindStart, TheLastUnitStaysAndMayStillHaveToGo) {
    const StartInStep start = find({audioAt(-3072), audioAt(-2048)});
    EXPECT_EQ(start.early, 1u);
    EXPECT_FALSE(start.settled);
    EXPECT_FALSE(find({}).settled);
    EXPECT_EQ(find({}).early, 0u);
    EXPECT_TRUE(find({audioAt(-512)}).settled);
}

TEST(FindStart, AHoleAtThePictureKeepsTheUnitInFrontOfIt) {
    const StartInStep start = find({audioAt(-2048), audioAt(-1024), audioAt(1024)});
    EXPECT_EQ(start.early, 1u);
    EXPECT_TRUE(start.settled);
    // One that lies further back costs nothing.
    EXPECT_EQ(find({audioAt(-9000), audioAt(-1024), audioAt(0)}).early, 2u);
}

}  // namespace
}  // namespace clipfileModule
