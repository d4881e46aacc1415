#include "boxlib/sample/sample_layout.h"

#include "boxlib/support/registry.h"
#include "boxlib/support/sample_fixture.h"

namespace {

StaticList<MbxChunkRun, 2> chunkTable = {{{1, 8, 1}, {3, 0x0A0B0C0D, 2}}};
StaticList<uint32_t, 3> sizeTable = {{0x01020304, 0, 9}};
StaticList<uint64_t, 2> offsetTable = {{0x24, 0xFFFFFFFF}};
StaticList<uint64_t, 2> wideTable = {{0x24, 0x0102030405060708}};

const MbxChunkState kChunks = {0, 0, 0, 3, chunkTable.list, nullptr};
const MbxSizeList kSizes = {0, 3, sizeTable.list};
const MbxChunkOffsetList kOffsets = {0, offsetTable.list};
const MbxChunkOffsetList kWideOffsets = {0, wideTable.list};

const BoxRegistration kStsc = RegisterBox<MbxStscBox>(
    {.name = "Stsc",
     .code = "stsc",
     .parents = "stbl",
     .clause = "ISO/IEC 14496-12 8.7.4",
     .presence = Presence::kMandatory,
     .golden = Hex("00000028 'stsc'"               // size, type
                   "00 000000"                     // version, flags
                   "00000002"                      // entry_count
                   "00000001 00000008 00000001"    // first_chunk, samples_per_chunk, sample_description_index
                   "00000003 0A0B0C0D 00000002"),  // first_chunk, samples_per_chunk, sample_description_index
     .build = [](MbxContext* context, const MbxOptions* options,
                 MbxStscBox* box) { return MbxBuildStsc(context, options, &kChunks, box); },
     .write = MbxWriteStscBox,
     .free = MbxFreeStsc});

const BoxRegistration kStsz = RegisterBox<MbxStszBox>(
    {.name = "Stsz",
     .code = "stsz",
     .parents = "stbl",
     .clause = "ISO/IEC 14496-12 8.7.3.2",
     .presence = Presence::kMandatory,
     .golden = Hex("00000020 'stsz'"               // size, type
                   "00 000000"                     // version, flags
                   "00000000"                      // sample_size
                   "00000003"                      // sample_count
                   "01020304 00000000 00000009"),  // entry_size
     .build = [](MbxContext* context, const MbxOptions* options,
                 MbxStszBox* box) { return MbxBuildStsz(context, options, &kSizes, box); },
     .write = MbxWriteStszBox,
     .free = MbxFreeStsz});

const BoxRegistration kStco = RegisterBox<MbxStcoBox>(
    {.name = "Stco",
     .code = "stco",
     .parents = "stbl",
     .clause = "ISO/IEC 14496-12 8.7.5",
     .presence = Presence::kOptional,
     .golden = Hex("00000018 'stco'"      // size, type
                   "00 000000"            // version, flags
                   "00000002"             // entry_count
                   "00000024 FFFFFFFF"),  // chunk_offset
     .build = [](MbxContext* context, const MbxOptions* options,
                 MbxStcoBox* box) { return MbxBuildStco(context, options, &kOffsets, box); },
     .write = MbxWriteStcoBox,
     .free = MbxFreeStco});

const BoxRegistration kCo64 = RegisterBox<MbxCo64Box>(
    {.name = "Co64",
     .code = "co64",
     .parents = "stbl",
     .clause = "ISO/IEC 14496-12 8.7.5",
     .presence = Presence::kOptional,
     .golden = Hex("00000020 'co64'"                      // size, type
                   "00 000000"                            // version, flags
                   "00000002"                             // entry_count
                   "0000000000000024 0102030405060708"),  // chunk_offset
     .build = [](MbxContext* context, const MbxOptions* options,
                 MbxCo64Box* box) { return MbxBuildCo64(context, options, &kWideOffsets, box); },
     .write = MbxWriteCo64Box,
     .free = MbxFreeCo64});

class SampleLayoutTest : public SampleTest {
 protected:
    void SetUp() override {
        SampleTest::SetUp();
        track = addTrack();
    }

    const MbxSampleSegment& segment() const { return *track->segments.first; }

    Bytes stsz() {
        MbxStszBox box = {};
        EXPECT_EQ(MbxBuildStsz(context, &options, &segment().sizes, &box), MBX_OK);
        MemoryFile target;
        EXPECT_EQ(MbxWriteStszBox(context, &options, &target, 0, &box, nullptr, nullptr), MBX_OK);
        return target.bytes;
    }

