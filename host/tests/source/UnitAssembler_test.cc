#include "source/UnitAssembler.h"

#include <gtest/gtest.h>

#include <string>

namespace receiver {
namespace {

constexpr FrameRate k25{25000, 25, 1, 25, false};
constexpr FrameRate k2997{29970, 30000, 1001, 30, true};

class UnitAssemblerTest : public testing::Test {
 protected:
    static std::shared_ptr<unsigned char> Data() {
        return {new unsigned char[4]{}, std::default_delete<unsigned char[]>()};
    }
    void Picture(std::int64_t time, std::optional<Timecode> timecode = {}) {
        assembler_.AddPicture({Data(), 4, time, false, timecode});
    }
    void Audio(std::int64_t time) { assembler_.AddAudio({Data(), 4, time}); }
    /// "v0 a0 k0 ...": media and times of what came since the last call; 's' is silence, 'n' a notice. Behind
    /// a slash follows for how long pictures are missing.
    std::string Made() {
        std::string text;
        for (const auto& item : assembler_.Take()) {
            text += text.empty() ? "" : " ";
            const auto* const unit = std::get_if<SourceUnit>(&item);
            if (unit == nullptr) {
                text += "n";
                notice_ = std::get<std::string>(item);
                continue;
            }
            text += unit->medium == Medium::kVideo ? "v"
                    : unit->medium == Medium::kKlv ? "k"
                    : unit->size == 4              ? "a"
                                                   : "s";
            text += std::to_string(unit->time);
            text += unit->passed != 0 ? "/" + std::to_string(unit->passed) : "";
            timecode_ = unit->timecode;
        }
        return text;
    }

