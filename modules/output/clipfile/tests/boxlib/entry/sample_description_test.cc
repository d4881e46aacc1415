#include "boxlib/entry/sample_description.h"

#include "boxlib/support/entry_fixture.h"

namespace {

// One entry of each kind. It owns nothing, so that it lives as long as the test program.
struct EntryOfEachKind {
    uint8_t nul[1] = {0};
    MbxAvcConfig avc = {{1, 0x42, 0xC0, 0x1E, 3, 0, 0, 0, 0}, {}, {}, {}};
    MbxHvcCParams hevc = {};
    Mbx3stpParams step = {0, 2, {}};
    MbxSampleEntry entries[12] = {};
    MbxSampleEntryList list = {};

    EntryOfEachKind() {
        const uint32_t codes[12] = {MbxCode("mp4v"), MbxCode("avc1"), MbxCode("mp4a"), MbxCode("mp4s"),
                                    MbxCode("pla5"), MbxCode("rtmd"), MbxCode("pla7"), MbxCode("gra8"),
                                    MbxCode("gra9"), MbxCode("text"), MbxCode("hvc1"), MbxCode("tmcd")};
        for (uint32_t i = 0; i < 12; i++) {
            entries[i].kind = i + 1;
            entries[i].code = codes[i];
            entries[i].dataReferenceIndex = 1;
            MbxListAppend(&list.entries, &entries[i]);
        }
        entries[1].visual.avcConfig = &avc;
        entries[2].audio.fieldsSet = 14;
        entries[2].audio.params = {1, 2, 16};
        entries[8].graphics.step = &step;
        entries[9].text.texts[0] = {nul, 1};
        entries[10].visual.hvcConfig = &hevc;
        list.version = 1;
    }
};

EntryOfEachKind kEntries;

const std::string kHead = "000000000000 0001";  // reserved, data_reference_index

// The rest of a visual body of no size and resolution, with that name.
std::string visualBody(const std::string& name) {
    return kHead + std::string(2 * 16, '0')  // pre_defined, reserved, pre_defined
           + "0000 0000"                     // width, height
           + "00000000 00000000"             // horizresolution, vertresolution
           + "00000000 0001"                 // reserved, frame_count
           + name + "0018 FFFF";             // compressorname, depth, pre_defined
}

// 16 + 86 + 101 + 36 + 16 + 20 + 16 + 20 + 40 + 49 + 17 + 117 + 34 bytes
const std::string kGolden = std::string(
                                "00000238 'stsd'"
                                "01 000000"    // version, flags
                                "0000000C") +  // entry_count
                            "00000056 'mp4v'" +
                            visualBody(std::string(64, '0')) +                                              //
                            "00000065 'avc1'" + visualBody("0A 'AVC Coding'" + std::string(2 * 21, '0')) +  //
                            "0000000F 'avcC' 01 42 C0 1E FF E0 00" +                                        //
                            "00000024 'mp4a'" + kHead + "0001 000000000000 0002 0010 00000000 BB800000" +   //
                            "00000010 'mp4s'" + kHead +                                                     //
                            "00000014 'pla5'" + kHead + "00000000" +                                        //
                            "00000010 'rtmd'" + kHead +                                                     //
                            "00000014 'pla7'" + kHead + "00000000" +                                        //
                            "00000028 'gra8'" + kHead + std::string(2 * 24, '0') +                          //
                            "00000031 'gra9'" + kHead + std::string(2 * 24, '0') +                          //
                            "00000009 '3STP' 02" +                                                          //
                            "00000011 'text'" + kHead + "00" +                                              //
                            "00000075 'hvc1'" +
                            visualBody("0B 'HEVC Coding'" + std::string(2 * 20, '0')) +                     //
                            "0000001F 'hvcC' 00 00 00000000 000000000000 00 F000 FC FC F8 F8 0000 00 00" +  //
                            "00000022 'tmcd'" + kHead + std::string(2 * 18, '0');

const BoxRegistration kRows[] = {
    RegisterBox<MbxStsdBox>(
        {.name = "Stsd",
         .code = "stsd",
         .parents = "stbl MTSM",
         .clause = "ISO/IEC 14496-12 8.5.2",
         .presence = Presence::kMandatory,
         .golden = Hex(kGolden),
         .build = [](MbxContext* context, const MbxOptions* options,
                     MbxStsdBox* box) { return MbxBuildStsd(context, options, 48000, &kEntries.list, box); },
         .write = MbxWriteStsdBox,
         .free = MbxFreeStsd}),
};

class SampleDescriptionTest : public EntryTest {
 protected:
    Bytes write(uint32_t timescale) {
        return WriteBuiltBox<MbxStsdBox>(
            context, &options,
            [&](MbxStsdBox* box) { return MbxBuildStsd(context, &options, timescale, &list, box); },
            MbxWriteStsdBox, MbxFreeStsd);
    }

