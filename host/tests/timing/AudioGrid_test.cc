#include "timing/AudioGrid.h"

#include <gtest/gtest.h>

namespace receiver {

using Action = AudioGrid::Action;

static bool operator==(const AudioGrid::Place& a, const AudioGrid::Place& b) {
    return a.action == b.action && a.time == b.time;
}
static void PrintTo(const AudioGrid::Place& place, std::ostream* out) {
    *out << "action " << static_cast<int>(place.action) << " at " << place.time;
}

namespace {

using Place = AudioGrid::Place;

TEST(AudioGrid, FramesStandOneBehindTheOtherWhateverTheirStampsWander) {
    AudioGrid grid;
    EXPECT_EQ(grid.Next(10), (Place{Action::kAccept, 10}));
    EXPECT_EQ(grid.Next(1034 + 700), (Place{Action::kAccept, 1034}));
    EXPECT_EQ(grid.Next(2058 - 700), (Place{Action::kAccept, 2058}));
}

TEST(AudioGrid, SilenceLeadsUpToAFirstFrameThatComesLate) {
    AudioGrid grid;
    EXPECT_EQ(grid.Next(2058), (Place{Action::kFill, 10}));
    EXPECT_EQ(grid.Next(2058), (Place{Action::kFill, 1034}));
    EXPECT_EQ(grid.Next(2058), (Place{Action::kAccept, 2058}));
}

TEST(AudioGrid, AGapIsFilled) {
    AudioGrid grid;
    grid.Next(0);
    EXPECT_EQ(grid.Next(3072 + 5), (Place{Action::kFill, 1024}));
    EXPECT_EQ(grid.Next(3072 + 5), (Place{Action::kFill, 2048}));
    EXPECT_EQ(grid.Next(3072 + 5), (Place{Action::kAccept, 3072}));
}

// With the first frame at most half its length before or behind the first picture, sound and picture begin in
// step.
TEST(AudioGrid, FramesFromLongerBeforeTheBeginningThanHalfAFrameAreLeftOut) {
    AudioGrid grid;
    EXPECT_EQ(grid.Next(-513).action, Action::kOverlap);
    EXPECT_EQ(grid.Next(-512), (Place{Action::kAccept, -512}));
    EXPECT_EQ(grid.Next(512), (Place{Action::kAccept, 512}));
}

TEST(AudioGrid, SilenceLeadsUpToAFirstFrameThatIsMoreThanHalfAFrameLate) {
    AudioGrid grid;
    EXPECT_EQ(grid.Next(513), (Place{Action::kFill, -511}));
    EXPECT_EQ(grid.Next(513), (Place{Action::kAccept, 513}));
}

TEST(AudioGrid, AFrameThatOverlapsIsLeftOut) {
    AudioGrid grid;
    grid.Next(0);
    EXPECT_EQ(grid.Next(100).action, Action::kOverlap);
    EXPECT_EQ(grid.Next(1024), (Place{Action::kAccept, 1024}));
}

TEST(AudioGrid, AClockThatDriftsGivesOneFrameForEachFrameOfDriftAndNoMore) {
    AudioGrid grid;
    int fills = 0;
    for (std::int64_t n = 0; n < 10000; ++n) {
        // One frame in a thousand: ten in all.
        const std::int64_t stamp = n * 1024 + n;
        Place place = grid.Next(stamp);
        while (place.action == Action::kFill) {
            ++fills;
            place = grid.Next(stamp);
        }
        ASSERT_EQ(place.action, Action::kAccept);
    }
    EXPECT_EQ(fills, 10);
}

TEST(AudioGrid, TheAudioOfMissingVideoIsLeftOutAndItsTimePasses) {
    AudioGrid grid;
    grid.Next(0);
    grid.AddVideoGap(1024, 2048);
    EXPECT_EQ(grid.Next(1024).action, Action::kVideoMissing);
    EXPECT_EQ(grid.Next(2048).action, Action::kVideoMissing);
    EXPECT_EQ(grid.Next(3072), (Place{Action::kAccept, 3072}));
}

TEST(AudioGrid, AGapOfBothMediaIsNotFilled) {
    AudioGrid grid;
    grid.Next(0);
    grid.AddVideoGap(1024, 10240);
    EXPECT_EQ(grid.Next(11264), (Place{Action::kAccept, 11264}));
}

TEST(AudioGrid, AudioThatWasMissingBeforeTheVideoIsFilledUpToIt) {
    AudioGrid grid;
    grid.Next(0);
    grid.AddVideoGap(3072, 10240);
    EXPECT_EQ(grid.Next(13312), (Place{Action::kFill, 1024}));
    EXPECT_EQ(grid.Next(13312), (Place{Action::kFill, 2048}));
    EXPECT_EQ(grid.Next(13312), (Place{Action::kAccept, 13312}));
}

TEST(AudioGrid, ManySmallGapsAddUpToWholeFrames) {
    AudioGrid grid;
    std::int64_t accepted = 0;
    std::int64_t leftOut = 0;
    // A frame of 1920 samples (25 a second) is missing in each of 100 seconds.
    for (std::int64_t n = 0; n * 1024 < 100 * 48000; ++n) {
        if (n % 47 == 0) {
            grid.AddVideoGap(n * 1024 + 3000, 1920);
        }
        const Place place = grid.Next(n * 1024);
        ASSERT_NE(place.action, Action::kFill);
        ASSERT_NE(place.action, Action::kOverlap);
        ++(place.action == Action::kAccept ? accepted : leftOut);
    }
    // 100 gaps of 1.875 frames.
    EXPECT_NEAR(static_cast<double>(leftOut), 187.5, 1.0);
    EXPECT_EQ(accepted + leftOut, 4688);
}

TEST(AudioGrid, SilenceCanBeMadeWithoutASource) {
    AudioGrid grid;
    EXPECT_EQ(grid.Append(), 0);
    EXPECT_EQ(grid.Append(), 1024);
    grid.AddVideoGap(2048, 1024);
    EXPECT_EQ(grid.End(), 3072);
    EXPECT_EQ(grid.Append(), 3072);
    EXPECT_EQ(grid.Next(4096 + 5), (Place{Action::kAccept, 4096}));
}

TEST(AudioGrid, ASourceThatBeginsAnewStandsWhereItIsAndSilenceLeadsUpToIt) {
    for (const std::int64_t offset : {-512, -300, 0, 300, 511}) {
        AudioGrid grid;
        grid.Next(0);
        grid.Rejoin();
        EXPECT_EQ(grid.Next(1024 + offset), (Place{Action::kAccept, 1024 + offset}));
        EXPECT_EQ(grid.Next(2048 + offset), (Place{Action::kAccept, 2048 + offset}));
    }
    AudioGrid grid;
    grid.Next(0);
    grid.Rejoin();
    EXPECT_EQ(grid.Next(1024 + 512), (Place{Action::kFill, 512}));
    EXPECT_EQ(grid.Next(1024 + 512), (Place{Action::kAccept, 1536}));
    // From there on stamps may wander.
    EXPECT_EQ(grid.Next(2560 + 700), (Place{Action::kAccept, 2560}));
}

TEST(AudioGrid, WhatOverlapsAndWhatIsLeftOutDoesNotMoveASourceThatBeginsAnew) {
    AudioGrid grid;
    grid.Next(0);
    grid.Rejoin();
    EXPECT_EQ(grid.Next(511).action, Action::kOverlap);
    EXPECT_EQ(grid.Next(1535), (Place{Action::kAccept, 1535}));
}

TEST(AudioGrid, BehindAGapThatEndsARecordingFramesStandWhereTheyAre) {
    AudioGrid grid;
    grid.Next(0);
    // 23.5 frames.
    grid.AddVideoGap(1024, 24064, true);
    EXPECT_EQ(grid.Next(1024).action, Action::kVideoMissing);
    EXPECT_EQ(grid.Next(25088 + 100), (Place{Action::kAccept, 25188}));
    EXPECT_EQ(grid.Next(26112 + 100), (Place{Action::kAccept, 26212}));
}

/// The recorder begins with the frame nearest to the picture, which must be there whatever was entered
/// before.
TEST(AudioGrid, TheFrameNearestToAPictureBehindAGapIsNeverLeftOut) {
    for (std::int64_t silent = 1; silent <= 2; ++silent) {
        for (std::int64_t begin = 8000; begin < 10100; begin += 100) {
            AudioGrid grid;
            grid.Next(0);
            for (std::int64_t frame = 0; frame < silent; ++frame) {
                grid.Append();
            }
            grid.Rejoin();
            grid.AddVideoGap(1920, begin - 1920);
            EXPECT_EQ(grid.Next(begin - 500), (Place{Action::kAccept, begin - 500}));
        }
    }
}

TEST(AudioGrid, SilenceBehindAGapBeginsNearestToThePicture) {
    AudioGrid grid;
    grid.Next(0);
    grid.Append();
    grid.Rejoin();
    grid.AddVideoGap(1920, 8080);
    EXPECT_EQ(grid.Next(12000), (Place{Action::kFill, 9952}));
    EXPECT_EQ(grid.Next(12000), (Place{Action::kFill, 10976}));
    EXPECT_EQ(grid.Next(12000), (Place{Action::kAccept, 12000}));
}

}  // namespace
}  // namespace receiver
