#include "boxlib/entry/codec_config.h"

#include "boxlib/support/entry_fixture.h"

namespace {

uint8_t kSpsBytes[] = {0x67, 0x42, 0x00, 0x1E};
uint8_t kPpsBytes[] = {0x68, 0xCE};
uint8_t kExtBytes[] = {0x6D, 0x01};
MbxParameterSet kSps = {BufferOf(kSpsBytes), nullptr};
MbxParameterSet kPps = {BufferOf(kPpsBytes), nullptr};
MbxParameterSet kExt = {BufferOf(kExtBytes), nullptr};

constexpr MbxAvcConfigParams kAvcValues = {1, 0x42, 0xC0, 0x1E, 3, 0, 0, 0, 0};
constexpr MbxAvcConfigParams kAvcExtended = {1, 0x64, 0xC0, 0x1E, 3, 1, 1, 2, 3};

const MbxAvcConfig kAvcConfig = {kAvcExtended, {&kSps, &kSps}, {&kPps, &kPps}, {&kExt, &kExt}};

uint8_t kVpsBytes[] = {0x40, 0x01, 0x02};
uint8_t kHevcSpsBytes[] = {0x42, 0x01};
uint8_t kShortBytes[] = {0x42};
MbxParameterSet kVps = {BufferOf(kVpsBytes), nullptr};
MbxParameterSet kHevcSps2 = {BufferOf(kShortBytes), nullptr};
MbxParameterSet kHevcSps1 = {BufferOf(kHevcSpsBytes), &kHevcSps2};
MbxHvcCArray kSpsArray = {0, 33, {&kHevcSps1, &kHevcSps2}, nullptr};
MbxHvcCArray kVpsArray = {1, 32, {&kVps, &kVps}, &kSpsArray};

constexpr MbxHvcCValues kHvcValues = {1,      1, 1, 2, 0x20000000, 0xB00000000000, 93, 0x123, 2, 1, 2, 3,
                                      0x1900, 1, 3, 1, 3};

const MbxHvcCParams kHvcParams = {kHvcValues, {&kVpsArray, &kSpsArray}};

const BoxRegistration kRows[] = {
    RegisterBox<MbxAvcCBox>(
        {.name = "AvcC",
         .code = "avcC",
         .parents = "avc1",
         .clause = "ISO/IEC 14496-15 5.2.4.1",
         .presence = Presence::kMandatory,
         .golden = Hex("00000021 'avcC'"
                       "01"             // configurationVersion
                       "64"             // AVCProfileIndication
                       "C0"             // profile_compatibility
                       "1E"             // AVCLevelIndication
                       "FF"             // reserved, lengthSizeMinusOne
                       "E1"             // reserved, numOfSequenceParameterSets
                       "0004 6742001E"  // length, sequence parameter set
                       "01"             // numOfPictureParameterSets
                       "0002 68CE"      // length, picture parameter set
                       "FD"             // reserved, chroma_format
                       "FA"             // reserved, bit_depth_luma_minus8
                       "FB"             // reserved, bit_depth_chroma_minus8
                       "01"             // numOfSequenceParameterSetExt
                       "0002 6D01"),    // length, extension
         .build = [](MbxContext* context, const MbxOptions* options,
                     MbxAvcCBox* box) { return MbxBuildAvcC(context, options, &kAvcConfig, box); },
         .write = MbxWriteAvcCBox,
         .free = MbxFreeAvcC}),
    RegisterBox<MbxHvcCBox>(
        {.name = "HvcC",
         .code = "hvcC",
         .parents = "hvc1",
         .clause = "ISO/IEC 14496-15 8.3.3.1",
         .presence = Presence::kMandatory,
         .golden = Hex("00000031 'hvcC'"
                       "01"            // configurationVersion
                       "62"            // general_profile_space 1, tier 1, profile 2
                       "20000000"      // general_profile_compatibility_flags
                       "B00000000000"  // general_constraint_indicator_flags
                       "5D"            // general_level_idc
                       "F123"          // reserved, min_spatial_segmentation_idc
                       "FE"            // reserved, parallelismType
                       "FD"            // reserved, chromaFormat
                       "FA"            // reserved, bitDepthLumaMinus8
                       "FB"            // reserved, bitDepthChromaMinus8
                       "1900"          // avgFrameRate
                       "5F"            // constantFrameRate 1, layers 3, nested 1, length size 3
                       "02"            // numOfArrays
                       "A0 0001"       // array_completeness 1, type 32, numNalus
                       "0003 400102"   // length, NAL unit
                       "21 0002"       // array_completeness 0, type 33, numNalus
                       "0002 4201"     // length, NAL unit
                       "0001 42"),     // length, NAL unit
         .build = [](MbxContext* context, const MbxOptions* options,
                     MbxHvcCBox* box) { return MbxBuildHvcC(context, options, &kHvcParams, box); },
         .write = MbxWriteHvcCBox,
         .free = MbxFreeHvcC}),
};

class CodecConfigTest : public EntryTest {
 protected:
    MbxStatus buildAvcC(const MbxAvcConfig* config) {
        return BuildStatus<MbxAvcCBox>(
            context, [&](MbxAvcCBox* box) { return MbxBuildAvcC(context, &options, config, box); },
            MbxFreeAvcC);
    }

