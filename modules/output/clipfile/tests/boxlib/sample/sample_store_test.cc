#include "boxlib/sample/sample_store.h"

#include "boxlib/support/sample_fixture.h"

namespace {

using Numbers = std::vector<uint32_t>;
using Runs = std::vector<std::pair<uint32_t, uint32_t>>;  // count, value

Runs runsOf(const MbxRunList& list) {
    Runs runs;
    for (const MbxRun& run : Entries<MbxRun>(list.list)) runs.emplace_back(run.count, run.value);
    return runs;
}

class SampleStoreTest : public SampleTest {
 protected:
    void SetUp() override {
        SampleTest::SetUp();
        track = addTrack();
    }

    const MbxSampleSegment& segment() const { return *track->segments.last; }

    void addSizes(const Numbers& sizes) {
        for (const uint32_t size : sizes) ASSERT_EQ(add(sample(size)), MBX_OK);
    }

    void addSyncs(const Numbers& flags) {
        for (const uint32_t flag : flags) ASSERT_EQ(add(sample(100, 10, flag)), MBX_OK);
    }

    void addDependencies(const std::vector<uint8_t>& values) {
        for (const uint8_t value : values) {
            MbxSampleInfo info = sample();
            info.dependency = value;
            ASSERT_EQ(add(info), MBX_OK);
        }
    }

