#include "boxlib/sample/auxiliary_information.h"

#include "boxlib/core/row_table.h"
#include "boxlib/sample/sample_store.h"
#include "boxlib/support/entry_fixture.h"
#include "boxlib/support/sample_fixture.h"

namespace {

uint8_t kFirst[] = {0xA0, 0xA1};
uint8_t kThird[] = {0xC0};
MbxAuxSize kSizeEntries[] = {{2, kFirst}, {0, nullptr}, {1, kThird}};
MbxBlock kSizeBlock = {3, kSizeEntries, nullptr};
const MbxAuxSizeList kSizes = {0, 3, {1000, &kSizeBlock, &kSizeBlock}};

MbxAuxOffset kOffsetEntries[] = {{1, 0x1010}, {5, 0x2020}};
MbxBlock kOffsetBlock = {2, kOffsetEntries, nullptr};
const MbxBlockList kOffsets = {1000, &kOffsetBlock, &kOffsetBlock};

constexpr MbxAuxInfo kCenc = {1, MbxCode("cenc"), 7};

const BoxRegistration kRows[] = {
    RegisterBox<MbxSencBox>({.name = "Senc",
                             .code = "senc",
                             .parents = "trak traf",
                             .clause = "ISO/IEC 23001-7 7.2.1",
                             .presence = Presence::kOptional,
                             .golden = Hex("00000013 'senc'"
                                           "00 000002"  // version, flags
                                           "00000003"   // sample_count
                                           "A0A1"       // first sample; the second has none
                                           "C0"),       // third sample
                             .build =
                                 [](MbxContext* context, const MbxOptions* options, MbxSencBox* box) {
                                     const MbxSencParams params = {2, &kSizes};
                                     return MbxBuildSenc(context, options, &params, box);
                                 },
                             .write = MbxWriteSencBox,
                             .free = MbxFreeSenc}),
    RegisterBox<MbxSaioBox>({.name = "Saio",
                             .code = "saio",
                             .parents = "stbl traf",
                             .clause = "ISO/IEC 14496-12 8.7.9",
                             .presence = Presence::kOptional,
                             .golden = Hex("00000020 'saio'"
                                           "00 000001"   // version, flags
                                           "'cenc'"      // aux_info_type
                                           "00000007"    // aux_info_type_parameter
                                           "00000002"    // entry_count
                                           "00000010"    // offset, less the base
                                           "00001020"),  // offset, less the base
                             .build =
                                 [](MbxContext* context, const MbxOptions* options, MbxSaioBox* box) {
                                     const MbxSaioParams params = {kCenc, 0x1000, &kOffsets};
                                     return MbxBuildSaio(context, nullptr, options, &params, box);
                                 },
                             .write = MbxWithScratch(nullptr, MbxWriteSaioBox),
                             .free = MbxFreeSaio}),
    RegisterBox<MbxSaizBox>({.name = "Saiz",
                             .code = "saiz",
                             .parents = "stbl traf",
                             .clause = "ISO/IEC 14496-12 8.7.8",
                             .presence = Presence::kOptional,
                             .golden = Hex("0000001C 'saiz'"
                                           "00 000001"   // version, flags
                                           "'cenc'"      // aux_info_type
                                           "00000007"    // aux_info_type_parameter
                                           "00"          // default_sample_info_size
                                           "00000003"    // sample_count
                                           "02 00 01"),  // sample_info_size
                             .build =
                                 [](MbxContext* context, const MbxOptions* options, MbxSaizBox* box) {
                                     const MbxSaizParams params = {kCenc, &kSizes};
                                     return MbxBuildSaiz(context, nullptr, options, &params, box);
                                 },
                             .write = MbxWithScratch(nullptr, MbxWriteSaizBox),
                             .free = MbxFreeSaiz}),
};

class AuxiliaryInformationTest : public BoxTest {
 protected:
    void SetUp() override {
        BoxTest::SetUp();
        ASSERT_EQ(MbxScratchInit(context, MBX_MEMORY_CLASS, 8192, &scratch), MBX_OK);
    }

    void TearDown() override {
        MbxBlockListRelease(context, &offsets);
        MbxBlockListRelease(context, &sizes.list);
        MbxScratchRelease(context, &scratch);
        BoxTest::TearDown();
    }