    MbxStatus buildHvcC(const MbxHvcCParams* params) {
        return BuildStatus<MbxHvcCBox>(
            context, [&](MbxHvcCBox* box) { return MbxBuildHvcC(context, &options, params, box); },
            MbxFreeHvcC);
    }

    Bytes writeAvcC(const MbxAvcConfig* config) {
        return WriteBuiltBox<MbxAvcCBox>(
            context, &options, [&](MbxAvcCBox* box) { return MbxBuildAvcC(context, &options, config, box); },
            MbxWriteAvcCBox, MbxFreeAvcC);
    }

    Bytes writeHvcC(const MbxHvcCParams* params) {
        return WriteBuiltBox<MbxHvcCBox>(
            context, &options, [&](MbxHvcCBox* box) { return MbxBuildHvcC(context, &options, params, box); },
            MbxWriteHvcCBox, MbxFreeHvcC);
    }

    // `count` records, linked in order.
    template <typename Record>
    static MbxList<Record> link(std::vector<Record>* records) {
        for (size_t i = 0; i + 1 < records->size(); i++) (*records)[i].next = &(*records)[i + 1];
        return {records->data(), &records->back()};
    }
};

TEST_F(CodecConfigTest, AvcCWithoutExtensionEndsBehindThePictureParameterSets) {
    MbxSampleEntry* entry = add(MBX_ENTRY_AVC1);
    ASSERT_EQ(MbxEntrySetAvcConfig(context, entry, &kAvcValues), MBX_OK);
    ASSERT_EQ(MbxEntryAddAvcSps(context, entry, kSpsBytes, sizeof(kSpsBytes)), MBX_OK);
    ASSERT_EQ(MbxEntryAddAvcPps(context, entry, kPpsBytes, sizeof(kPpsBytes)), MBX_OK);
    ASSERT_EQ(MbxEntryAddAvcPps(context, entry, kPpsBytes, 1), MBX_OK);
    EXPECT_BYTES(writeAvcC(entry->visual.avcConfig), Hex("0000001C 'avcC'"
                                                         "01 42 C0 1E FF"
                                                         "E1 0004 6742001E"
                                                         "02 0002 68CE 0001 68"));
}

TEST_F(CodecConfigTest, ThirtyOneSpsPassAndThirtyTwoOverflowAtBuildNotWhenAdded) {
    MbxSampleEntry* entry = add(MBX_ENTRY_AVC1);
    ASSERT_EQ(MbxEntrySetAvcConfig(context, entry, &kAvcValues), MBX_OK);
    for (int i = 0; i < 31; i++) ASSERT_EQ(MbxEntryAddAvcSps(context, entry, kSpsBytes, 1), MBX_OK);
    const Bytes written = writeAvcC(entry->visual.avcConfig);
    ASSERT_EQ(written.size(), 8 + 6 + 31 * 3 + 1U);
    EXPECT_EQ(written[13], 0xFF);  // reserved bits and 31
    ASSERT_EQ(MbxEntryAddAvcSps(context, entry, kSpsBytes, 1), MBX_OK);
    EXPECT_EQ(buildAvcC(entry->visual.avcConfig), MBX_ERR_OVERFLOW);
}

TEST_F(CodecConfigTest, PictureParameterSetsAbove255OverflowAtBuild) {
    std::vector<MbxParameterSet> sets(255, kPps);
    MbxAvcConfig config = {kAvcValues, {}, link(&sets), {}};
    EXPECT_EQ(buildAvcC(&config), MBX_OK);
    sets.push_back(kPps);
    config.pictureSets = link(&sets);
    EXPECT_EQ(buildAvcC(&config), MBX_ERR_OVERFLOW);
}

TEST_F(CodecConfigTest, ExtensionsAbove255OverflowAtBuildAndCountOnlyWithTheExtension) {
    std::vector<MbxParameterSet> sets(255, kExt);
    MbxAvcConfig config = {kAvcExtended, {}, {}, link(&sets)};
    EXPECT_EQ(buildAvcC(&config), MBX_OK);
    sets.push_back(kExt);
    config.sequenceExtensions = link(&sets);
    EXPECT_EQ(buildAvcC(&config), MBX_ERR_OVERFLOW);
    config.values.hasExtension = 0;
    EXPECT_EQ(buildAvcC(&config), MBX_OK);
}

TEST_F(CodecConfigTest, ParameterSetLengthNeedsToFitSixteenBits) {
    Bytes bytes(65535, 0x67);
    MbxParameterSet set = {{bytes.data(), bytes.size()}, nullptr};
    const MbxAvcConfig config = {kAvcValues, {&set, &set}, {}, {}};
    EXPECT_EQ(writeAvcC(&config).size(), 8 + 6 + 2 + 65535 + 1U);
    bytes.push_back(0);
    set.bytes = {bytes.data(), bytes.size()};
    EXPECT_EQ(buildAvcC(&config), MBX_ERR_INTERNAL);
}

TEST_F(CodecConfigTest, SetAvcConfigRefusesValuesOutOfRange) {
    MbxSampleEntry* entry = add(MBX_ENTRY_AVC1);
    MbxAvcConfigParams params = kAvcExtended;
    params.lengthSizeMinusOne = 4;
    EXPECT_EQ(MbxEntrySetAvcConfig(context, entry, &params), MBX_ERR_INVALID_ARG);
    params = kAvcExtended;
    params.chroma_format = 4;
    EXPECT_EQ(MbxEntrySetAvcConfig(context, entry, &params), MBX_ERR_INVALID_ARG);
    params = kAvcExtended;
    params.bit_depth_luma_minus8 = 8;
    EXPECT_EQ(MbxEntrySetAvcConfig(context, entry, &params), MBX_ERR_INVALID_ARG);
    params = kAvcExtended;
    params.bit_depth_chroma_minus8 = 8;
    EXPECT_EQ(MbxEntrySetAvcConfig(context, entry, &params), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(entry->visual.avcConfig, nullptr);
    params = {1, 2, 3, 4, 3, 1, 3, 7, 7};
    EXPECT_EQ(MbxEntrySetAvcConfig(context, entry, &params), MBX_OK);
}

TEST_F(CodecConfigTest, SetAvcConfigReadsTheExtensionOnlyWhenThereIsOne) {
    MbxSampleEntry* entry = add(MBX_ENTRY_AVC1);
    const MbxAvcConfigParams params = {1, 2, 3, 4, 3, 0, 99, 99, 99};
    EXPECT_EQ(MbxEntrySetAvcConfig(context, entry, &params), MBX_OK);
}

TEST_F(CodecConfigTest, SetAvcConfigOverwritesTheValuesAndKeepsTheSets) {
    MbxSampleEntry* entry = add(MBX_ENTRY_AVC1);
    ASSERT_EQ(MbxEntrySetAvcConfig(context, entry, &kAvcExtended), MBX_OK);
    ASSERT_EQ(MbxEntryAddAvcSps(context, entry, kSpsBytes, sizeof(kSpsBytes)), MBX_OK);
    ASSERT_EQ(MbxEntrySetAvcConfig(context, entry, &kAvcValues), MBX_OK);
    EXPECT_BYTES(writeAvcC(entry->visual.avcConfig), Hex("00000015 'avcC'"
                                                         "01 42 C0 1E FF"
                                                         "E1 0004 6742001E"
                                                         "00"));
}

TEST_F(CodecConfigTest, AvcOperationsRefuseEntriesOfAnotherKind) {
    for (uint32_t kind = 1; kind <= 12; kind++) {
        if (kind == MBX_ENTRY_AVC1) continue;
        MbxSampleEntry* entry = add(kind);
        EXPECT_EQ(MbxEntrySetAvcConfig(context, entry, &kAvcValues), MBX_ERR_BAD_STATE) << kind;
        EXPECT_EQ(MbxEntryAddAvcSps(context, entry, kSpsBytes, 1), MBX_ERR_BAD_STATE) << kind;
        EXPECT_EQ(MbxEntryAddAvcPps(context, entry, kPpsBytes, 1), MBX_ERR_BAD_STATE) << kind;
    }
}

TEST_F(CodecConfigTest, ParameterSetsNeedTheConfigurationFirst) {
    MbxSampleEntry* avc = add(MBX_ENTRY_AVC1);
    EXPECT_EQ(MbxEntryAddAvcSps(context, avc, kSpsBytes, 1), MBX_ERR_BAD_STATE);
    EXPECT_EQ(MbxEntryAddAvcPps(context, avc, kPpsBytes, 1), MBX_ERR_BAD_STATE);
    MbxSampleEntry* hevc = add(MBX_ENTRY_HVC1);
    EXPECT_EQ(MbxEntryAddHvcNalUnit(context, hevc, 32, 1, kVpsBytes, 1), MBX_ERR_BAD_STATE);
}

TEST_F(CodecConfigTest, NullArgumentsAndLengthsWithoutAPointerAreRefused) {
    MbxSampleEntry* entry = add(MBX_ENTRY_AVC1);
    EXPECT_EQ(MbxEntrySetAvcConfig(nullptr, entry, &kAvcValues), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxEntrySetAvcConfig(context, nullptr, &kAvcValues), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxEntrySetAvcConfig(context, entry, nullptr), MBX_ERR_INVALID_ARG);
    ASSERT_EQ(MbxEntrySetAvcConfig(context, entry, &kAvcValues), MBX_OK);
    EXPECT_EQ(MbxEntryAddAvcSps(context, nullptr, kSpsBytes, 1), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxEntryAddAvcSps(context, entry, nullptr, 1), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxEntryAddAvcPps(nullptr, entry, kPpsBytes, 1), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxEntryAddAvcPps(context, entry, nullptr, 1), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(entry->visual.avcConfig->sequenceSets.first, nullptr);
    EXPECT_EQ(entry->visual.avcConfig->pictureSets.first, nullptr);

    MbxSampleEntry* hevc = add(MBX_ENTRY_HVC1);
    EXPECT_EQ(MbxEntrySetHvcConfig(context, nullptr, &kHvcValues), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxEntrySetHvcConfig(context, hevc, nullptr), MBX_ERR_INVALID_ARG);
    ASSERT_EQ(MbxEntrySetHvcConfig(context, hevc, &kHvcValues), MBX_OK);
    EXPECT_EQ(MbxEntryAddHvcNalUnit(context, nullptr, 32, 1, kVpsBytes, 1), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxEntryAddHvcNalUnit(context, hevc, 32, 1, nullptr, 1), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(hevc->visual.hvcConfig->arrays.first, nullptr);
}

TEST_F(CodecConfigTest, BuildersRefuseNullArguments) {
    MbxAvcCBox avc = {};
    EXPECT_EQ(MbxBuildAvcC(nullptr, &options, &kAvcConfig, &avc), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxBuildAvcC(context, nullptr, &kAvcConfig, &avc), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxBuildAvcC(context, &options, nullptr, &avc), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxBuildAvcC(context, &options, &kAvcConfig, nullptr), MBX_ERR_INVALID_ARG);
    MbxHvcCBox hevc = {};
    EXPECT_EQ(MbxBuildHvcC(context, &options, nullptr, &hevc), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxBuildHvcC(context, &options, &kHvcParams, nullptr), MBX_ERR_INVALID_ARG);
}

TEST_F(CodecConfigTest, RefusedAllocationLeavesTheConfigurationAsItWas) {
    MbxSampleEntry* entry = add(MBX_ENTRY_AVC1);
    host.failAllocation = host.allocations + 1;
    EXPECT_EQ(MbxEntrySetAvcConfig(context, entry, &kAvcValues), MBX_ERR_NO_MEMORY);
    EXPECT_EQ(entry->visual.avcConfig, nullptr);
    ASSERT_EQ(MbxEntrySetAvcConfig(context, entry, &kAvcValues), MBX_OK);
    for (uint64_t n = 1; n <= 2; n++) {
        host.failAllocation = host.allocations + n;
        EXPECT_EQ(MbxEntryAddAvcSps(context, entry, kSpsBytes, 4), MBX_ERR_NO_MEMORY) << n;
        EXPECT_EQ(entry->visual.avcConfig->sequenceSets.first, nullptr);
    }
    MbxSampleEntry* hevc = add(MBX_ENTRY_HVC1);
    ASSERT_EQ(MbxEntrySetHvcConfig(context, hevc, &kHvcValues), MBX_OK);
    for (uint64_t n = 1; n <= 3; n++) {
        host.failAllocation = host.allocations + n;
        EXPECT_EQ(MbxEntryAddHvcNalUnit(context, hevc, 32, 1, kVpsBytes, 3), MBX_ERR_NO_MEMORY) << n;
        EXPECT_EQ(hevc->visual.hvcConfig->arrays.first, nullptr);
    }
}

TEST_F(CodecConfigTest, HvcNalUnitsAreGroupedByTypeInOrderOfFirstUse) {
    MbxSampleEntry* entry = add(MBX_ENTRY_HVC1);
    ASSERT_EQ(MbxEntrySetHvcConfig(context, entry, &kHvcValues), MBX_OK);
    ASSERT_EQ(MbxEntryAddHvcNalUnit(context, entry, 32, 1, kVpsBytes, 3), MBX_OK);
    ASSERT_EQ(MbxEntryAddHvcNalUnit(context, entry, 33, 1, kHevcSpsBytes, 2), MBX_OK);
    ASSERT_EQ(MbxEntryAddHvcNalUnit(context, entry, 33, 0, kShortBytes, 1),
              MBX_OK);  // the last completeness holds
    const Bytes written = writeHvcC(entry->visual.hvcConfig);
    ASSERT_EQ(written.size(), 0x31U);
    EXPECT_BYTES(Bytes(written.begin() + 30, written.end()), Hex("02"
                                                                 "A0 0001 0003 400102"
                                                                 "21 0002 0002 4201 0001 42"));
}

TEST_F(CodecConfigTest, SetHvcConfigOverwritesTheValuesAndKeepsTheArrays) {
    MbxSampleEntry* entry = add(MBX_ENTRY_HVC1);
    ASSERT_EQ(MbxEntrySetHvcConfig(context, entry, &kHvcValues), MBX_OK);
    ASSERT_EQ(MbxEntryAddHvcNalUnit(context, entry, 32, 1, kVpsBytes, 3), MBX_OK);
    MbxHvcCValues values = kHvcValues;
    values.general_level_idc = 120;
    ASSERT_EQ(MbxEntrySetHvcConfig(context, entry, &values), MBX_OK);
    const Bytes written = writeHvcC(entry->visual.hvcConfig);
    ASSERT_EQ(written.size(), 8 + 23 + 8U);
    EXPECT_EQ(written[20], 120);
    EXPECT_EQ(written[30], 1);  // numOfArrays
}

TEST_F(CodecConfigTest, SetHvcConfigRefusesValuesWiderThanTheirFields) {
    MbxSampleEntry* entry = add(MBX_ENTRY_HVC1);
    const auto refused = [&](auto member, uint16_t value) {
        MbxHvcCValues values = kHvcValues;
        values.*member = static_cast<std::remove_reference_t<decltype(values.*member)>>(value);
        return MbxEntrySetHvcConfig(context, entry, &values) == MBX_ERR_INVALID_ARG;
    };
    EXPECT_TRUE(refused(&MbxHvcCValues::general_profile_space, 4));
    EXPECT_TRUE(refused(&MbxHvcCValues::general_tier_flag, 2));
    EXPECT_TRUE(refused(&MbxHvcCValues::general_profile_idc, 32));
    EXPECT_TRUE(refused(&MbxHvcCValues::min_spatial_segmentation_idc, 0x1000));
    EXPECT_TRUE(refused(&MbxHvcCValues::parallelismType, 4));
    EXPECT_TRUE(refused(&MbxHvcCValues::chromaFormat, 4));
    EXPECT_TRUE(refused(&MbxHvcCValues::bitDepthLumaMinus8, 8));
    EXPECT_TRUE(refused(&MbxHvcCValues::bitDepthChromaMinus8, 8));
    EXPECT_TRUE(refused(&MbxHvcCValues::constantFrameRate, 4));
    EXPECT_TRUE(refused(&MbxHvcCValues::numTemporalLayers, 8));
    EXPECT_TRUE(refused(&MbxHvcCValues::temporalIdNested, 2));
    EXPECT_TRUE(refused(&MbxHvcCValues::lengthSizeMinusOne, 4));
    EXPECT_EQ(entry->visual.hvcConfig, nullptr);
    const MbxHvcCValues widest = {255,   3, 1, 31, UINT32_MAX, 0xFFFFFFFFFFFF, 255, 0xFFF, 3, 3, 7, 7,
                                  65535, 3, 7, 1,  3};
    EXPECT_EQ(MbxEntrySetHvcConfig(context, entry, &widest), MBX_OK);
}

TEST_F(CodecConfigTest, ConstraintFlagsAreWrittenInTheirLow48Bits) {
    MbxSampleEntry* entry = add(MBX_ENTRY_HVC1);
    MbxHvcCValues values = kHvcValues;
    values.general_constraint_indicator_flags = 0xFFFF112233445566;
    ASSERT_EQ(MbxEntrySetHvcConfig(context, entry, &values), MBX_OK);
    const Bytes written = writeHvcC(entry->visual.hvcConfig);
    ASSERT_EQ(written.size(), 31U);
    EXPECT_BYTES(Bytes(written.begin() + 14, written.begin() + 20), Hex("112233445566"));
}

TEST_F(CodecConfigTest, HvcOperationsRefuseOtherKindsAndValuesOutOfRange) {
    MbxSampleEntry* avc = add(MBX_ENTRY_AVC1);
    EXPECT_EQ(MbxEntrySetHvcConfig(context, avc, &kHvcValues), MBX_ERR_BAD_STATE);
    EXPECT_EQ(MbxEntryAddHvcNalUnit(context, avc, 32, 1, kVpsBytes, 1), MBX_ERR_BAD_STATE);
    MbxSampleEntry* hevc = add(MBX_ENTRY_HVC1);
    ASSERT_EQ(MbxEntrySetHvcConfig(context, hevc, &kHvcValues), MBX_OK);
    EXPECT_EQ(MbxEntryAddHvcNalUnit(context, hevc, 64, 1, kVpsBytes, 1), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxEntryAddHvcNalUnit(context, hevc, 32, 2, kVpsBytes, 1), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxEntryAddHvcNalUnit(context, hevc, 63, 1, kVpsBytes, 1), MBX_OK);
}

TEST_F(CodecConfigTest, HvcCCountsThatTheirFieldsCannotCarryOverflowAtBuild) {
    std::vector<MbxHvcCArray> arrays(255, MbxHvcCArray{0, 1, {}, nullptr});
    MbxHvcCParams params = {kHvcValues, link(&arrays)};
    EXPECT_EQ(buildHvcC(&params), MBX_OK);
    arrays.push_back({0, 1, {}, nullptr});
    params.arrays = link(&arrays);
    EXPECT_EQ(buildHvcC(&params), MBX_ERR_OVERFLOW);

    std::vector<MbxParameterSet> units(65535, kHevcSps2);
    MbxHvcCArray array = {0, 33, link(&units), nullptr};
    params.arrays = {&array, &array};
    EXPECT_EQ(buildHvcC(&params), MBX_OK);
    units.push_back(kHevcSps2);
    array.nalUnits = link(&units);
    EXPECT_EQ(buildHvcC(&params), MBX_ERR_OVERFLOW);
}

TEST_F(CodecConfigTest, FreesNullAndRefusesANullContext) {
    EXPECT_EQ(MbxFreeAvcConfig(context, nullptr), MBX_OK);
    EXPECT_EQ(MbxFreeAvcConfig(nullptr, nullptr), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxFreeHvcConfig(context, nullptr), MBX_OK);
    EXPECT_EQ(MbxFreeHvcConfig(nullptr, nullptr), MBX_ERR_INVALID_ARG);
}

}  // namespace
