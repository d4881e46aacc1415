#include "boxlib/entry/visual_entry.h"

#include "boxlib/support/entry_fixture.h"

namespace {

constexpr MbxVisualEntryParams kParams = {2, 1, 1920, 1080, 72, 0, 72, 0x8000};

uint8_t kSpsBytes[] = {0x67, 0x42};
uint8_t kPpsBytes[] = {0x68};
MbxParameterSet kSps = {BufferOf(kSpsBytes), nullptr};
MbxParameterSet kPps = {BufferOf(kPpsBytes), nullptr};
MbxAvcConfig kAvcConfig = {{1, 0x42, 0xC0, 0x1E, 3, 0, 0, 0, 0}, {&kSps, &kSps}, {&kPps, &kPps}, {}};
MbxHvcCParams kHvcConfig = {};

uint8_t kRawEsds[] = {0xE5};
MbxEsdsValues kEsds = {1, 0, 0, 0, 0, 0, 0, {}, BufferOf(kRawEsds)};

uint8_t kStereo[] = {0x5D};
uint8_t kRestricted[] = {0x4F, 0x50};
uint8_t kProtection[] = {0x9A};
MbxSinfParams kSecondSinf = {nullptr, nullptr, nullptr, {}, nullptr};
MbxSinfParams kFirstSinf = {nullptr, nullptr, nullptr, BufferOf(kProtection), &kSecondSinf};

// An entry that owns nothing, so that it need not be released.
MbxSampleEntry bareEntry(uint32_t kind, uint32_t code) {
    MbxSampleEntry entry = {};
    entry.kind = kind;
    entry.code = code;
    entry.dataReferenceIndex = 1;
    entry.visual.params = kParams;
    return entry;
}

MbxSampleEntry fullEntry() {
    MbxSampleEntry entry = bareEntry(MBX_ENTRY_AVC1, MbxCode("avc1"));
    entry.visual.avcConfig = &kAvcConfig;
    entry.visual.stereo = BufferOf(kStereo);
    entry.visual.restricted = BufferOf(kRestricted);
    entry.esds = &kEsds;
    entry.sinf = {&kFirstSinf, &kSecondSinf};
    return entry;
}

const MbxSampleEntry kFull = fullEntry();

// The 78 bytes that all three kinds share, but for the name.
Bytes body(const std::string& name) {
    return Hex("000000000000"                // reserved
               "0001"                        // data_reference_index
               "0000 0000"                   // pre_defined, reserved
               "00000000 00000000 00000000"  // pre_defined
               "0780"                        // width
               "0438"                        // height
               "00480000"                    // horizresolution
               "00488000"                    // vertresolution
               "00000000"                    // reserved
               "0001") +                     // frame_count
           Hex(name) +                       // compressorname
           Hex("0018"                        // depth
               "FFFF");                      // pre_defined
}

const BoxRegistration kRows[] = {
    RegisterBox<MbxVisualEntryBox>(
        {.name = "VisualEntry",
         .code = "avc1",
         .parents = "stsd",
         .clause = "ISO/IEC 14496-12 12.1.3",
         .presence = Presence::kMandatory,
         .golden = Hex("000000AD 'avc1'") +
                   body("0A 'AVC Coding' 000000000000000000000000000000000000000000") +
                   Hex("00000016 'avcC' 01 42 C0 1E FF E1 0002 6742 01 0001 68"
                       "0000000D 'esds' 00000000 E5"
                       "00000019 'uuid' 33444453 21D24FCE BB88695C FAC9C740 5D"
                       "0000000A 'rinf' 4F50"
                       "00000009 'sinf' 9A"
                       "00000008 'sinf'"),
         .build = [](MbxContext* context, const MbxOptions* options,
                     MbxVisualEntryBox* box) { return MbxBuildVisualEntry(context, options, &kFull, box); },
         .write = MbxWriteVisualEntryBox,
         .free = MbxFreeVisualEntry}),
};

class VisualEntryTest : public BoxTest {
 protected:
    Bytes write(const MbxSampleEntry& entry) {
        return WriteBuiltBox<MbxVisualEntryBox>(
            context, &options,
            [&](MbxVisualEntryBox* box) { return MbxBuildVisualEntry(context, &options, &entry, box); },
            MbxWriteVisualEntryBox, MbxFreeVisualEntry);
    }

