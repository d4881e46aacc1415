#include "boxlib/sample/sample_cursor.h"

#include "boxlib/support/sample_fixture.h"

namespace {

class SampleCursorTest : public SampleTest {
 protected:
    void SetUp() override {
        SampleTest::SetUp();
        track = addTrack();
    }

    void start() { MbxStartCursor(track, track->segments.first, &cursor); }

    MbxSampleDefaults defaults() { return MbxSegmentDefaults(track->segments.first, {71, 72, 73, 74}); }

    MbxTrack* track = nullptr;
    MbxSampleCursor cursor = {};
};

TEST_F(SampleCursorTest, ReadsBackWhatWasEnteredSampleBySample) {
    std::vector<MbxSampleInfo> samples;
    for (uint32_t i = 0; i < 3000; i++) {
        MbxSampleInfo info = sample(i / 5, i / 7, i % 3 == 0);
        info.compositionOffset = static_cast<int32_t>(i / 4);
        info.dependency = static_cast<uint8_t>(i / 600);
        samples.push_back(info);
        ASSERT_EQ(add(info), MBX_OK);
    }
    ASSERT_EQ(endChunk(), MBX_OK);
    start();
    for (const MbxSampleInfo& info : samples) {
        MbxSampleValues values = {};
        ASSERT_EQ(MbxStepSample(&cursor, &values), MBX_OK);
        EXPECT_EQ(values.size, info.size);
        EXPECT_EQ(values.duration, info.duration);
        EXPECT_EQ(values.compositionOffset, static_cast<uint32_t>(info.compositionOffset));
        EXPECT_EQ(values.flags, uint32_t{info.dependency} << 20 | (info.isSync != 0 ? 0 : 0x10000));
    }
    MbxSampleValues values = {};
    EXPECT_EQ(MbxStepSample(&cursor, &values), MBX_ERR_NOT_FOUND);
}

TEST_F(SampleCursorTest, ACopySavesThePosition) {
    addChunk(1, 0, sample(1));
    addChunk(1, 0, sample(2));
    start();
    MbxSampleValues values = {};
    ASSERT_EQ(MbxStepSample(&cursor, &values), MBX_OK);
    const MbxSampleCursor saved = cursor;
    ASSERT_EQ(MbxStepSample(&cursor, &values), MBX_OK);
    EXPECT_EQ(values.size, 2U);
    MbxSampleCursor copy = saved;
    ASSERT_EQ(MbxStepSample(&copy, &values), MBX_OK);
    EXPECT_EQ(values.size, 2U);
}

TEST_F(SampleCursorTest, ChunksGoOnInRunsToTheLastOne) {
    std::vector<uint32_t> counts;
    for (uint32_t i = 0; i < 2100; i++) counts.push_back(i % 2 + 1);  // a run per chunk, over blocks
    for (uint32_t i = 0; i < 5; i++) counts.push_back(3);
    for (const uint32_t count : counts) addChunk(count, count * 10);
    start();
    for (const uint32_t count : counts) {
        uint32_t samples = 0;
        uint64_t offset = 0;
        ASSERT_EQ(MbxStepChunk(&cursor, &samples), MBX_OK);
        ASSERT_EQ(MbxStepChunkOffset(&cursor, &offset), MBX_OK);
        EXPECT_EQ(samples, count);
        EXPECT_EQ(offset, count * 10);
    }
    uint32_t samples = 0;
    uint64_t offset = 0;
    EXPECT_EQ(MbxStepChunk(&cursor, &samples), MBX_ERR_NOT_FOUND);
    EXPECT_EQ(MbxStepChunkOffset(&cursor, &offset), MBX_ERR_NOT_FOUND);
}

TEST_F(SampleCursorTest, AnEmptySegmentHasNothing) {
    ASSERT_EQ(MbxRequireSegment(context, track), MBX_OK);
    start();
    MbxSampleValues values = {};
    uint32_t samples = 0;
    uint64_t offset = 0;
    EXPECT_EQ(MbxStepSample(&cursor, &values), MBX_ERR_NOT_FOUND);
    EXPECT_EQ(MbxStepChunk(&cursor, &samples), MBX_ERR_NOT_FOUND);
    EXPECT_EQ(MbxStepChunkOffset(&cursor, &offset), MBX_ERR_NOT_FOUND);
}

TEST_F(SampleCursorTest, DefaultsAreThoseOfTheFirstSample) {
    MbxSampleInfo info = sample(100, 10, 1);
    info.descriptionIndex = 2;
    addChunk(2, 0, info);
    EXPECT_EQ(defaults().descriptionIndex, 2U);
    EXPECT_EQ(defaults().duration, 10U);
    EXPECT_EQ(defaults().size, 100U);
    EXPECT_EQ(defaults().flags, 0U);  // all are sync samples
    addChunk(1, 0, sample(7, 11, 0));
    EXPECT_EQ(defaults().descriptionIndex, 2U);
    EXPECT_EQ(defaults().duration, 10U);
    EXPECT_EQ(defaults().size, 100U);  // the first that is listed
    EXPECT_EQ(defaults().flags, 0x10000U);
}

TEST_F(SampleCursorTest, DefaultsOfASegmentWithoutSamplesAreTheFallbackAndNonSync) {
    ASSERT_EQ(MbxRequireSegment(context, track), MBX_OK);
    EXPECT_EQ(defaults().descriptionIndex, 71U);
    EXPECT_EQ(defaults().duration, 72U);
    EXPECT_EQ(defaults().size, 73U);
    EXPECT_EQ(defaults().flags, 0x10000U);
}

TEST_F(SampleCursorTest, DefaultFlagsAreNonSyncWhenNoneIsASyncSample) {
    addChunk(2, 0, sample(100, 10, 0));
    EXPECT_EQ(defaults().flags, 0x10000U);
}

}  // namespace
