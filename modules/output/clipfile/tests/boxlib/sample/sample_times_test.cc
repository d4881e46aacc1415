#include "boxlib/sample/sample_times.h"

#include "boxlib/support/registry.h"
#include "boxlib/support/sample_fixture.h"

namespace {

StaticList<MbxRun, 2> durationTable = {{{3, 0x10}, {2, 0x01020304}}};
StaticList<MbxRun, 2> offsetTable = {{{1, 0}, {4, 0xFFFFFFF0}}};
StaticList<uint32_t, 3> syncTable = {{1, 7, 0x01000000}};

const MbxRunList kDurations = {durationTable.list, nullptr};
const MbxCompositionList kOffsets = {0, {offsetTable.list, nullptr}};
const MbxSyncList kSyncs = {3, syncTable.list};
uint8_t dependencyStore[] = {0x20, 0x14};
const MbxDependencyList kDependencies = {&dependencyStore[0], &dependencyStore[1], {0, 0}, 2, {}};

const BoxRegistration kStts = RegisterBox<MbxSttsBox>(
    {.name = "Stts",
     .code = "stts",
     .parents = "stbl",
     .clause = "ISO/IEC 14496-12 8.6.1.2",
     .presence = Presence::kMandatory,
     .golden = Hex("00000020 'stts'"      // size, type
                   "00 000000"            // version, flags
                   "00000002"             // entry_count
                   "00000003 00000010"    // sample_count, sample_delta
                   "00000002 01020304"),  // sample_count, sample_delta
     .build = [](MbxContext* context, const MbxOptions* options,
                 MbxSttsBox* box) { return MbxBuildStts(context, options, &kDurations, box); },
     .write = MbxWriteSttsBox,
     .free = MbxFreeStts});

const BoxRegistration kCtts = RegisterBox<MbxCttsBox>(
    {.name = "Ctts",
     .code = "ctts",
     .parents = "stbl",
     .clause = "ISO/IEC 14496-12 8.6.1.3",
     .presence = Presence::kOptional,
     .golden = Hex("00000020 'ctts'"      // size, type
                   "00 000000"            // version, flags
                   "00000002"             // entry_count
                   "00000001 00000000"    // sample_count, sample_offset
                   "00000004 FFFFFFF0"),  // sample_count, sample_offset
     .build = [](MbxContext* context, const MbxOptions* options,
                 MbxCttsBox* box) { return MbxBuildCtts(context, options, &kOffsets, box); },
     .write = MbxWriteCttsBox,
     .free = MbxFreeCtts});

const BoxRegistration kStss = RegisterBox<MbxStssBox>(
    {.name = "Stss",
     .code = "stss",
     .parents = "stbl",
     .clause = "ISO/IEC 14496-12 8.6.2",
     .presence = Presence::kOptional,
     .golden = Hex("0000001C 'stss'"               // size, type
                   "00 000000"                     // version, flags
                   "00000003"                      // entry_count
                   "00000001 00000007 01000000"),  // sample_number
     .build = [](MbxContext* context, const MbxOptions* options,
                 MbxStssBox* box) { return MbxBuildStss(context, options, &kSyncs, box); },
     .write = MbxWriteStssBox,
     .free = MbxFreeStss});

const BoxRegistration kSdtp = RegisterBox<MbxSdtpBox>(
    {.name = "Sdtp",
     .code = "sdtp",
     .parents = "stbl",
     .clause = "ISO/IEC 14496-12 8.6.4",
     .presence = Presence::kOptional,
     .golden = Hex("0000000F 'sdtp'"  // size, type
                   "00 000000"        // version, flags
                   "20 14 14"),       // leading, depends on, depended on, redundancy: one byte per sample
     .build = [](MbxContext* context, const MbxOptions* options,
                 MbxSdtpBox* box) { return MbxBuildSdtp(context, options, &kDependencies, box); },
     .write = MbxWriteSdtpBox,
     .free = MbxFreeSdtp});

class SampleTimesTest : public SampleTest {
 protected:
    void SetUp() override {
        SampleTest::SetUp();
        track = addTrack();
    }

    const MbxSampleSegment& segment() const { return *track->segments.first; }

