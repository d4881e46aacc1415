#include "GroupWatch.h"

#include <gtest/gtest.h>

#include "fakes/FakeSource.h"
#include "support/Rates.h"

namespace receiver {
namespace {

/// What is told of a stream whose IDR frames stand at these pictures.
std::vector<std::string> Told(GroupWatch watch, const FrameRate& rate,
                              const std::vector<std::int64_t>& keyFrames) {
    std::vector<std::string> told;
    for (std::int64_t frame = 0; frame <= keyFrames.back(); ++frame) {
        const bool keyFrame = std::find(keyFrames.begin(), keyFrames.end(), frame) != keyFrames.end();
        const std::int64_t time = frame * 90000 * rate.denominator / rate.numerator;
        if (const auto notice = watch.Look(MakeFrame(time, keyFrame, 0))) {
            told.push_back(*notice);
        }
    }
    return told;
}

std::vector<std::int64_t> Every(std::int64_t group, std::int64_t count = 10) {
    std::vector<std::int64_t> keyFrames;
    for (std::int64_t n = 0; n < count; ++n) {
        keyFrames.push_back(n * group);
    }
    return keyFrames;
}

using Sentences = std::vector<std::string>;

TEST(CadenceOf, IsThatOfTheModule) {
    const std::vector<std::pair<const char*, std::int64_t>> cadences{{"23.98", 512},  {"24", 64}, {"25", 8},
                                                                     {"29.97", 640},  {"30", 16}, {"50", 16},
                                                                     {"59.94", 1280}, {"60", 32}};
    for (const auto& [rate, pictures] : cadences) {
        EXPECT_EQ(CadenceOf(Rate(rate)), pictures) << rate;
    }
}

TEST(GroupWatch, GroupsThatMeetTheCadenceInTimeAreNotTold) {
    for (const char* const rate : {"24", "25", "30", "50", "60"}) {
        EXPECT_EQ(Told({Rate(rate), 60, 0}, Rate(rate), Every(25)), Sentences()) << rate;
    }
    // 16 groups of 32 pictures are 512, and 3 groups of 640 or 1280 are 64 of 30 or 60.
    EXPECT_EQ(Told({Rate("23.98"), 60, 0}, Rate("23.98"), Every(32)), Sentences());
    EXPECT_EQ(Told({Rate("29.97"), 60, 0}, Rate("29.97"), Every(30)), Sentences());
    EXPECT_EQ(Told({Rate("59.94"), 60, 0}, Rate("59.94"), Every(60)), Sentences());
}

TEST(GroupWatch, GroupsThatDoNotMeetItInTimeAreToldOnce) {
    // 512 and 25 have no common divisor: 12800 pictures of 1001/24000 s. An hour is 86314 pictures, and the
    // seventh meeting comes 3286 pictures behind it, 137 s. A group of 24 meets every 64.06 s.
    EXPECT_EQ(
        Told({Rate("23.98"), 60, 0}, Rate("23.98"), Every(25)),
        (Sentences{"an IDR frame comes every 25 pictures, picture and sound are in step every 512, and "
                   "the two meet every 533.9 s only: the file behind one of 60 minutes begins with a "
                   "picture that cannot be shown by itself; set the encoder to groups of 24 pictures"}));
}

TEST(GroupWatch, FilesOfReorderedPicturesGoOnToAnIdrFrame) {
    EXPECT_EQ(Told({Rate("23.98"), 60, 0, true}, Rate("23.98"), Every(25)),
              (Sentences{"an IDR frame comes every 25 pictures, picture and sound are in step every 512, and "
                         "the two meet every 533.9 s only: files of 60 minutes get two minutes more; set the "
                         "encoder to groups of 24 pictures"}));
    EXPECT_EQ(
        Told({Rate("29.97"), 60, 0, true}, Rate("29.97"), {0, 20, 45, 60, 90, 115, 135, 165, 180, 200}),
        (Sentences{"IDR frames come at distances that vary from 15 to 30 pictures, and picture and sound "
                   "are in step every 640: files of 60 minutes may get two minutes more; set the encoder "
                   "to groups of one length"}));
}

TEST(GroupWatch, ALengthThatAMeetingFollowsIsNotTold) {
    // 7 meetings of 533.87 s are 3737.1 s, 17 s behind 62 minutes.
    EXPECT_EQ(Told({Rate("23.98"), 62, 0}, Rate("23.98"), Every(25)), Sentences());
}

TEST(GroupWatch, FilesOfNoLengthHaveToMeetItToo) {
    EXPECT_EQ(Told({Rate("23.98"), 0, 0}, Rate("23.98"), Every(25)).size(), 1u);
    EXPECT_EQ(Told({Rate("23.98"), 0, 0}, Rate("23.98"), Every(24)), Sentences());
}

TEST(GroupWatch, LostPicturesDoNotChangeAGroup) {
    GroupWatch watch(Rate("23.98"), 60, 0);
    std::size_t told = 0;
    // Nothing but IDR frames comes.
    for (const std::int64_t frame : Every(25)) {
        told += watch.Look(MakeFrame(frame * 90000 * 1001 / 24000, true, 0)) ? 1U : 0U;
    }
    EXPECT_EQ(told, 1u);
}

TEST(GroupWatch, WhatIsExpectedIsToldWithTheFirstPicture) {
    GroupWatch watch(Rate("23.98"), 60, 25);
    const auto notice = watch.Look(MakeFrame(0, true, 0));
    ASSERT_TRUE(notice);
    EXPECT_EQ(notice->find("an IDR frame comes every 25 pictures"), 0u) << *notice;
    // And not again when it is measured.
    EXPECT_EQ(Told({Rate("23.98"), 60, 25}, Rate("23.98"), Every(25)).size(), 1u);
}

TEST(GroupWatch, WhatTurnsOutToBeAnotherGroupIsTold) {
    EXPECT_EQ(Told({Rate("25"), 60, 25}, Rate("25"), Every(50)),
              Sentences{"the source has 50 pictures in a group, and --gop says 25"});
    const auto told = Told({Rate("23.98"), 60, 24}, Rate("23.98"), Every(25));
    ASSERT_EQ(told.size(), 1u);
    EXPECT_EQ(
        told[0].find("the source has 25 pictures in a group, and --gop says 24: an IDR frame comes every"),
        0u)
        << told[0];
}

TEST(GroupWatch, IrregularGroupsAreToldWhereTheCadenceIsLong) {
    const std::vector<std::int64_t> keyFrames{0, 20, 45, 60, 90, 115, 135, 165, 180, 200};
    EXPECT_EQ(Told({Rate("25"), 60, 0}, Rate("25"), keyFrames), Sentences());
    EXPECT_EQ(
        Told({Rate("29.97"), 60, 0}, Rate("29.97"), keyFrames),
        (Sentences{"IDR frames come at distances that vary from 15 to 30 pictures, and picture and sound "
                   "are in step every 640: a file that follows on another may begin with a picture that "
                   "cannot be shown by itself; set the encoder to groups of one length"}));
}

}  // namespace
}  // namespace receiver
