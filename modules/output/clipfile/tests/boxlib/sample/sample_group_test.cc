#include "boxlib/sample/sample_group.h"

#include <list>

#include "boxlib/core/row_table.h"
#include "boxlib/support/registry.h"
#include "boxlib/support/sample_fixture.h"

namespace {

// Lists of records that stand in the test.
template <typename Record>
MbxList<Record> linked(std::list<Record>& records) {
    MbxList<Record> list = {};
    for (Record& record : records) {
        record.next = nullptr;
        MbxListAppend(&list, &record);
    }
    return list;
}

StaticList<MbxSampleGroupRow, 2> groupTable = {{{10, 1}, {0x01020304, 0}}};
const MbxSampleGroupParams kGroup = {1, 0x000102, MbxCode("seig"), 0x0A0B0C0D, groupTable.list, nullptr};

MbxGroupDescription seigEntry() {
    MbxGroupDescription entry = {};
    entry.isEncrypted = 0x010203;
    entry.ivSize = 8;
    for (uint8_t i = 0; i < 16; i++) entry.keyId[i] = i;
    return entry;
}

std::list<MbxGroupDescription> seigEntries = {seigEntry()};
const MbxGroupDescriptionParams kSeig = {MbxCode("seig"), 0, linked(seigEntries), nullptr};

std::list<MbxSubSample> subSamples = {{0x1234, 5, 1, nullptr}, {7, 0, 0, nullptr}};
std::list<MbxSubSampleParams> subEntries = {{3, linked(subSamples), nullptr}, {4, {}, nullptr}};
const MbxList<MbxSubSampleParams> kSubEntries = linked(subEntries);

const BoxRegistration kSbgp = RegisterBox<MbxSbgpBox>(
    {.name = "Sbgp",
     .code = "sbgp",
     .parents = "stbl traf",
     .clause = "ISO/IEC 14496-12 8.9.2",
     .presence = Presence::kMandatory,
     .golden = Hex("00000028 'sbgp'"      // size, type
                   "01 000102"            // version, flags
                   "'seig'"               // grouping_type
                   "0A0B0C0D"             // grouping_type_parameter
                   "00000002"             // entry_count
                   "0000000A 00000001"    // sample_count, group_description_index
                   "01020304 00000000"),  // sample_count, group_description_index
     .build = [](MbxContext* context, const MbxOptions* options,
                 MbxSbgpBox* box) { return MbxBuildSbgp(context, nullptr, options, &kGroup, box); },
     .write = MbxWithScratch(nullptr, MbxWriteSbgpBox),
     .free = MbxFreeSbgp});

const BoxRegistration kSgpd = RegisterBox<MbxSgpdBox>(
    {.name = "Sgpd",
     .code = "sgpd",
     .parents = "stbl traf",
     .clause = "ISO/IEC 14496-12 8.9.3",
     .presence = Presence::kMandatory,
     .golden = Hex("0000002C 'sgpd'"                     // size, type
                   "01 000000"                           // version, flags
                   "'seig'"                              // grouping_type
                   "00000014"                            // default_length
                   "00000001"                            // entry_count
                   "010203"                              // IsEncrypted
                   "08"                                  // IV_size
                   "000102030405060708090A0B0C0D0E0F"),  // KID
     .build = [](MbxContext* context, const MbxOptions* options,
                 MbxSgpdBox* box) { return MbxBuildSgpd(context, nullptr, options, &kSeig, box); },
     .write = MbxWithScratch(nullptr, MbxWriteSgpdBox),
     .free = MbxFreeSgpd});

const BoxRegistration kSubs = RegisterBox<MbxSubsBox>(
    {.name = "Subs",
     .code = "subs",
     .parents = "traf",
     .clause = "ISO/IEC 14496-12 8.7.7",
     .presence = Presence::kOptional,
     .golden = Hex("0000002C 'subs'"      // size, type
                   "00 000000"            // version, flags
                   "00000002"             // entry_count
                   "00000003 0002"        // sample_delta, subsample_count
                   "1234 05 01 00000000"  // subsample_size, priority, discardable, reserved
                   "0007 00 00 00000000"  // subsample_size, priority, discardable, reserved
                   "00000004 0000"),      // sample_delta, subsample_count
     .build = [](MbxContext* context, const MbxOptions* options,
                 MbxSubsBox* box) { return MbxBuildSubs(context, nullptr, options, kSubEntries.first, box); },
     .write = MbxWithScratch(nullptr, MbxWriteSubsBox),
     .free = MbxFreeSubs});

class SampleGroupTest : public SampleTest {
 protected:
    Bytes sbgp(const MbxSampleGroupParams& params) {
        MbxSbgpBox box = {};
        EXPECT_EQ(MbxBuildSbgp(context, &session.scratch, &options, &params, &box), MBX_OK);
        MemoryFile target;
        EXPECT_EQ(MbxWriteSbgpBox(context, &session.scratch, &options, &target, 0, &box, nullptr, nullptr),
                  MBX_OK);
        EXPECT_EQ(box.size, target.bytes.size());
        return target.bytes;
    }

