#include "boxlib/entry/elementary_stream.h"

#include "boxlib/support/entry_fixture.h"

namespace {

uint8_t kAacLc[] = {0x11, 0x90};
const MbxEsdsValues kAac = {0, 0x40, 5, 0, 1536, 128000, 125376, BufferOf(kAacLc), {}};

constexpr MbxBtrtParams kBtrt = {0x01020304, 128000, 125376};

const BoxRegistration kRows[] = {
    RegisterBox<MbxEsdsBox>(
        {.name = "Esds",
         .code = "esds",
         .parents = "mp4v avc1 hvc1 mp4a and entries of kind 4",
         .clause = "ISO/IEC 14496-14 5.6",
         .presence = Presence::kOptional,
         .golden = Hex("00000027 'esds'"
                       "00000000"  // version, flags
                       "03 19"     // ES_Descriptor, 25 bytes
                       "0000"      // ES_ID
                       "00"        // no dependence, URL or clock; priority 0
                       "04 11"     // DecoderConfigDescriptor, 17 bytes
                       "40"        // objectTypeIndication
                       "15000600"  // streamType 5, upStream 0, reserved 1, bufferSizeDB
                       "0001F400"  // maxBitrate
                       "0001E9C0"  // avgBitrate
                       "05 02"     // DecoderSpecificInfo, 2 bytes
                       "1190"      // AAC LC, 48 kHz, stereo
                       "06 01"     // SLConfigDescriptor, 1 byte
                       "02"),      // predefined
         .build = [](MbxContext* context, const MbxOptions* options,
                     MbxEsdsBox* box) { return MbxBuildEsds(context, options, &kAac, box); },
         .write = MbxWriteEsdsBox,
         .free = MbxFreeEsds}),
    RegisterBox<MbxBtrtBox>(
        {.name = "Btrt",
         .code = "btrt",
         .parents = "entries of kind 10",
         .clause = "ISO/IEC 14496-12 8.5.2.2",
         .presence = Presence::kOptional,
         .golden = Hex("00000014 'btrt'"
                       "01020304"    // bufferSizeDB
                       "0001F400"    // maxBitrate
                       "0001E9C0"),  // avgBitrate
         .build = [](MbxContext* context, const MbxOptions* options,
                     MbxBtrtBox* box) { return MbxBuildBtrt(context, options, &kBtrt, box); },
         .write = MbxWriteBtrtBox,
         .free = MbxFreeBtrt}),
};

class ElementaryStreamTest : public EntryTest {
 protected:
    Bytes writeEsds(const MbxEsdsValues* values) {
        return WriteBuiltBox<MbxEsdsBox>(
            context, &options, [&](MbxEsdsBox* box) { return MbxBuildEsds(context, &options, values, box); },
            MbxWriteEsdsBox, MbxFreeEsds);
    }

    MbxStatus buildEsds(const MbxEsdsValues* values) {
        return BuildStatus<MbxEsdsBox>(
            context, [&](MbxEsdsBox* box) { return MbxBuildEsds(context, &options, values, box); },
            MbxFreeEsds);
    }

    static MbxEsdsParams fields() {
        MbxEsdsParams params = {};
        params.objectTypeIndication = 0x40;
        params.streamType = 5;
        params.bufferSizeDB = 1536;
        params.maxBitrate = 128000;
        params.avgBitrate = 125376;
        params.decoderSpecificInfo = kAacLc;
        params.decoderSpecificInfoSize = sizeof(kAacLc);
        return params;
    }

