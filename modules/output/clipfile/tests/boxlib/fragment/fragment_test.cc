#include "boxlib/fragment/fragment.h"

#include "boxlib/core/row_table.h"
#include "boxlib/fragment/fragment_index.h"
#include "boxlib/support/fragment_sample.h"
#include "boxlib/support/registry.h"

namespace {

const FragmentSample kSample;
const MbxMfhdParams kMfhdParams = {1};
const MbxMoofParams kMoofParams = {&kSample.movie, 1};

const BoxRegistration kMfhd = RegisterBox<MbxMfhdBox>(
    {.name = "Mfhd",
     .code = "mfhd",
     .parents = "moof",
     .clause = "ISO/IEC 14496-12 8.8.5",
     .presence = Presence::kMandatory,
     .golden = FragmentSample::Mfhd(),
     .build = [](MbxContext* context, const MbxOptions* options,
                 MbxMfhdBox* box) { return MbxBuildMfhd(context, options, &kMfhdParams, box); },
     .write = MbxWriteMfhdBox,
     .free = MbxFreeMfhd});

const BoxRegistration kMoof = RegisterBox<MbxMoofBox>(
    {.name = "Moof",
     .code = "moof",
     .parents = "file",
     .clause = "ISO/IEC 14496-12 8.8.4",
     .presence = Presence::kMandatory,
     .golden = Hex("00000109 'moof'") + FragmentSample::Mfhd() + FragmentSample::Traf(),
     .build = [](MbxContext* context, const MbxOptions* options,
                 MbxMoofBox* box) { return MbxBuildMoof(context, nullptr, options, &kMoofParams, box); },
     .write = MbxWithScratch(nullptr, MbxWriteMoofBox),
     .free = MbxFreeMoof});

class FragmentTest : public SampleTest {
 protected:
    MbxStatus writeMoof(uint32_t fragment, uint64_t position = 0) {
        file.bytes.clear();
        return MbxMovieWriteMoof(context, &session.scratch, &options, &movie, &file, fragment, position,
                                 &size);
    }

    MbxStatus measureMoof(uint32_t fragment) {
        return MbxMovieWriteMoof(context, &session.scratch, &options, &movie, nullptr, fragment, 0, &size);
    }

    MbxStatus sealFirst() { return MbxMovieSealFirstFragment(context, &movie); }
    MbxStatus seal() { return MbxMovieSealFragment(context, &movie); }
    MbxStatus release(uint32_t fragment) { return MbxMovieReleaseFragment(context, &movie, fragment); }

    static std::vector<uint32_t> defaultsOf(const MbxTrack& track) {
        return {track.defaults.descriptionIndex, track.defaults.duration, track.defaults.size,
                track.defaults.flags};
    }

