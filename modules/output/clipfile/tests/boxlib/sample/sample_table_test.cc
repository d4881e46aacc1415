#include "boxlib/sample/sample_table.h"

#include "boxlib/model/session_model.h"
#include "boxlib/sample/sample_segment.h"
#include "boxlib/support/registry.h"
#include "boxlib/support/track_fixture.h"

namespace {

// A block of a store that stands in the test.
template <typename Entry>
MbxBlock* blockOf(std::vector<Entry>* entries) {
    static std::deque<MbxBlock> blocks;
    blocks.push_back({static_cast<uint32_t>(entries->size()), entries->data(), nullptr});
    return &blocks.back();
}

// Three samples of sizes 5, 5, 7 in two chunks, with every table that a normal file can have.
const MbxTrack* track() {
    static const MbxTrack instance = [] {
        static std::vector<MbxRun> durations = {{3, 1000}};
        static std::vector<MbxRun> offsets = {{1, 0}, {2, 500}};
        static std::vector<MbxChunkRun> chunks = {{1, 2, 1}, {2, 1, 1}};
        static std::vector<uint32_t> sizes = {5, 5, 7};
        static std::vector<uint64_t> chunkOffsets = {0x30, 0x40};
        static std::vector<uint32_t> syncs = {1, 3};
        static std::vector<uint8_t> dependencies = {0x24};
        static MbxSampleSegment segment = {};
        segment.durations.list.first = blockOf(&durations);
        segment.durations.last = &durations.back();
        segment.compositionOffsets.runs.list.first = blockOf(&offsets);
        segment.compositionOffsets.runs.last = &offsets.back();
        segment.chunks.list.first = blockOf(&chunks);
        segment.chunks.last = &chunks.back();
        segment.sizes.count = 3;
        segment.sizes.list.first = blockOf(&sizes);
        segment.chunkOffsets.list.first = blockOf(&chunkOffsets);
        segment.syncSamples.syncCount = 2;
        segment.syncSamples.list.first = blockOf(&syncs);
        segment.dependencies.store[0] = 0x10;
        segment.dependencies.store[1] = 0x18;
        segment.dependencies.first = &segment.dependencies.store[0];
        segment.dependencies.second = &segment.dependencies.store[1];
        segment.dependencies.runCount = 1;
        segment.dependencies.list.first = blockOf(&dependencies);
        MbxTrack made = {};
        made.segments = {&segment, &segment};
        return made;
    }();
    return &instance;
}

const Bytes kStbl =
    Hex("000000D7 'stbl'"
        "00000010 'stsd' 00000000 00000000"
        "00000018 'stts' 00000000 00000001"
        "00000003 000003E8"  // three samples of 1000 ticks
        "00000020 'ctts' 00000000 00000002"
        "00000001 00000000"  // the first without an offset
        "00000002 000001F4"  // the others with 500 ticks
        "00000028 'stsc' 00000000 00000002"
        "00000001 00000002 00000001"  // from chunk 1 on two samples of entry 1
        "00000002 00000001 00000001"  // from chunk 2 on one sample of entry 1
        "00000020 'stsz' 00000000 00000000 00000003"
        "00000005 00000005 00000007"  // the sizes
        "00000018 'stco' 00000000 00000002"
        "00000030 00000040"  // the offsets
        "00000018 'stss' 00000000 00000002"
        "00000001 00000003"  // the sync samples
        "0000000F 'sdtp' 00000000"
        "10 18 24");  // the dependencies

const BoxRegistration kStblRow = RegisterBox<MbxStblBox>(
    {.name = "Stbl",
     .code = "stbl",
     .parents = "minf",
     .clause = "ISO/IEC 14496-12 8.5.1",
     .presence = Presence::kMandatory,
     .golden = kStbl,
     .build = [](MbxContext* context, const MbxOptions* options,
                 MbxStblBox* box) { return MbxBuildStbl(context, options, track(), box); },
     .write = MbxWriteStblBox,
     .free = MbxFreeStbl});

// A session with one bare video track, whose `stbl` the tests look at.
class SampleTableTest : public SessionTest {
 protected:
    void SetUp() override {
        SessionTest::SetUp();
        CreateSession();
        ASSERT_EQ(MbxCreateMovie(session, 1000), MBX_OK);
        const MbxTrackParams params = TrackParams(1, 24000);
        const MbxVisualEntryParams entry = {1, 1, 16, 16, 72, 0, 72, 0};
        uint32_t number = 0;
        ASSERT_EQ(MbxAddVideoTrack(session, &params, &number), MBX_OK);
        ASSERT_EQ(MbxAddDataReference(session, 1, nullptr, 0, &number), MBX_OK);
        ASSERT_EQ(MbxAddVideoEntry(session, 1, &entry, &number), MBX_OK);
    }

