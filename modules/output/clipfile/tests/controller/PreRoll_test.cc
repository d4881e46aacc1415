#include "controller/PreRoll.h"

#include <gtest/gtest.h>

#include <cstdint>
#include <memory>
#include <string>
#include <vector>

namespace clipfileModule {
namespace {

using Names = std::vector<std::string>;

std::shared_ptr<StreamData> unitAt(std::uint64_t timestamp) {
    auto unit = std::make_shared<StreamData>();
    unit->timestamp = timestamp;
    return unit;
}

class PreRollTest : public testing::Test {
 protected:
    void Add(Medium medium, std::uint64_t timestamp) { preRoll_.Add(medium, unitAt(timestamp)); }
    /// "V1000" for a video unit at 1000 ms, and so on.
    Names From(std::uint64_t timestamp) const {
        Names names;
        for (const PreRoll::Entry& entry : preRoll_.From(timestamp)) {
            names.push_back("VAM"[static_cast<std::size_t>(entry.medium)] +
                            std::to_string(entry.unit->timestamp));
        }
        return names;
    }

    static constexpr Medium V = Medium::kVideo;
    static constexpr Medium A = Medium::kAudio;
    static constexpr Medium M = Medium::kMeta;

    PreRoll preRoll_;
};

TEST_F(PreRollTest, PicturesInDecodingOrderBelongToTheInstantAtWhichTheyAreShown) {
    preRoll_.SetPictureOrder(PictureOrder::kDecoding);
    // Decoded at 960, 1000 and 1040 ms, shown at 1040, 1160 and 1000 ms.
    const std::uint64_t shown[] = {1040, 1160, 1000};
    for (std::uint64_t i = 0; i < 3; ++i) {
        auto unit = unitAt(960 + 40 * i);
        unit->rtp_timestamp = 90 * unit->timestamp;
        unit->presentation_timestamp = 90 * shown[i];
        preRoll_.Add(V, unit);
    }
    // The last one is shown earlier, but decoded behind one that belongs.
    EXPECT_EQ(From(1040), (Names{"V960", "V1000", "V1040"}));
    EXPECT_EQ(From(1041), (Names{"V1000", "V1040"}));
}

TEST_F(PreRollTest, GivesTheMediaInStepAndAtTheSameInstantMetadataAudioVideo) {
    for (const std::uint64_t t : {1000, 1040, 1080}) {
        Add(V, t);
    }
    for (const std::uint64_t t : {1000, 1021, 1042}) {
        Add(A, t);
    }
    for (const std::uint64_t t : {1000, 1040}) {
        Add(M, t);
    }
    EXPECT_EQ(From(1000), (Names{"M1000", "A1000", "V1000", "A1021", "M1040", "V1040", "A1042", "V1080"}));
}

TEST_F(PreRollTest, GivesAudioFromElevenMillisecondsBeforeTheStartAndTheOthersFromTheStartOn) {
    for (const std::uint64_t t : {988, 989, 1000}) {
        Add(V, t);
        Add(A, t);
        Add(M, t);
    }
    EXPECT_EQ(From(1000), (Names{"A989", "M1000", "A1000", "V1000"}));
}

TEST_F(PreRollTest, GivesAllAudioAtTheBeginningOfTheClock) {
    Add(A, 0);
    EXPECT_EQ(From(5), Names{"A0"});
}

TEST_F(PreRollTest, KeepsTheOrderInWhichAMediumCame) {
    for (const std::uint64_t t : {1000, 1120, 1040, 1080}) {
        Add(V, t);
    }
    EXPECT_EQ(From(1000), (Names{"V1000", "V1120", "V1040", "V1080"}));
}

TEST_F(PreRollTest, KeepsSoManyUnitsOfEachMedium) {
    for (std::uint64_t i = 0; i < 200; ++i) {
        Add(V, 1000 + i);
        Add(A, 1000 + i);
        Add(M, 1000 + i);
    }
    EXPECT_EQ(preRoll_.From(0).size(), 64U + 128U + 64U);
    EXPECT_EQ(From(1199), (Names{"A1188", "A1189", "A1190", "A1191", "A1192", "A1193", "A1194", "A1195",
                                 "A1196", "A1197", "A1198", "M1199", "A1199", "V1199"}));
}

/// While a metadata unit is in hand 50 more fill their queue: 51 frames of the slowest rate, and their audio.
TEST_F(PreRollTest, ReachesBackOverAFullQueueOfMetadataAtTheSlowestRate) {
    const auto frame = [](std::uint64_t n) { return 1000 + n * 1001 / 24; };
    for (std::uint64_t n = 0; n < 52; ++n) {
        Add(V, frame(n));
    }
    for (std::uint64_t k = 0; 1000 + k * 1024 / 48 < frame(52); ++k) {
        Add(A, 1000 + k * 1024 / 48);
    }
    EXPECT_EQ(preRoll_.From(1000).front().unit->timestamp, 1000U);
    EXPECT_EQ(From(1000)[0], "A1000");
    EXPECT_EQ(From(1000)[1], "V1000");
}

TEST_F(PreRollTest, ClearDropsWhatIsKeptAndTheGapThatFollowsIsNoLeap) {
    Add(V, 1000);
    Add(A, 1000);
    preRoll_.Clear();
    EXPECT_TRUE(From(0).empty());
    Add(V, 4000);
    Add(A, 1021);
    EXPECT_EQ(From(0), (Names{"A1021", "V4000"}));
}

TEST_F(PreRollTest, ALeapBackDropsAllMediaAndKeepsTheOldClockOutUntilEachHasLeapt) {
    Add(V, 90000);
    Add(A, 90000);
    Add(M, 90000);
    Add(V, 40);
    EXPECT_EQ(From(0), Names{"V40"});
    // Units of the old clock that were still on their way.
    Add(A, 90021);
    Add(M, 90040);
    EXPECT_EQ(From(0), Names{"V40"});
    Add(A, 42);
    Add(V, 80);
    Add(M, 80);
    EXPECT_EQ(From(0), (Names{"V40", "A42", "M80", "V80"}));
}

TEST_F(PreRollTest, ALeapForwardDropsAllMediaToo) {
    Add(A, 1000);
    Add(M, 1000);
    Add(V, 1000);
    Add(M, 2001);
    Add(V, 1040);
    Add(A, 1021);
    EXPECT_EQ(From(0), Names{"M2001"});
}

TEST_F(PreRollTest, ReorderedPicturesAndShortGapsAreNoLeaps) {
    Add(V, 1000);
    Add(V, 1667);
    Add(V, 967);
    Add(V, 2667);
    EXPECT_EQ(preRoll_.From(0).size(), 4U);
}

TEST_F(PreRollTest, ACommandOfTheNewClockFindsNothingOfTheOldOne) {
    Add(V, 90000);
    Add(A, 90000);
    Add(M, 90000);
    preRoll_.Follow(M, 40);
    EXPECT_TRUE(From(40).empty());
    Add(V, 90040);
    EXPECT_TRUE(From(40).empty());
}

TEST_F(PreRollTest, TwoLeapsInARowAreAwaitedOfEachMedium) {
    Add(V, 90000);
    Add(A, 90000);
    Add(V, 40000);
    Add(V, 40);
    Add(A, 40000);
    EXPECT_EQ(From(0), Names{"V40"});
    Add(A, 42);
    EXPECT_EQ(From(0), (Names{"V40", "A42"}));
}

TEST_F(PreRollTest, AfterAGapOfOneMediumTheOthersAreKeptAgainInTime) {
    Add(V, 1000);
    Add(A, 1000);
    Add(A, 5000);
    for (std::uint64_t i = 0; i < 64; ++i) {
        Add(V, 1040 + i);
    }
    EXPECT_EQ(From(0), (Names{"V1103", "A5000"}));
}

TEST_F(PreRollTest, NewestIsTheLatestInstantOfAllMediaThatWentByOrWereDropped) {
    EXPECT_FALSE(preRoll_.Newest());
    Add(V, 1040);
    preRoll_.Follow(A, 1063);
    EXPECT_EQ(preRoll_.Newest(), 1063U);
    preRoll_.Skip(M, 1120);
    EXPECT_EQ(preRoll_.Newest(), 1120U);
    preRoll_.Clear();
    EXPECT_EQ(preRoll_.Newest(), 1120U);
    // What the clock was before its leap counts no more.
    Add(V, 40);
    EXPECT_EQ(preRoll_.Newest(), 40U);
}

}  // namespace
}  // namespace clipfileModule
