#include "recover/ChunkSource.h"

#include <gtest/gtest.h>

#include "support/TestStream.h"

namespace clipfile {
namespace {

TEST(SampleClock, CutsMetadataWithThePicturesAndAudioToWithinHalfAFrame) {
    const test_stream::Stream stream = test_stream::MakePlainStream(2);
    SampleClock clock(30000, 1001);
    clock.Count(*stream.chunks[0]);  // 8 pictures and 13 audio frames
    const Chunk chunk = clock.Cut(stream.chunks[1], 3);
    ASSERT_NE(chunk, nullptr);
    EXPECT_EQ(chunk->video.size(), 3U);
    EXPECT_EQ(chunk->meta.size(), 3U);
    // 11 pictures end at 17617.6 samples at 48 kHz. The 17th frame begins at 16384, the 18th at 17408, which
    // is less than half a frame before the end.
    EXPECT_EQ(chunk->audio.size(), 4U);
}

TEST(SampleClock, LeavesNothingWithoutAPicture) {
    const test_stream::Stream stream = test_stream::MakePlainStream(1);
    EXPECT_EQ(SampleClock(30000, 1001).Cut(stream.chunks[0], 0), nullptr);
}

}  // namespace
}  // namespace clipfile
