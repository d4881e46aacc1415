#include "boxlib/fragment/fragment_index.h"

#include "boxlib/core/row_table.h"
#include "boxlib/support/registry.h"
#include "boxlib/support/sample_fixture.h"

namespace {

// Two tracks over two fragments, of which the first track has samples in the second fragment alone.
struct IndexSample {
    StaticList<MbxFragmentIndexEntry, 2> rows = {{{0x10, 1, 2, 1, 1}, {0x0102030405060708, 2, 2, 0x102, 3}}};
    MbxSampleSegment first[3] = {};
    MbxSampleSegment second[3] = {};
    MbxTrack tracks[2] = {};
    MbxMovie movie = {};

    IndexSample() {
        for (int i = 0; i < 2; i++) {
            MbxSampleSegment* segments = i == 0 ? first : second;
            segments[0].next = &segments[1];
            segments[1].next = &segments[2];
            tracks[i].segments = {&segments[0], &segments[2]};
            tracks[i].segmentCount = 3;
            tracks[i].header.trackId = static_cast<uint32_t>(i) + 7;
        }
        first[2].sizes.count = 5;
        second[1].releasedSamples = 5;
        second[2].sizes.count = 5;
        second[1].fragmentOffset = 0x1000;
        second[2].fragmentOffset = 0x2000;
        tracks[1].fragmentIndex = rows.list;
        tracks[0].next = &tracks[1];
        movie.tracks = {&tracks[0], &tracks[1]};
        movie.fragmentCount = 2;
    }
};
const IndexSample kSample;

const Bytes kTfraGolden =
    Hex("00000040 'tfra'"   // size, type
        "01 000000"         // version, flags
        "00000008"          // track_ID
        "00000004"          // length sizes: traf 0, trun 1, sample 0
        "00000002"          // number_of_entry
        "0000000000000010"  // time
        "0000000000001000"  // moof_offset
        "01 0001 01"        // traf_number, trun_number, sample_number
        "0102030405060708"  // time
        "0000000000002000"  // moof_offset
        "02 0102 03");      // traf_number, trun_number, sample_number

const BoxRegistration kTfra =
    RegisterBox<MbxTfraBox>({.name = "Tfra",
                             .code = "tfra",
                             .parents = "mfra",
                             .clause = "ISO/IEC 14496-12 8.8.10",
                             .presence = Presence::kMandatory,
                             .golden = kTfraGolden,
                             .build =
                                 [](MbxContext* context, const MbxOptions* options, MbxTfraBox* box) {
                                     const MbxTfraParams params = {&kSample.movie, &kSample.tracks[1]};
                                     return MbxBuildTfra(context, nullptr, options, &params, box);
                                 },
                             .write = MbxWithScratch(nullptr, MbxWriteTfraBox),
                             .free = MbxFreeTfra});

const BoxRegistration kMfro =
    RegisterBox<MbxMfroBox>({.name = "Mfro",
                             .code = "mfro",
                             .parents = "mfra",
                             .clause = "ISO/IEC 14496-12 8.8.11",
                             .presence = Presence::kMandatory,
                             .golden = Hex("00000010 'mfro'"  // size, type
                                           "00 000000"        // version, flags
                                           "01020304"),       // size of the enclosing box
                             .build =
                                 [](MbxContext* context, const MbxOptions* options, MbxMfroBox* box) {
                                     const MbxMfroParams params = {0x01020304};
                                     return MbxBuildMfro(context, options, &params, box);
                                 },
                             .write = MbxWriteMfroBox,
                             .free = MbxFreeMfro});

const BoxRegistration kMfra = RegisterBox<MbxMfraBox>(
    {.name = "Mfra",
     .code = "mfra",
     .parents = "file",
     .clause = "ISO/IEC 14496-12 8.8.9",
     .presence = Presence::kMandatory,
     .golden = Hex("00000058 'mfra'") + kTfraGolden + Hex("00000010 'mfro' 00000000 00000058"),
     .build = [](MbxContext* context, const MbxOptions* options,
                 MbxMfraBox* box) { return MbxBuildMfra(context, nullptr, options, &kSample.movie, box); },
     .write = MbxWithScratch(nullptr, MbxWriteMfraBox),
     .free = MbxFreeMfra});

class FragmentIndexTest : public SampleTest {
 protected:
    void SetUp() override {
        SampleTest::SetUp();
        options.time_version_mode = 2;  // version 0
    }

