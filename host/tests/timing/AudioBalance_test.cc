#include "timing/AudioBalance.h"

#include <gtest/gtest.h>

#include <cstdlib>
#include <random>
#include <vector>

#include "timing/AudioGrid.h"

namespace receiver {
namespace {

TEST(AudioBalance, OutsideOfARecordingEachFrameIsTaken) {
    AudioBalance balance;
    EXPECT_TRUE(balance.Takes(0, 0));
    EXPECT_TRUE(balance.Takes(1024, 1000));
    balance.Begin(2048, std::nullopt);
    balance.End();
    EXPECT_TRUE(balance.Takes(3072, 1000));
}

/// Pictures of 1920 samples, one of which is missing: a frame of audio is left out by the source, and 896
/// samples are over.
TEST(AudioBalance, SoundThatWouldBeMoreThanHalfAFrameBehindIsLeftOutByAFrame) {
    AudioBalance balance;
    balance.Begin(0, 0);
    EXPECT_TRUE(balance.Takes(1024, 0));
    EXPECT_FALSE(balance.Takes(3072, 1920));
    EXPECT_TRUE(balance.Takes(4096, 0));
    // So it gets 128, 256 and 384 ahead, and with the next gap 512 behind, which is near enough.
    EXPECT_FALSE(balance.Takes(6144, 1920));
    EXPECT_FALSE(balance.Takes(8192, 1920));
    EXPECT_TRUE(balance.Takes(10240, 1920));
}

/// The recorder begins with the frame nearest to the picture, up to half a frame before or behind it.
TEST(AudioBalance, WhereTheFirstFrameStandsCountsToo) {
    AudioBalance ahead;
    ahead.Begin(1000, 1000 + 1);
    EXPECT_TRUE(ahead.Takes(1001 + 1024 + 1024, 1024 + 512));
    AudioBalance behind;
    behind.Begin(1000, 1000 - 1);
    EXPECT_FALSE(behind.Takes(999 + 1024 + 1024, 1024 + 512));
    AudioBalance later;
    later.Begin(1000, 1000 - 513);
    EXPECT_TRUE(later.Takes(1511, 0));
    EXPECT_TRUE(later.Takes(1511 + 1024, 1023));
    EXPECT_FALSE(later.Takes(1511 + 2048, 1));
}

/// Gaps at random, through the grid of a source: wherever a recording begins, each frame of audio stands
/// within half a frame of where it belongs to its pictures, by the counts of both.
TEST(AudioBalance, SoundStaysWithinHalfAFrameOfItsPicturesWhereverARecordingBegins) {
    constexpr std::int64_t kPicture = 1920;
    constexpr std::int64_t kLength = 2000;
    for (unsigned seed = 1; seed <= 100; ++seed) {
        SCOPED_TRACE(seed);
        std::mt19937 random(seed);
        std::vector<bool> there(kLength, true);
        for (std::size_t at = 20; at < kLength; at += 2 + random() % 60) {
            for (std::size_t lost = 1 + random() % 11; lost > 0 && at < kLength - 1; --lost) {
                there[at++] = false;
            }
        }
        // How many pictures there are in front of each.
        std::vector<std::int64_t> before = {0};
        for (const bool picture : there) {
            before.push_back(before.back() + (picture ? 1 : 0));
        }
        AudioGrid grid;
        for (std::int64_t at = 0; at < kLength; ++at) {
            if (!there[static_cast<std::size_t>(at)]) {
                grid.AddVideoGap(at * kPicture, kPicture);
            }
        }
        struct Sound {
            std::int64_t time;
            std::int64_t passed;
        };
        std::vector<Sound> sounds;
        const std::int64_t offset = static_cast<std::int64_t>(random() % 1024) - 512;
        for (std::int64_t time = offset; time < kLength * kPicture; time += 1024) {
            const AudioGrid::Place place = grid.Next(time);
            if (place.action == AudioGrid::Action::kAccept) {
                ASSERT_EQ(place.time, time);
                sounds.push_back({time, grid.TakePassed()});
            } else {
                ASSERT_EQ(place.action, AudioGrid::Action::kVideoMissing);
            }
        }
        for (std::int64_t first = 0; first < kLength - 300; first += 25) {
            if (!there[static_cast<std::size_t>(first)]) {
                continue;
            }
            AudioBalance balance;
            std::optional<std::int64_t> last;
            bool begun = false;
            std::int64_t count = 0;
            for (const Sound& sound : sounds) {
                if (sound.time > (first + 200) * kPicture) {
                    break;
                }
                if (!begun && sound.time >= first * kPicture) {
                    begun = true;
                    balance.Begin(first * kPicture, last);
                    if (last && *last >= first * kPicture - 512) {
                        count = 1;
                    }
                }
                if (balance.Takes(sound.time, sound.passed)) {
                    last = sound.time;
                    if (begun) {
                        // Its middle says to which picture it belongs.
                        const std::int64_t middle = sound.time + 512;
                        const std::int64_t at = middle / kPicture;
                        if (at < kLength && there[static_cast<std::size_t>(at)] && at >= first) {
                            const std::int64_t picture = (before[static_cast<std::size_t>(at)] -
                                                          before[static_cast<std::size_t>(first)]) *
                                                         kPicture;
                            const std::int64_t distance =
                                count * 1024 - picture - (sound.time - at * kPicture);
                            ASSERT_LE(std::abs(distance), 512) << "from " << first << " at " << at;
                        }
                        ++count;
                    }
                }
            }
        }
    }
}

}  // namespace
}  // namespace receiver