    MbxStatus sgpd(const MbxGroupDescriptionParams& params) {
        MbxSgpdBox box = {};
        file.bytes.clear();
        MBX_TRY(MbxBuildSgpd(context, &session.scratch, &options, &params, &box));
        const MbxStatus status =
            MbxWriteSgpdBox(context, &session.scratch, &options, &file, 0, &box, nullptr, nullptr);
        EXPECT_EQ(box.size, file.bytes.size());
        return status;
    }

    // A `subs` of one sample with one sub-sample.
    MbxStatus subs(uint32_t size) {
        std::list<MbxSubSample> subs = {{size, 0, 0, nullptr}};
        std::list<MbxSubSampleParams> samples = {{1, linked(subs), nullptr}};
        MbxSubsBox box = {};
        file.bytes.clear();
        MBX_TRY(MbxBuildSubs(context, &session.scratch, &options, &samples.front(), &box));
        return MbxWriteSubsBox(context, &session.scratch, &options, &file, 0, &box, nullptr, nullptr);
    }
};

TEST_F(SampleGroupTest, SbgpHasItsParameterInVersion1Alone) {
    MbxSampleGroupParams params = kGroup;
    params.version = 0;
    params.rows = {};
    EXPECT_BYTES(sbgp(params), Hex("00000014 'sbgp' 00000102 'seig' 00000000"));
}

TEST_F(SampleGroupTest, SbgpRowsUseTheScratchUpTo8192Bytes) {
    // 1023, 1024 and 1025 rows of 8 bytes: 8184, 8192 and 8200.
    for (const uint32_t rows : {1023U, 1024U, 1025U}) {
        MbxSampleGroupParams params = kGroup;
        params.rows = {100, nullptr, nullptr};
        for (uint32_t i = 0; i < rows; i++) {
            ASSERT_EQ(MbxBlockListAppend(context, &params.rows, MbxSampleGroupRow{i, i + 1}, nullptr),
                      MBX_OK);
        }
        const uint64_t before = host.allocations;
        const Bytes bytes = sbgp(params);
        EXPECT_EQ(host.allocations - before, rows > 1024 ? 2U : 0U);  // measured and written
        ASSERT_EQ(bytes.size(), 24 + rows * 8);
        EXPECT_BYTES(Bytes(bytes.end() - 8, bytes.end()), Words({rows - 1, rows}));
        MbxBlockListRelease(context, &params.rows);
    }
}

TEST_F(SampleGroupTest, SgpdRawEntriesOfOneLengthShareIt) {
    uint8_t a[] = {1, 2};
    uint8_t b[] = {3, 4};
    std::list<MbxGroupDescription> raw(2);
    raw.front().raw = {a, 2};
    raw.back().raw = {b, 2};
    ASSERT_EQ(sgpd({MbxCode("roll"), 1, linked(raw), nullptr}), MBX_OK);
    EXPECT_BYTES(file.bytes, Hex("0000001C 'sgpd' 01000000 'roll' 00000002 00000002 0102 0304"));
}

TEST_F(SampleGroupTest, SgpdRawEntriesOfDifferentLengthsCarryTheirOwn) {
    uint8_t a[] = {1, 2};
    std::list<MbxGroupDescription> raw(2);
    raw.front().raw = {a, 2};
    ASSERT_EQ(sgpd({MbxCode("roll"), 1, linked(raw), nullptr}), MBX_OK);
    EXPECT_BYTES(file.bytes, Hex("00000022 'sgpd' 01000000 'roll' 00000000 00000002"
                                 "00000002 0102"
                                 "00000000"));
}

TEST_F(SampleGroupTest, SgpdRawEntriesWithoutBytesCarryTheirLength) {
    std::list<MbxGroupDescription> raw(2);
    ASSERT_EQ(sgpd({MbxCode("roll"), 1, linked(raw), nullptr}), MBX_OK);
    EXPECT_BYTES(file.bytes, Hex("00000020 'sgpd' 01000000 'roll' 00000000 00000002 00000000 00000000"));
}

TEST_F(SampleGroupTest, SgpdRowsUseTheScratchUpTo8192BytesAndABlockBeyond) {
    Bytes content = Repeat(0x5A, 8193);
    for (const uint32_t length : {8191U, 8192U, 8193U}) {
        std::list<MbxGroupDescription> raw(1);
        raw.front().raw = {content.data(), length};
        const uint64_t before = host.allocations;
        ASSERT_EQ(sgpd({MbxCode("roll"), 1, linked(raw), nullptr}), MBX_OK);
        EXPECT_EQ(host.allocations - before, length > 8192 ? 2U : 0U);  // measured and written
        EXPECT_EQ(Bytes(file.bytes.begin() + 24, file.bytes.end()), Repeat(0x5A, length));
    }
}

TEST_F(SampleGroupTest, SgpdTemporalLevelIsItsTopBit) {
    std::list<MbxGroupDescription> levels(2);
    levels.front().levelIndependentlyDecodable = 1;
    ASSERT_EQ(sgpd({MbxCode("tele"), 0, linked(levels), nullptr}), MBX_OK);
    EXPECT_BYTES(file.bytes, Hex("0000001A 'sgpd' 01000000 'tele' 00000001 00000002 80 00"));
}

TEST_F(SampleGroupTest, SgpdOfAnUnknownTypeFailsAtItsFirstRow) {
    std::list<MbxGroupDescription> one(1);
    EXPECT_EQ(sgpd({MbxCode("roll"), 0, linked(one), nullptr}), MBX_ERR_INTERNAL);
    EXPECT_EQ(sgpd({MbxCode("roll"), 0, {}, nullptr}), MBX_OK);
    EXPECT_BYTES(file.bytes, Hex("00000018 'sgpd' 01000000 'roll' 00000000 00000000"));
}

TEST_F(SampleGroupTest, SubsVersionInEachModeAtTheEdge) {
    struct Case {
        uint32_t mode, size;
        MbxStatus status;
        uint8_t version;
    };
    for (const Case& c :
         {Case{0, 65535, MBX_OK, 0}, Case{0, 65536, MBX_ERR_BAD_STATE, 0}, Case{1, 65535, MBX_OK, 0},
          Case{1, 65536, MBX_OK, 1}, Case{2, 65535, MBX_OK, 0}, Case{2, 65536, MBX_ERR_BAD_STATE, 0},
          Case{3, 65535, MBX_OK, 1}, Case{3, 65536, MBX_OK, 1}, Case{3, 0, MBX_OK, 1}}) {
        options.time_version_mode = c.mode;
        EXPECT_EQ(subs(c.size), c.status) << c.mode << " " << c.size;
        if (c.status == MBX_OK) {
            const Bytes head = Hex(c.version == 1 ? "00000020 'subs' 01000000" : "0000001E 'subs' 00000000");
            const Bytes size = Words({c.size});
            EXPECT_BYTES(file.bytes, head + Hex("00000001 00000001 0001") +
                                         (c.version == 1 ? size : Bytes(size.begin() + 2, size.end())) +
                                         Hex("00 00 00000000"));
        }
    }
}

TEST_F(SampleGroupTest, SubsRowsUseTheScratchUpTo8192BytesAndABlockBeyond) {
    options.time_version_mode = 3;  // ten bytes a sub-sample
    // Samples of six bytes each: 2 with 818 sub-samples are 8192 bytes, 3 with 818 are 8198.
    for (const size_t entries : {size_t{1}, size_t{2}, size_t{3}}) {
        std::list<MbxSubSample> subs(818);
        std::list<MbxSubSampleParams> samples(entries);
        const MbxList<MbxSubSampleParams> all = linked(samples);
        samples.back().subSamples = linked(subs);
        MbxSubsBox box = {};
        const uint64_t before = host.allocations;
        ASSERT_EQ(MbxBuildSubs(context, &session.scratch, &options, all.first, &box), MBX_OK);
        EXPECT_EQ(MbxWriteSubsBox(context, &session.scratch, &options, &file, 0, &box, nullptr, nullptr),
                  MBX_OK);
        EXPECT_EQ(box.size, 16 + 6 * entries + 8180);
        EXPECT_EQ(host.allocations - before, entries > 2 ? 2U : 0U);  // measured and written
    }
}

TEST_F(SampleGroupTest, SubsCountAbove65535Overflows) {
    std::list<MbxSubSample> many(65535);
    std::list<MbxSubSampleParams> samples = {{1, linked(many), nullptr}};
    MbxSubsBox box = {};
    EXPECT_EQ(MbxBuildSubs(context, &session.scratch, &options, &samples.front(), &box), MBX_OK);
    many.emplace_back();
    samples.front().subSamples = linked(many);
    EXPECT_EQ(MbxBuildSubs(context, &session.scratch, &options, &samples.front(), &box), MBX_ERR_OVERFLOW);
}

TEST_F(SampleGroupTest, BuildersRefuseNullArguments) {
    MbxSbgpBox sbgp = {};
    MbxSgpdBox sgpd = {};
    MbxSubsBox subs = {};
    EXPECT_EQ(MbxBuildSbgp(nullptr, nullptr, &options, &kGroup, &sbgp), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxBuildSbgp(context, nullptr, nullptr, &kGroup, &sbgp), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxBuildSbgp(context, nullptr, &options, nullptr, &sbgp), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxBuildSbgp(context, nullptr, &options, &kGroup, nullptr), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxBuildSgpd(context, nullptr, &options, nullptr, &sgpd), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxBuildSubs(context, nullptr, &options, nullptr, &subs), MBX_ERR_INVALID_ARG);
}

TEST_F(SampleGroupTest, ReleaseFreesAllThatASegmentWasGiven) {
    MbxTrack* track = addTrack();
    ASSERT_EQ(MbxRequireSegment(context, track), MBX_OK);
    MbxSampleSegment* segment = track->segments.first;
    const size_t before = host.live.size();

    MbxSampleGroupParams* group = nullptr;
    ASSERT_EQ(MbxNew(context, &group), MBX_OK);
    group->rows.capacity = 4;
    ASSERT_EQ(MbxBlockListAppend(context, &group->rows, MbxSampleGroupRow{1, 1}, nullptr), MBX_OK);
    MbxListAppend(&segment->sampleGroups, group);

    MbxGroupDescriptionParams* descriptions = nullptr;
    ASSERT_EQ(MbxNew(context, &descriptions), MBX_OK);
    MbxListAppend(&segment->groupDescriptions, descriptions);
    MbxGroupDescription* description = nullptr;
    ASSERT_EQ(MbxNew(context, &description), MBX_OK);
    MbxListAppend(&descriptions->entries, description);
    ASSERT_EQ(MbxBufferAssign(context, 0, &description->raw, "abc", 3), MBX_OK);

    MbxSubSampleParams* entry = nullptr;
    ASSERT_EQ(MbxNew(context, &entry), MBX_OK);
    MbxListAppend(&segment->subSamples, entry);
    MbxSubSample* subSample = nullptr;
    ASSERT_EQ(MbxNew(context, &subSample), MBX_OK);
    MbxListAppend(&entry->subSamples, subSample);

    EXPECT_EQ(MbxReleaseSampleGroups(context, segment), MBX_OK);
    EXPECT_EQ(host.live.size(), before);
    EXPECT_EQ(MbxReleaseSampleGroups(context, segment), MBX_OK);
}

}  // namespace