    MbxTrack* track = nullptr;
};

TEST_F(SampleTimesTest, SttsOf1001DifferentDurationsIsWrittenBlockByBlock) {
    for (uint32_t i = 0; i < 1001; i++) ASSERT_EQ(add(sample(1, i)), MBX_OK);
    MbxSttsBox box = {};
    ASSERT_EQ(MbxBuildStts(context, &options, &segment().durations, &box), MBX_OK);
    EXPECT_EQ(box.size, 16U + 1001 * 8);
    ASSERT_EQ(MbxWriteSttsBox(context, &options, &file, 0, &box, nullptr, nullptr), MBX_OK);
    Bytes expected = Hex("00001F58 'stts' 00000000 000003E9");
    for (uint32_t i = 0; i < 1001; i++) expected = expected + Words({1, i});
    EXPECT_BYTES(file.bytes, expected);
    EXPECT_EQ(file.writeSizes, (std::vector<uint64_t>{8, 8, 8000, 8}));
}

TEST_F(SampleTimesTest, TablesWithoutSamplesHoldNoEntry) {
    ASSERT_EQ(MbxRequireSegment(context, track), MBX_OK);
    MbxSttsBox stts = {};
    ASSERT_EQ(MbxBuildStts(context, &options, &segment().durations, &stts), MBX_OK);
    ASSERT_EQ(MbxWriteSttsBox(context, &options, &file, 0, &stts, nullptr, nullptr), MBX_OK);
    EXPECT_BYTES(file.bytes, Hex("00000010 'stts' 00000000 00000000"));
    MemoryFile other;
    MbxSdtpBox sdtp = {};
    ASSERT_EQ(MbxBuildSdtp(context, &options, &segment().dependencies, &sdtp), MBX_OK);
    ASSERT_EQ(MbxWriteSdtpBox(context, &options, &other, 0, &sdtp, nullptr, nullptr), MBX_OK);
    EXPECT_BYTES(other.bytes, Hex("0000000C 'sdtp' 00000000"));
}

TEST_F(SampleTimesTest, CttsVersionComesFromTheModeOrFromSignedOffsets) {
    struct Case {
        uint32_t mode, signedOffsets, version;
    };
    for (const Case& c : {Case{0, 0, 0}, Case{1, 0, 1}, Case{0, 1, 1}, Case{1, 1, 1}, Case{2, 0, 0}}) {
        options.trun_version_mode = c.mode;
        MbxCompositionList list = kOffsets;
        list.signedOffsets = c.signedOffsets;
        MbxCttsBox box = {};
        ASSERT_EQ(MbxBuildCtts(context, &options, &list, &box), MBX_OK);
        MemoryFile target;
        ASSERT_EQ(MbxWriteCttsBox(context, &options, &target, 0, &box, nullptr, nullptr), MBX_OK);
        EXPECT_EQ(target.bytes[8], c.version) << c.mode << c.signedOffsets;
        EXPECT_EQ(Bytes(target.bytes.end() - 4, target.bytes.end()), Hex("FFFFFFF0"));
    }
}

TEST_F(SampleTimesTest, SdtpWritesFirstThenTheRunThenTheBlocks) {
    for (const int value : {1, 2, 2, 3, 2}) {
        MbxSampleInfo info = sample();
        info.dependency = static_cast<uint8_t>(value);
        ASSERT_EQ(add(info), MBX_OK);
    }
    MbxSdtpBox box = {};
    ASSERT_EQ(MbxBuildSdtp(context, &options, &segment().dependencies, &box), MBX_OK);
    ASSERT_EQ(MbxWriteSdtpBox(context, &options, &file, 0, &box, nullptr, nullptr), MBX_OK);
    EXPECT_BYTES(file.bytes, Hex("00000011 'sdtp' 00000000 01 02 02 03 02"));
    // Header, head, and a buffer of three bytes: full once, then what is left.
    EXPECT_EQ(file.writeSizes, (std::vector<uint64_t>{8, 4, 3, 2}));
}

TEST_F(SampleTimesTest, SdtpFlushesWheneverTheFirstBlocksRoomIsFull) {
    MbxSampleInfo info = sample();
    for (uint32_t i = 0; i < 2502; i++) {
        info.dependency = static_cast<uint8_t>(i);
        ASSERT_EQ(add(info), MBX_OK);
    }
    MbxSdtpBox box = {};
    ASSERT_EQ(MbxBuildSdtp(context, &options, &segment().dependencies, &box), MBX_OK);
    ASSERT_EQ(MbxWriteSdtpBox(context, &options, &file, 0, &box, nullptr, nullptr), MBX_OK);
    Bytes expected = Hex("000009D2 'sdtp' 00000000");
    for (uint32_t i = 0; i < 2502; i++) expected.push_back(static_cast<uint8_t>(i));
    EXPECT_BYTES(file.bytes, expected);
    EXPECT_EQ(file.writeSizes, (std::vector<uint64_t>{8, 4, 1000, 1000, 502}));
}

}  // namespace