    MbxTrack* track = nullptr;
};

// ---- What a sample must satisfy ----

TEST_F(SampleStoreTest, NullArgumentsAreInvalid) {
    const MbxSampleInfo info = sample();
    EXPECT_EQ(MbxAddSample(nullptr, &session, 1, &info, 0), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxAddSample(context, nullptr, 1, &info, 0), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxAddSample(context, &session, 1, nullptr, 0), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxEndChunk(nullptr, &session, 1), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxEndChunk(context, nullptr, 1), MBX_ERR_INVALID_ARG);
}

TEST_F(SampleStoreTest, AMissingTrackIsBadStateToASampleAndNotFoundToTheEndOfAChunk) {
    EXPECT_EQ(add(sample(), 2), MBX_ERR_BAD_STATE);
    EXPECT_EQ(endChunk(2), MBX_ERR_NOT_FOUND);
    EXPECT_EQ(track->segments.first, nullptr);
}

TEST_F(SampleStoreTest, AMissingMovieIsBadStateAndTrackZeroInvalid) {
    EXPECT_EQ(add(sample(), 0), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(endChunk(0), MBX_ERR_INVALID_ARG);
    session.movie = nullptr;
    EXPECT_EQ(add(sample()), MBX_ERR_BAD_STATE);
    EXPECT_EQ(endChunk(), MBX_ERR_BAD_STATE);
    EXPECT_EQ(track->segments.first, nullptr);
}

TEST_F(SampleStoreTest, TheSampleDescriptionMustExist) {
    MbxSampleInfo info = sample();
    info.descriptionIndex = 2;
    EXPECT_EQ(add(info), MBX_OK);
    info.descriptionIndex = 3;
    EXPECT_EQ(add(info), MBX_ERR_BAD_STATE);
    info.descriptionIndex = 0;
    EXPECT_EQ(add(info), MBX_ERR_BAD_STATE);
    EXPECT_EQ(segment().sizes.count, 1U);
}

TEST_F(SampleStoreTest, TheFirstSegmentIsMadeWithTheFirstSampleAtTheBaseTimeOfTheTrack) {
    track->baseDecodeTime = 5000;
    ASSERT_EQ(add(sample()), MBX_OK);
    EXPECT_EQ(track->segmentCount, 1U);
    EXPECT_EQ(track->segments.first, track->segments.last);
    EXPECT_EQ(segment().firstDecodeTime, 5000U);
    EXPECT_EQ(segment().earliestPresentation, 5000);
    EXPECT_EQ(segment().decodeDuration, 10U);
    for (const MbxBlockList* list :
         {&segment().durations.list, &segment().compositionOffsets.runs.list, &segment().chunks.list,
          &segment().sizes.list, &segment().chunkOffsets.list, &segment().syncSamples.list,
          &segment().dependencies.list, &segment().auxSizes.list, &segment().auxOffsets,
          &segment().trickBytes, &std::as_const(track->fragmentIndex)}) {
        EXPECT_EQ(list->capacity, 1000U);
    }
}

TEST_F(SampleStoreTest, ADecodeTimeBeyond64BitsOverflowsAndIsNotRecorded) {
    ASSERT_EQ(add(sample()), MBX_OK);
    track->segments.last->decodeDuration = UINT64_MAX - 10;
    EXPECT_EQ(add(sample(100, 11)), MBX_ERR_OVERFLOW);
    EXPECT_EQ(segment().sizes.count, 1U);
    EXPECT_EQ(add(sample(100, 10)), MBX_OK);
    EXPECT_EQ(segment().decodeDuration, UINT64_MAX);
}

TEST_F(SampleStoreTest, ACompositionTimeBeyond64BitsOverflows) {
    ASSERT_EQ(add(sample()), MBX_OK);
    track->segments.last->decodeDuration = UINT64_MAX - 10;
    MbxSampleInfo info = sample(100, 0);
    info.compositionOffset = 11;
    EXPECT_EQ(add(info), MBX_ERR_OVERFLOW);
    info.compositionOffset = -1;  // unsigned: 2^32 - 1
    EXPECT_EQ(add(info), MBX_ERR_OVERFLOW);
    info.compositionOffset = 10;
    EXPECT_EQ(add(info), MBX_OK);
}

TEST_F(SampleStoreTest, ANegativeOffsetOfASignedSegmentCannotOverflow) {
    ASSERT_EQ(MbxTrackSetSignedOffsets(context, track, 1), MBX_OK);
    track->segments.last->decodeDuration = UINT64_MAX - 10;
    MbxSampleInfo info = sample(100, 0);
    info.compositionOffset = -1;
    EXPECT_EQ(add(info), MBX_OK);
    info.compositionOffset = 11;
    EXPECT_EQ(add(info), MBX_ERR_OVERFLOW);
}

// ---- Runs ----

TEST_F(SampleStoreTest, EqualDurationsAreOneRun) {
    for (int i = 0; i < 1001; i++) ASSERT_EQ(add(sample()), MBX_OK);
    EXPECT_EQ(runsOf(segment().durations), (Runs{{1001, 10}}));
    EXPECT_EQ(BlockCount(segment().durations.list), 1U);
    EXPECT_EQ(segment().decodeDuration, 10010U);
}

TEST_F(SampleStoreTest, DifferentDurationsUseASecondBlockAfterAThousand) {
    for (uint32_t i = 0; i < 1000; i++) ASSERT_EQ(add(sample(100, i)), MBX_OK);
    EXPECT_EQ(BlockCount(segment().durations.list), 1U);
    ASSERT_EQ(add(sample(100, 5)), MBX_OK);
    EXPECT_EQ(BlockCount(segment().durations.list), 2U);
    EXPECT_EQ(segment().durations.list.first->count, 1000U);
    EXPECT_EQ(segment().durations.list.current->count, 1U);
    // The last run stays reachable across blocks.
    ASSERT_EQ(add(sample(100, 5)), MBX_OK);
    EXPECT_EQ(segment().durations.list.current->count, 1U);
    EXPECT_EQ(segment().durations.last->count, 2U);
}

TEST_F(SampleStoreTest, CompositionOffsetsRunTheSameWay) {
    for (const int32_t offset : {0, 0, 20, -5, -5}) {
        MbxSampleInfo info = sample();
        info.compositionOffset = offset;
        ASSERT_EQ(add(info), MBX_OK);
    }
    EXPECT_EQ(runsOf(segment().compositionOffsets.runs), (Runs{{2, 0}, {1, 20}, {2, 0xFFFFFFFB}}));
}

// ---- Presentation times ----

TEST_F(SampleStoreTest, EarliestPresentationIsTheSmallestDecodeTimeAndOffset) {
    MbxSampleInfo info = sample();
    info.compositionOffset = 30;
    ASSERT_EQ(add(info), MBX_OK);
    EXPECT_EQ(segment().earliestPresentation, 30);
    info.compositionOffset = 5;  // decoded at 10
    ASSERT_EQ(add(info), MBX_OK);
    EXPECT_EQ(segment().earliestPresentation, 15);
    info.compositionOffset = -1;  // unsigned here: far ahead
    ASSERT_EQ(add(info), MBX_OK);
    EXPECT_EQ(segment().earliestPresentation, 15);
}

TEST_F(SampleStoreTest, ASignedOffsetCanPutPresentationBeforeZero) {
    ASSERT_EQ(MbxTrackSetSignedOffsets(context, track, 1), MBX_OK);
    MbxSampleInfo info = sample();
    ASSERT_EQ(add(info), MBX_OK);
    info.compositionOffset = -25;  // decoded at 10
    ASSERT_EQ(add(info), MBX_OK);
    EXPECT_EQ(segment().earliestPresentation, -15);
    info.compositionOffset = -5;  // decoded at 20
    ASSERT_EQ(add(info), MBX_OK);
    EXPECT_EQ(segment().earliestPresentation, -15);
}

TEST_F(SampleStoreTest, PresentationStaysAtTheEndOfItsRange) {
    track->baseDecodeTime = UINT64_MAX - 5;
    ASSERT_EQ(add(sample()), MBX_OK);
    EXPECT_EQ(segment().earliestPresentation, INT64_MAX);
}

TEST_F(SampleStoreTest, SignedOffsetsCanBeSetUntilASampleHasAnOffset) {
    EXPECT_EQ(MbxTrackSetSignedOffsets(nullptr, track, 1), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxTrackSetSignedOffsets(context, nullptr, 1), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxTrackSetSignedOffsets(context, track, 2), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxTrackSetSignedOffsets(context, track, 1), MBX_OK);
    ASSERT_EQ(add(sample()), MBX_OK);
    EXPECT_EQ(MbxTrackSetSignedOffsets(context, track, 0), MBX_OK);
    MbxSampleInfo info = sample();
    info.compositionOffset = 1;
    ASSERT_EQ(add(info), MBX_OK);
    EXPECT_EQ(MbxTrackSetSignedOffsets(context, track, 1), MBX_ERR_BAD_STATE);
}

// ---- Chunks ----

TEST_F(SampleStoreTest, ChunksOf2And2And3SamplesAreTwoRuns) {
    addChunk(2, 1000);
    addChunk(2, 2000);
    addChunk(3, 3000);
    const auto runs = Entries<MbxChunkRun>(segment().chunks.list);
    ASSERT_EQ(runs.size(), 2U);
    EXPECT_EQ(runs[0].firstChunk, 1U);
    EXPECT_EQ(runs[0].samplesPerChunk, 2U);
    EXPECT_EQ(runs[0].descriptionIndex, 1U);
    EXPECT_EQ(runs[1].firstChunk, 3U);
    EXPECT_EQ(runs[1].samplesPerChunk, 3U);
    EXPECT_EQ(runs[1].descriptionIndex, 1U);
    EXPECT_EQ(segment().chunks.chunkCount, 3U);
    EXPECT_EQ(Entries<uint64_t>(segment().chunkOffsets.list), (std::vector<uint64_t>{1000, 2000, 3000}));
    EXPECT_EQ(segment().chunkOffsets.firstSampleOfChunk, 4U);
}

TEST_F(SampleStoreTest, AChunkOfAnotherDescriptionBeginsARun) {
    MbxSampleInfo info = sample();
    addChunk(2, 0, info);
    info.descriptionIndex = 2;
    addChunk(2, 0, info);
    const auto runs = Entries<MbxChunkRun>(segment().chunks.list);
    ASSERT_EQ(runs.size(), 2U);
    EXPECT_EQ(runs[1].firstChunk, 2U);
    EXPECT_EQ(runs[1].descriptionIndex, 2U);
}

TEST_F(SampleStoreTest, TheFirstSampleOfAChunkGivesItsOffsetAndDescription) {
    MbxSampleInfo info = sample();
    info.offset = 700;
    ASSERT_EQ(add(info), MBX_OK);
    info.offset = 800;
    info.descriptionIndex = 2;
    ASSERT_EQ(add(info), MBX_OK);
    ASSERT_EQ(endChunk(), MBX_OK);
    EXPECT_EQ(Entries<uint64_t>(segment().chunkOffsets.list), std::vector<uint64_t>{700});
    EXPECT_EQ(segment().chunks.last->descriptionIndex, 1U);
}

TEST_F(SampleStoreTest, EndChunkWithoutAnOpenChunkIsBadState) {
    EXPECT_EQ(endChunk(), MBX_ERR_BAD_STATE);
    addChunk(1, 0);
    EXPECT_EQ(endChunk(), MBX_ERR_BAD_STATE);
    EXPECT_EQ(segment().chunks.chunkCount, 1U);
}

// ---- Sizes ----

TEST_F(SampleStoreTest, ASizeThatNeverChangesCostsNothing) {
    addSizes(Numbers(3000, 77));
    EXPECT_EQ(segment().sizes.uniformSize, 77U);
    EXPECT_EQ(segment().sizes.count, 3000U);
    EXPECT_EQ(segment().sizes.list.first, nullptr);
}

TEST_F(SampleStoreTest, Sizes557SpillIntoTheList) {
    addSizes({5, 5, 7});
    EXPECT_EQ(Entries<uint32_t>(segment().sizes.list), (Numbers{5, 5, 7}));
    EXPECT_EQ(segment().sizes.uniformSize, 0U);
    EXPECT_EQ(segment().sizes.count, 3U);
    addSizes({5});
    EXPECT_EQ(Entries<uint32_t>(segment().sizes.list), (Numbers{5, 5, 7, 5}));
}

TEST_F(SampleStoreTest, ASpillCrossesBlocks) {
    addSizes(Numbers(1500, 5));
    addSizes({7});
    Numbers expected(1500, 5);
    expected.push_back(7);
    EXPECT_EQ(Entries<uint32_t>(segment().sizes.list), expected);
    EXPECT_EQ(BlockCount(segment().sizes.list), 2U);
}

TEST_F(SampleStoreTest, SizesOfZeroAreListedSinceZeroMeansAList) {
    addSizes({0, 0});
    EXPECT_EQ(Entries<uint32_t>(segment().sizes.list), (Numbers{0, 0}));
    addSizes({9});
    EXPECT_EQ(Entries<uint32_t>(segment().sizes.list), (Numbers{0, 0, 9}));
    EXPECT_EQ(segment().sizes.uniformSize, 0U);
    EXPECT_EQ(segment().sizes.count, 3U);
}

TEST_F(SampleStoreTest, ASizeOfZeroAfterOthersSpillsThem) {
    addSizes({4, 0});
    EXPECT_EQ(Entries<uint32_t>(segment().sizes.list), (Numbers{4, 0}));
}

// ---- Sync samples ----

TEST_F(SampleStoreTest, SyncFlags1101ListSamples1And2And4) {
    addSyncs({1, 1, 0, 1});
    EXPECT_EQ(Entries<uint32_t>(segment().syncSamples.list), (Numbers{1, 2, 4}));
    EXPECT_EQ(segment().syncSamples.syncCount, 3U);
}

TEST_F(SampleStoreTest, SyncFlags01ListSample2) {
    addSyncs({0, 1});
    EXPECT_EQ(Entries<uint32_t>(segment().syncSamples.list), Numbers{2});
}

TEST_F(SampleStoreTest, OnlySyncSamplesKeepTheListEmpty) {
    addSyncs({1, 1, 1});
    EXPECT_EQ(segment().syncSamples.list.first, nullptr);
    EXPECT_EQ(segment().syncSamples.syncCount, 3U);
}

TEST_F(SampleStoreTest, NoSyncSampleKeepsTheListEmptyToo) {
    addSyncs({0, 0, 0});
    EXPECT_EQ(segment().syncSamples.list.first, nullptr);
    EXPECT_EQ(segment().syncSamples.syncCount, 0U);
}

TEST_F(SampleStoreTest, SyncNumbersCountFromOneInEachSegment) {
    addSyncs({1, 0});
    ASSERT_EQ(endChunk(), MBX_OK);
    ASSERT_EQ(MbxAppendSegments(context, &movie), MBX_OK);
    addSyncs({0, 1, 0, 1});
    EXPECT_EQ(Entries<uint32_t>(track->segments.first->syncSamples.list), Numbers{1});
    EXPECT_EQ(Entries<uint32_t>(segment().syncSamples.list), (Numbers{2, 4}));
}

// ---- Dependencies ----

TEST_F(SampleStoreTest, DependenciesKeepTheFirstAndRunTheSecond) {
    addDependencies({1, 2, 2, 2});
    const MbxDependencyList& list = segment().dependencies;
    EXPECT_EQ(*list.first, 1U);
    EXPECT_EQ(*list.second, 2U);
    EXPECT_EQ(list.runCount, 3U);
    EXPECT_EQ(list.list.first, nullptr);
}

TEST_F(SampleStoreTest, ADependencyThatDiffersOpensTheListForAllThatFollow) {
    addDependencies({1, 2, 2, 1, 2, 2});
    const MbxDependencyList& list = segment().dependencies;
    EXPECT_EQ(list.runCount, 2U);
    EXPECT_EQ(Entries<uint8_t>(list.list), (std::vector<uint8_t>{1, 2, 2}));
}

TEST_F(SampleStoreTest, ARunOfDependenciesIsAddedAtOnce) {
    MbxDependencyList list = {};
    list.list.capacity = 2;
    EXPECT_EQ(MbxAddDependency(context, &list, 8, 5), MBX_OK);
    EXPECT_EQ(*list.first, 8U);
    EXPECT_EQ(*list.second, 8U);
    EXPECT_EQ(list.runCount, 4U);
    EXPECT_EQ(MbxAddDependency(context, &list, 8, 1000000), MBX_OK);
    EXPECT_EQ(list.runCount, 1000004U);
    EXPECT_EQ(list.list.first, nullptr);
    EXPECT_EQ(MbxAddDependency(context, &list, 9, 3), MBX_OK);
    EXPECT_EQ(Entries<uint8_t>(list.list), (std::vector<uint8_t>{9, 9, 9}));
    EXPECT_EQ(MbxAddDependency(context, &list, 8, 0), MBX_OK);
    MbxBlockListRelease(context, &list.list);
}

// ---- Trick play and auxiliary information ----

TEST_F(SampleStoreTest, TrickBytesHoldPictureTypeAndDependencyLevel) {
    MbxSampleInfo info = sample();
    info.pictureType = 2;
    info.dependencyLevel = 5;
    ASSERT_EQ(add(info), MBX_OK);
    EXPECT_EQ(segment().trickBytes.first, nullptr);  // not enabled
    track->trickEnabled = 1;
    ASSERT_EQ(add(info), MBX_OK);
    info.pictureType = 7;
    info.dependencyLevel = 0xFF;
    ASSERT_EQ(add(info), MBX_OK);
    EXPECT_EQ(Entries<uint8_t>(segment().trickBytes), (std::vector<uint8_t>{0x85, 0xFF}));
}

TEST_F(SampleStoreTest, AuxiliaryBytesAreCopiedAndTheirOffsetIsKeptPerChunk) {
    track->auxEnabled = 1;
    uint8_t bytes[] = {1, 2, 3};
    MbxSampleInfo info = sample();
    info.auxSize = 3;
    info.auxData = bytes;
    info.auxOffset = 900;
    ASSERT_EQ(add(info), MBX_OK);
    bytes[0] = 9;
    info.auxOffset = 901;
    ASSERT_EQ(add(info), MBX_OK);
    ASSERT_EQ(endChunk(), MBX_OK);
    info.auxOffset = 950;
    ASSERT_EQ(add(info), MBX_OK);
    const auto aux = Entries<MbxAuxSize>(segment().auxSizes.list);
    ASSERT_EQ(aux.size(), 3U);
    EXPECT_EQ(Bytes(aux[0].data, aux[0].data + 3), Hex("010203"));
    EXPECT_EQ(Bytes(aux[1].data, aux[1].data + 3), Hex("090203"));
    const auto offsets = Entries<MbxAuxOffset>(segment().auxOffsets);
    ASSERT_EQ(offsets.size(), 2U);
    EXPECT_EQ(offsets[0].sampleNumber, 1U);
    EXPECT_EQ(offsets[0].offset, 900U);
    EXPECT_EQ(offsets[1].sampleNumber, 3U);
    EXPECT_EQ(offsets[1].offset, 950U);
}

TEST_F(SampleStoreTest, AuxiliaryDefaultSizeIsLostForGoodWhenTwoDiffer) {
    MbxAuxSizeList list = {};
    list.list.capacity = 10;
    const uint8_t bytes[8] = {};
    ASSERT_EQ(MbxAddAuxSize(context, &list, 8, bytes), MBX_OK);
    ASSERT_EQ(MbxAddAuxSize(context, &list, 8, bytes), MBX_OK);
    EXPECT_EQ(list.defaultSize, 8U);
    ASSERT_EQ(MbxAddAuxSize(context, &list, 0, nullptr), MBX_OK);
    EXPECT_EQ(list.defaultSize, 0U);
    ASSERT_EQ(MbxAddAuxSize(context, &list, 8, bytes), MBX_OK);
    EXPECT_EQ(list.defaultSize, 0U);
    EXPECT_EQ(list.count, 4U);
    const auto aux = Entries<MbxAuxSize>(list.list);
    EXPECT_EQ(aux[2].data, nullptr);
    for (const MbxAuxSize& entry : aux) MbxFree(context, entry.data);
    MbxBlockListRelease(context, &list.list);
}

TEST_F(SampleStoreTest, AuxiliarySizeWithoutBytesIsInvalidBeforeAnythingIsRecorded) {
    track->auxEnabled = 1;
    MbxSampleInfo info = sample();
    info.auxSize = 3;
    EXPECT_EQ(add(info), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(track->segments.first, nullptr);
    MbxAuxSizeList list = {};
    EXPECT_EQ(MbxAddAuxSize(context, &list, 3, nullptr), MBX_ERR_INVALID_ARG);
}

// ---- Fragment index ----

TEST_F(SampleStoreTest, AnIndexEntryAskedForOnTheFirstSegmentAddsNoRow) {
    EXPECT_EQ(add(sample(), 1, 1), MBX_OK);
    EXPECT_EQ(track->fragmentIndex.first, nullptr);
}

TEST_F(SampleStoreTest, AnIndexEntryHoldsTimeFragmentTrackChunkAndPlaceInIt) {
    addTrack();
    addChunk(1, 0, sample(100, 500), 2);
    ASSERT_EQ(MbxAppendSegments(context, &movie), MBX_OK);
    movie.fragmentCount = 1;
    ASSERT_EQ(MbxAppendSegments(context, &movie), MBX_OK);
    movie.fragmentCount = 2;
    addChunk(3, 0, sample(), 2);
    ASSERT_EQ(add(sample(), 2, 0), MBX_OK);
    ASSERT_EQ(add(sample(), 2, 1), MBX_OK);
    const auto rows = Entries<MbxFragmentIndexEntry>(tracks[1].fragmentIndex);
    ASSERT_EQ(rows.size(), 1U);
    EXPECT_EQ(rows[0].time, 540U);  // 500, three samples and one of 10
    EXPECT_EQ(rows[0].fragmentIndex, 2U);
    EXPECT_EQ(rows[0].trackIndex, 2U);
    EXPECT_EQ(rows[0].trunNumber, 2U);
    EXPECT_EQ(rows[0].sampleNumber, 2U);
    EXPECT_EQ(tracks[0].fragmentIndex.first, nullptr);
}

TEST_F(SampleStoreTest, AnIndexEntryTellsThePresentationTimeToThoseWhoAskForThat) {
    ASSERT_EQ(MbxAppendSegments(context, &movie), MBX_OK);
    movie.fragmentCount = 1;
    MbxSampleInfo info = sample(100, 10);
    info.compositionOffset = 25;
    ASSERT_EQ(add(info, 1, MBX_INDEX_ROW_OF_DECODING), MBX_OK);
    ASSERT_EQ(add(info, 1, MBX_INDEX_ROW_OF_PRESENTATION), MBX_OK);
    const auto rows = Entries<MbxFragmentIndexEntry>(track->fragmentIndex);
    ASSERT_EQ(rows.size(), 2U);
    EXPECT_EQ(rows[0].time, 0U);
    EXPECT_EQ(rows[1].time, 35U);
}

TEST_F(SampleStoreTest, AnIndexEntryOfAPresentationBeforeTheBeginningTells0) {
    ASSERT_EQ(MbxTrackSetSignedOffsets(context, track, 1), MBX_OK);
    ASSERT_EQ(MbxAppendSegments(context, &movie), MBX_OK);
    movie.fragmentCount = 1;
    MbxSampleInfo info = sample(100, 10);
    info.compositionOffset = -3;
    ASSERT_EQ(add(info, 1, MBX_INDEX_ROW_OF_PRESENTATION), MBX_OK);
    EXPECT_EQ(Entries<MbxFragmentIndexEntry>(track->fragmentIndex).at(0).time, 0U);
}

TEST_F(SampleStoreTest, AnIndexEntryWhoseFragmentNumberDisagreesIsInternal) {
    ASSERT_EQ(MbxAppendSegments(context, &movie), MBX_OK);
    EXPECT_EQ(add(sample(), 1, 1), MBX_ERR_INTERNAL);
}

// ---- Refused memory ----

TEST_F(SampleStoreTest, EveryRefusedAllocationIsReportedAndLeaksNothing) {
    for (uint64_t n = 1;; n++) {
        ASSERT_LT(n, 100U);
        EXPECT_EQ(MbxFreeSegments(context, track), MBX_OK);
        track->auxEnabled = 1;
        track->trickEnabled = 1;
        const uint8_t bytes[] = {1, 2};
        MbxSampleInfo info = sample();
        info.auxSize = 2;
        info.auxData = bytes;
        const auto record = [&] {
            for (uint32_t i = 0; i < 4; i++) {
                info.size = 100 + i / 2;
                info.isSync = i != 2;
                info.dependency = static_cast<uint8_t>(i);
                MBX_TRY(add(info));
            }
            return endChunk();
        };
        host.allocations = 0;
        host.failAllocation = n;
        const MbxStatus status = record();
        host.failAllocation = 0;
        if (host.allocations < n) {
            EXPECT_EQ(status, MBX_OK);
            break;
        }
        EXPECT_EQ(status, MBX_ERR_NO_MEMORY) << n;
    }
}

TEST_F(SampleStoreTest, ARefusedBlockLeavesTheAccumulatorAsItWas) {
    MbxSizeList sizes = {};
    sizes.list.capacity = 2;
    for (int i = 0; i < 3; i++) ASSERT_EQ(MbxAddSize(context, &sizes, 5), MBX_OK);
    MbxSyncList syncs = {};
    syncs.list.capacity = 2;
    for (uint32_t i = 1; i <= 3; i++) ASSERT_EQ(MbxAddSync(context, &syncs, i, true), MBX_OK);
    for (uint64_t n = 1; n <= 4; n++) {  // two blocks of two allocations each
        host.failAllocation = host.allocations + n;
        EXPECT_EQ(MbxAddSize(context, &sizes, 7), MBX_ERR_NO_MEMORY);
        EXPECT_EQ(sizes.list.first, nullptr);
        EXPECT_EQ(sizes.list.current, nullptr);
        EXPECT_EQ(sizes.uniformSize, 5U);
        EXPECT_EQ(sizes.count, 3U);
        host.failAllocation = host.allocations + n;
        EXPECT_EQ(MbxAddSync(context, &syncs, 4, false), MBX_ERR_NO_MEMORY);
        EXPECT_EQ(syncs.list.first, nullptr);
        EXPECT_EQ(syncs.syncCount, 3U);
    }
    host.failAllocation = 0;
    EXPECT_EQ(MbxAddSize(context, &sizes, 7), MBX_OK);
    EXPECT_EQ(Entries<uint32_t>(sizes.list), (Numbers{5, 5, 5, 7}));
    EXPECT_EQ(MbxAddSync(context, &syncs, 4, false), MBX_OK);
    EXPECT_EQ(Entries<uint32_t>(syncs.list), (Numbers{1, 2, 3}));
    MbxBlockListRelease(context, &sizes.list);
    MbxBlockListRelease(context, &syncs.list);
}

TEST_F(SampleStoreTest, ARefusedCopyOfAuxiliaryBytesLeaksNothing) {
    MbxAuxSizeList list = {};
    list.list.capacity = 10;
    const uint8_t bytes[] = {1};
    host.failCopy = 1;
    EXPECT_EQ(MbxAddAuxSize(context, &list, 1, bytes), MBX_ERR_INTERNAL);
    host.failCopy = 0;
    host.failAllocation = host.allocations + 2;  // the list's block, behind the copy
    EXPECT_EQ(MbxAddAuxSize(context, &list, 1, bytes), MBX_ERR_NO_MEMORY);
    EXPECT_EQ(list.count, 0U);
}

}  // namespace