    UnitAssembler assembler_{k25};
    std::string notice_;
    std::optional<Timecode> timecode_;
};

TEST_F(UnitAssemblerTest, AudioWaitsForThePictureOfItsTime) {
    assembler_.Begin(true);
    Audio(0);
    EXPECT_EQ(Made(), "");
    Picture(0);
    EXPECT_EQ(Made(), "a0 v0");
    Audio(1024);
    EXPECT_EQ(Made(), "");
    // 1024 samples are 1920 ticks.
    Picture(3600);
    EXPECT_EQ(Made(), "a1024 v3600");
    Audio(2048);
    Picture(7200);
    EXPECT_EQ(Made(), "a2048 v7200");
}

TEST_F(UnitAssemblerTest, AReorderedPictureIsShownInThePlaceOfAnotherOne) {
    assembler_.Begin(false);
    // Stamps in milliseconds, which are 90 ticks.
    const std::pair<std::int64_t, std::int64_t> pictures[] = {
        {0, 0}, {3600, 10760}, {7190, 20}, {10800, -7240}};
    std::vector<std::int64_t> shown;
    for (const auto& [time, later] : pictures) {
        assembler_.AddPicture({Data(), 4, time, time == 0, {}, later});
    }
    for (const auto& item : assembler_.Take()) {
        const auto* const unit = std::get_if<SourceUnit>(&item);
        if (unit != nullptr && unit->medium == Medium::kVideo) {
            shown.push_back(unit->time + unit->later);
        }
    }
    EXPECT_EQ(shown, (std::vector<std::int64_t>{0, 4 * 3600, 2 * 3600, 3600}));
}

TEST_F(UnitAssemblerTest, WithoutAudioSilenceKeepsStepWithThePictures) {
    assembler_.Begin(false);
    Picture(0);
    EXPECT_EQ(Made(), "s0 v0");
    Picture(3600);
    EXPECT_EQ(Made(), "s1024 v3600");
    Picture(7200);
    EXPECT_EQ(Made(), "s2048 s3072 v7200");
}

TEST_F(UnitAssemblerTest, SilenceStandsInForAudioThatStaysAway) {
    assembler_.Begin(true);
    for (int n = 0; n < 75; ++n) {
        Picture(n * 3600);
    }
    EXPECT_EQ(Made().find('s'), std::string::npos);
    // Three seconds behind.
    Picture(75 * 3600);
    EXPECT_EQ(Made().substr(0, 3), "s0 ");
    EXPECT_EQ(notice_, "the source has gaps: 1 audio frame missing and filled with silence");
    EXPECT_EQ(assembler_.SilentFrames(), 1u);
}

TEST_F(UnitAssemblerTest, AudioOfALostPictureIsLeftOut) {
    assembler_.Begin(true);
    Picture(0);
    Audio(0);
    Audio(1024);
    EXPECT_EQ(Made(), "v0 a0");
    Audio(2048);
    Audio(3072);
    Audio(4096);
    // The pictures at 3600 and 7200 are missing: 3840 samples from 1920 on.
    Picture(10800);
    EXPECT_EQ(Made(), "a1024 v10800 n");
    EXPECT_EQ(notice_, "the source has gaps: 2 video frames lost, 3 audio frames left out with them");
    Audio(5120);
    Audio(6144);
    Picture(14400);
    // 768 samples are left over.
    EXPECT_EQ(Made(), "a5120/3840 a6144 v14400");
    EXPECT_EQ(assembler_.LostFrames(), 2u);
}

TEST_F(UnitAssemblerTest, TheGapBeforeANewConnectionIsNoLoss) {
    assembler_.Begin(true);
    Picture(0);
    assembler_.Begin(true);
    Picture(900000);
    // Audio is filled up to the end of the picture in front of the gap, and nowhere else.
    EXPECT_EQ(Made(), "v0 s0 s1024 v900000 n");
    EXPECT_EQ(assembler_.LostFrames(), 0u);
    // The gap was 478080 samples long.
    Audio(480300);
    Picture(903600);
    EXPECT_EQ(Made(), "a480300/478080 v903600");
}

TEST_F(UnitAssemblerTest, AudioThatEndsBeforeTheLastPictureIsFilledUpToItsEnd) {
    assembler_.Begin(true);
    Audio(-512);
    Picture(0);
    Picture(3600);
    EXPECT_EQ(Made(), "a-512 v0 v3600");
    // The pictures end at sample 3840.
    assembler_.Finish();
    EXPECT_EQ(Made(), "s512 s1536 s2560 s3584");
    assembler_.Finish();
    EXPECT_EQ(Made(), "");
}

TEST_F(UnitAssemblerTest, SoundThatHasStoppedLongBeforeTheEndIsToldThere) {
    assembler_.Begin(true);
    for (std::int64_t number = 0; number <= 50; ++number) {
        Audio(number == 0 ? 0 : -10000);
        Picture(number * 3600);
    }
    Made();
    assembler_.Finish();
    Made();
    // 51 pictures are 95.6 frames of sound, of which one came.
    EXPECT_EQ(notice_, "the source has gaps: 95 audio frames missing and filled with silence");
}

TEST_F(UnitAssemblerTest, PicturesThatEndLongBeforeTheSoundAreLost) {
    assembler_.Begin(true);
    Audio(0);
    Picture(0);
    // The last one begins at 5.013 s, and the pictures end at 0.04 s.
    for (std::int64_t time = 1024; time <= 235 * 1024; time += 1024) {
        Audio(time);
    }
    assembler_.Finish();
    Made();
    EXPECT_EQ(notice_, "the pictures ended 5 s before the sound, which is left out: 124 video frames lost");
    EXPECT_EQ(assembler_.LostFrames(), 124u);
}

TEST_F(UnitAssemblerTest, SoundThatRunsAheadOfThePicturesAtTheEndIsNoLoss) {
    assembler_.Begin(true);
    Audio(0);
    Picture(0);
    Audio(3 * 48000);
    assembler_.Finish();
    EXPECT_EQ(Made(), "a0 v0 s1024");
    EXPECT_EQ(assembler_.LostFrames(), 0u);
}

TEST_F(UnitAssemblerTest, NothingIsFilledUpWithoutAPicture) {
    assembler_.Begin(true);
    Audio(0);
    assembler_.Finish();
    EXPECT_EQ(Made(), "a0");
}

TEST_F(UnitAssemblerTest, KlvIsStampedWithItsTimeOrThatOfTheLastPicture) {
    assembler_.Begin(true);
    assembler_.AddKlv("early", 0);
    Picture(0);
    EXPECT_EQ(Made(), "k0 v0");
    assembler_.AddKlv("late", std::nullopt);
    EXPECT_EQ(Made(), "k0");
    assembler_.AddKlv("ahead", 3600);
    EXPECT_EQ(Made(), "");
    Picture(3600);
    EXPECT_EQ(Made(), "k3600 v3600");
    assembler_.AddKlv("behind", 1000);
    EXPECT_EQ(Made(), "k3600");
}

TEST_F(UnitAssemblerTest, KlvPassesUnchanged) {
    assembler_.Begin(true);
    const std::string packet("\x00\x01zero\x00", 7);
    assembler_.AddKlv(packet, 0);
    Picture(0);
    const Batch batch = assembler_.Take();
    const auto& unit = std::get<SourceUnit>(batch.front());
    EXPECT_EQ(std::string(reinterpret_cast<const char*>(unit.data.get()), unit.size), packet);
}

TEST_F(UnitAssemblerTest, TimecodeIsCountedOnOverLostPictures) {
    assembler_.Begin(true);
    Picture(0);
    Made();
    EXPECT_FALSE(timecode_);
    Picture(3600, Timecode{10, 20, 30, 23, false});
    Made();
    EXPECT_EQ(timecode_, (Timecode{10, 20, 30, 23, false}));
    Picture(4 * 3600);
    Made();
    EXPECT_EQ(timecode_, (Timecode{10, 20, 31, 1, false}));
    // The source's own word counts.
    Picture(5 * 3600, Timecode{1, 0, 0, 0, false});
    Made();
    EXPECT_EQ(timecode_, (Timecode{1, 0, 0, 0, false}));
}

TEST_F(UnitAssemblerTest, TimecodeThatCannotBeIsPassedOver) {
    assembler_.Begin(true);
    Picture(0, Timecode{10, 20, 30, 25, false});
    Made();
    EXPECT_FALSE(timecode_);
}

TEST(UnitAssembler, DropFrameTimecodeLeavesNumbersOut) {
    UnitAssembler assembler(k2997);
    assembler.Begin(true);
    assembler.SetTimecode({10, 0, 59, 29, true});
    for (const std::int64_t time : {0, 3003}) {
        assembler.AddPicture({std::shared_ptr<unsigned char>(new unsigned char), 1, time, false, {}});
    }
    const Batch batch = assembler.Take();
    EXPECT_EQ(std::get<SourceUnit>(batch.back()).timecode, (Timecode{10, 1, 0, 2, true}));
}

}  // namespace
}  // namespace receiver
