#include "boxlib/entry/sample_entry.h"

#include "boxlib/entry/codec_config.h"
#include "boxlib/entry/elementary_stream.h"
#include "boxlib/model/protection_model.h"
#include "boxlib/support/entry_fixture.h"

namespace {

class SampleEntryTest : public EntryTest {
 protected:
    static Bytes bytes(const MbxBuffer& buffer) { return Bytes(buffer.data, buffer.data + buffer.size); }

    static MbxSampleEntryRequest request(uint32_t kind) {
        MbxSampleEntryRequest made = {};
        made.kind = kind;
        made.code = MbxCode("code");
        made.dataReferenceIndex = 3;
        return made;
    }
};

TEST_F(SampleEntryTest, IndexIsTheNewNumberOfEntries) {
    for (uint32_t kind = 1; kind <= 12; kind++) {
        const MbxSampleEntryRequest wanted = request(kind);
        uint32_t index = 0;
        ASSERT_EQ(MbxAddSampleEntry(context, &list, &wanted, &index), MBX_OK);
        EXPECT_EQ(index, kind);
        EXPECT_EQ(list.entries.last->kind, kind);
        EXPECT_EQ(list.entries.last->dataReferenceIndex, 3U);
    }
}

TEST_F(SampleEntryTest, KindOutsideTheTableIsABrokenInvariant) {
    uint32_t index = 77;
    for (const uint32_t kind : {0U, 13U, UINT32_MAX}) {
        const MbxSampleEntryRequest wanted = request(kind);
        EXPECT_EQ(MbxAddSampleEntry(context, &list, &wanted, &index), MBX_ERR_INTERNAL);
    }
    EXPECT_EQ(index, 77U);
    EXPECT_EQ(list.entries.first, nullptr);
}

TEST_F(SampleEntryTest, KindsWithACodeOfTheirOwnIgnoreTheCallers) {
    const std::vector<std::pair<uint32_t, uint32_t>> codes = {
        {1, MbxCode("mp4v")}, {2, MbxCode("avc1")},  {3, MbxCode("mp4a")},  {4, MbxCode("code")},
        {5, MbxCode("code")}, {6, MbxCode("rtmd")},  {7, MbxCode("code")},  {8, MbxCode("code")},
        {9, MbxCode("code")}, {10, MbxCode("code")}, {11, MbxCode("hvc1")}, {12, MbxCode("tmcd")}};
    for (const auto& [kind, code] : codes) EXPECT_EQ(add(request(kind))->code, code) << kind;
}

TEST_F(SampleEntryTest, SoundHasAllFieldsButTheSampleRate) {
    MbxSampleEntryRequest wanted = request(MBX_ENTRY_MP4A);
    wanted.audio = {3, 2, 16};
    const MbxSampleEntry* entry = add(wanted);
    EXPECT_EQ(entry->audio.fieldsSet, 14U);
    EXPECT_EQ(entry->audio.params.channelCount, 2U);
    EXPECT_EQ(entry->audio.params.sampleSize, 16U);
}

TEST_F(SampleEntryTest, EmptyFirstTextStoresANulAndTheOthersAreAsGiven) {
    const MbxSampleEntry* empty = add(request(MBX_ENTRY_TEXT));
    EXPECT_BYTES(bytes(empty->text.texts[0]), Hex("00"));
    EXPECT_BYTES(bytes(empty->text.texts[1]), Hex(""));
    EXPECT_BYTES(bytes(empty->text.texts[2]), Hex(""));

    MbxSampleEntryRequest wanted = request(MBX_ENTRY_TEXT);
    wanted.texts[0] = "abcdef";
    wanted.textSizes[0] = 3;
    wanted.texts[1] = "";
    wanted.textSizes[1] = 1;
    wanted.texts[2] = "xy";
    wanted.textSizes[2] = 3;
    const MbxBtrtParams btrt = {1, 2, 3};
    wanted.btrt = &btrt;
    const MbxSampleEntry* entry = add(wanted);
    EXPECT_BYTES(bytes(entry->text.texts[0]), Hex("'abc' 00"));
    EXPECT_BYTES(bytes(entry->text.texts[1]), Hex("00"));
    EXPECT_BYTES(bytes(entry->text.texts[2]), Hex("'xy' 00"));
    ASSERT_NE(entry->text.btrt, nullptr);
    EXPECT_NE(entry->text.btrt, &btrt);
    EXPECT_EQ(entry->text.btrt->avgBitrate, 3U);
}

TEST_F(SampleEntryTest, TextWithALengthButNoPointerIsRefused) {
    MbxSampleEntryRequest wanted = request(MBX_ENTRY_TEXT);
    wanted.textSizes[1] = 1;
    uint32_t index = 0;
    EXPECT_EQ(MbxAddSampleEntry(context, &list, &wanted, &index), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(list.entries.first, nullptr);
}

TEST_F(SampleEntryTest, GraphicsCopiesItsStep) {
    MbxSampleEntryRequest wanted = request(MBX_ENTRY_GRAPHICS_3D);
    Mbx3stpParams step = {1, 2, {3, 4, 5}};
    wanted.graphics.byte28 = 9;
    wanted.graphics.step = &step;
    const MbxSampleEntry* entry = add(wanted);
    EXPECT_EQ(entry->graphics.byte28, 9U);
    ASSERT_NE(entry->graphics.step, nullptr);
    EXPECT_NE(entry->graphics.step, &step);
    EXPECT_EQ(entry->graphics.step->details[2], 5U);
}

TEST_F(SampleEntryTest, NullArgumentsAreRefused) {
    const MbxSampleEntryRequest wanted = request(1);
    uint32_t index = 0;
    EXPECT_EQ(MbxAddSampleEntry(nullptr, &list, &wanted, &index), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxAddSampleEntry(context, nullptr, &wanted, &index), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxAddSampleEntry(context, &list, nullptr, &index), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxAddSampleEntry(context, &list, &wanted, nullptr), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxReleaseSampleEntries(nullptr, &list), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxReleaseSampleEntries(context, nullptr), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(list.entries.first, nullptr);
}

TEST_F(SampleEntryTest, EveryRefusedAllocationLeavesTheListAsItWas) {
    const MbxBtrtParams btrt = {};
    Mbx3stpParams step = {};
    for (uint32_t kind = 1; kind <= 12; kind++) {
        MbxSampleEntryRequest wanted = request(kind);
        wanted.texts[0] = wanted.texts[1] = wanted.texts[2] = "a";
        wanted.textSizes[0] = wanted.textSizes[1] = wanted.textSizes[2] = 1;
        wanted.btrt = &btrt;
        wanted.graphics.step = &step;
        const MbxSampleEntry* last = list.entries.last;
        uint32_t index = 0;
        MbxStatus status = MBX_ERR_NO_MEMORY;
        for (uint64_t n = 1; status != MBX_OK; n++) {
            ASSERT_LT(n, 10U);
            EXPECT_EQ(status, MBX_ERR_NO_MEMORY);
            EXPECT_EQ(list.entries.last, last);
            const size_t live = host.live.size();
            host.failAllocation = host.allocations + n;
            status = MbxAddSampleEntry(context, &list, &wanted, &index);
            host.failAllocation = 0;
            if (status != MBX_OK) {
                EXPECT_EQ(host.live.size(), live);
            }
        }
        EXPECT_EQ(index, kind);
    }
}

TEST_F(SampleEntryTest, ReleaseTakesEverythingThatAnEntryOwns) {
    MbxSampleEntry* avc = add(request(MBX_ENTRY_AVC1));
    const MbxAvcConfigParams avcParams = {};
    ASSERT_EQ(MbxEntrySetAvcConfig(context, avc, &avcParams), MBX_OK);
    const uint8_t nal[] = {0x67};
    ASSERT_EQ(MbxEntryAddAvcSps(context, avc, nal, 1), MBX_OK);
    assign(&avc->visual.stereo, Hex("01"));
    assign(&avc->visual.restricted, Hex("02"));
    MbxSampleEntry* hevc = add(request(MBX_ENTRY_HVC1));
    const MbxHvcCValues hevcValues = {};
    ASSERT_EQ(MbxEntrySetHvcConfig(context, hevc, &hevcValues), MBX_OK);
    ASSERT_EQ(MbxEntryAddHvcNalUnit(context, hevc, 1, 1, nal, 1), MBX_OK);
    MbxSampleEntry* sound = add(request(MBX_ENTRY_MP4A));
    give(&sound->audio.srat, MbxSratParams{});
    give(&sound->audio.ddts, MbxDdtsParams{});
    give(&sound->audio.dac3, MbxDac3Params{});
    give(&sound->audio.dec3, MbxDec3Params{});
    give(&sound->audio.fcfg, MbxFcfgParams{});
    assign(&sound->rawTail, Hex("03"));
    MbxSinfParams* sinf = nullptr;
    give(&sinf, MbxSinfParams{});
    MbxListAppend(&sound->sinf, sinf);
    MbxSampleEntry* systems = add(request(MBX_ENTRY_SYSTEMS));
    const MbxEsdsParams esds = {};
    ASSERT_EQ(MbxEntrySetEsds(context, systems, &esds), MBX_OK);

    EXPECT_EQ(MbxReleaseSampleEntries(context, &list), MBX_OK);
    EXPECT_EQ(host.live.size(), 1U);  // the context
    EXPECT_EQ(list.entries.first, nullptr);
    EXPECT_EQ(list.entries.last, nullptr);
    EXPECT_EQ(MbxReleaseSampleEntries(context, &list), MBX_OK);
}

}  // namespace
