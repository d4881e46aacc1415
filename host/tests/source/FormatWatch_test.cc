#include "source/FormatWatch.h"

#include <gtest/gtest.h>

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

}  // namespace
}  // namespace receiver
