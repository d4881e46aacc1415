#include "boxlib/track/track.h"

#include "boxlib/fragment/fragment.h"
#include "boxlib/support/registry.h"
#include "boxlib/support/track_fixture.h"

namespace {

uint8_t kName[] = "";
uint8_t kUsage[] = {0, 0, 0, 1, 0, 0, 0, 0};

// A track with every optional part: references, an edit, user metadata.
const MbxTrack* track() {
    static const MbxTrack instance = [] {
        static MbxReferenceTarget target = {1, nullptr};
        static MbxReferenceGroup group = {MbxCode("cdsc"), {&target, &target}, nullptr};
        static MbxEdit edit = {2000, 0, 1, 0, nullptr};
        static MbxEditList editList = {{&edit, &edit}};
        static MbxDataEntry self = {MbxCode("url "), {}, {}, nullptr};
        static MbxMetadataItem item = {10, 0, 0x55C4, 0, {kUsage, 8}, nullptr};
        MbxTrack made = {};
        made.header = {.fieldsSet = 8,
                       .flags = 7,
                       .creationTime = 0,
                       .modificationTime = 0,
                       .trackId = 2,
                       .duration = 0,
                       .layer = 0,
                       .alternateGroup = 0,
                       .volume = 0,
                       .matrix = {0x00010000, 0, 0, 0, 0x00010000, 0, 0, 0, 0x40000000},
                       .width = 0,
                       .height = 0};
        made.references = {&group, &group};
        made.editList = &editList;
        made.mediaHeader = {20, 0, 0, 90000, 0, 0x15C7};
        made.handler = {MbxCode("meta"), {kName, 1}};
        made.mediaInformation.code = MbxCode("nmhd");
        made.dataEntries = {&self, &self};
        made.userMetadata.items = {&item, &item};
        return made;
    }();
    return &instance;
}

const Bytes kTkhd = Hex("0000005C 'tkhd' 00000007 00000000 00000000 00000002 00000000"
                        "000007D0"  // duration: the edit's
                        "00000000 00000000 0000 0000 0000 0000") +
                    IdentityMatrix() + Hex("00000000 00000000");

// 32 + 33 + 8 + 12 + 36 + 92 bytes in 8
const Bytes kMdia = Hex("000000DD 'mdia'"
                        "00000020 'mdhd' 00000000 00000000 00000000 00015F90 00000000 15C7 0000"
                        "00000021 'hdlr' 00000000 00000000 'meta' 00000000 00000000 00000000 00"
                        "00000094 'minf' 0000000C 'nmhd' 00000000") +
                    SelfDinf() + EmptyStbl();

const BoxRegistration kTrakRow = RegisterBox<MbxTrakBox>(
    {.name = "Trak",
     .code = "trak",
     .parents = "moov",
     .clause = "ISO/IEC 14496-12 8.3.1",
     .presence = Presence::kMandatory,
     // 8 + 92 + 20 + 36 + 221 + 52 bytes
     .golden = Hex("000001AD 'trak'") + kTkhd + Hex("00000014 'tref' 0000000C 'cdsc' 00000001") +
               Hex("00000024 'edts' 0000001C 'elst' 00000000 00000001 000007D0 00000000 0001 0000") + kMdia +
               Hex("00000034 'uuid' 55534D54 21D24FCE BB88695C FAC9C740"
                   "0000001C 'MTDT' 0001 0012 0000000A 55C4 0000 00000001 00 00 0000"),
     .build =
         [](MbxContext* context, const MbxOptions* options, MbxTrakBox* box) {
             const MbxTrackInMovie inMovie = {track(), 1000};
             return MbxBuildTrak(context, options, &inMovie, box);
         },
     .write = MbxWriteTrakBox,
     .free = MbxFreeTrak});

class TrackTest : public MovieTest {};

struct HandlerCase {
    const char* handler;
    const char* name;
    uint64_t nameSize;
    uint32_t flags;
    const char* mediaHeader;
    uint32_t mediaFieldsSet;
    uint32_t timescale;
    bool hasSize;
    int16_t layer;
    uint16_t volume;
    bool hasUsage;
    uint32_t enableMode;
};

// The parameters give timescale 24000, enable_mode 2 and a size of 1920.5 x 1080.25; the movie has 1000.
const HandlerCase kHandlerCases[] = {
    {"vide", "Video Media Handler", 20, 6, "vmhd", 20, 24000, true, 0, 0, true, 2},
    {"soun", "Sound Media Handler", 20, 7, "smhd", 20, 24000, false, 0, 0x0100, true, 1},
    {"subt", "", 1, 7, "sthd", 20, 24000, true, -1, 0, false, 1},
    {"meta", "Timed Metadata Media Handler", 29, 7, "nmhd", 20, 24000, false, 0, 0, true, 16},
    {"tmcd", "Time Code Media Handler", 24, 7, "nmhd", 20, 24000, false, 0, 0, false, 1},
    {"odsm", "ObjectDescriptor Media Handler", 31, 7, "nmhd", 0, 1000, false, 0, 0, true, 1},
    {"BKDT", "Book Media Handler", 19, 7, "nmhd", 16, 1, false, 0, 0, true, 1},
    {"PKDT", "Packed Data Media Handler", 26, 7, "nmhd", 16, 1, false, 0, 0, true, 1},
    {"GRAP", "Graphics Media Handler", 23, 7, "nmhd", 20, 24000, true, -1, 0, true, 8},
};

uint32_t codeOf(const char* text) {
    uint32_t code = 0;
    for (int i = 0; i < 4; i++) code = code << 8 | static_cast<uint8_t>(text[i]);
    return code;
}

MbxTrackParams sizedParams() {
    MbxTrackParams params = TrackParams(1, 24000);
    params.enable_mode = 2;
    params.width = 1920;
    params.widthFraction = 0x8000;
    params.height = 1080;
    params.heightFraction = 0x4000;
    return params;
}

TEST_F(TrackTest, EveryHandlerMakesItsTrack) {
    uint32_t trackId = 100;
    for (const HandlerCase& c : kHandlerCases) {
        SCOPED_TRACE(c.handler);
        MbxTrackParams params = sizedParams();
        params.trackId = trackId++;
        ASSERT_EQ(create(codeOf(c.handler), params), MBX_OK);
        const MbxTrack& made = *last();
        EXPECT_EQ(made.header.fieldsSet, c.hasSize ? 0x3C08U : 8U);
        EXPECT_EQ(made.header.flags, c.flags);
        EXPECT_EQ(made.header.trackId, params.trackId);
        EXPECT_EQ(made.header.layer, c.layer);
        EXPECT_EQ(made.header.alternateGroup, 0);
        EXPECT_EQ(made.header.volume, c.volume);
        EXPECT_EQ(made.header.matrix[0], 0x00010000U);
        EXPECT_EQ(made.header.matrix[4], 0x00010000U);
        EXPECT_EQ(made.header.matrix[8], 0x40000000U);
        EXPECT_EQ(made.header.width, c.hasSize ? 0x07808000U : 0U);
        EXPECT_EQ(made.header.height, c.hasSize ? 0x04384000U : 0U);
        EXPECT_EQ(made.mediaHeader.fieldsSet, c.mediaFieldsSet);
        EXPECT_EQ(made.mediaHeader.timescale, c.timescale);
        EXPECT_EQ(made.mediaHeader.language, std::string(c.handler) == "odsm" ? 0x55C4 : 0x15C7);
        EXPECT_EQ(made.handler.type, codeOf(c.handler));
        EXPECT_EQ(made.handler.name.size, c.nameSize);
        EXPECT_STREQ(reinterpret_cast<const char*>(made.handler.name.data), c.name);
        EXPECT_EQ(made.mediaInformation.code, codeOf(c.mediaHeader));
        EXPECT_NE(made.editList, nullptr);
        ASSERT_EQ(made.userMetadata.items.first != nullptr, c.hasUsage);
        if (c.hasUsage) {
            const MbxMetadataItem& usage = *made.userMetadata.items.first;
            EXPECT_EQ(usage.type, 10U);
            EXPECT_EQ(usage.language, 0x55C4);
            EXPECT_EQ(usage.encoding, 0);
            EXPECT_BYTES(Bytes(usage.data.data, usage.data.data + usage.data.size), Words({c.enableMode, 0}));
        }
    }
    EXPECT_EQ(trackIndex, 9U);
}

TEST_F(TrackTest, EnableModeChoosesTheFlags) {
    const struct {
        uint32_t mode;
        MbxStatus status;
        uint32_t flags;
    } kCases[] = {{0, MBX_OK, 0},
                  {1, MBX_OK, 7},
                  {8, MBX_OK, 7},
                  {16, MBX_OK, 7},
                  {2, MBX_OK, 6},
                  {6, MBX_OK, 6},
                  {UINT32_MAX, MBX_OK, 0},
                  {3, MBX_ERR_INVALID_ARG, 99},
                  {7, MBX_ERR_INVALID_ARG, 99},
                  {UINT32_MAX - 1, MBX_ERR_INVALID_ARG, 99}};
    for (const auto& c : kCases) {
        uint32_t flags = 99;
        EXPECT_EQ(MbxEnableModeFlags(c.mode, &flags), c.status) << c.mode;
        EXPECT_EQ(flags, c.flags) << c.mode;
    }
}

TEST_F(TrackTest, EnableMode3FailsAndEnableMode2IsInMovieAndPreviewButNotEnabled) {
    MbxTrackParams params = TrackParams(1, 1000);
    params.enable_mode = 3;
    EXPECT_EQ(create(MbxCode("vide"), params), MBX_ERR_INVALID_ARG);
    params.enable_mode = 2;
    ASSERT_EQ(create(MbxCode("vide"), params), MBX_OK);
    EXPECT_EQ(last()->header.flags, 6U);  // 2 in movie, 4 in preview, not 1 enabled
}

TEST_F(TrackTest, EnableModeIsReadForVideoAlone) {
    MbxTrackParams params = TrackParams(1, 1000);
    params.enable_mode = 3;
    EXPECT_EQ(create(MbxCode("soun"), params), MBX_OK);
}

TEST_F(TrackTest, ATimescaleOfZeroIsRefusedForEveryHandler) {
    const uint64_t before = host.allocations;
    for (const HandlerCase& c : kHandlerCases) {
        EXPECT_EQ(create(codeOf(c.handler), TrackParams(1, 0)), MBX_ERR_INVALID_ARG) << c.handler;
    }
    EXPECT_EQ(host.allocations, before);
    EXPECT_EQ(movie->tracks.first, nullptr);
}

TEST_F(TrackTest, ATrackAfterTheFirstSealIsBadState) {
    ASSERT_EQ(create(MbxCode("vide"), TrackParams(1, 1000)), MBX_OK);
    ASSERT_EQ(MbxMovieSealFirstFragment(context, movie), MBX_OK);
    const uint64_t before = host.allocations;
    EXPECT_EQ(create(MbxCode("soun"), TrackParams(2, 1000)), MBX_ERR_BAD_STATE);
    EXPECT_EQ(create(MbxCode("soun"), TrackParams(1, 1000)), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(host.allocations, before);
    EXPECT_EQ(trackIndex, 1U);
    EXPECT_EQ(last()->header.trackId, 1U);
}

TEST_F(TrackTest, RefusedParametersAllocateNothing) {
    const uint64_t before = host.allocations;
    MbxTrackParams params = TrackParams(1, 1000);
    params.language = 0x8000;
    EXPECT_EQ(create(MbxCode("vide"), params), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(create(MbxCode("hint"), TrackParams(1, 1000)), MBX_ERR_INTERNAL);
    EXPECT_EQ(host.allocations, before);
    EXPECT_EQ(trackIndex, 7U);
    EXPECT_EQ(movie->tracks.first, nullptr);
}

TEST_F(TrackTest, IdentifierMustBeOrdinaryAndFree) {
    for (const uint32_t id : {0U, 640U, 1023U, 63488U, 65535U, 65536U, UINT32_MAX}) {
        EXPECT_EQ(create(MbxCode("vide"), TrackParams(id, 1000)), MBX_ERR_INVALID_ARG) << id;
    }
    for (const uint32_t id : {1U, 639U, 1024U, 63487U}) {
        EXPECT_EQ(create(MbxCode("vide"), TrackParams(id, 1000)), MBX_OK) << id;
        EXPECT_EQ(create(MbxCode("soun"), TrackParams(id, 1000)), MBX_ERR_INVALID_ARG) << id;
    }
}

TEST_F(TrackTest, ControlWordsLeaveOutUsageItemAndEditList) {
    MbxTrackParams params = TrackParams(1, 1000);
    params.noUsageEntry = 1;
    params.noEditList = 1;
    ASSERT_EQ(create(MbxCode("vide"), params), MBX_OK);
    EXPECT_EQ(last()->editList, nullptr);
    EXPECT_FALSE(MbxHasUserMetadata(&last()->userMetadata));
}

TEST_F(TrackTest, OtherParametersReachTheTrack) {
    MbxTrackParams params = TrackParams(1, 1000);
    params.stsdVersion = 1;
    params.auxEnabled = 1;
    params.trickEnabled = 1;
    const uint32_t defaults[4] = {1, 0, 188, 0};
    std::copy(defaults, defaults + 4, params.fragmentDefaults);
    params.defaultsForced[2] = 1;
    params.perSampleForced[1] = 1;
    ASSERT_EQ(create(MbxCode("soun"), params), MBX_OK);
    EXPECT_EQ(last()->sampleEntries.version, 1U);
    EXPECT_EQ(last()->auxEnabled, 1U);
    EXPECT_EQ(last()->trickEnabled, 1U);
    EXPECT_EQ(last()->defaults.descriptionIndex, 1U);
    EXPECT_EQ(last()->defaults.size, 188U);
    EXPECT_EQ(last()->defaultsMask, 0b0101U);  // description index and size were given
    EXPECT_EQ(last()->defaultsForced[2], 1U);
    EXPECT_EQ(last()->perSampleForced[1], 1U);
    EXPECT_EQ(last()->fragmentIndex.capacity, 1000U);
    params.trackId = 2;
    ASSERT_EQ(create(MbxCode("vide"), params), MBX_OK);
    EXPECT_EQ(last()->sampleEntries.version, 0U);  // audio alone takes the version
}

TEST_F(TrackTest, HalfBuiltTrackIsReleased) {
    for (uint64_t n = 1; n <= 5; n++) {  // track, name, edit list, usage item, its data
        host.failAllocation = host.allocations + n;
        const size_t live = host.live.size();
        EXPECT_EQ(create(MbxCode("vide"), TrackParams(1, 1000)), MBX_ERR_NO_MEMORY);
        EXPECT_EQ(host.live.size(), live);
        EXPECT_EQ(movie->tracks.first, nullptr);
    }
    EXPECT_EQ(create(MbxCode("vide"), TrackParams(1, 1000)), MBX_OK);
}

TEST_F(TrackTest, CreateRefusesNullArguments) {
    const MbxHandlerRequest request = {MbxCode("vide"), TrackParams(1, 1000)};
    EXPECT_EQ(MbxCreateTrack(nullptr, movie, &request, &trackIndex), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxCreateTrack(context, nullptr, &request, &trackIndex), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxCreateTrack(context, movie, nullptr, &trackIndex), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxCreateTrack(context, movie, &request, nullptr), MBX_ERR_INVALID_ARG);
}

// The next identifier of a movie with these in use.
class NextTrackIdTest : public MovieTest {
 protected:
    MbxStatus next(const std::vector<uint32_t>& used) {
        MbxTrackParams params = TrackParams(0, 1000);
        params.noUsageEntry = 1;
        params.noEditList = 1;
        for (const uint32_t trackId : used) {
            params.trackId = trackId;
            EXPECT_EQ(create(MbxCode("vide"), params), MBX_OK);
        }
        return MbxFindNextTrackId(movie, &id);
    }

    uint32_t id = 0;
};

TEST_F(NextTrackIdTest, FirstIdentifierIs1) {
    EXPECT_EQ(next({}), MBX_OK);
    EXPECT_EQ(id, 1U);
}

TEST_F(NextTrackIdTest, OneMoreThanTheHighest) {
    EXPECT_EQ(next({1, 638}), MBX_OK);
    EXPECT_EQ(id, 639U);
}

TEST_F(NextTrackIdTest, Identifiers1And639InUseGive1024) {
    EXPECT_EQ(next({1, 639}), MBX_OK);
    EXPECT_EQ(id, 1024U);
}

TEST_F(NextTrackIdTest, OneMoreThanTheHighestInTheUpperRange) {
    EXPECT_EQ(next({1024, 63486}), MBX_OK);
    EXPECT_EQ(id, 63487U);
}

TEST_F(NextTrackIdTest, BeyondTheEndTheLowestFreeOne) {
    EXPECT_EQ(next({63487, 1, 3}), MBX_OK);
    EXPECT_EQ(id, 2U);
}

// Movies with thousands of tracks, on records that stand in the test.
class FullMovieTest : public testing::Test {
 protected:
    void fill(uint32_t begin, uint32_t end) {
        for (uint32_t trackId = begin; trackId <= end; trackId++) {
            tracks.emplace_back();
            tracks.back().header.trackId = trackId;
            MbxListAppend(&movie.tracks, &tracks.back());
        }
    }

    std::deque<MbxTrack> tracks;
    MbxMovie movie = {};
    uint32_t id = 7;
};

TEST_F(FullMovieTest, LowRangeFullGivesTheLowestFreeOneOfTheUpperRange) {
    fill(63487, 63487);
    fill(1, 639);
    fill(1024, 1030);
    EXPECT_EQ(MbxFindNextTrackId(&movie, &id), MBX_OK);
    EXPECT_EQ(id, 1031U);
}

TEST_F(FullMovieTest, SearchEndsAtTheEndsOfTheRanges) {
    fill(63487, 63487);
    fill(1, 638);
    EXPECT_EQ(MbxFindNextTrackId(&movie, &id), MBX_OK);
    EXPECT_EQ(id, 639U);
}

class ReferenceTest : public MovieTest {
 protected:
    void SetUp() override {
        MovieTest::SetUp();
        for (const uint32_t id : {1U, 2U, 4U})
            ASSERT_EQ(create(MbxCode("vide"), TrackParams(id, 1000)), MBX_OK);
    }

    MbxStatus refer(uint32_t type, uint32_t target) {
        const MbxTrackReferenceParams request = {type, target};
        return MbxAddTrackReference(context, movie, last(), &request, &index);
    }

    Bytes write() {
        MbxTrefBox* box = nullptr;
        EXPECT_EQ(MbxNew(context, &box), MBX_OK);
        EXPECT_EQ(MbxBuildTref(context, &options, &last()->references, box), MBX_OK);
        MemoryFile target;
        EXPECT_EQ(MbxWriteTrefBox(context, &options, &target, 0, box, nullptr, nullptr), MBX_OK);
        EXPECT_EQ(MbxFreeTref(context, box), MBX_OK);
        return target.bytes;
    }

    uint32_t index = 7;
};

TEST_F(ReferenceTest, TargetsAreGroupedByTypeInOrderOfFirstUse) {
    EXPECT_EQ(refer(MbxCode("hint"), 2), MBX_OK);
    EXPECT_EQ(index, 1U);
    EXPECT_EQ(refer(MbxCode("cdsc"), 1), MBX_OK);
    EXPECT_EQ(index, 1U);
    EXPECT_EQ(refer(MbxCode("hint"), 1), MBX_OK);
    EXPECT_EQ(index, 2U);
    EXPECT_BYTES(write(), Hex("00000024 'tref' 00000010 'hint' 00000002 00000001 0000000C 'cdsc' 00000001"));
}

TEST_F(ReferenceTest, TargetOfAGroupIsNotAddedTwice) {
    EXPECT_EQ(refer(MbxCode("cdsc"), 2), MBX_OK);
    EXPECT_EQ(refer(MbxCode("cdsc"), 1), MBX_OK);
    EXPECT_EQ(refer(MbxCode("cdsc"), 2), MBX_OK);
    EXPECT_EQ(index, 1U);
    EXPECT_BYTES(write(), Hex("00000018 'tref' 00000010 'cdsc' 00000002 00000001"));
}

TEST_F(ReferenceTest, OwnAndMissingTargetsAreRefused) {
    EXPECT_EQ(refer(MbxCode("cdsc"), 4), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(refer(MbxCode("cdsc"), 3), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(refer(MbxCode("cdsc"), 0), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(refer(MbxCode("cdsc"), 63488), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(index, 7U);
    EXPECT_EQ(last()->references.first, nullptr);
}

TEST_F(ReferenceTest, HighTargetsNameMetadataTracksOfTheMovie) {
    MbxMetadataTrack* metadata = nullptr;
    ASSERT_EQ(MbxNew(context, &metadata), MBX_OK);
    metadata->header.trackId = 65535;
    MbxListAppend(&movie->userMetadata.tracks, metadata);
    EXPECT_EQ(refer(MbxCode("cdsc"), 65535), MBX_OK);
    EXPECT_EQ(index, 1U);
    EXPECT_EQ(refer(MbxCode("cdsc"), 65534), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(refer(MbxCode("cdsc"), 65536), MBX_ERR_INVALID_ARG);
}

TEST_F(ReferenceTest, FailureLeavesTheReferencesAsTheyWere) {
    for (uint64_t n = 1; n <= 2; n++) {  // the group, the target
        host.failAllocation = host.allocations + n;
        EXPECT_EQ(refer(MbxCode("cdsc"), 1), MBX_ERR_NO_MEMORY);
        EXPECT_EQ(last()->references.first, nullptr);
    }
    ASSERT_EQ(refer(MbxCode("cdsc"), 1), MBX_OK);
    host.failAllocation = host.allocations + 1;
    EXPECT_EQ(refer(MbxCode("cdsc"), 2), MBX_ERR_NO_MEMORY);
    EXPECT_BYTES(write(), Hex("00000014 'tref' 0000000C 'cdsc' 00000001"));
}

class EditTest : public MovieTest {
 protected:
    void SetUp() override {
        MovieTest::SetUp();
        MbxTrackParams params = TrackParams(1, 48000);
        params.noEditList = 1;
        ASSERT_EQ(create(MbxCode("soun"), params), MBX_OK);
    }

    MbxStatus add(uint32_t fromZero) { return MbxTrackAddEdit(context, &options, movie, last(), fromZero); }
};

TEST_F(EditTest, EditSpansTheMediaInTicksOfTheMovie) {
    MbxSampleSegment* segment = addSegment(last(), 48000 + 47);
    segment->earliestPresentation = 4800;
    ASSERT_EQ(add(0), MBX_OK);
    const MbxEdit& edit = *last()->editList->edits.first;
    EXPECT_EQ(edit.segmentDuration, 1000U);  // 1000.98, truncated
    EXPECT_EQ(edit.mediaTime, 100);          // rescaled the same way
    EXPECT_EQ(edit.rateInteger, 1);
    EXPECT_EQ(edit.rateFraction, 0);
}

TEST_F(EditTest, MediaTimeIsZeroWhenAskedForOrWithoutSamples) {
    ASSERT_EQ(add(0), MBX_OK);  // no segment
    MbxSampleSegment* segment = addSegment(last(), 48000);
    ASSERT_EQ(add(0), MBX_OK);  // no sample
    segment->earliestPresentation = 4800;
    ASSERT_EQ(add(1), MBX_OK);
    for (const MbxEdit* edit = last()->editList->edits.first; edit != nullptr; edit = edit->next) {
        EXPECT_EQ(edit->mediaTime, 0);
    }
    EXPECT_EQ(last()->editList->edits.first->segmentDuration, 0U);
    EXPECT_EQ(last()->editList->edits.last->segmentDuration, 1000U);
}

TEST_F(EditTest, TheDurationOfTheLastEditIsOverwritten) {
    EXPECT_EQ(MbxTrackSetEditDuration(&options, last(), 1), MBX_ERR_BAD_STATE);
    addSegment(last(), 48000);
    ASSERT_EQ(add(0), MBX_OK);
    ASSERT_EQ(add(0), MBX_OK);
    ASSERT_EQ(MbxTrackSetEditDuration(&options, last(), 70), MBX_OK);
    EXPECT_EQ(last()->editList->edits.first->segmentDuration, 1000U);
    EXPECT_EQ(last()->editList->edits.last->segmentDuration, 70U);
    EXPECT_EQ(last()->editList->edits.last->rateInteger, 1);
    for (const uint32_t mode : {0U, 2U}) {
        options.time_version_mode = mode;
        EXPECT_EQ(MbxTrackSetEditDuration(&options, last(), 1ULL << 32), MBX_ERR_BAD_STATE);
        EXPECT_EQ(last()->editList->edits.last->segmentDuration, 70U);
        EXPECT_EQ(MbxTrackSetEditDuration(&options, last(), UINT32_MAX), MBX_OK);
        last()->editList->edits.last->segmentDuration = 70;
    }
    options.time_version_mode = 1;
    EXPECT_EQ(MbxTrackSetEditDuration(&options, last(), 1ULL << 32), MBX_OK);
    EXPECT_EQ(MbxTrackSetEditDuration(nullptr, last(), 1), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxTrackSetEditDuration(&options, nullptr, 1), MBX_ERR_INVALID_ARG);
}

TEST_F(EditTest, NegativePresentationTimeIsRescaledTowardsZero) {
    MbxSampleSegment* segment = addSegment(last(), 48000);
    segment->earliestPresentation = -4847;
    ASSERT_EQ(add(0), MBX_OK);
    EXPECT_EQ(last()->editList->edits.first->mediaTime, -100);  // -100.98
}

TEST_F(EditTest, WideValuesAreRefusedOneByOneInModes0And2) {
    movie->header.timescale = 48000;
    MbxSampleSegment* segment = addSegment(last(), 1ULL << 32);
    for (const uint32_t mode : {0U, 2U}) {
        options.time_version_mode = mode;
        segment->decodeDuration = 1ULL << 32;
        segment->earliestPresentation = 0;
        EXPECT_EQ(add(0), MBX_ERR_BAD_STATE);
        segment->decodeDuration = UINT32_MAX;
        segment->earliestPresentation = INT32_MAX + 1LL;
        EXPECT_EQ(add(0), MBX_ERR_BAD_STATE);
        segment->earliestPresentation = INT32_MIN - 1LL;
        EXPECT_EQ(add(0), MBX_ERR_BAD_STATE);
        EXPECT_EQ(last()->editList, nullptr);
    }
    segment->earliestPresentation = INT32_MAX;
    EXPECT_EQ(add(0), MBX_OK);
    segment->earliestPresentation = INT32_MIN;
    EXPECT_EQ(add(0), MBX_OK);
    options.time_version_mode = 1;
    segment->decodeDuration = 1ULL << 32;
    segment->earliestPresentation = INT64_MIN;
    EXPECT_EQ(add(0), MBX_ERR_OVERFLOW);  // its magnitude does not fit
    segment->earliestPresentation = INT64_MIN + 1;
    EXPECT_EQ(add(0), MBX_OK);
}

TEST_F(EditTest, FirstEditMakesTheHolderAndAFailureDoesNot) {
    for (uint64_t n = 1; n <= 2; n++) {
        host.failAllocation = host.allocations + n;
        EXPECT_EQ(add(0), MBX_ERR_NO_MEMORY);
        EXPECT_EQ(last()->editList, nullptr);
    }
    EXPECT_EQ(add(0), MBX_OK);
    EXPECT_NE(last()->editList, nullptr);
}

TEST_F(EditTest, MediaTooLongForTheMovieOverflows) {
    movie->header.timescale = 48001;
    addSegment(last(), UINT64_MAX);
    EXPECT_EQ(add(0), MBX_ERR_OVERFLOW);
    EXPECT_EQ(last()->editList, nullptr);
}

}  // namespace