    MbxStatus build(const MbxSampleEntry& entry) {
        return BuildStatus<MbxVisualEntryBox>(
            context,
            [&](MbxVisualEntryBox* box) { return MbxBuildVisualEntry(context, &options, &entry, box); },
            MbxFreeVisualEntry);
    }
};

TEST_F(VisualEntryTest, Mp4vWithoutEsdsIsABodyAndNoChild) {
    const MbxSampleEntry entry = bareEntry(MBX_ENTRY_MP4V, MbxCode("mp4v"));
    EXPECT_BYTES(write(entry), Hex("00000056 'mp4v'") + body(std::string(64, '0')));
}

TEST_F(VisualEntryTest, Mp4vWritesItsDescriptor) {
    MbxSampleEntry entry = bareEntry(MBX_ENTRY_MP4V, MbxCode("mp4v"));
    entry.esds = &kEsds;
    EXPECT_BYTES(write(entry),
                 Hex("00000063 'mp4v'") + body(std::string(64, '0')) + Hex("0000000D 'esds' 00000000 E5"));
}

TEST_F(VisualEntryTest, Mp4vIgnoresAConfigurationOfAnotherKind) {
    MbxSampleEntry entry = bareEntry(MBX_ENTRY_MP4V, MbxCode("mp4v"));
    entry.visual.avcConfig = &kAvcConfig;
    EXPECT_EQ(write(entry).size(), 0x56U);
}

TEST_F(VisualEntryTest, Hvc1NamesItsCoderAndHoldsItsConfiguration) {
    MbxSampleEntry entry = bareEntry(MBX_ENTRY_HVC1, MbxCode("hvc1"));
    entry.visual.hvcConfig = &kHvcConfig;
    EXPECT_BYTES(write(entry), Hex("00000075 'hvc1'") +
                                   body("0B 'HEVC Coding' 0000000000000000000000000000000000000000") +
                                   Hex("0000001F 'hvcC'"
                                       "00 00 00000000 000000000000 00 F000 FC FC F8 F8 0000 00 00"));
}

TEST_F(VisualEntryTest, MissingConfigurationIsABadStateAtBuild) {
    EXPECT_EQ(build(bareEntry(MBX_ENTRY_AVC1, MbxCode("avc1"))), MBX_ERR_BAD_STATE);
    EXPECT_EQ(build(bareEntry(MBX_ENTRY_HVC1, MbxCode("hvc1"))), MBX_ERR_BAD_STATE);
}

TEST_F(VisualEntryTest, KindThatIsNotVisualIsABrokenInvariant) {
    EXPECT_EQ(build(bareEntry(MBX_ENTRY_MP4A, MbxCode("mp4a"))), MBX_ERR_INTERNAL);
    MbxSampleEntry entry = bareEntry(MBX_ENTRY_MP4V, MbxCode("mp4v"));
    MbxVisualEntryBox* box = nullptr;
    ASSERT_EQ(MbxNew(context, &box), MBX_OK);
    ASSERT_EQ(MbxBuildVisualEntry(context, &options, &entry, box), MBX_OK);
    entry.kind = 13;
    EXPECT_EQ(MbxWriteVisualEntryBox(context, &options, &file, 0, box, nullptr, nullptr), MBX_ERR_INTERNAL);
    EXPECT_EQ(MbxFreeVisualEntry(context, box), MBX_OK);
}

TEST_F(VisualEntryTest, ConfigurationThatExistsTwiceIsABrokenInvariant) {
    MbxVisualEntryBox* box = nullptr;
    ASSERT_EQ(MbxNew(context, &box), MBX_OK);
    ASSERT_EQ(MbxBuildVisualEntry(context, &options, &kFull, box), MBX_OK);
    EXPECT_EQ(MbxBuildVisualEntry(context, &options, &kFull, box), MBX_ERR_INTERNAL);
    EXPECT_EQ(MbxFreeVisualEntry(context, box), MBX_OK);
}

TEST_F(VisualEntryTest, BuilderRefusesNullArguments) {
    MbxVisualEntryBox box = {};
    EXPECT_EQ(MbxBuildVisualEntry(nullptr, &options, &kFull, &box), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxBuildVisualEntry(context, nullptr, &kFull, &box), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxBuildVisualEntry(context, &options, nullptr, &box), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxBuildVisualEntry(context, &options, &kFull, nullptr), MBX_ERR_INVALID_ARG);
}

}  // namespace
