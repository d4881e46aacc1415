#include "boxlib/entry/audio_entry.h"

#include "boxlib/support/entry_fixture.h"

namespace {

MbxSratParams kSrat = {96000};
MbxDac3Params kDac3 = {};
MbxDec3Params kDec3 = {};
MbxDdtsParams kDdts = {};
MbxFcfgParams kFcfg = {};
uint8_t kRawEsds[] = {0xE5};
MbxEsdsValues kEsds = {1, 0, 0, 0, 0, 0, 0, {}, BufferOf(kRawEsds)};
uint8_t kProtection[] = {0x9A};
MbxSinfParams kSinf = {nullptr, nullptr, nullptr, BufferOf(kProtection), nullptr};
uint8_t kTail[] = {0xAA, 0xBB};

// As the constructor leaves it: three fields are given, the sample rate is not.
MbxSampleEntry bareEntry() {
    MbxSampleEntry entry = {};
    entry.kind = MBX_ENTRY_MP4A;
    entry.code = MbxCode("mp4a");
    entry.dataReferenceIndex = 1;
    entry.audio.fieldsSet = 14;
    entry.audio.params = {1, 2, 16};
    return entry;
}

MbxSampleEntry fullEntry() {
    MbxSampleEntry entry = bareEntry();
    entry.audio.srat = &kSrat;
    entry.audio.ddts = &kDdts;
    entry.audio.dac3 = &kDac3;
    entry.audio.dec3 = &kDec3;
    entry.audio.fcfg = &kFcfg;
    entry.esds = &kEsds;
    entry.sinf = {&kSinf, &kSinf};
    return entry;
}

const MbxSampleEntry kFull = fullEntry();

// The 28 bytes of the body, from the version on.
Bytes body(const std::string& version, const std::string& sampleRate) {
    return Hex("000000000000"    // reserved
               "0001") +         // data_reference_index
           Hex(version) +        // entry_version
           Hex("0000 0000 0000"  // reserved
               "0002"            // channelcount
               "0010"            // samplesize
               "0000 0000") +    // pre_defined, reserved
           Hex(sampleRate);      // samplerate
}

const BoxRegistration kRows[] = {
    RegisterBox<MbxAudioEntryBox>(
        {.name = "AudioEntry",
         .code = "mp4a",
         .parents = "stsd",
         .clause = "ISO/IEC 14496-12 12.2.3",
         .presence = Presence::kMandatory,
         .golden = Hex("0000008C 'mp4a'") + body("0001", "BB800000") +
                   Hex("00000010 'srat' 00000000 00017700"
                       "0000000D 'esds' 00000000 E5"
                       "0000001C 'ddts' 00000000 00000000 00000000 00 000000000000 00"
                       "0000000B 'dac3' 000000"
                       "0000000D 'dec3' 00000000 00"
                       "0000000E 'fcfg' 00000000 0000"
                       "00000009 'sinf' 9A"),
         .build =
             [](MbxContext* context, const MbxOptions* options, MbxAudioEntryBox* box) {
                 return MbxBuildAudioEntry(context, options, 48000, 1, &kFull, box);
             },
         .write = MbxWriteAudioEntryBox,
         .free = MbxFreeAudioEntry}),
};

class AudioEntryTest : public BoxTest {
 protected:
    Bytes write(const MbxSampleEntry& entry, uint32_t timescale, uint32_t version) {
        return WriteBuiltBox<MbxAudioEntryBox>(
            context, &options,
            [&](MbxAudioEntryBox* box) {
                return MbxBuildAudioEntry(context, &options, timescale, version, &entry, box);
            },
            MbxWriteAudioEntryBox, MbxFreeAudioEntry);
    }

    MbxStatus build(const MbxSampleEntry& entry, uint32_t timescale) {
        return BuildStatus<MbxAudioEntryBox>(
            context,
            [&](MbxAudioEntryBox* box) {
                return MbxBuildAudioEntry(context, &options, timescale, 0, &entry, box);
            },
            MbxFreeAudioEntry);
    }
};

TEST_F(AudioEntryTest, TimescaleOf48000WritesTheSampleRateBB800000) {
    MbxSampleEntry entry = bareEntry();
    entry.esds = &kEsds;
    EXPECT_BYTES(write(entry, 48000, 0),
                 Hex("00000031 'mp4a'") + body("0000", "BB800000") + Hex("0000000D 'esds' 00000000 E5"));
}

TEST_F(AudioEntryTest, TimescaleAbove65535WithoutASampleRateIsABadState) {
    const MbxSampleEntry entry = bareEntry();
    EXPECT_BYTES(write(entry, 65535, 0), Hex("00000024 'mp4a'") + body("0000", "FFFF0000"));
    EXPECT_EQ(build(entry, 65536), MBX_ERR_BAD_STATE);
    EXPECT_EQ(build(entry, 96000), MBX_ERR_BAD_STATE);
}

TEST_F(AudioEntryTest, ExplicitSampleRateIsWrittenWhateverTheTimescale) {
    MbxSampleEntry entry = bareEntry();
    entry.audio.fieldsSet |= MBX_AUDIO_SAMPLE_RATE;
    entry.audio.sampleRate = 0x12345678;
    EXPECT_BYTES(write(entry, 96000, 0), Hex("00000024 'mp4a'") + body("0000", "12345678"));
}

TEST_F(AudioEntryTest, RawTailStandsInPlaceOfAllChildren) {
    MbxSampleEntry entry = kFull;
    entry.rawTail = BufferOf(kTail);
    EXPECT_BYTES(write(entry, 48000, 0), Hex("00000026 'mp4a'") + body("0000", "BB800000") + Hex("AABB"));
}

TEST_F(AudioEntryTest, ChildThatIsSetTwiceIsABrokenInvariant) {
    MbxAudioEntryBox* box = nullptr;
    ASSERT_EQ(MbxNew(context, &box), MBX_OK);
    ASSERT_EQ(MbxBuildAudioEntry(context, &options, 48000, 0, &kFull, box), MBX_OK);
    EXPECT_EQ(MbxBuildAudioEntry(context, &options, 48000, 0, &kFull, box), MBX_ERR_INTERNAL);
    EXPECT_EQ(MbxFreeAudioEntry(context, box), MBX_OK);
}

TEST_F(AudioEntryTest, BuilderRefusesNullArguments) {
    MbxAudioEntryBox box = {};
    EXPECT_EQ(MbxBuildAudioEntry(nullptr, &options, 48000, 0, &kFull, &box), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxBuildAudioEntry(context, nullptr, 48000, 0, &kFull, &box), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxBuildAudioEntry(context, &options, 48000, 0, nullptr, &box), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxBuildAudioEntry(context, &options, 48000, 0, &kFull, nullptr), MBX_ERR_INVALID_ARG);
}

}  // namespace