    MbxStatus setEsds(const MbxEsdsParams& params) {
        return MbxEntrySetEsds(context, add(MBX_ENTRY_MP4A), &params);
    }
};

TEST_F(ElementaryStreamTest, NoDecoderSpecificInfoGivesNoTag5) {
    MbxEsdsValues values = kAac;
    values.decoderSpecificInfo = {};
    EXPECT_BYTES(writeEsds(&values), Hex("00000023 'esds' 00000000"
                                         "03 15 0000 00"
                                         "04 0D 40 15000600 0001F400 0001E9C0"
                                         "06 01 02"));
}

TEST_F(ElementaryStreamTest, StreamWordHoldsTheWidestValues) {
    MbxEsdsValues values = kAac;
    values.streamType = 63;
    values.upStream = 1;
    values.bufferSizeDB = 0xFFFFFF;
    const Bytes written = writeEsds(&values);
    ASSERT_EQ(written.size(), 0x27U);
    EXPECT_BYTES(Bytes(written.begin() + 20, written.begin() + 24), Hex("FFFFFFFF"));
    values.upStream = 0;
    values.streamType = 0;
    values.bufferSizeDB = 0;
    const Bytes zero = writeEsds(&values);
    EXPECT_BYTES(Bytes(zero.begin() + 20, zero.begin() + 24), Hex("01000000"));
}

TEST_F(ElementaryStreamTest, LongDecoderSpecificInfoTakesTwoSizeBytesInEveryDescriptorAroundIt) {
    Bytes info(128, 0xAB);
    MbxEsdsValues values = kAac;
    values.decoderSpecificInfo = {info.data(), info.size()};
    // Tag 5 holds 128 bytes, tag 4 holds 13 + 3 + 128 = 144, tag 3 holds 3 + 3 + 144 + 3 = 153.
    EXPECT_BYTES(writeEsds(&values), Hex("000000A8 'esds' 00000000"
                                         "03 8119 0000 00"
                                         "04 8110 40 15000600 0001F400 0001E9C0"
                                         "05 8100") +
                                         info + Hex("06 01 02"));
}

TEST_F(ElementaryStreamTest, RawFormWritesItsBytesAsTheyAre) {
    uint8_t raw[] = {0x03, 0x80, 0x01, 0xFF};
    MbxEsdsValues values = kAac;
    values.form = 1;
    values.raw = BufferOf(raw);
    EXPECT_BYTES(writeEsds(&values), Hex("00000010 'esds' 00000000 038001FF"));
    values.raw = {};
    EXPECT_BYTES(writeEsds(&values), Hex("0000000C 'esds' 00000000"));
}

TEST_F(ElementaryStreamTest, UnknownFormIsABrokenInvariant) {
    MbxEsdsValues values = kAac;
    values.form = 2;
    EXPECT_EQ(buildEsds(&values), MBX_ERR_INTERNAL);
    MbxEsdsParams params = fields();
    params.form = 2;
    EXPECT_EQ(setEsds(params), MBX_ERR_INTERNAL);
}

TEST_F(ElementaryStreamTest, DescriptorThatNeedsMoreThanFourSizeBytesOverflows) {
    // Only measured, so that the bytes are never read.
    MbxEsdsValues values = kAac;
    values.decoderSpecificInfo.size = (1U << 28) - 1;
    EXPECT_EQ(buildEsds(&values), MBX_ERR_OVERFLOW);  // the descriptors around it exceed the limit
    values.decoderSpecificInfo.size = (1U << 28) - 64;
    EXPECT_EQ(buildEsds(&values), MBX_OK);
}

TEST_F(ElementaryStreamTest, SetEsdsCopiesTheValuesAndTheirBytes) {
    MbxSampleEntry* entry = add(MBX_ENTRY_MP4A);
    uint8_t info[] = {0x11, 0x90};
    MbxEsdsParams params = fields();
    params.decoderSpecificInfo = info;
    ASSERT_EQ(MbxEntrySetEsds(context, entry, &params), MBX_OK);
    info[0] = 0;
    EXPECT_BYTES(writeEsds(entry->esds), Hex("00000027 'esds' 00000000 03190000 00041140 15000600"
                                             "0001F400 0001E9C0 05021190 060102"));
}

TEST_F(ElementaryStreamTest, SetEsdsAgainReplacesTheParameters) {
    MbxSampleEntry* entry = add(MBX_ENTRY_MP4V);
    MbxEsdsParams params = fields();
    ASSERT_EQ(MbxEntrySetEsds(context, entry, &params), MBX_OK);
    const uint8_t raw[] = {0xAA};
    params.form = 1;
    params.raw = raw;
    params.rawSize = 1;
    ASSERT_EQ(MbxEntrySetEsds(context, entry, &params), MBX_OK);
    EXPECT_BYTES(writeEsds(entry->esds), Hex("0000000D 'esds' 00000000 AA"));
}

TEST_F(ElementaryStreamTest, SetEsdsRefusesValuesOutOfRange) {
    MbxEsdsParams params = fields();
    params.streamType = 64;
    EXPECT_EQ(setEsds(params), MBX_ERR_INVALID_ARG);
    params = fields();
    params.upStream = 2;
    EXPECT_EQ(setEsds(params), MBX_ERR_INVALID_ARG);
    params = fields();
    params.bufferSizeDB = 0x1000000;
    EXPECT_EQ(setEsds(params), MBX_ERR_INVALID_ARG);
    params = fields();
    params.decoderSpecificInfo = nullptr;
    EXPECT_EQ(setEsds(params), MBX_ERR_INVALID_ARG);
    params = {};
    params.form = 1;
    params.rawSize = 1;
    EXPECT_EQ(setEsds(params), MBX_ERR_INVALID_ARG);
    params = fields();
    params.streamType = 63;
    params.upStream = 1;
    params.bufferSizeDB = 0xFFFFFF;
    params.decoderSpecificInfo = nullptr;
    params.decoderSpecificInfoSize = 0;
    EXPECT_EQ(setEsds(params), MBX_OK);
}

TEST_F(ElementaryStreamTest, SetEsdsIsForKinds1And3And4) {
    const MbxEsdsParams params = fields();
    for (uint32_t kind = 1; kind <= 12; kind++) {
        const bool taken = kind == 1 || kind == 3 || kind == 4;
        EXPECT_EQ(MbxEntrySetEsds(context, add(kind), &params), taken ? MBX_OK : MBX_ERR_BAD_STATE) << kind;
    }
}

TEST_F(ElementaryStreamTest, SetEsdsRefusesSoundThatHasARawTailOrAnotherCodec) {
    const MbxEsdsParams params = fields();
    MbxSampleEntry* entry = add(MBX_ENTRY_MP4A);
    assign(&entry->rawTail, Hex("00"));
    EXPECT_EQ(MbxEntrySetEsds(context, entry, &params), MBX_ERR_BAD_STATE);
    entry = add(MBX_ENTRY_MP4A);
    give(&entry->audio.ddts, MbxDdtsParams{});
    EXPECT_EQ(MbxEntrySetEsds(context, entry, &params), MBX_ERR_BAD_STATE);
    entry = add(MBX_ENTRY_MP4A);
    give(&entry->audio.dac3, MbxDac3Params{});
    EXPECT_EQ(MbxEntrySetEsds(context, entry, &params), MBX_ERR_BAD_STATE);
    entry = add(MBX_ENTRY_MP4A);
    give(&entry->audio.dec3, MbxDec3Params{});
    EXPECT_EQ(MbxEntrySetEsds(context, entry, &params), MBX_ERR_BAD_STATE);
    entry = add(MBX_ENTRY_MP4A);
    give(&entry->audio.fcfg, MbxFcfgParams{});
    EXPECT_EQ(MbxEntrySetEsds(context, entry, &params), MBX_ERR_BAD_STATE);
    entry = add(MBX_ENTRY_MP4A);
    give(&entry->audio.srat, MbxSratParams{});
    EXPECT_EQ(MbxEntrySetEsds(context, entry, &params), MBX_OK);
}

TEST_F(ElementaryStreamTest, SetEsdsRefusesNullArguments) {
    const MbxEsdsParams params = fields();
    MbxSampleEntry* entry = add(MBX_ENTRY_MP4A);
    EXPECT_EQ(MbxEntrySetEsds(nullptr, entry, &params), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxEntrySetEsds(context, nullptr, &params), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxEntrySetEsds(context, entry, nullptr), MBX_ERR_INVALID_ARG);
}

TEST_F(ElementaryStreamTest, SetEsdsThatRunsOutOfMemoryKeepsTheOldOne) {
    MbxSampleEntry* entry = add(MBX_ENTRY_MP4A);
    MbxEsdsParams params = fields();
    ASSERT_EQ(MbxEntrySetEsds(context, entry, &params), MBX_OK);
    const MbxEsdsValues* before = entry->esds;
    for (uint64_t n = 1; n <= 2; n++) {
        host.failAllocation = host.allocations + n;
        EXPECT_EQ(MbxEntrySetEsds(context, entry, &params), MBX_ERR_NO_MEMORY) << n;
        EXPECT_EQ(entry->esds, before);
    }
}

TEST_F(ElementaryStreamTest, BuildersRefuseNullArguments) {
    MbxEsdsBox esds = {};
    EXPECT_EQ(MbxBuildEsds(nullptr, &options, &kAac, &esds), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxBuildEsds(context, nullptr, &kAac, &esds), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxBuildEsds(context, &options, nullptr, &esds), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxBuildEsds(context, &options, &kAac, nullptr), MBX_ERR_INVALID_ARG);
    MbxBtrtBox btrt = {};
    EXPECT_EQ(MbxBuildBtrt(context, &options, nullptr, &btrt), MBX_ERR_INVALID_ARG);
}

}  // namespace
