#include "boxlib/entry/timed_data_entry.h"

#include "boxlib/support/entry_fixture.h"

namespace {

uint8_t kRawEsds[] = {0xE5};
MbxEsdsValues kEsds = {1, 0, 0, 0, 0, 0, 0, {}, BufferOf(kRawEsds)};
uint8_t kProtection[] = {0x9A};
MbxSinfParams kSecondSinf = {nullptr, nullptr, nullptr, {}, nullptr};
MbxSinfParams kFirstSinf = {nullptr, nullptr, nullptr, BufferOf(kProtection), &kSecondSinf};
uint8_t kTail[] = {0xAA, 0xBB};
Mbx3stpParams kStep = {0, 2, {}};
MbxBtrtParams kBtrt = {1, 2, 3};
uint8_t kFirstText[] = {'a', 'b', 0};
uint8_t kNul[] = {0};

MbxSampleEntry bareEntry(uint32_t kind, uint32_t code) {
    MbxSampleEntry entry = {};
    entry.kind = kind;
    entry.code = code;
    entry.dataReferenceIndex = 0x0102;
    return entry;
}

MbxSampleEntry systemsEntry() {
    MbxSampleEntry entry = bareEntry(MBX_ENTRY_SYSTEMS, MbxCode("mp4s"));
    entry.esds = &kEsds;
    return entry;
}

MbxSampleEntry metaEntry() {
    MbxSampleEntry entry = bareEntry(MBX_ENTRY_RTMD, MbxCode("rtmd"));
    entry.sinf = {&kFirstSinf, &kSecondSinf};
    return entry;
}

MbxSampleEntry graphicsEntry(uint32_t kind) {
    MbxSampleEntry entry = bareEntry(kind, MbxCode("grap"));
    entry.graphics = {{0x0A0B, 0x0C0D, 0x0E0F}, {0x10111213, 0x14151617}, {0x1819, 0x1A1B}, 0x1C, &kStep};
    return entry;
}

MbxSampleEntry textEntry() {
    MbxSampleEntry entry = bareEntry(MBX_ENTRY_TEXT, MbxCode("stpp"));
    entry.text = {{BufferOf(kFirstText), BufferOf(kNul), {}}, &kBtrt};
    entry.sinf = {&kSecondSinf, &kSecondSinf};
    return entry;
}

MbxSampleEntry timecodeEntry() {
    MbxSampleEntry entry = bareEntry(MBX_ENTRY_TMCD, MbxCode("tmcd"));
    entry.timecode = {1, 1, 30000, 1001, 30, {}};
    return entry;
}

const MbxSampleEntry kSystems = systemsEntry();
const MbxSampleEntry kPlain = bareEntry(MBX_ENTRY_PLAIN, MbxCode("plai"));
const MbxSampleEntry kMeta = metaEntry();
const MbxSampleEntry kGraphics3d = graphicsEntry(MBX_ENTRY_GRAPHICS_3D);
const MbxSampleEntry kText = textEntry();
const MbxSampleEntry kTimecode = timecodeEntry();

const BoxRegistration kRows[] = {
    RegisterBox<MbxSystemsEntryBox>(
        {.name = "SystemsEntry",
         .code = "mp4s",
         .parents = "stsd",
         .clause = "ISO/IEC 14496-14 5.6",
         .presence = Presence::kMandatory,
         .golden = Hex("0000001D 'mp4s'"
                       "000000000000"  // reserved
                       "0102"          // data_reference_index
                       "0000000D 'esds' 00000000 E5"),
         .build =
             [](MbxContext* context, const MbxOptions* options, MbxSystemsEntryBox* box) {
                 return MbxBuildSystemsEntry(context, options, &kSystems, box);
             },
         .write = MbxWriteSystemsEntryBox,
         .free = MbxFreeSystemsEntry}),
    RegisterBox<MbxPlainEntryBox>(
        {.name = "PlainEntry",
         .code = "plai",
         .parents = "stsd",
         .clause = "ISO/IEC 14496-12 8.5.2",
         .presence = Presence::kMandatory,
         .golden = Hex("00000014 'plai'"
                       "000000000000"  // reserved
                       "0102"          // data_reference_index
                       "00000000"),    // reserved
         .build = [](MbxContext* context, const MbxOptions* options,
                     MbxPlainEntryBox* box) { return MbxBuildPlainEntry(context, options, &kPlain, box); },
         .write = MbxWritePlainEntryBox,
         .free = MbxFreePlainEntry}),
    RegisterBox<MbxMetaEntryBox>(
        {.name = "MetaEntry",
         .code = "rtmd",
         .parents = "stsd",
         .clause = "ISO/IEC 14496-12 8.5.2",
         .presence = Presence::kMandatory,
         .golden = Hex("00000021 'rtmd'"
                       "000000000000"  // reserved
                       "0102"          // data_reference_index
                       "00000009 'sinf' 9A"
                       "00000008 'sinf'"),
         .build = [](MbxContext* context, const MbxOptions* options,
                     MbxMetaEntryBox* box) { return MbxBuildMetaEntry(context, options, &kMeta, box); },
         .write = MbxWriteMetaEntryBox,
         .free = MbxFreeMetaEntry}),
    RegisterBox<MbxGraphicsEntryBox>(
        {.name = "GraphicsEntry",
         .code = "grap",
         .parents = "stsd",
         .clause = "own: graphics entry",
         .presence = Presence::kMandatory,
         .golden = Hex("00000031 'grap'"
                       "000000000000"  // reserved
                       "0102"          // data_reference_index
                       "0A0B 0000"     // at byte 8
                       "0C0D 0E0F"     // at bytes 12, 14
                       "10111213"      // at byte 16
                       "14151617"      // at byte 20
                       "1819 1A1B"     // at bytes 24, 26
                       "1C 000000"     // at byte 28
                       "00000009 '3STP' 02"),
         .build =
             [](MbxContext* context, const MbxOptions* options, MbxGraphicsEntryBox* box) {
                 return MbxBuildGraphicsEntry(context, options, &kGraphics3d, box);
             },
         .write = MbxWriteGraphicsEntryBox,
         .free = MbxFreeGraphicsEntry}),
    RegisterBox<MbxTextEntryBox>(
        {.name = "TextEntry",
         .code = "stpp",
         .parents = "stsd",
         .clause = "ISO/IEC 14496-12 8.5.2",
         .presence = Presence::kMandatory,
         .golden = Hex("00000030 'stpp'"
                       "000000000000"  // reserved
                       "0102"          // data_reference_index
                       "'ab' 00"       // first text
                       "00"            // second text
                       ""              // third text
                       "00000014 'btrt' 00000001 00000002 00000003"
                       "00000008 'sinf'"),
         .build = [](MbxContext* context, const MbxOptions* options,
                     MbxTextEntryBox* box) { return MbxBuildTextEntry(context, options, &kText, box); },
         .write = MbxWriteTextEntryBox,
         .free = MbxFreeTextEntry}),
    RegisterBox<MbxTimecodeEntryBox>(
        {.name = "TimecodeEntry",
         .code = "tmcd",
         .parents = "stsd",
         .clause = "ISO/IEC 14496-12 8.5.2",
         .presence = Presence::kMandatory,
         .golden = Hex("00000022 'tmcd'"
                       "000000000000"  // reserved
                       "0102"          // data_reference_index
                       "00000000"      // reserved
                       "00000001"      // flags
                       "00007530"      // timescale
                       "000003E9"      // frame_duration
                       "1E"            // number_of_frames
                       "00"),          // reserved
         .build =
             [](MbxContext* context, const MbxOptions* options, MbxTimecodeEntryBox* box) {
                 return MbxBuildTimecodeEntry(context, options, &kTimecode, box);
             },
         .write = MbxWriteTimecodeEntryBox,
         .free = MbxFreeTimecodeEntry}),
};

class TimedDataEntryTest : public BoxTest {};

TEST_F(TimedDataEntryTest, SystemsEntryWithoutEsdsIsAHead) {
    const MbxSampleEntry entry = bareEntry(MBX_ENTRY_SYSTEMS, MbxCode("mp4s"));
    EXPECT_BYTES(
        WriteBuiltBox<MbxSystemsEntryBox>(
            context, &options,
            [&](MbxSystemsEntryBox* box) { return MbxBuildSystemsEntry(context, &options, &entry, box); },
            MbxWriteSystemsEntryBox, MbxFreeSystemsEntry),
        Hex("00000010 'mp4s' 000000000000 0102"));
}

TEST_F(TimedDataEntryTest, RawTailOfAMetadataEntryStandsInPlaceOfItsProtection) {
    MbxSampleEntry entry = kMeta;
    entry.rawTail = BufferOf(kTail);
    EXPECT_BYTES(WriteBuiltBox<MbxMetaEntryBox>(
                     context, &options,
                     [&](MbxMetaEntryBox* box) { return MbxBuildMetaEntry(context, &options, &entry, box); },
                     MbxWriteMetaEntryBox, MbxFreeMetaEntry),
                 Hex("00000012 'rtmd' 000000000000 0102 AABB"));
}

TEST_F(TimedDataEntryTest, RawTailOfATimecodeEntryStandsBehindItsBody) {
    MbxSampleEntry entry = kTimecode;
    entry.rawTail = BufferOf(kTail);
    EXPECT_BYTES(
        WriteBuiltBox<MbxTimecodeEntryBox>(
            context, &options,
            [&](MbxTimecodeEntryBox* box) { return MbxBuildTimecodeEntry(context, &options, &entry, box); },
            MbxWriteTimecodeEntryBox, MbxFreeTimecodeEntry),
        Hex("00000024 'tmcd' 000000000000 0102 00000000 00000001 00007530 000003E9 1E 00 AABB"));
}

TEST_F(TimedDataEntryTest, StepIsForKind9Only) {
    const MbxSampleEntry entry = graphicsEntry(MBX_ENTRY_GRAPHICS);
    EXPECT_EQ(
        WriteBuiltBox<MbxGraphicsEntryBox>(
            context, &options,
            [&](MbxGraphicsEntryBox* box) { return MbxBuildGraphicsEntry(context, &options, &entry, box); },
            MbxWriteGraphicsEntryBox, MbxFreeGraphicsEntry)
            .size(),
        40U);
}

TEST_F(TimedDataEntryTest, Kind9WithoutItsStepIsABadStateAtBuild) {
    MbxSampleEntry entry = graphicsEntry(MBX_ENTRY_GRAPHICS_3D);
    entry.graphics.step = nullptr;
    EXPECT_EQ(
        BuildStatus<MbxGraphicsEntryBox>(
            context,
            [&](MbxGraphicsEntryBox* box) { return MbxBuildGraphicsEntry(context, &options, &entry, box); },
            MbxFreeGraphicsEntry),
        MBX_ERR_BAD_STATE);
}

TEST_F(TimedDataEntryTest, BuildersRefuseNullArguments) {
    MbxSystemsEntryBox systems = {};
    EXPECT_EQ(MbxBuildSystemsEntry(context, &options, nullptr, &systems), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxBuildSystemsEntry(nullptr, &options, &kSystems, &systems), MBX_ERR_INVALID_ARG);
    MbxPlainEntryBox plain = {};
    EXPECT_EQ(MbxBuildPlainEntry(context, nullptr, &kPlain, &plain), MBX_ERR_INVALID_ARG);
    MbxMetaEntryBox meta = {};
    EXPECT_EQ(MbxBuildMetaEntry(context, &options, nullptr, &meta), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxBuildGraphicsEntry(context, &options, &kGraphics3d, nullptr), MBX_ERR_INVALID_ARG);
    MbxTextEntryBox text = {};
    EXPECT_EQ(MbxBuildTextEntry(context, &options, nullptr, &text), MBX_ERR_INVALID_ARG);
    MbxTimecodeEntryBox timecode = {};
    EXPECT_EQ(MbxBuildTimecodeEntry(context, &options, nullptr, &timecode), MBX_ERR_INVALID_ARG);
}

}  // namespace