    void openFragment() {
        ASSERT_EQ(MbxAppendSegments(context, &movie), MBX_OK);
        movie.fragmentCount++;
    }

    void addRow(MbxTrack* track, const MbxFragmentIndexEntry& row) {
        track->fragmentIndex.capacity = MBX_BLOCK_CAPACITY;
        ASSERT_EQ(MbxBlockListAppend(context, &track->fragmentIndex, row, nullptr), MBX_OK);
    }

    MbxStatus write() {
        file.bytes.clear();
        return MbxMovieWriteMfra(context, &session.scratch, &options, &movie, &file, 0, &size);
    }

    // The only `tfra` of the movie.
    Bytes tfra() {
        EXPECT_EQ(write(), MBX_OK);
        EXPECT_EQ(size, file.bytes.size());
        return file.bytes.size() > 24 ? Bytes(file.bytes.begin() + 8, file.bytes.end() - 16) : Bytes();
    }

    uint64_t size = 0;
};

TEST_F(FragmentIndexTest, AMovieWithoutRowsHasAnMfraOfItsSizeAlone) {
    addTrack();
    ASSERT_EQ(write(), MBX_OK);
    EXPECT_BYTES(file.bytes, Hex("00000018 'mfra' 00000010 'mfro' 00000000 00000018"));
    ASSERT_EQ(MbxMovieWriteMfra(context, nullptr, &options, &movie, nullptr, 0, &size), MBX_OK);
    EXPECT_EQ(size, 24U);
}

TEST_F(FragmentIndexTest, RowsOfSamplesTellTimePositionAndNumbers) {
    addTrack();
    addTrack();
    addChunk(5, 0, sample(), 1);
    openFragment();
    ASSERT_EQ(add(sample(), 2), MBX_OK);
    ASSERT_EQ(add(sample(), 2, 1), MBX_OK);
    ASSERT_EQ(endChunk(2), MBX_OK);
    ASSERT_EQ(add(sample(), 2, 1), MBX_OK);
    ASSERT_EQ(endChunk(2), MBX_OK);
    tracks[1].segments.last->fragmentOffset = 0x300;
    EXPECT_BYTES(tfra(), Hex("0000002E 'tfra' 00000000 00000014 00000000 00000002"
                             "0000000A 00000300 01 01 02"  // the first track has none in this fragment
                             "00000014 00000300 01 02 01"));
}

TEST_F(FragmentIndexTest, TrafNumbersShiftDownWhereATrackBeforeHasNoSamples) {
    for (int i = 0; i < 3; i++) addTrack();
    openFragment();
    for (const uint32_t track : {1U, 2U, 3U}) {
        ASSERT_EQ(add(sample(), track, track == 3), MBX_OK);
        ASSERT_EQ(endChunk(track), MBX_OK);
    }
    openFragment();
    for (const uint32_t track : {1U, 3U}) {
        ASSERT_EQ(add(sample(), track, track == 3), MBX_OK);
        ASSERT_EQ(endChunk(track), MBX_OK);
    }
    openFragment();
    ASSERT_EQ(add(sample(), 3, 1), MBX_OK);
    ASSERT_EQ(endChunk(3), MBX_OK);
    const Bytes expected =
        Hex("00000039 'tfra' 00000000 0000001E 00000000 00000003"
            "00000000 00000000 03 01 01"
            "0000000A 00000000 02 01 01"
            "00000014 00000000 01 01 01");
    EXPECT_BYTES(tfra(), expected);
    // The numbers hold after the fragments were released.
    for (MbxTrack& track : tracks) {
        for (uint32_t fragment = 1; fragment <= 2; fragment++) {
            ASSERT_EQ(MbxReleaseSegment(context, MbxFindSegment(&track, fragment)), MBX_OK);
        }
    }
    EXPECT_BYTES(tfra(), expected);
}

TEST_F(FragmentIndexTest, NumberWidthsGrowAtTheirEdges) {
    struct Case {
        uint32_t value, length;
        std::string row;
    };
    for (const Case& c :
         {Case{0xFF, 0, "FF"}, Case{0x100, 1, "0100"}, Case{0xFFFF, 1, "FFFF"}, Case{0x10000, 2, "010000"},
          Case{0xFFFFFF, 2, "FFFFFF"}, Case{0x1000000, 3, "01000000"}}) {
        MbxTrack track = {};
        track.header.trackId = 5;
        movie.tracks = {&track, &track};
        movie.fragmentCount = 0;
        openFragment();
        addRow(&track, {1, 1, 1, c.value, 2});
        Bytes bytes = tfra();
        EXPECT_BYTES(Bytes(bytes.begin() + 12, bytes.end()), Hex("00000005") + Words({c.length << 2, 1}) +
                                                                 Hex("00000001 00000000 01" + c.row + "02"));
        MbxBlockListRelease(context, &track.fragmentIndex);
        addRow(&track, {1, 1, 1, 3, c.value});
        bytes = tfra();
        EXPECT_BYTES(Bytes(bytes.begin() + 12, bytes.end()),
                     Hex("00000005") + Words({c.length, 1}) + Hex("00000001 00000000 01 03" + c.row));
        ASSERT_EQ(MbxFreeSegments(context, &track), MBX_OK);
    }
    movie.tracks = {};
}

TEST_F(FragmentIndexTest, ThreeHundredRunsMakeATwoByteRunNumber) {
    addTrack();
    openFragment();
    for (int i = 0; i < 300; i++) {
        ASSERT_EQ(add(sample(), 1, 1), MBX_OK);
        ASSERT_EQ(endChunk(), MBX_OK);
    }
    const Bytes bytes = tfra();
    EXPECT_EQ(bytes.size(), 24U + 300 * 12);
    EXPECT_BYTES(Bytes(bytes.begin(), bytes.begin() + 24),
                 Hex("00000E28 'tfra' 00000000 0000000A 00000004 0000012C"));
    EXPECT_BYTES(Bytes(bytes.end() - 4, bytes.end()), Hex("01 012C 01"));
}

TEST_F(FragmentIndexTest, ASampleNumberOf256MakesATwoByteSampleNumber) {
    addTrack();
    openFragment();
    for (uint32_t i = 1; i <= 256; i++) ASSERT_EQ(add(sample(1, 1), 1, i >= 255), MBX_OK);
    ASSERT_EQ(endChunk(), MBX_OK);
    EXPECT_BYTES(tfra(), Hex("00000030 'tfra' 00000000 0000000A 00000001 00000002"
                             "000000FE 00000000 01 01 00FF"
                             "000000FF 00000000 01 01 0100"));
}

TEST_F(FragmentIndexTest, TrafNumbersAbove255TakeTwoBytes) {
    for (int i = 0; i < 256; i++) addTrack();
    openFragment();
    for (uint32_t i = 1; i <= 256; i++) {
        ASSERT_EQ(add(sample(), i, i == 256), MBX_OK);
        ASSERT_EQ(endChunk(i), MBX_OK);
    }
    EXPECT_BYTES(tfra(), Hex("00000024 'tfra' 00000000 00000A00 00000010 00000001"
                             "00000000 00000000 0100 01 01"));
}

TEST_F(FragmentIndexTest, TfraVersionInEachModeAtTheEdge) {
    constexpr uint64_t kFits = 0xFFFFFFFF;
    constexpr uint64_t kWide = 0x100000000;
    struct Case {
        uint32_t mode;
        uint64_t time, offset;
        MbxStatus status;
        uint32_t version;
    };
    MbxTrack* track = addTrack();
    openFragment();
    for (const Case& c : {Case{0, 0, 0, MBX_OK, 1}, Case{0, kFits, kFits, MBX_OK, 1},
                          Case{0, kWide, kWide, MBX_OK, 1}, Case{1, kFits, kFits, MBX_OK, 0},
                          Case{1, kWide, kFits, MBX_OK, 1}, Case{1, kFits, kWide, MBX_OK, 1},
                          Case{2, kFits, kFits, MBX_OK, 0}, Case{2, kWide, 0, MBX_ERR_BAD_STATE, 0},
                          Case{2, 0, kWide, MBX_ERR_BAD_STATE, 0}, Case{3, 0, 0, MBX_OK, 1}}) {
        SCOPED_TRACE(c.mode);
        options.time_version_mode = c.mode;
        MbxBlockListRelease(context, &track->fragmentIndex);
        addRow(track, {c.time, 1, 1, 1, 1});
        track->segments.last->fragmentOffset = c.offset;
        EXPECT_EQ(write(), c.status);
        if (c.status != MBX_OK) continue;
        const auto time = static_cast<uint32_t>(c.time);
        const auto offset = static_cast<uint32_t>(c.offset);
        const Bytes fields = c.version == 1 ? Words({static_cast<uint32_t>(c.time >> 32), time,
                                                     static_cast<uint32_t>(c.offset >> 32), offset})
                                            : Words({time, offset});
        EXPECT_BYTES(Bytes(file.bytes.begin() + 8, file.bytes.end() - 16),
                     Words({c.version == 1 ? 43U : 35U}) + Hex("'tfra'") + Words({c.version << 24}) +
                         Hex("0000000A 00000000 00000001") + fields + Hex("010101"));
    }
}

TEST_F(FragmentIndexTest, TfraVersionLooksAtThePositionOfTheLastFragmentAlone) {
    options.time_version_mode = 1;
    MbxTrack* track = addTrack();
    openFragment();
    openFragment();
    addRow(track, {1, 1, 1, 1, 1});
    addRow(track, {2, 2, 1, 1, 1});
    MbxFindSegment(track, 1)->fragmentOffset = 0x100000005;  // cut without a word
    MbxFindSegment(track, 2)->fragmentOffset = 6;
    EXPECT_BYTES(tfra(), Hex("0000002E 'tfra' 00000000 0000000A 00000000 00000002"
                             "00000001 00000005 01 01 01"
                             "00000002 00000006 01 01 01"));
    MbxFindSegment(track, 2)->fragmentOffset = 0x100000006;
    EXPECT_BYTES(tfra(), Hex("0000003E 'tfra' 01000000 0000000A 00000000 00000002"
                             "0000000000000001 0000000100000005 01 01 01"
                             "0000000000000002 0000000100000006 01 01 01"));
}

TEST_F(FragmentIndexTest, MehdMode0AndTimeVersionMode0StillMakeTfraVersion1) {
    options = {};
    MbxTrack* track = addTrack();
    openFragment();
    addRow(track, {1, 1, 1, 1, 1});
    EXPECT_EQ(tfra()[8], 1U);
}

TEST_F(FragmentIndexTest, ARowOfAFragmentThatTheTrackLacksIsNotFound) {
    MbxTrack* track = addTrack();
    openFragment();
    addRow(track, {1, 2, 1, 1, 1});
    EXPECT_EQ(write(), MBX_ERR_NOT_FOUND);
}

TEST_F(FragmentIndexTest, RowsUseTheScratchUpTo8192BytesAndABlockBeyond) {
    MbxTrack* track = addTrack();
    openFragment();
    // Rows of 16 bytes: four of the run number and three of the sample number.
    const auto allocationsOf = [&](uint32_t rows) {
        uint32_t present = 0;
        EXPECT_EQ(MbxBlockListCount(&track->fragmentIndex, &present), MBX_OK);
        for (; present < rows; present++) addRow(track, {present, 1, 1, 0x1000000, 0x10000});
        const uint64_t before = host.allocations;
        EXPECT_EQ(write(), MBX_OK);
        EXPECT_EQ(size, 8U + 24 + rows * 16 + 16);
        return host.allocations - before;
    };
    const uint64_t inScratch = allocationsOf(511);
    EXPECT_EQ(allocationsOf(512), inScratch);      // 8192 bytes
    EXPECT_EQ(allocationsOf(513), inScratch + 3);  // measured in `tfra` and in `mfra`, and written
}

TEST_F(FragmentIndexTest, AnMfraAbove32BitsIsBadState) {
    MbxMfroBox box = {};
    EXPECT_EQ(MbxSetMfroParentSize(&box, 0xFFFFFFFF), MBX_OK);
    EXPECT_EQ(box.params.parentSize, 0xFFFFFFFFU);
    EXPECT_EQ(MbxSetMfroParentSize(&box, 0x100000000), MBX_ERR_BAD_STATE);
    EXPECT_EQ(box.params.parentSize, 0xFFFFFFFFU);
    EXPECT_EQ(MbxSetMfroParentSize(nullptr, 1), MBX_ERR_INVALID_ARG);
}

TEST_F(FragmentIndexTest, MfraRefusesNullArguments) {
    EXPECT_EQ(MbxMovieWriteMfra(nullptr, nullptr, &options, &movie, nullptr, 0, &size), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxMovieWriteMfra(context, nullptr, nullptr, &movie, nullptr, 0, &size), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxMovieWriteMfra(context, nullptr, &options, nullptr, nullptr, 0, &size), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxMovieWriteMfra(context, nullptr, &options, &movie, nullptr, 0, nullptr),
              MBX_ERR_INVALID_ARG);
    MbxTfraBox box = {};
    EXPECT_EQ(MbxBuildTfra(context, nullptr, &options, nullptr, &box), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxBuildMfro(context, &options, nullptr, nullptr), MBX_ERR_INVALID_ARG);
}

}  // namespace
