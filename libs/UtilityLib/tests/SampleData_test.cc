#include <gtest/gtest.h>

#include "StreamAnalyzer.h"
#include "test_units.h"

namespace nal_access {
namespace {

using namespace testing;

TEST(SampleData, GivesBackWhatItWasMadeOf) {
    SampleData sample({1, 2, 3}, 90000, 1000, true);
    EXPECT_EQ(BytesOf(sample), (ByteVector{1, 2, 3}));
    EXPECT_EQ(sample.GetRtpTimestamp(), 90000U);
    EXPECT_EQ(sample.GetTimestamp(), 1000U);
    EXPECT_TRUE(sample.GetSync());
    EXPECT_FALSE(SampleData({}, 0, 0, false).GetSync());
}

TEST(SampleData, HasNoDurationUntilItIsSet) {
    SampleData sample({}, 0, 0, false);
    EXPECT_EQ(sample.GetDuration(), 0U);
    sample.SetDuration(0xFFFFFFFFFFFFFFFF);
    EXPECT_EQ(sample.GetDuration(), 0xFFFFFFFFFFFFFFFF);
}

TEST(SampleData, LetsItsBytesBeChanged) {
    SampleData sample({1, 2}, 0, 0, false);
    sample.GetData()[1] = 9;
    EXPECT_EQ(BytesOf(sample), (ByteVector{1, 9}));
}

}  // namespace
}  // namespace nal_access