    uint64_t size = 0;
};

using Words4 = std::vector<uint32_t>;

// ---- Sealing
// -------------------------------------------------------------------------------------------------------

TEST_F(FragmentTest, SealingTheFirstOpensFragment1AndCanBeDoneOnce) {
    addTrack();
    addChunk(2, 0);
    EXPECT_EQ(seal(), MBX_ERR_BAD_STATE);
    EXPECT_EQ(sealFirst(), MBX_OK);
    EXPECT_EQ(movie.fragmentCount, 1U);
    EXPECT_EQ(tracks[0].segmentCount, 2U);
    EXPECT_EQ(sealFirst(), MBX_ERR_BAD_STATE);
    EXPECT_EQ(seal(), MBX_OK);
    EXPECT_EQ(movie.fragmentCount, 2U);
    EXPECT_EQ(tracks[0].segmentCount, 3U);
}

TEST_F(FragmentTest, SealingWithAChunkLeftOpenIsBadState) {
    addTrack();
    addTrack();
    ASSERT_EQ(add(sample(), 2), MBX_OK);
    EXPECT_EQ(sealFirst(), MBX_ERR_BAD_STATE);
    EXPECT_EQ(movie.fragmentCount, 0U);
    ASSERT_EQ(endChunk(2), MBX_OK);
    EXPECT_EQ(sealFirst(), MBX_OK);
    ASSERT_EQ(add(sample(), 1), MBX_OK);
    EXPECT_EQ(seal(), MBX_ERR_BAD_STATE);
    EXPECT_EQ(movie.fragmentCount, 1U);
    EXPECT_EQ(tracks[0].segmentCount, 2U);
}

TEST_F(FragmentTest, SealingDerivesTrexDefaultsFromTheFirstSamples) {
    addTrack();
    addTrack();
    addTrack();
    MbxSampleInfo info = sample(77, 40, 1);
    info.descriptionIndex = 2;
    addChunk(3, 0, info, 1);
    addChunk(1, 0, sample(7, 30, 1), 2);
    addChunk(1, 0, sample(8, 31, 0), 2);
    ASSERT_EQ(sealFirst(), MBX_OK);
    EXPECT_EQ(defaultsOf(tracks[0]), (Words4{2, 40, 77, 0}));
    EXPECT_EQ(defaultsOf(tracks[1]), (Words4{1, 30, 7, 0x10000}));
    EXPECT_EQ(defaultsOf(tracks[2]), (Words4{1, 0, 0, 0x10000}));
    EXPECT_EQ(tracks[0].defaultsDone, 1U);
    EXPECT_EQ(tracks[2].defaultsDone, 0U);
}

TEST_F(FragmentTest, ATrackWithoutSamplesLearnsItsDefaultsLaterAndOnce) {
    addTrack();
    ASSERT_EQ(sealFirst(), MBX_OK);
    addChunk(1, 0, sample(5, 6, 1));
    ASSERT_EQ(seal(), MBX_OK);
    EXPECT_EQ(defaultsOf(tracks[0]), (Words4{1, 6, 5, 0}));
    addChunk(1, 0, sample(8, 9, 1));
    ASSERT_EQ(seal(), MBX_OK);
    EXPECT_EQ(defaultsOf(tracks[0]), (Words4{1, 6, 5, 0}));
}

TEST_F(FragmentTest, SealingLooksAtTheSegmentThatItSealsAlone) {
    // A track can stay empty for a whole recording: what was sealed before must not be walked again.
    addTrack();
    ASSERT_EQ(sealFirst(), MBX_OK);
    ASSERT_EQ(seal(), MBX_OK);
    for (MbxSampleSegment* segment : {tracks[0].segments.first, tracks[0].sealedSegment}) {
        segment->sizes.uniformSize = 77;
        segment->sizes.count = 1;
    }
    addChunk(1, 0, sample(5, 6, 1));
    ASSERT_EQ(seal(), MBX_OK);
    EXPECT_EQ(defaultsOf(tracks[0]), (Words4{1, 6, 5, 0}));
}

TEST_F(FragmentTest, DefaultsGivenByTheCallerAreLeftAlone) {
    addTrack();
    tracks[0].defaults = {11, 12, 13, 14};
    addChunk(1, 0, sample(5, 6, 1));
    for (uint32_t mask = 0; mask < 16; mask++) {
        MbxTrack track = tracks[0];
        track.defaultsMask = mask;
        track.next = nullptr;
        MbxMovie copy = {};
        copy.tracks = {&track, &track};
        const MbxSampleSegment* shared = track.segments.last;
        ASSERT_EQ(MbxMovieSealFirstFragment(context, &copy), MBX_OK);
        EXPECT_EQ(defaultsOf(track), (Words4{(mask & 1) != 0 ? 11U : 1U, (mask & 2) != 0 ? 12U : 6U,
                                             (mask & 4) != 0 ? 13U : 5U, (mask & 8) != 0 ? 14U : 0U}));
        MbxFree(context, shared->next);
        tracks[0].segments.last->next = nullptr;
    }
}

TEST_F(FragmentTest, SealingThatIsRefusedMemoryOrOverflowsCanBeTriedAgain) {
    addTrack();
    addTrack();
    addChunk(1, 0, sample(5, 6), 2);
    for (uint64_t n = 1; n <= 3; n++) {
        host.failAllocation = host.allocations + n;
        EXPECT_EQ(sealFirst(), MBX_ERR_NO_MEMORY);
        EXPECT_EQ(movie.fragmentCount, 0U);
        EXPECT_EQ(tracks[0].segmentCount, 0U);
        EXPECT_EQ(tracks[1].segmentCount, 1U);
    }
    host.failAllocation = 0;
    tracks[1].segments.first->firstDecodeTime = UINT64_MAX;
    EXPECT_EQ(sealFirst(), MBX_ERR_OVERFLOW);
    EXPECT_EQ(movie.fragmentCount, 0U);
    tracks[1].segments.first->firstDecodeTime = 0;
    EXPECT_EQ(sealFirst(), MBX_OK);
    EXPECT_EQ(tracks[1].segments.last->firstDecodeTime, 6U);
    uint32_t count = 0;
    EXPECT_EQ(MbxFragmentCount(&movie, &count), MBX_OK);
    EXPECT_EQ(count, 1U);
}

// ---- Writing
// -------------------------------------------------------------------------------------------------------

TEST_F(FragmentTest, OnlyASealedFragmentCanBeWrittenOrReleased) {
    addTrack();
    EXPECT_EQ(measureMoof(0), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(measureMoof(1), MBX_ERR_NOT_FOUND);
    ASSERT_EQ(sealFirst(), MBX_OK);
    addChunk(1, 0);
    EXPECT_EQ(measureMoof(1), MBX_ERR_BAD_STATE);  // open
    EXPECT_EQ(measureMoof(2), MBX_ERR_NOT_FOUND);
    EXPECT_EQ(release(1), MBX_ERR_BAD_STATE);
    EXPECT_EQ(release(2), MBX_ERR_NOT_FOUND);
    ASSERT_EQ(seal(), MBX_OK);
    EXPECT_EQ(measureMoof(1), MBX_OK);
    EXPECT_EQ(measureMoof(2), MBX_ERR_BAD_STATE);
    EXPECT_EQ(measureMoof(3), MBX_ERR_NOT_FOUND);
    EXPECT_EQ(release(1), MBX_OK);
}

TEST_F(FragmentTest, SamplesOutsideAChunkAreBadState) {
    addTrack();
    ASSERT_EQ(sealFirst(), MBX_OK);
    ASSERT_EQ(add(sample()), MBX_OK);
    movie.fragmentCount = 2;  // as if it had been sealed
    EXPECT_EQ(measureMoof(1), MBX_ERR_BAD_STATE);
}

TEST_F(FragmentTest, MoofOfEqualSamplesHasDefaultsAndARunWithoutRows) {
    addTrack();
    addChunk(1, 0);
    ASSERT_EQ(sealFirst(), MBX_OK);
    addChunk(3, 0x1000);
    ASSERT_EQ(seal(), MBX_OK);
    ASSERT_EQ(measureMoof(1), MBX_OK);
    EXPECT_EQ(size, 76U);
    ASSERT_EQ(writeMoof(1, 100), MBX_OK);
    EXPECT_EQ(size, 76U);
    EXPECT_BYTES(file.bytes, Repeat(0, 100) + Hex("0000004C 'moof'"
                                                  "00000010 'mfhd' 00000000 00000001"
                                                  "00000034 'traf'"
                                                  "00000018 'tfhd' 00000001 0000000A 0000000000001000"
                                                  "00000014 'trun' 00000001 00000003 00000000"));
}

TEST_F(FragmentTest, ATrackWithoutChunksHasNoTraf) {
    addTrack();
    addTrack();
    addTrack();
    for (uint32_t track = 1; track <= 3; track++) addChunk(1, 0, sample(), track);
    ASSERT_EQ(sealFirst(), MBX_OK);
    addChunk(1, 0x1000, sample(), 1);
    addChunk(1, 0x1064, sample(), 3);
    ASSERT_EQ(seal(), MBX_OK);
    ASSERT_EQ(writeMoof(1), MBX_OK);
    EXPECT_BYTES(file.bytes, Hex("00000080 'moof'"
                                 "00000010 'mfhd' 00000000 00000001"
                                 "00000034 'traf'"
                                 "00000018 'tfhd' 00000001 0000000A 0000000000001000"
                                 "00000014 'trun' 00000001 00000001 00000000"
                                 "00000034 'traf'"
                                 "00000018 'tfhd' 00000001 0000001E 0000000000001064"
                                 "00000014 'trun' 00000001 00000001 00000000"));
}

TEST_F(FragmentTest, AFragmentWithoutSamplesIsAMoofOfItsHeader) {
    addTrack();
    ASSERT_EQ(sealFirst(), MBX_OK);
    ASSERT_EQ(seal(), MBX_OK);
    ASSERT_EQ(seal(), MBX_OK);
    ASSERT_EQ(writeMoof(2), MBX_OK);
    EXPECT_BYTES(file.bytes, Hex("00000018 'moof' 00000010 'mfhd' 00000000 00000002"));
}

TEST_F(FragmentTest, TheBaseRunsOnFromTrackToTrackInBaseOffsetMode1) {
    options.base_offset_mode = 1;
    options.trun_offset_mode = 1;
    addTrack();
    addTrack();
    addChunk(1, 0, sample(), 1);
    addChunk(1, 0, sample(), 2);
    ASSERT_EQ(sealFirst(), MBX_OK);
    addChunk(1, 0x100, sample(), 1);  // from the first byte of `moof`
    addChunk(1, 0x164, sample(), 2);
    ASSERT_EQ(seal(), MBX_OK);
    ASSERT_EQ(writeMoof(1), MBX_OK);
    EXPECT_BYTES(file.bytes, Hex("0000006C 'moof'"
                                 "00000010 'mfhd' 00000000 00000001"
                                 "0000002C 'traf'"
                                 "00000010 'tfhd' 00000000 0000000A"
                                 "00000014 'trun' 00000001 00000001 00000100"
                                 "00000028 'traf'"
                                 "00000010 'tfhd' 00000000 00000014"
                                 "00000010 'trun' 00000000 00000001"));
}

TEST_F(FragmentTest, TheBaseIsMoofInBaseOffsetMode2) {
    options.base_offset_mode = 2;
    addTrack();
    addChunk(1, 0);
    ASSERT_EQ(sealFirst(), MBX_OK);
    addChunk(1, 0x64);
    ASSERT_EQ(seal(), MBX_OK);
    ASSERT_EQ(writeMoof(1), MBX_OK);
    EXPECT_BYTES(file.bytes, Hex("00000044 'moof'"
                                 "00000010 'mfhd' 00000000 00000001"
                                 "0000002C 'traf'"
                                 "00000010 'tfhd' 00020000 0000000A"
                                 "00000014 'trun' 00000001 00000001 00000064"));
}

TEST_F(FragmentTest, TfdtTellsTheDecodeTimeOfEachFragment) {
    options.tfdt_mode = 1;
    addTrack();
    addChunk(3, 0);
    ASSERT_EQ(sealFirst(), MBX_OK);
    addChunk(2, 0);
    ASSERT_EQ(seal(), MBX_OK);
    addChunk(1, 0);
    ASSERT_EQ(seal(), MBX_OK);
    ASSERT_EQ(writeMoof(1), MBX_OK);
    EXPECT_BYTES(Bytes(file.bytes.begin() + 56, file.bytes.begin() + 72),
                 Hex("00000010 'tfdt' 00000000 0000001E"));
    ASSERT_EQ(writeMoof(2), MBX_OK);
    EXPECT_BYTES(Bytes(file.bytes.begin() + 56, file.bytes.begin() + 72),
                 Hex("00000010 'tfdt' 00000000 00000032"));
}

// ---- Placing
// -------------------------------------------------------------------------------------------------------

TEST_F(FragmentTest, ShiftingAFragmentMovesItsOffsetsAlone) {
    addTrack();
    addChunk(1, 1);
    ASSERT_EQ(sealFirst(), MBX_OK);
    addChunk(1, 2);
    ASSERT_EQ(seal(), MBX_OK);
    EXPECT_EQ(MbxMovieShiftFragmentOffsets(context, &options, &movie, 1, 0, 0, 10), MBX_OK);
    EXPECT_EQ(MbxApplyOffsetDelta(context, 0, 0, 0, 0, 100, &movie.tracks), MBX_OK);
    EXPECT_EQ(Entries<uint64_t>(MbxFindSegment(&tracks[0], 0)->chunkOffsets.list),
              std::vector<uint64_t>{101});
    EXPECT_EQ(Entries<uint64_t>(MbxFindSegment(&tracks[0], 1)->chunkOffsets.list), std::vector<uint64_t>{12});
    EXPECT_EQ(MbxMovieShiftFragmentOffsets(context, &options, &movie, 3, 0, 0, 10), MBX_ERR_NOT_FOUND);
}

TEST_F(FragmentTest, AShiftThatWrapsIsForgivenUnlessBaseOffsetModeIsZero) {
    addTrack();
    ASSERT_EQ(sealFirst(), MBX_OK);
    addChunk(1, 5);
    ASSERT_EQ(seal(), MBX_OK);
    EXPECT_EQ(MbxMovieShiftFragmentOffsets(context, &options, &movie, 1, 0, 0, -6), MBX_ERR_OVERFLOW);
    EXPECT_EQ(MbxMovieShiftFragmentOffsets(context, &options, &movie, 1, 0, 0, 6), MBX_ERR_OVERFLOW);
    for (const uint32_t mode : {1U, 2U}) {
        options.base_offset_mode = mode;
        EXPECT_EQ(MbxMovieShiftFragmentOffsets(context, &options, &movie, 1, 0, 0, -6), MBX_OK);
        ASSERT_EQ(writeMoof(1), MBX_OK);
        EXPECT_BYTES(Bytes(file.bytes.end() - 4, file.bytes.end()), Hex("FFFFFFFF"));
        EXPECT_EQ(MbxMovieShiftFragmentOffsets(context, &options, &movie, 1, 0, 0, 6), MBX_OK);
        EXPECT_EQ(MbxMovieShiftFragmentOffsets(context, &options, &movie, 9, 0, 0, 6), MBX_ERR_NOT_FOUND);
    }
}

TEST_F(FragmentTest, TheBaseIsSetOnEveryTrackAndATrackThatLacksTheFragmentIsNotFound) {
    addTrack();
    addTrack();
    ASSERT_EQ(sealFirst(), MBX_OK);
    EXPECT_EQ(MbxMovieSetFragmentBase(context, &movie, 1, 4711), MBX_OK);
    EXPECT_EQ(tracks[0].segments.last->fragmentOffset, 4711U);
    EXPECT_EQ(tracks[1].segments.last->fragmentOffset, 4711U);
    EXPECT_EQ(tracks[0].segments.first->fragmentOffset, 0U);
    EXPECT_EQ(MbxMovieSetFragmentBase(context, &movie, 2, 1), MBX_ERR_NOT_FOUND);
    EXPECT_EQ(MbxMovieSetFragmentBase(context, &movie, 0, 1), MBX_ERR_INVALID_ARG);
    addTrack();
    EXPECT_EQ(MbxMovieSetFragmentBase(context, &movie, 1, 1), MBX_ERR_NOT_FOUND);
}

// ---- Releasing
// -----------------------------------------------------------------------------------------------------

TEST_F(FragmentTest, ReleaseOfOneFragmentEmptiesItOnEveryTrack) {
    addTrack();
    addTrack();
    ASSERT_EQ(sealFirst(), MBX_OK);
    addChunk(1, 0, sample(), 1);
    addChunk(1, 0, sample(), 2);
    ASSERT_EQ(seal(), MBX_OK);
    addChunk(1, 0, sample(), 1);
    EXPECT_EQ(release(1), MBX_OK);
    EXPECT_EQ(MbxFindSegment(&tracks[0], 1)->sizes.count, 0U);
    EXPECT_EQ(MbxFindSegment(&tracks[1], 1)->sizes.count, 0U);
    EXPECT_EQ(MbxFindSegment(&tracks[0], 1)->decodeDuration, 10U);
    EXPECT_EQ(MbxFindSegment(&tracks[0], 2)->sizes.count, 1U);
    EXPECT_EQ(measureMoof(1), MBX_OK);
    EXPECT_EQ(size, 24U);  // nothing left to tell
}

TEST_F(FragmentTest, ReleaseOfAllNeedsTwoFragmentsAndSparesTheFirstAndTheOpenSegment) {
    addTrack();
    addChunk(1, 0);
    EXPECT_EQ(release(0), MBX_ERR_BAD_STATE);
    ASSERT_EQ(sealFirst(), MBX_OK);
    EXPECT_EQ(release(0), MBX_ERR_BAD_STATE);
    for (int i = 0; i < 3; i++) {
        addChunk(1, 0);
        ASSERT_EQ(seal(), MBX_OK);
    }
    addChunk(1, 0);
    EXPECT_EQ(release(0), MBX_OK);
    std::vector<uint32_t> counts;
    for (uint32_t i = 0; i < 5; i++) counts.push_back(MbxFindSegment(&tracks[0], i)->sizes.count);
    EXPECT_EQ(counts, (std::vector<uint32_t>{1, 0, 0, 0, 1}));
}

TEST_F(FragmentTest, MemoryOverTenThousandFragmentsGrowsWithIndexRowsAndSegmentRecordsAlone) {
    options.chunk_offset_mode = 0;
    addTrack();
    uint64_t before = 0;
    uint64_t rowBlocks = 0;
    ASSERT_EQ(sealFirst(), MBX_OK);
    for (uint32_t fragment = 1; fragment <= 10000; fragment++) {
        if (fragment == 2) {
            before = host.liveBytes;
            rowBlocks = BlockCount(tracks[0].fragmentIndex);
        }
        for (uint32_t i = 0; i < 4; i++)
            ASSERT_EQ(add(sample(fragment + i, i + 1, i == 0), 1, i == 0), MBX_OK);
        ASSERT_EQ(endChunk(), MBX_OK);
        ASSERT_EQ(seal(), MBX_OK);
        ASSERT_EQ(MbxMovieSetFragmentBase(context, &movie, fragment, fragment), MBX_OK);
        MemoryFile target;
        ASSERT_EQ(MbxMovieWriteMoof(context, &session.scratch, &options, &movie, &target, fragment, 0, &size),
                  MBX_OK);
        ASSERT_EQ(release(fragment), MBX_OK);
    }
    constexpr uint64_t kHeader = 8;  // of the counted allocator
    const uint64_t segments = 9999 * (sizeof(MbxSampleSegment) + kHeader);
    const uint64_t newRowBlocks = BlockCount(tracks[0].fragmentIndex) - rowBlocks;
    const uint64_t rows =
        newRowBlocks * (sizeof(MbxBlock) + kHeader + 1000 * sizeof(MbxFragmentIndexEntry) + kHeader);
    EXPECT_EQ(newRowBlocks, 9U);
    EXPECT_EQ(host.liveBytes - before, segments + rows);
    ASSERT_EQ(MbxMovieWriteMfra(context, &session.scratch, &options, &movie, nullptr, 0, &size), MBX_OK);
    EXPECT_EQ(size, 8U + 8 + 16 + 10000 * 19 + 16);  // rows of version 1
}

// ---- Failures
// ------------------------------------------------------------------------------------------------------

class FragmentFailureTest : public FragmentTest {
 protected:
    // Two tracks with three chunks each in fragment 1, whose `moof` and index the tests know.
    void enter(uint32_t samplesPerChunk) {
        const uint8_t bytes[] = {1, 2};
        for (uint32_t number = 1; number <= 2; number++) {
            MbxTrack* track = addTrack();
            track->auxEnabled = number == 1;
            track->trickEnabled = number == 1;
        }
        MbxSampleInfo info = sample();
        info.auxSize = 2;
        info.auxData = bytes;
        addChunk(2, 0, info, 1);
        addChunk(2, 0, info, 2);
        ASSERT_EQ(sealFirst(), MBX_OK);
        for (uint32_t chunk = 0; chunk < 3; chunk++) {
            for (uint32_t number = 1; number <= 2; number++) {
                for (uint32_t i = 0; i < samplesPerChunk; i++) {
                    info.size = i;
                    info.duration = i + chunk;
                    info.isSync = i % 10 == 0;
                    info.offset = 5000 + chunk * 7;
                    info.auxOffset = 6000 + chunk;
                    ASSERT_EQ(add(info, number, i % 10 == 0), MBX_OK);
                }
                ASSERT_EQ(endChunk(number), MBX_OK);
            }
        }
        ASSERT_EQ(seal(), MBX_OK);
        ASSERT_EQ(writeMoof(1), MBX_OK);
        expected = file.bytes;
        const MbxStatus status =
            MbxMovieWriteMfra(context, &session.scratch, &options, &movie, &mfra, 0, &size);
        ASSERT_EQ(status, MBX_OK);
    }

    // What a failure must leave: nothing allocated in addition, and a tree that writes the same bytes.
    void expectIntact(size_t live) {
        EXPECT_EQ(host.live.size(), live);
        file = MemoryFile();
        ASSERT_EQ(writeMoof(1), MBX_OK);
        EXPECT_TRUE(file.bytes == expected);
        MemoryFile again;
        const MbxStatus status =
            MbxMovieWriteMfra(context, &session.scratch, &options, &movie, &again, 0, &size);
        ASSERT_EQ(status, MBX_OK);
        EXPECT_TRUE(again.bytes == mfra.bytes);
    }

    Bytes expected;
    MemoryFile mfra;
};

TEST_F(FragmentFailureTest, EveryRefusedAllocationOfMoofLeavesAValidTree) {
    enter(900);  // more rows than the scratch holds
    const size_t live = host.live.size();
    for (uint64_t n = 1;; n++) {
        ASSERT_LT(n, 1000U);
        host.allocations = 0;
        host.failAllocation = n;
        size = 77;
        const MbxStatus status = writeMoof(1);
        host.failAllocation = 0;
        if (host.allocations < n) {
            EXPECT_EQ(status, MBX_OK);
            break;
        }
        EXPECT_EQ(status, MBX_ERR_NO_MEMORY) << n;
        EXPECT_EQ(size, 77U);
        expectIntact(live);
    }
}

TEST_F(FragmentFailureTest, EveryFailedWriteAndSeekOfMoofLeavesAValidTree) {
    enter(5);
    const size_t live = host.live.size();
    const uint64_t writes = file.writes;
    const uint64_t seeks = file.seeks;
    for (uint64_t n = 1; n <= writes; n++) {
        file = MemoryFile();
        file.failWrite = n;
        EXPECT_EQ(writeMoof(1), MBX_ERR_IO) << n;
        file = MemoryFile();
        file.shortWrite = n;
        EXPECT_EQ(writeMoof(1), MBX_ERR_IO) << n;
        expectIntact(live);
    }
    for (uint64_t n = 1; n <= seeks; n++) {
        file = MemoryFile();
        file.failSeek = n;
        EXPECT_EQ(writeMoof(1), MBX_ERR_IO) << n;
        expectIntact(live);
    }
}

TEST_F(FragmentFailureTest, EveryFailureOfMfraLeavesAValidTree) {
    enter(900);  // more rows than the scratch holds
    const size_t live = host.live.size();
    const uint64_t writes = mfra.writes;
    for (uint64_t n = 1;; n++) {
        ASSERT_LT(n, 1000U);
        host.allocations = 0;
        host.failAllocation = n;
        const MbxStatus status =
            MbxMovieWriteMfra(context, &session.scratch, &options, &movie, nullptr, 0, &size);
        host.failAllocation = 0;
        if (host.allocations < n) break;
        EXPECT_EQ(status, MBX_ERR_NO_MEMORY) << n;
        expectIntact(live);
    }
    for (uint64_t n = 1; n <= writes; n++) {
        MemoryFile failing;
        failing.failWrite = n;
        EXPECT_EQ(MbxMovieWriteMfra(context, &session.scratch, &options, &movie, &failing, 0, &size),
                  MBX_ERR_IO);
        expectIntact(live);
    }
}

TEST_F(FragmentFailureTest, AQuotaOneByteTooSmallIsNoMemoryAndLeavesAValidTree) {
    enter(900);  // more rows than the scratch holds
    const size_t live = host.live.size();
    host.peakBytes = 0;
    const uint64_t start = host.liveBytes;
    ASSERT_EQ(measureMoof(1), MBX_OK);
    const uint64_t needed = host.peakBytes - start;
    ASSERT_EQ(MbxSetQuota(context, 0, needed - 1, 0, 0), MBX_OK);
    EXPECT_EQ(measureMoof(1), MBX_ERR_NO_MEMORY);
    ASSERT_EQ(MbxSetQuota(context, 0, needed, 0, 0), MBX_OK);
    EXPECT_EQ(measureMoof(1), MBX_OK);
    EXPECT_EQ(context->class1_used, 0U);
    ASSERT_EQ(MbxSetQuota(context, 0, 0, 0, 0), MBX_OK);
    expectIntact(live);
}

TEST_F(FragmentTest, OperationsRefuseNullArguments) {
    EXPECT_EQ(MbxMovieSealFirstFragment(nullptr, &movie), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxMovieSealFirstFragment(context, nullptr), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxMovieSealFragment(nullptr, &movie), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxMovieSealFragment(context, nullptr), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxMovieReleaseFragment(nullptr, &movie, 1), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxMovieReleaseFragment(context, nullptr, 1), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxMovieSetFragmentBase(nullptr, &movie, 1, 0), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxMovieSetFragmentBase(context, nullptr, 1, 0), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxMovieShiftFragmentOffsets(context, nullptr, &movie, 1, 0, 0, 0), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxMovieShiftFragmentOffsets(context, &options, nullptr, 1, 0, 0, 0), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxMovieWriteMoof(nullptr, nullptr, &options, &movie, nullptr, 1, 0, &size),
              MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxMovieWriteMoof(context, nullptr, &options, &movie, nullptr, 1, 0, nullptr),
              MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxBuildMoof(context, nullptr, &options, nullptr, nullptr), MBX_ERR_INVALID_ARG);
}

}  // namespace