    void addOffset(uint64_t offset) {
        ASSERT_EQ(MbxBlockListAppend(context, &offsets, MbxAuxOffset{1, offset}), MBX_OK);
    }

    // A sample with that size and no bytes, for boxes that do not look at them.
    void addSize(uint8_t size) {
        ASSERT_EQ(MbxBlockListAppend(context, &sizes.list, MbxAuxSize{size, nullptr}), MBX_OK);
        sizes.count++;
    }

    MbxStatus buildSaio(uint64_t base, MbxSaioBox* box) {
        const MbxSaioParams params = {{}, base, &offsets};
        return MbxBuildSaio(context, &scratch, &options, &params, box);
    }

    // Builds and writes into `file`.
    MbxStatus writeSaio(uint64_t base) {
        MbxSaioBox box = {};
        MBX_TRY(buildSaio(base, &box));
        file = MemoryFile();
        MBX_TRY(MbxWriteSaioBox(context, &scratch, &options, &file, 0, &box, nullptr, nullptr));
        EXPECT_EQ(box.size, file.bytes.size());
        return MBX_OK;
    }

    MbxStatus writeSaiz() {
        MbxSaizBox box = {};
        const MbxSaizParams params = {{}, &sizes};
        MBX_TRY(MbxBuildSaiz(context, &scratch, &options, &params, &box));
        file = MemoryFile();
        MBX_TRY(MbxWriteSaizBox(context, &scratch, &options, &file, 0, &box, nullptr, nullptr));
        EXPECT_EQ(box.size, file.bytes.size());
        return MBX_OK;
    }