    void add(uint32_t size, uint32_t isSync, uint8_t dependency = 0, int32_t compositionOffset = 0) {
        MbxSampleInfo sample = {};
        sample.size = size;
        sample.offset = offset;
        sample.duration = 1000;
        sample.isSync = isSync;
        sample.dependency = dependency;
        sample.compositionOffset = compositionOffset;
        sample.descriptionIndex = 1;
        ASSERT_EQ(MbxAddSample(session, 1, &sample, 0), MBX_OK);
        offset += size;
    }

    // `stbl` without its header and `stsd`.
    Bytes tables() {
        MbxStblBox* box = nullptr;
        EXPECT_EQ(MbxNew(context, &box), MBX_OK);
        EXPECT_EQ(MbxBuildStbl(context, &session->config, session->movie->tracks.first, box), MBX_OK);
        MemoryFile target;
        EXPECT_EQ(MbxWriteStblBox(context, &session->config, &target, 0, box, nullptr, nullptr), MBX_OK);
        const auto skipped = static_cast<std::ptrdiff_t>(8 + box->stsd->size);
        EXPECT_EQ(MbxFreeStbl(context, box), MBX_OK);
        return {target.bytes.begin() + skipped, target.bytes.end()};
    }

    uint64_t offset = 0x30;
};

TEST_F(SampleTableTest, OneSyncSampleNeedsNeitherCttsNorStssNorSdtp) {
    add(5, 1);
    ASSERT_EQ(MbxEndChunk(session, 1), MBX_OK);
    EXPECT_BYTES(tables(), Hex("00000018 'stts' 00000000 00000001 00000001 000003E8"
                               "0000001C 'stsc' 00000000 00000001 00000001 00000001 00000001"
                               "00000014 'stsz' 00000000 00000005 00000001"
                               "00000014 'stco' 00000000 00000001 00000030"));
}

TEST_F(SampleTableTest, WithoutASampleAllTablesAreEmpty) {
    EXPECT_BYTES(tables(), Hex("00000010 'stts' 00000000 00000000"
                               "00000010 'stsc' 00000000 00000000"
                               "00000014 'stsz' 00000000 00000000 00000000"
                               "00000010 'stco' 00000000 00000000"));
}

TEST_F(SampleTableTest, TrackWithoutASyncSampleHasAnStssWithoutEntries) {
    add(5, 0);
    add(5, 0);
    ASSERT_EQ(MbxEndChunk(session, 1), MBX_OK);
    EXPECT_BYTES(tables(), Hex("00000018 'stts' 00000000 00000001 00000002 000003E8"
                               "0000001C 'stsc' 00000000 00000001 00000001 00000002 00000001"
                               "00000014 'stsz' 00000000 00000005 00000002"
                               "00000014 'stco' 00000000 00000001 00000030"
                               "00000010 'stss' 00000000 00000000"));
}

TEST_F(SampleTableTest, SyncFlagsChooseTheSamplesOfStss) {
    const struct {
        std::vector<uint32_t> flags;
        const char* stss;  // null for none
    } kCases[] = {
        {{1, 1, 0, 1}, "0000001C 'stss' 00000000 00000003 00000001 00000002 00000004"},
        {{0, 1}, "00000014 'stss' 00000000 00000001 00000002"},
        {{1, 1, 1}, nullptr},
        {{0, 0}, "00000010 'stss' 00000000 00000000"},
    };
    for (const auto& c : kCases) {
        SCOPED_TRACE(testing::PrintToString(c.flags));
        ASSERT_EQ(MbxFreeSegments(context, session->movie->tracks.first), MBX_OK);
        for (const uint32_t flag : c.flags) add(5, flag);
        ASSERT_EQ(MbxEndChunk(session, 1), MBX_OK);
        const Bytes all = tables();
        const Bytes expected = c.stss != nullptr ? Hex(c.stss) : Bytes();
        const Bytes code = Hex("'stss'");
        const auto found = std::search(all.begin(), all.end(), code.begin(), code.end());
        EXPECT_BYTES(Bytes(found != all.end() ? found - 4 : found, all.end()), expected);
    }
}

TEST_F(SampleTableTest, OneRunOfAnOffsetOtherThanZeroNeedsCtts) {
    add(5, 1, 0, 500);
    ASSERT_EQ(MbxEndChunk(session, 1), MBX_OK);
    EXPECT_BYTES(tables(), Hex("00000018 'stts' 00000000 00000001 00000001 000003E8"
                               "00000018 'ctts' 00000000 00000001 00000001 000001F4"
                               "0000001C 'stsc' 00000000 00000001 00000001 00000001 00000001"
                               "00000014 'stsz' 00000000 00000005 00000001"
                               "00000014 'stco' 00000000 00000001 00000030"));
}

TEST_F(SampleTableTest, ValuesOfDependencyDecideWhetherSdtpIsWritten) {
    const struct {
        std::vector<uint8_t> values;
        const char* sdtp;  // null for none
    } kCases[] = {
        {{0, 0, 0}, nullptr},
        {{0x10}, "0000000D 'sdtp' 00000000 10"},
        {{0, 0x10}, "0000000E 'sdtp' 00000000 0010"},
        {{0, 0, 0x10}, "0000000F 'sdtp' 00000000 000010"},
        {{0x10, 0, 0, 0}, "00000010 'sdtp' 00000000 10000000"},
    };
    for (const auto& c : kCases) {
        SCOPED_TRACE(testing::PrintToString(c.values));
        ASSERT_EQ(MbxFreeSegments(context, session->movie->tracks.first), MBX_OK);
        for (const uint8_t value : c.values) add(5, 1, value);
        ASSERT_EQ(MbxEndChunk(session, 1), MBX_OK);
        const Bytes all = tables();
        const Bytes code = Hex("'sdtp'");
        const auto found = std::search(all.begin(), all.end(), code.begin(), code.end());
        EXPECT_BYTES(Bytes(found != all.end() ? found - 4 : found, all.end()),
                     c.sdtp != nullptr ? Hex(c.sdtp) : Bytes());
    }
}

TEST_F(SampleTableTest, WideOffsetInMode1MakesCo64ForThatTrackOnly) {
    session->config.chunk_offset_mode = 1;
    const MbxTrackParams params = TrackParams(2, 24000);
    uint32_t number = 0;
    ASSERT_EQ(MbxAddMetaTrack(session, &params, &number), MBX_OK);
    offset = 1ULL << 32;
    add(5, 1);
    ASSERT_EQ(MbxEndChunk(session, 1), MBX_OK);
    uint64_t size = 0;
    ASSERT_EQ(MbxWriteMoov(session, &file, 0, &size), MBX_OK);
    const Bytes co64 = Hex("00000018 'co64' 00000000 00000001 0000000100000000");
    const Bytes stco = Hex("00000010 'stco' 00000000 00000000");
    const auto wide = std::search(file.bytes.begin(), file.bytes.end(), co64.begin(), co64.end());
    EXPECT_NE(wide, file.bytes.end());
    EXPECT_NE(std::search(wide, file.bytes.end(), stco.begin(), stco.end()), file.bytes.end());
}

TEST_F(SampleTableTest, OffsetOf2To32IsRefusedInMode0AndOneBelowStaysInStco) {
    offset = 0xFFFFFFFF;
    add(5, 1);
    ASSERT_EQ(MbxEndChunk(session, 1), MBX_OK);
    const Bytes all = tables();
    EXPECT_BYTES(Bytes(all.end() - 20, all.end()), Hex("00000014 'stco' 00000000 00000001 FFFFFFFF"));
    ASSERT_EQ(MbxShiftChunkOffsets(session, 1, 1, 1), MBX_OK);
    uint64_t size = 0;
    EXPECT_EQ(MbxWriteMoov(session, nullptr, 0, &size), MBX_ERR_BAD_STATE);
}

TEST_F(SampleTableTest, AuxiliaryTablesAndGroupsStandBehindTheTables) {
    MbxTrack* made = session->movie->tracks.first;
    made->auxEnabled = 1;
    const uint8_t bytes[] = {1, 2};
    MbxSampleInfo sample = {};
    sample.size = 5;
    sample.duration = 1000;
    sample.isSync = 1;
    sample.descriptionIndex = 1;
    sample.auxOffset = 0x99;
    sample.auxSize = 2;
    sample.auxData = bytes;
    ASSERT_EQ(MbxAddSample(session, 1, &sample, 0), MBX_OK);
    ASSERT_EQ(MbxEndChunk(session, 1), MBX_OK);
    MbxSampleSegment* segment = made->segments.first;
    MbxSampleGroupParams* group = nullptr;
    ASSERT_EQ(MbxNew(context, &group), MBX_OK);
    group->groupingType = MbxCode("tele");
    group->rows.capacity = 1;
    ASSERT_EQ(MbxBlockListAppend(context, &group->rows, MbxSampleGroupRow{1, 1}, nullptr), MBX_OK);
    MbxListAppend(&segment->sampleGroups, group);
    MbxGroupDescriptionParams* descriptions = nullptr;
    ASSERT_EQ(MbxNew(context, &descriptions), MBX_OK);
    descriptions->groupingType = MbxCode("roll");
    MbxListAppend(&segment->groupDescriptions, descriptions);
    EXPECT_BYTES(tables(), Hex("00000018 'stts' 00000000 00000001 00000001 000003E8"
                               "0000001C 'stsc' 00000000 00000001 00000001 00000001 00000001"
                               "00000014 'stsz' 00000000 00000005 00000001"
                               "00000014 'stco' 00000000 00000001 00000000"
                               "00000014 'saio' 00000000 00000001 00000099"
                               "00000011 'saiz' 00000000 02 00000001"
                               "0000001C 'sbgp' 00000000 'tele' 00000001 00000001 00000001"
                               "00000018 'sgpd' 01000000 'roll' 00000000 00000000"));
    made->auxEnabled = 0;
    const Bytes code = Hex("'saio'");
    const Bytes without = tables();
    EXPECT_EQ(std::search(without.begin(), without.end(), code.begin(), code.end()), without.end());
}

TEST_F(SampleTableTest, Mode2MakesCo64EvenForSmallOffsets) {
    session->config.chunk_offset_mode = 2;
    add(5, 1);
    ASSERT_EQ(MbxEndChunk(session, 1), MBX_OK);
    const Bytes all = tables();
    EXPECT_BYTES(Bytes(all.end() - 24, all.end()), Hex("00000018 'co64' 00000000 00000001 0000000000000030"));
}

TEST_F(SampleTableTest, FragmentsAreNotReported) {
    add(5, 1);
    ASSERT_EQ(MbxEndChunk(session, 1), MBX_OK);
    const Bytes before = tables();
    ASSERT_EQ(MbxAppendSegments(context, session->movie), MBX_OK);
    add(9, 0);
    ASSERT_EQ(MbxEndChunk(session, 1), MBX_OK);
    EXPECT_BYTES(tables(), before);
}

}  // namespace
