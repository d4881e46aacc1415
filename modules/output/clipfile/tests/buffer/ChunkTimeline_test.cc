#include "buffer/ChunkTimeline.h"

#include <gtest/gtest.h>

namespace clipfileModule {
namespace {

TEST(ChunkTimeline, AUnitThatStartsAtTheEndBelongsToTheChunk) {
    // Units start at 0, 1024, 2048, 3072.
    EXPECT_EQ(CountUntil(2047, 0, 1024, 4), 2);
    EXPECT_EQ(CountUntil(2048, 0, 1024, 4), 3);
    EXPECT_EQ(CountUntil(2049, 0, 1024, 4), 3);
}

TEST(ChunkTimeline, ACacheThatDoesNotReachPastTheEndGivesNoCount) {
    EXPECT_EQ(CountUntil(2048, 0, 1024, 3), -1);
    EXPECT_EQ(CountUntil(2048, 0, 1024, 0), -1);
}

TEST(ChunkTimeline, EarlierUnitsMoveTheLine) {
    EXPECT_EQ(CountUntil(10240, 8, 1024, 4), 3);
    EXPECT_EQ(CountUntil(10239, 8, 1024, 4), 2);
}

TEST(ChunkTimeline, ZeroIsACount) {
    EXPECT_EQ(CountUntil(8191, 8, 1024, 4), 0);
}

TEST(ChunkTimeline, WithoutADurationTheLineStandsStill) {
    EXPECT_EQ(CountUntil(0, 0, 0, 1000), -1);
}

TEST(ChunkTimeline, ALastChunkNeedsNoUnitBehindIt) {
    // Units start at 0, 1024, 2048, 3072.
    EXPECT_EQ(CountUpTo(2047, 0, 1024, 2), 2);
    EXPECT_EQ(CountUpTo(2048, 0, 1024, 3), 3);
    EXPECT_EQ(CountUpTo(2048, 0, 1024, 9), 3);
    EXPECT_EQ(CountUpTo(2048, 0, 1024, 2), -1);
    EXPECT_EQ(CountUpTo(10240, 8, 1024, 3), 3);
    EXPECT_EQ(CountUpTo(10240, 8, 1024, 2), -1);
    EXPECT_EQ(CountUpTo(8191, 8, 1024, 0), 0);
    EXPECT_EQ(CountUpTo(1024, 8, 1024, 0), 0);
}

}  // namespace
}  // namespace clipfileModule