    MbxTrack* track = nullptr;
};

TEST_F(SampleLayoutTest, StszOfOneSizeHoldsItAndTheCountAlone) {
    addChunk(1, 0, sample(77));
    EXPECT_BYTES(stsz(), Hex("00000014 'stsz' 00000000 0000004D 00000001"));
}

TEST_F(SampleLayoutTest, StszOf557ListsThemUnderASampleSizeOfZero) {
    for (const uint32_t size : {5, 5, 7}) ASSERT_EQ(add(sample(size)), MBX_OK);
    EXPECT_BYTES(stsz(), Hex("00000020 'stsz' 00000000 00000000 00000003 00000005 00000005 00000007"));
}

TEST_F(SampleLayoutTest, StszOfEmptySamplesListsZeros) {
    for (int i = 0; i < 2; i++) ASSERT_EQ(add(sample(0)), MBX_OK);
    EXPECT_BYTES(stsz(), Hex("0000001C 'stsz' 00000000 00000000 00000002 00000000 00000000"));
}

TEST_F(SampleLayoutTest, StszWithoutSamplesIsEmpty) {
    ASSERT_EQ(MbxRequireSegment(context, track), MBX_OK);
    EXPECT_BYTES(stsz(), Hex("00000014 'stsz' 00000000 00000000 00000000"));
}

TEST_F(SampleLayoutTest, OffsetWidthFollowsTheModeAndTheLargestOffset) {
    constexpr uint64_t kFits = 0xFFFFFFFF;
    constexpr uint64_t kWide = 0x100000000;
    struct Case {
        uint32_t mode;
        uint64_t offset;
        MbxStatus status;
        uint32_t width;
    };
    for (const Case& c : {Case{0, kFits, MBX_OK, 4}, Case{0, kWide, MBX_ERR_BAD_STATE, 99},
                          Case{1, kFits, MBX_OK, 4}, Case{1, kWide, MBX_OK, 8}, Case{2, 0, MBX_OK, 8},
                          Case{2, kFits, MBX_OK, 8}, Case{2, kWide, MBX_OK, 8}}) {
        options.chunk_offset_mode = c.mode;
        StaticList<uint64_t, 3> table = {{5, c.offset, 6}};
        const MbxChunkOffsetList list = {0, table.list};
        uint32_t width = 99;
        EXPECT_EQ(MbxChooseOffsetWidth(&options, &list, &width), c.status) << c.mode << " " << c.offset;
        EXPECT_EQ(width, c.width) << c.mode << " " << c.offset;
    }
    const MbxChunkOffsetList none = {};
    uint32_t width = 99;
    options.chunk_offset_mode = 0;
    EXPECT_EQ(MbxChooseOffsetWidth(&options, &none, &width), MBX_OK);
    EXPECT_EQ(width, 4U);
    options.chunk_offset_mode = 2;
    EXPECT_EQ(MbxChooseOffsetWidth(&options, &none, &width), MBX_OK);
    EXPECT_EQ(width, 8U);
    EXPECT_EQ(MbxChooseOffsetWidth(nullptr, &none, &width), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxChooseOffsetWidth(&options, nullptr, &width), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxChooseOffsetWidth(&options, &none, nullptr), MBX_ERR_INVALID_ARG);
}

TEST_F(SampleLayoutTest, OffsetsInLaterBlocksCountToo) {
    options.chunk_offset_mode = 1;
    for (uint64_t i = 0; i < 1000; i++) addChunk(1, i);
    uint32_t width = 0;
    ASSERT_EQ(MbxChooseOffsetWidth(&options, &segment().chunkOffsets, &width), MBX_OK);
    EXPECT_EQ(width, 4U);
    addChunk(1, 1ULL << 40);
    ASSERT_EQ(MbxChooseOffsetWidth(&options, &segment().chunkOffsets, &width), MBX_OK);
    EXPECT_EQ(width, 8U);
}

TEST_F(SampleLayoutTest, StscOfThreeChunksHoldsTwoRuns) {
    addChunk(2, 0);
    addChunk(2, 0);
    addChunk(3, 0);
    MbxStscBox box = {};
    ASSERT_EQ(MbxBuildStsc(context, &options, &segment().chunks, &box), MBX_OK);
    ASSERT_EQ(MbxWriteStscBox(context, &options, &file, 0, &box, nullptr, nullptr), MBX_OK);
    EXPECT_BYTES(file.bytes, Hex("00000028 'stsc' 00000000 00000002"
                                 "00000001 00000002 00000001"
                                 "00000003 00000003 00000001"));
}

}  // namespace
