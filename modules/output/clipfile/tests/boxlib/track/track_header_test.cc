#include "boxlib/track/track_header.h"

#include "boxlib/support/registry.h"

namespace {

constexpr MbxTrackHeader kHeader = {.fieldsSet = MBX_TRACK_ID,
                                    .flags = 7,
                                    .creationTime = 0x01020304,
                                    .modificationTime = 0x05060708,
                                    .trackId = 3,
                                    .duration = 99,
                                    .layer = -1,
                                    .alternateGroup = 2,
                                    .volume = 0x0100,
                                    .matrix = {0x00010000, 0, 0, 0, 0x00010000, 0, 0, 0, 0x40000000},
                                    .width = 0x07800000,
                                    .height = 0x04388000};

const MbxTrack* track() {
    static const MbxTrack instance = [] {
        static MbxSampleSegment segment = {};
        segment.decodeDuration = 48000;
        MbxTrack made = {};
        made.header = kHeader;
        made.mediaHeader.timescale = 48000;
        made.segments = {&segment, &segment};
        return made;
    }();
    return &instance;
}

MbxEdit kSecondEdit = {100, -1, 1, 0, nullptr};
MbxEdit kFirstEdit = {50, 7, 1, 0x4000, &kSecondEdit};
const MbxEditList kEdits = {{&kFirstEdit, &kSecondEdit}};

MbxReferenceTarget kSecondTarget = {0x0000F800, nullptr};
MbxReferenceTarget kFirstTarget = {1, &kSecondTarget};
MbxReferenceTarget kOtherTarget = {2, nullptr};
MbxReferenceGroup kHint = {MbxCode("hint"), {&kOtherTarget, &kOtherTarget}, nullptr};
MbxReferenceGroup kCdsc = {MbxCode("cdsc"), {&kFirstTarget, &kSecondTarget}, &kHint};
const MbxList<MbxReferenceGroup> kGroups = {&kCdsc, &kHint};

const Bytes kMatrix =
    Hex("00010000 00000000 00000000  00000000 00010000 00000000  00000000 00000000 40000000");

const Bytes kTkhd = Hex("0000005C 'tkhd'"
                        "00 000007"          // version, flags
                        "01020304"           // creation_time
                        "05060708"           // modification_time
                        "00000003"           // track_ID
                        "00000000"           // reserved
                        "000003E8"           // duration: 1 s of a movie of 1000 ticks
                        "00000000 00000000"  // reserved
                        "FFFF"               // layer
                        "0002"               // alternate_group
                        "0100"               // volume
                        "0000") +            // reserved
                    kMatrix +                // matrix
                    Hex("07800000"           // width
                        "04388000");         // height

const Bytes kElst =
    Hex("00000028 'elst'"
        "00 000000"    // version, flags
        "00000002"     // entry_count
        "00000032"     // segment_duration
        "00000007"     // media_time
        "0001 4000"    // media_rate
        "00000064"     // segment_duration
        "FFFFFFFF"     // media_time
        "0001 0000");  // media_rate

const Bytes kCdscBytes =
    Hex("00000010 'cdsc'"
        "00000001"  // track_IDs
        "0000F800");

const BoxRegistration kRows[] = {
    RegisterBox<MbxTkhdBox>({.name = "Tkhd",
                             .code = "tkhd",
                             .parents = "trak",
                             .clause = "ISO/IEC 14496-12 8.3.2",
                             .presence = Presence::kMandatory,
                             .golden = kTkhd,
                             .build =
                                 [](MbxContext* context, const MbxOptions* options, MbxTkhdBox* box) {
                                     const MbxTrackInMovie inMovie = {track(), 1000};
                                     return MbxBuildTkhd(context, options, &inMovie, box);
                                 },
                             .write = MbxWriteTkhdBox,
                             .free = MbxFreeTkhd}),
    RegisterBox<MbxEdtsBox>(
        {.name = "Edts",
         .code = "edts",
         .parents = "trak",
         .clause = "ISO/IEC 14496-12 8.6.5",
         .presence = Presence::kOptional,
         .golden = Hex("00000030 'edts'") + kElst,
         .build = [](MbxContext* context, const MbxOptions* options,
                     MbxEdtsBox* box) { return MbxBuildEdts(context, options, &kEdits, box); },
         .write = MbxWriteEdtsBox,
         .free = MbxFreeEdts}),
    RegisterBox<MbxElstBox>(
        {.name = "Elst",
         .code = "elst",
         .parents = "edts",
         .clause = "ISO/IEC 14496-12 8.6.6",
         .presence = Presence::kMandatory,
         .golden = kElst,
         .build = [](MbxContext* context, const MbxOptions* options,
                     MbxElstBox* box) { return MbxBuildElst(context, options, &kEdits, box); },
         .write = MbxWriteElstBox,
         .free = MbxFreeElst}),
    RegisterBox<MbxTrefBox>(
        {.name = "Tref",
         .code = "tref",
         .parents = "trak",
         .clause = "ISO/IEC 14496-12 8.3.3",
         .presence = Presence::kOptional,
         .golden = Hex("00000024 'tref'") + kCdscBytes + Hex("0000000C 'hint' 00000002"),
         .build = [](MbxContext* context, const MbxOptions* options,
                     MbxTrefBox* box) { return MbxBuildTref(context, options, &kGroups, box); },
         .write = MbxWriteTrefBox,
         .free = MbxFreeTref}),
    RegisterBox<MbxTrefGroupBox>(
        {.name = "TrefGroup",
         .code = "cdsc",
         .parents = "tref",
         .clause = "ISO/IEC 14496-12 8.3.3",
         .presence = Presence::kMandatory,
         .golden = kCdscBytes,
         .build = [](MbxContext* context, const MbxOptions* options,
                     MbxTrefGroupBox* box) { return MbxBuildTrefGroup(context, options, &kCdsc, box); },
         .write = MbxWriteTrefGroupBox,
         .free = MbxFreeTrefGroup}),
};

class TrackHeaderTest : public BoxTest {
 protected:
    void SetUp() override {
        BoxTest::SetUp();
        own.header = kHeader;
        own.mediaHeader.timescale = 48000;
        own.segments = {&segment, &segment};
        own.editList = &editList;
    }

