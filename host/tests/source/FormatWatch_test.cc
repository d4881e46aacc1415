#include "source/FormatWatch.h"

#include <gtest/gtest.h>

#include <algorithm>

namespace receiver {
namespace {

constexpr std::int64_t kPeriod = 3600;

/// Pictures at 25 frames a second, each shown so long behind its decoding.
std::string ChangeWith(const std::vector<std::int64_t>& delays) {
    FormatWatch watch(AV_CODEC_ID_H264, *NearestFrameRate(25, 1), true);
    std::int64_t decoded = 0;
    try {
        for (const std::int64_t delay : delays) {
            watch.Look({}, decoded + delay, delay);
            decoded += kPeriod;
        }
    } catch (const FormatChanged& change) {
        return change.what();
    }
    return "";
}

TEST(FormatWatch, APictureWithADamagedStampChangesNothing) {
    EXPECT_EQ(ChangeWith({0, 0, kPeriod, 0, 0, 0, -kPeriod, 0, 0}), "");
    EXPECT_EQ(ChangeWith({0, 0, 10 * kPeriod, 0, 0}), "");
}

TEST(FormatWatch, PicturesThatAreShownLaterBehindTheirDecodingAreReordered) {
    // An IDR frame and the picture that is sent in front of two others.
    EXPECT_EQ(ChangeWith({0, 0, kPeriod, 3 * kPeriod}),
              "the video begins to send its pictures reordered (B frames)");
}

/// Pictures that come reordered, 0 to 3 pictures later than decoded; -1 is one that is late.
std::string ChangeOfReordered(const std::vector<std::int64_t>& delays) {
    FormatWatch watch(AV_CODEC_ID_H264, *NearestFrameRate(25, 1), true, true);
    try {
        for (const std::int64_t delay : delays) {
            watch.LookAtReordering(std::max<std::int64_t>(0, delay) * kPeriod, delay < 0);
        }
    } catch (const FormatChanged& change) {
        return change.what();
    }
    return "";
}

TEST(FormatWatch, PicturesThatAreKnownToBeReorderedMayStayInOrderForAWhile) {
    std::vector<std::int64_t> delays;
    for (int group = 0; group < 8; ++group) {
        delays.insert(delays.end(), {1, 3, 0, 0, 3, 0, 0, 1});
    }
    EXPECT_EQ(ChangeOfReordered(delays), "");
    // 16 pictures may stand in front of one that they all need.
    EXPECT_EQ(ChangeOfReordered(std::vector<std::int64_t>(31, 0)), "");
    // An encoder that might reorder stamps for it, also where it does not.
    EXPECT_EQ(ChangeOfReordered(std::vector<std::int64_t>(100, 2)), "");
}

TEST(FormatWatch, PicturesThatAreAllShownWhenTheyAreDecodedAreReorderedNoMore) {
    EXPECT_EQ(ChangeOfReordered(std::vector<std::int64_t>(32, 0)),
              "the video no longer sends its pictures reordered (B frames)");
}

TEST(FormatWatch, MorePicturesThatAreLateThanADamagedStampMakesAreReorderedOtherwise) {
    constexpr const char* kOtherwise = "the order changed in which the video sends its pictures (B frames)";
    EXPECT_EQ(ChangeOfReordered({1, 3, -1, 0, -1}), kOtherwise);
    std::vector<std::int64_t> apart(40, 1);
    apart[3] = apart[30] = -1;
    EXPECT_EQ(ChangeOfReordered(apart), "");
}

}  // namespace
}  // namespace receiver