    MbxStatus build(uint32_t timescale) {
        return BuildStatus<MbxStsdBox>(
            context, [&](MbxStsdBox* box) { return MbxBuildStsd(context, &options, timescale, &list, box); },
            MbxFreeStsd);
    }
};

TEST_F(SampleDescriptionTest, WithoutEntriesTheCountIsZero) {
    EXPECT_BYTES(write(0), Hex("00000010 'stsd' 00000000 00000000"));
}

TEST_F(SampleDescriptionTest, Version1GivesAudioEntriesVersion1AndChangesNothingInVisualOnes) {
    add(MBX_ENTRY_MP4V);
    add(MBX_ENTRY_MP4A);
    const Bytes version0 = write(48000);
    list.version = 1;
    const Bytes version1 = write(48000);
    Bytes expected = version0;
    expected[8] = 1;                      // version of `stsd`
    expected[16 + 0x56 + 8 + 8 + 1] = 1;  // low byte of the version in `mp4a`, behind `mp4v`
    EXPECT_BYTES(version1, expected);
}

TEST_F(SampleDescriptionTest, OtherVersionsOfTheListCountAsZero) {
    list.version = 2;
    EXPECT_BYTES(write(0), Hex("00000010 'stsd' 00000000 00000000"));
}

TEST_F(SampleDescriptionTest, SampleRateComesFromTheTimescaleOfTheTrack) {
    add(MBX_ENTRY_MP4A);
    const Bytes written = write(44100);
    ASSERT_EQ(written.size(), 16 + 0x24U);
    EXPECT_BYTES(Bytes(written.end() - 4, written.end()), Hex("AC440000"));
    EXPECT_EQ(build(96000), MBX_ERR_BAD_STATE);
}

TEST_F(SampleDescriptionTest, StatusOfAnEntryIsPassedOn) {
    add(MBX_ENTRY_MP4V);
    add(MBX_ENTRY_AVC1);  // without its configuration
    EXPECT_EQ(build(0), MBX_ERR_BAD_STATE);
}

TEST_F(SampleDescriptionTest, EveryDispatcherRefusesAnUnknownKind) {
    add(MBX_ENTRY_MP4V);
    add(MBX_ENTRY_PLAIN)->kind = 13;
    EXPECT_EQ(build(0), MBX_ERR_INTERNAL);

    MbxStsdBox* box = nullptr;
    ASSERT_EQ(MbxNew(context, &box), MBX_OK);
    MbxSampleEntryBox* unknown = nullptr;
    ASSERT_EQ(MbxNew(context, &unknown), MBX_OK);
    unknown->kind = 13;
    MbxListAppend(&box->entries, unknown);
    EXPECT_EQ(MbxWriteStsdBox(context, &options, &file, 0, box, nullptr, nullptr), MBX_ERR_INTERNAL);
    EXPECT_EQ(MbxFreeStsd(context, box), MBX_ERR_INTERNAL);
    EXPECT_EQ(MbxFreeStsd(context, box), MBX_OK);  // the entry is gone
}

TEST_F(SampleDescriptionTest, BuilderRefusesNullArguments) {
    MbxStsdBox box = {};
    EXPECT_EQ(MbxBuildStsd(nullptr, &options, 0, &list, &box), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxBuildStsd(context, nullptr, 0, &list, &box), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxBuildStsd(context, &options, 0, nullptr, &box), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxBuildStsd(context, &options, 0, &list, nullptr), MBX_ERR_INVALID_ARG);
}

}  // namespace
