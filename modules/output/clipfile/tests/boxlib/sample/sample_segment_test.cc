#include "boxlib/sample/sample_segment.h"

#include "boxlib/support/sample_fixture.h"

namespace {

class SampleSegmentTest : public SampleTest {
 protected:
    void appendSegments() {
        ASSERT_EQ(MbxAppendSegments(context, &movie), MBX_OK);
        movie.fragmentCount++;
    }

    std::vector<uint64_t> offsets(const MbxTrack* track, uint32_t fragment) const {
        return Entries<uint64_t>(MbxFindSegment(track, fragment)->chunkOffsets.list);
    }

    MbxStatus shift(uint32_t byFragment, uint32_t track, uint32_t fragment, uint32_t chunk, int64_t delta) {
        return MbxApplyOffsetDelta(context, byFragment, track, fragment, chunk, delta, &movie.tracks);
    }
};

using Offsets = std::vector<uint64_t>;

TEST_F(SampleSegmentTest, AppendGivesEveryTrackOneMoreAndTheFirstWhereThereIsNone) {
    MbxTrack* used = addTrack();
    MbxTrack* empty = addTrack();
    empty->baseDecodeTime = 70;
    addChunk(3, 0);
    appendSegments();
    EXPECT_EQ(used->segmentCount, 2U);
    EXPECT_EQ(empty->segmentCount, 2U);
    EXPECT_EQ(used->segments.first->next, used->segments.last);
    EXPECT_EQ(used->sealedSegment, used->segments.first);
    EXPECT_EQ(used->segments.last->firstDecodeTime, 30U);
    EXPECT_EQ(used->segments.last->decodeDuration, 0U);
    EXPECT_EQ(used->segments.last->earliestPresentation, INT64_MAX);
    EXPECT_EQ(empty->segments.first->firstDecodeTime, 70U);
    EXPECT_EQ(empty->segments.last->firstDecodeTime, 70U);
    EXPECT_EQ(empty->segments.last->next, nullptr);
    addChunk(2, 0);
    appendSegments();
    EXPECT_EQ(used->segments.last->firstDecodeTime, 50U);
}

TEST_F(SampleSegmentTest, AppendCarriesTheSignOfTheOffsetsOn) {
    MbxTrack* track = addTrack();
    ASSERT_EQ(MbxTrackSetSignedOffsets(context, track, 1), MBX_OK);
    appendSegments();
    EXPECT_EQ(track->segments.last->compositionOffsets.signedOffsets, 1U);
    EXPECT_EQ(MbxTrackSetSignedOffsets(context, track, 0), MBX_ERR_BAD_STATE);
}

TEST_F(SampleSegmentTest, ADecodeTimeThatWrapsOverflowsAndChangesNothing) {
    addTrack();
    MbxTrack* late = addTrack();
    addChunk(1, 0, sample(1, 10), 2);
    late->segments.first->firstDecodeTime = UINT64_MAX - 9;
    EXPECT_EQ(MbxAppendSegments(context, &movie), MBX_ERR_OVERFLOW);
    EXPECT_EQ(tracks[0].segmentCount, 0U);
    EXPECT_EQ(late->segmentCount, 1U);
    late->segments.first->firstDecodeTime = UINT64_MAX - 10;
    EXPECT_EQ(MbxAppendSegments(context, &movie), MBX_OK);
    EXPECT_EQ(late->segments.last->firstDecodeTime, UINT64_MAX);
}

TEST_F(SampleSegmentTest, ARefusedAllocationChangesNoTrack) {
    addTrack();
    addTrack();
    for (uint64_t n = 1; n <= 4; n++) {
        host.failAllocation = host.allocations + n;
        EXPECT_EQ(MbxAppendSegments(context, &movie), MBX_ERR_NO_MEMORY);
        EXPECT_EQ(tracks[0].segmentCount, 0U);
        EXPECT_EQ(tracks[1].segmentCount, 0U);
        EXPECT_EQ(tracks[0].segments.first, nullptr);
    }
    host.failAllocation = 0;
    EXPECT_EQ(MbxAppendSegments(context, &movie), MBX_OK);
    EXPECT_EQ(tracks[1].segmentCount, 2U);
}

TEST_F(SampleSegmentTest, FindTakesFragmentNumbersAndZeroForTheFirst) {
    MbxTrack* track = addTrack();
    EXPECT_EQ(MbxFindSegment(track, 0), nullptr);
    for (int i = 0; i < 4; i++) appendSegments();
    const MbxSampleSegment* segment = track->segments.first;
    for (uint32_t i = 0; i < 5; i++) {
        EXPECT_EQ(MbxFindSegment(track, i), segment) << i;
        segment = segment->next;
    }
    EXPECT_EQ(MbxFindSegment(track, 5), nullptr);
    EXPECT_EQ(MbxFindSegment(track, UINT32_MAX), nullptr);
    EXPECT_EQ(MbxFindSegment(track, UINT32_MAX - 1), nullptr);
}

TEST_F(SampleSegmentTest, FragmentCountIsThatOfTheLongestChainAndMustAgreeWithTheMovie) {
    uint32_t count = 9;
    EXPECT_EQ(MbxFragmentCount(nullptr, &count), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxFragmentCount(&movie, nullptr), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxFragmentCount(&movie, &count), MBX_OK);
    EXPECT_EQ(count, 0U);
    addTrack();
    addChunk(1, 0);
    EXPECT_EQ(MbxFragmentCount(&movie, &count), MBX_OK);
    EXPECT_EQ(count, 0U);
    appendSegments();
    appendSegments();
    addTrack();  // has no segment, and does not count
    EXPECT_EQ(MbxFragmentCount(&movie, &count), MBX_OK);
    EXPECT_EQ(count, 2U);
    movie.fragmentCount = 3;
    EXPECT_EQ(MbxFragmentCount(&movie, &count), MBX_ERR_INTERNAL);
}

TEST_F(SampleSegmentTest, ReleaseEmptiesTheTablesAndKeepsTimesPositionAndCount) {
    MbxTrack* track = addTrack();
    track->auxEnabled = 1;
    track->trickEnabled = 1;
    ASSERT_EQ(MbxTrackSetSignedOffsets(context, track, 1), MBX_OK);
    const uint8_t bytes[] = {1, 2};
    MbxSampleInfo info = sample();
    info.auxSize = 2;
    info.auxData = bytes;
    const size_t before = host.live.size();
    addChunk(3, 500, info);
    MbxSampleSegment* segment = track->segments.first;
    segment->fragmentOffset = 4711;
    EXPECT_TRUE(MbxSegmentHasSamples(segment));
    EXPECT_EQ(MbxReleaseSegment(context, segment), MBX_OK);
    EXPECT_EQ(MbxReleaseSegment(context, segment), MBX_OK);
    EXPECT_EQ(host.live.size(), before);
    EXPECT_EQ(segment->decodeDuration, 30U);
    EXPECT_EQ(segment->fragmentOffset, 4711U);
    EXPECT_EQ(segment->sizes.count, 0U);
    EXPECT_EQ(segment->chunks.chunkCount, 0U);
    EXPECT_EQ(segment->dependencies.first, nullptr);
    EXPECT_EQ(segment->compositionOffsets.signedOffsets, 1U);
    EXPECT_EQ(segment->durations.list.capacity, 1000U);
    EXPECT_TRUE(MbxSegmentHasSamples(segment));
    EXPECT_FALSE(MbxSegmentHasSamples(nullptr));
    appendSegments();
    EXPECT_FALSE(MbxSegmentHasSamples(track->segments.last));
}

TEST_F(SampleSegmentTest, ShiftOfTheFirstSegmentLeavesFragmentsAlone) {
    MbxTrack* first = addTrack();
    MbxTrack* second = addTrack();
    addChunk(1, 100);
    addChunk(1, 200);
    addChunk(1, 300, sample(), 2);
    appendSegments();
    addChunk(1, 400);
    EXPECT_EQ(shift(0, 0, 0, 0, 50), MBX_OK);
    EXPECT_EQ(offsets(first, 0), (Offsets{150, 250}));
    EXPECT_EQ(offsets(second, 0), Offsets{350});
    EXPECT_EQ(offsets(first, 1), Offsets{400});
    EXPECT_EQ(shift(0, 1, 0, 2, -50), MBX_OK);
    EXPECT_EQ(offsets(first, 0), (Offsets{150, 200}));
    EXPECT_EQ(shift(0, 2, 0, 0, 1), MBX_OK);
    EXPECT_EQ(offsets(first, 0), (Offsets{150, 200}));
    EXPECT_EQ(offsets(second, 0), Offsets{351});
}

TEST_F(SampleSegmentTest, ShiftByFragmentTakesOneOrWithZeroAllButTheFirst) {
    MbxTrack* track = addTrack();
    addChunk(1, 100);
    appendSegments();
    addChunk(1, 200);
    appendSegments();
    addChunk(1, 300);
    EXPECT_EQ(shift(1, 0, 1, 0, 5), MBX_OK);
    EXPECT_EQ(offsets(track, 0), Offsets{100});
    EXPECT_EQ(offsets(track, 1), Offsets{205});
    EXPECT_EQ(offsets(track, 2), Offsets{300});
    EXPECT_EQ(shift(1, 0, 0, 0, 10), MBX_OK);
    EXPECT_EQ(offsets(track, 0), Offsets{100});
    EXPECT_EQ(offsets(track, 1), Offsets{215});
    EXPECT_EQ(offsets(track, 2), Offsets{310});
}

TEST_F(SampleSegmentTest, ShiftReachesChunksInLaterBlocks) {
    MbxTrack* track = addTrack();
    for (uint64_t i = 0; i < 2001; i++) addChunk(1, i);
    EXPECT_EQ(shift(0, 1, 0, 1000, 5000), MBX_OK);
    EXPECT_EQ(shift(0, 1, 0, 1001, 6000), MBX_OK);
    EXPECT_EQ(shift(0, 1, 0, 2001, 7000), MBX_OK);
    Offsets expected(2001);
    for (uint64_t i = 0; i < 2001; i++) expected[i] = i;
    expected[999] += 5000;
    expected[1000] += 6000;
    expected[2000] += 7000;
    EXPECT_EQ(offsets(track, 0), expected);
    EXPECT_EQ(shift(0, 1, 0, 2002, 1), MBX_ERR_NOT_FOUND);
}

TEST_F(SampleSegmentTest, ShiftThatWrapsStoresTheWrappedValueGoesOnAndOverflows) {
    MbxTrack* track = addTrack();
    addChunk(1, 5);
    addChunk(1, 20);
    EXPECT_EQ(shift(0, 0, 0, 0, -6), MBX_ERR_OVERFLOW);
    EXPECT_EQ(offsets(track, 0), (Offsets{UINT64_MAX, 14}));
    EXPECT_EQ(shift(0, 0, 0, 0, 6), MBX_ERR_OVERFLOW);
    EXPECT_EQ(offsets(track, 0), (Offsets{5, 20}));
    EXPECT_EQ(shift(0, 0, 0, 0, -5), MBX_OK);
    EXPECT_EQ(shift(0, 0, 0, 0, INT64_MIN), MBX_ERR_OVERFLOW);
}

TEST_F(SampleSegmentTest, ShiftOfWhatDoesNotExistIsNotFoundAndShiftsNothing) {
    MbxTrack* track = addTrack();
    addTrack();
    addChunk(1, 100);
    EXPECT_EQ(MbxApplyOffsetDelta(nullptr, 0, 0, 0, 0, 1, &movie.tracks), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxApplyOffsetDelta(context, 0, 0, 0, 0, 1, nullptr), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(shift(0, 3, 0, 0, 1), MBX_ERR_NOT_FOUND);
    EXPECT_EQ(shift(0, 0, 0, 1, 1), MBX_ERR_NOT_FOUND);  // the second track has no chunk
    EXPECT_EQ(shift(0, 1, 0, 2, 1), MBX_ERR_NOT_FOUND);
    EXPECT_EQ(shift(1, 0, 1, 0, 1), MBX_ERR_NOT_FOUND);
    EXPECT_EQ(offsets(track, 0), Offsets{100});
    EXPECT_EQ(shift(1, 0, 0, 0, 1), MBX_OK);  // no fragment: nothing to shift
    EXPECT_EQ(shift(0, 2, 0, 0, 1), MBX_OK);
    EXPECT_EQ(offsets(track, 0), Offsets{100});
}

}  // namespace