    MbxStatus compute(uint32_t movieTimescale) {
        const MbxTrackInMovie inMovie = {&own, movieTimescale};
        return MbxComputeTrackDuration(&inMovie, &result);
    }

    MbxSampleSegment segment = {};
    MbxEditList editList = {};
    MbxTrack own = {};
    uint64_t result = 7;
};

TEST_F(TrackHeaderTest, Version1HasWideTimes) {
    options.time_version_mode = 3;
    MbxTkhdBox box = {};
    const MbxTrackInMovie inMovie = {track(), 1000};
    ASSERT_EQ(MbxBuildTkhd(context, &options, &inMovie, &box), MBX_OK);
    EXPECT_EQ(MbxWriteTkhdBox(context, &options, &file, 0, &box, nullptr, nullptr), MBX_OK);
    EXPECT_BYTES(file.bytes,
                 Hex("00000068 'tkhd' 01 000007 0000000001020304 0000000005060708 00000003 00000000"
                     "00000000000003E8 00000000 00000000 FFFF 0002 0100 0000") +
                     kMatrix + Hex("07800000 04388000"));
}

TEST_F(TrackHeaderTest, FlagsAbove24BitsAreRefused) {
    const MbxTrackInMovie inMovie = {&own, 1000};
    MbxTkhdBox box = {};
    own.header.flags = 0xFFFFFF;
    ASSERT_EQ(MbxBuildTkhd(context, &options, &inMovie, &box), MBX_OK);
    EXPECT_EQ(MbxWriteTkhdBox(context, &options, &file, 0, &box, nullptr, nullptr), MBX_OK);
    EXPECT_BYTES(Bytes(file.bytes.begin() + 8, file.bytes.begin() + 12), Hex("00 FFFFFF"));
    own.header.flags = 0x1000000;
    EXPECT_EQ(MbxBuildTkhd(context, &options, &inMovie, &box), MBX_ERR_INVALID_ARG);
}

TEST_F(TrackHeaderTest, GivenDurationIsNotComputed) {
    own.header.fieldsSet |= MBX_TRACK_DURATION;
    segment.decodeDuration = UINT64_MAX;
    own.mediaHeader.timescale = 1;
    MbxTkhdBox box = {};
    const MbxTrackInMovie inMovie = {&own, 90000};
    ASSERT_EQ(MbxBuildTkhd(context, &options, &inMovie, &box), MBX_OK);
    EXPECT_EQ(box.values.duration, 99U);
}

TEST_F(TrackHeaderTest, DurationWithoutEditsIsTheMediaRescaledAndTruncated) {
    segment.firstDecodeTime = 1000;
    segment.decodeDuration = 1024 * 3 + 1;
    EXPECT_EQ(compute(90000), MBX_OK);
    EXPECT_EQ(result, 7636U);  // 4073 * 90000 / 48000 = 7636.875: the decode time reached
    own.segments = {};
    EXPECT_EQ(compute(90000), MBX_OK);
    EXPECT_EQ(result, 0U);
}

TEST_F(TrackHeaderTest, DurationTakesTheGivenMediaDuration) {
    own.mediaHeader.fieldsSet = MBX_MEDIA_DURATION;
    own.mediaHeader.duration = 96000;
    segment.decodeDuration = 1;
    EXPECT_EQ(compute(1000), MBX_OK);
    EXPECT_EQ(result, 2000U);
}

TEST_F(TrackHeaderTest, DurationWithEditsIsTheirSum) {
    MbxEdit second = {UINT64_MAX - 50, 0, 1, 0, nullptr};
    MbxEdit first = {50, 0, 1, 0, &second};
    editList.edits = {&first, &second};
    EXPECT_EQ(compute(1000), MBX_OK);
    EXPECT_EQ(result, UINT64_MAX);
    first.segmentDuration = 51;
    EXPECT_EQ(compute(1000), MBX_ERR_OVERFLOW);
    EXPECT_EQ(result, UINT64_MAX);
}

TEST_F(TrackHeaderTest, DurationBeyond64BitsOverflows) {
    segment.decodeDuration = UINT64_MAX;
    EXPECT_EQ(compute(48001), MBX_ERR_OVERFLOW);
    EXPECT_EQ(compute(48000), MBX_OK);
    EXPECT_EQ(result, UINT64_MAX);
    segment.firstDecodeTime = 1;
    EXPECT_EQ(compute(48000), MBX_ERR_OVERFLOW);
}

TEST_F(TrackHeaderTest, EditListOfVersion1HasWideFields) {
    options.time_version_mode = 1;
    MbxEdit edit = {1ULL << 32, -2, 1, 0, nullptr};
    editList.edits = {&edit, &edit};
    MbxElstBox box = {};
    ASSERT_EQ(MbxBuildElst(context, &options, &editList, &box), MBX_OK);
    EXPECT_EQ(MbxWriteElstBox(context, &options, &file, 0, &box, nullptr, nullptr), MBX_OK);
    EXPECT_BYTES(file.bytes,
                 Hex("00000024 'elst' 01000000 00000001 0000000100000000 FFFFFFFFFFFFFFFE 0001 0000"));
}

TEST_F(TrackHeaderTest, EditListOfVersion0CutsWhatTheChooserLetPass) {
    MbxEdit edit = {0x123456789, 5, 1, 0, nullptr};
    editList.edits = {&edit, &edit};
    MbxElstBox box = {};
    ASSERT_EQ(MbxBuildElst(context, &options, &editList, &box), MBX_OK);
    EXPECT_EQ(MbxWriteElstBox(context, &options, &file, 0, &box, nullptr, nullptr), MBX_OK);
    EXPECT_BYTES(file.bytes, Hex("0000001C 'elst' 00000000 00000001 23456789 00000005 0001 0000"));
}

TEST_F(TrackHeaderTest, EditListTakesItsVersionInEachModeAtTheEdge) {
    constexpr uint64_t kWide = 1ULL << 32;
    constexpr int64_t kLate = 1LL << 31;
    constexpr int kRefused = -1;
    struct Case {
        uint64_t firstDuration, secondDuration;
        int64_t firstTime, secondTime;
        int version[4];  // by mode
    };
    for (const Case& c :
         {Case{kWide - 1, 0, kLate - 1, -kLate, {0, 0, 0, 1}}, Case{kWide, kWide, 0, 0, {0, 1, 0, 1}},
          Case{0, 0, kLate, -kLate - 1, {0, 1, 0, 1}}, Case{kWide, 0, kLate, 0, {kRefused, 1, kRefused, 1}},
          Case{0, kWide, -kLate - 1, 0, {kRefused, 1, kRefused, 1}}}) {
        MbxEdit second = {c.secondDuration, c.secondTime, 1, 0, nullptr};
        MbxEdit first = {c.firstDuration, c.firstTime, 1, 0, &second};
        editList.edits = {&first, &second};
        for (uint32_t mode = 0; mode < 4; mode++) {
            SCOPED_TRACE(testing::Message()
                         << "mode " << mode << ", edits " << c.firstDuration << " " << c.firstTime << ", "
                         << c.secondDuration << " " << c.secondTime);
            options.time_version_mode = mode;
            MbxElstBox box = {};
            const MbxStatus status = MbxBuildElst(context, &options, &editList, &box);
            EXPECT_EQ(status, c.version[mode] == kRefused ? MBX_ERR_BAD_STATE : MBX_OK);
            if (status != MBX_OK) continue;
            MemoryFile target;
            EXPECT_EQ(MbxWriteElstBox(context, &options, &target, 0, &box, nullptr, nullptr), MBX_OK);
            ASSERT_EQ(target.bytes.size(), c.version[mode] == 1 ? 56U : 40U);
            EXPECT_EQ(target.bytes[8], c.version[mode]);
        }
    }
}

TEST_F(TrackHeaderTest, HolderWithoutAnEditIsWrittenAsAnEmptyList) {
    MbxEdtsBox* box = nullptr;
    ASSERT_EQ(MbxNew(context, &box), MBX_OK);
    ASSERT_EQ(MbxBuildEdts(context, &options, &editList, box), MBX_OK);
    EXPECT_EQ(MbxWriteEdtsBox(context, &options, &file, 0, box, nullptr, nullptr), MBX_OK);
    EXPECT_BYTES(file.bytes, Hex("00000018 'edts' 00000010 'elst' 00000000 00000000"));
    EXPECT_EQ(MbxFreeEdts(context, box), MBX_OK);
}

TEST_F(TrackHeaderTest, ReferenceGroupWithoutATypeIsABrokenInvariant) {
    const MbxReferenceGroup group = {0, {&kOtherTarget, &kOtherTarget}, nullptr};
    MbxTrefGroupBox box = {};
    EXPECT_EQ(MbxBuildTrefGroup(context, &options, &group, &box), MBX_ERR_INTERNAL);
}

TEST_F(TrackHeaderTest, UnknownVersionModeIsABrokenInvariant) {
    options.time_version_mode = 4;
    MbxTkhdBox tkhd = {};
    MbxElstBox elst = {};
    const MbxTrackInMovie inMovie = {track(), 1000};
    EXPECT_EQ(MbxBuildTkhd(context, &options, &inMovie, &tkhd), MBX_ERR_INTERNAL);
    EXPECT_EQ(MbxBuildElst(context, &options, &kEdits, &elst), MBX_ERR_INTERNAL);
}

}  // namespace