    MbxScratch scratch = {};
    MbxBlockList offsets = {1000, nullptr, nullptr};
    MbxAuxSizeList sizes = {0, 0, {1000, nullptr, nullptr}};
};

TEST_F(AuxiliaryInformationTest, SaioWithOneEntryWritesOneOffsetWhateverTheListHoldsBeyondIt) {
    addOffset(0x1234);
    MbxSaioBox box = {};
    ASSERT_EQ(buildSaio(0, &box), MBX_OK);
    addOffset(0x5678);
    EXPECT_EQ(MbxWriteSaioBox(context, &scratch, &options, &file, 0, &box, nullptr, nullptr), MBX_OK);
    EXPECT_BYTES(file.bytes, Hex("00000014 'saio' 00000000 00000001 00001234"));
}

TEST_F(AuxiliaryInformationTest, SaioWithoutEntriesIsAHead) {
    ASSERT_EQ(writeSaio(0), MBX_OK);
    EXPECT_BYTES(file.bytes, Hex("00000010 'saio' 00000000 00000000"));
}

TEST_F(AuxiliaryInformationTest, SaioFlagsKeepTheirLow24Bits) {
    addOffset(1);
    MbxSaioBox box = {};
    const MbxSaioParams params = {{0xFF000002, 3, 4}, 0, &offsets};
    ASSERT_EQ(MbxBuildSaio(context, &scratch, &options, &params, &box), MBX_OK);
    EXPECT_EQ(MbxWriteSaioBox(context, &scratch, &options, &file, 0, &box, nullptr, nullptr), MBX_OK);
    EXPECT_BYTES(file.bytes, Hex("00000014 'saio' 00 000002 00000001 00000001"));
}

TEST_F(AuxiliaryInformationTest, OffsetBelowTheBaseOverflowsWhenWrittenAndCountsAsZeroWhenMeasured) {
    addOffset(0x2000);
    addOffset(0x0FFF);
    MbxSaioBox box = {};
    EXPECT_EQ(buildSaio(0x1000, &box), MBX_OK);
    EXPECT_EQ(box.size, 24U);
    uint64_t measured = 0;
    EXPECT_EQ(MbxWriteSaioBox(context, &scratch, &options, nullptr, 0, &box, &measured, nullptr), MBX_OK);
    EXPECT_EQ(measured, 24U);
    EXPECT_EQ(MbxWriteSaioBox(context, &scratch, &options, &file, 0, &box, nullptr, nullptr),
              MBX_ERR_OVERFLOW);
}

TEST_F(AuxiliaryInformationTest, OffsetAtTheBaseIsZero) {
    addOffset(0x1000);
    ASSERT_EQ(writeSaio(0x1000), MBX_OK);
    EXPECT_BYTES(file.bytes, Hex("00000014 'saio' 00000000 00000001 00000000"));
}

TEST_F(AuxiliaryInformationTest, SaioVersionFollowsTheTimeMode) {
    const Bytes narrow = Hex("00000018 'saio' 00000000 00000002 00000001 FFFFFFFF");
    const Bytes narrowAsVersion1 = Hex("00000020 'saio' 01000000 00000002 0000000000000001 00000000FFFFFFFF");
    const Bytes wide = Hex("00000020 'saio' 01000000 00000002 0000000000000001 0000000100000000");
    addOffset(1);
    addOffset(0xFFFFFFFF);
    const Bytes* narrowIn[] = {&narrow, &narrow, &narrow, &narrowAsVersion1};
    for (uint32_t mode = 0; mode < 4; mode++) {
        options.time_version_mode = mode;
        EXPECT_EQ(writeSaio(0), MBX_OK) << mode;
        EXPECT_BYTES(file.bytes, *narrowIn[mode]);
    }
    static_cast<MbxAuxOffset*>(offsets.first->data)[1].offset = 0x100000000;
    const MbxStatus wideIn[] = {MBX_ERR_BAD_STATE, MBX_OK, MBX_ERR_BAD_STATE, MBX_OK};
    for (uint32_t mode = 0; mode < 4; mode++) {
        options.time_version_mode = mode;
        EXPECT_EQ(writeSaio(0), wideIn[mode]) << mode;
        if (wideIn[mode] == MBX_OK) {
            EXPECT_BYTES(file.bytes, wide);
        }
    }
}

TEST_F(AuxiliaryInformationTest, SaioVersionLooksAtOffsetsLessTheBase) {
    addOffset(0x100000000);
    options.time_version_mode = 1;
    ASSERT_EQ(writeSaio(1), MBX_OK);
    EXPECT_BYTES(file.bytes, Hex("00000014 'saio' 00000000 00000001 FFFFFFFF"));
}

TEST_F(AuxiliaryInformationTest, SaioRunsOverBlocks) {
    for (uint64_t i = 1; i <= 1001; i++) addOffset(i);
    ASSERT_EQ(writeSaio(0), MBX_OK);
    ASSERT_EQ(file.bytes.size(), 16 + 4 * 1001U);
    EXPECT_BYTES(Bytes(file.bytes.end() - 8, file.bytes.end()), Words({1000, 1001}));
}

TEST_F(AuxiliaryInformationTest, SaioOfAListThatShrankIsABrokenInvariant) {
    addOffset(1);
    addOffset(2);
    MbxSaioBox box = {};
    ASSERT_EQ(buildSaio(0, &box), MBX_OK);
    offsets.first->count = 1;
    EXPECT_EQ(MbxWriteSaioBox(context, &scratch, &options, &file, 0, &box, nullptr, nullptr),
              MBX_ERR_INTERNAL);
}

TEST_F(AuxiliaryInformationTest, RowsTakeTheScratchUpTo8192BytesAndATemporaryBlockBeyond) {
    options.time_version_mode = 3;  // eight bytes an offset
    for (uint64_t i = 0; i < 1024; i++) addOffset(i);
    uint64_t before = host.allocations;
    ASSERT_EQ(writeSaio(0), MBX_OK);
    EXPECT_EQ(host.allocations, before);
    addOffset(1024);
    before = host.allocations;
    ASSERT_EQ(writeSaio(0), MBX_OK);
    EXPECT_EQ(host.allocations, before + 2);  // measured, and written

    for (uint32_t i = 0; i < 8193; i++) {
        before = host.allocations;
        if (i == 8191 || i == 8192) {
            ASSERT_EQ(writeSaiz(), MBX_OK);
            EXPECT_EQ(host.allocations, before) << i;
        }
        addSize(static_cast<uint8_t>(i));
    }
    before = host.allocations;
    ASSERT_EQ(writeSaiz(), MBX_OK);
    EXPECT_EQ(host.allocations, before + 2);
    ASSERT_EQ(file.bytes.size(), 17 + 8193U);
    for (uint32_t i = 0; i < 8193; i++) ASSERT_EQ(file.bytes[17 + i], static_cast<uint8_t>(i));
}

TEST_F(AuxiliaryInformationTest, SaizWithADefaultSizeHasNoEntries) {
    sizes.defaultSize = 8;
    addSize(8);
    addSize(8);
    ASSERT_EQ(writeSaiz(), MBX_OK);
    EXPECT_BYTES(file.bytes, Hex("00000011 'saiz' 00000000 08 00000002"));
}

TEST_F(AuxiliaryInformationTest, SaizWhoseCountAndEntriesDisagreeIsABrokenInvariant) {
    addSize(1);
    sizes.count = 2;
    EXPECT_EQ(writeSaiz(), MBX_ERR_INTERNAL);
}

TEST_F(AuxiliaryInformationTest, SencKeepsTheLengthOfItsHeader) {
    const uint64_t lengths[] = {8, 8, 16};
    for (uint32_t mode = 0; mode < 3; mode++) {
        options.box_size_mode = mode;
        MbxSencBox box = {};
        const MbxSencParams params = {0, &kSizes};
        EXPECT_EQ(MbxBuildSenc(context, &options, &params, &box), MBX_OK);
        EXPECT_EQ(box.headerLength, lengths[mode]);
        EXPECT_EQ(box.size, lengths[mode] + 11);
    }
}

TEST_F(AuxiliaryInformationTest, SencOfSamplesWithoutInformationHoldsTheirCount) {
    addSize(0);
    addSize(0);
    MbxSencBox box = {};
    const MbxSencParams params = {0xFF000000, &sizes};
    ASSERT_EQ(MbxBuildSenc(context, &options, &params, &box), MBX_OK);
    EXPECT_EQ(MbxWriteSencBox(context, &options, &file, 0, &box, nullptr, nullptr), MBX_OK);
    EXPECT_BYTES(file.bytes, Hex("00000010 'senc' 00000000 00000002"));
}

TEST_F(AuxiliaryInformationTest, SencRunsOverBlocksAndPassesOverSizesOfZero) {
    sizes.list.capacity = 2;
    for (uint8_t i = 0; i < 5; i++) {
        const uint8_t bytes[] = {i, static_cast<uint8_t>(i + 0x10)};
        ASSERT_EQ(MbxAddAuxSize(context, &sizes, i % 3, bytes), MBX_OK);
    }
    MbxSencBox box = {};
    const MbxSencParams params = {0, &sizes};
    ASSERT_EQ(MbxBuildSenc(context, &options, &params, &box), MBX_OK);
    EXPECT_EQ(MbxWriteSencBox(context, &options, &file, 0, &box, nullptr, nullptr), MBX_OK);
    EXPECT_BYTES(file.bytes, Hex("00000014 'senc' 00000000 00000005 01 0212 04"));
    for (const MbxAuxSize& entry : Entries<MbxAuxSize>(sizes.list)) MbxFree(context, entry.data);
}

TEST_F(AuxiliaryInformationTest, BuildersRefuseNullArguments) {
    MbxSencBox senc = {};
    const MbxSencParams noSizes = {0, nullptr};
    EXPECT_EQ(MbxBuildSenc(context, &options, nullptr, &senc), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxBuildSenc(context, &options, &noSizes, &senc), MBX_ERR_INVALID_ARG);
    MbxSaioBox saio = {};
    const MbxSaioParams noOffsets = {{}, 0, nullptr};
    EXPECT_EQ(MbxBuildSaio(nullptr, &scratch, &options, &noOffsets, &saio), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxBuildSaio(context, &scratch, &options, nullptr, &saio), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxBuildSaio(context, &scratch, &options, &noOffsets, &saio), MBX_ERR_INVALID_ARG);
    MbxSaizBox saiz = {};
    const MbxSaizParams saizWithoutSizes = {{}, nullptr};
    EXPECT_EQ(MbxBuildSaiz(context, &scratch, nullptr, &saizWithoutSizes, &saiz), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxBuildSaiz(context, &scratch, &options, &saizWithoutSizes, &saiz), MBX_ERR_INVALID_ARG);
}

}  // namespace
