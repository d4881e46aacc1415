#include "boxlib/fragment/movie_extends.h"

#include "boxlib/movie/movie.h"
#include "boxlib/support/registry.h"
#include "boxlib/support/sample_fixture.h"

namespace {

const MbxMehdParams kDuration = {0x01020304};
const MbxTrexParams kTrexParams = {7, {1, 0x400, 0x0A0B0C0D, 0x00010000}};

MbxLevel levels[5] = {
    {1, 1, 0, MbxCode("abcd"), 0, 0, &levels[1]},
    {2, 0, 1, MbxCode("efgh"), 0x01020304, 0, &levels[2]},
    {3, 0, 2, 0, 0, 0, &levels[3]},
    {4, 1, 3, 0, 0, 0, &levels[4]},
    {5, 0, 4, 0, 0, 0x0A0B0C0D, nullptr},
};

const Bytes kLevaGolden =
    Hex("00000036 'leva'"         // size, type
        "00 000000"               // version, flags
        "05"                      // level_count
        "00000001 80 'abcd'"      // track_id, padding and type 0, grouping_type
        "00000002 01 'efgh'"      // track_id, type 1, grouping_type
        "01020304"                // grouping_type_parameter
        "00000003 02"             // track_id, type 2
        "00000004 83"             // track_id, padding and type 3
        "00000005 04 0A0B0C0D");  // track_id, type 4, sub_track_id

const Bytes kTrexGolden =
    Hex("00000020 'trex'"  // size, type
        "00 000000"        // version, flags
        "00000007"         // track_ID
        "00000001"         // default_sample_description_index
        "00000400"         // default_sample_duration
        "0A0B0C0D"         // default_sample_size
        "00010000");       // default_sample_flags

// A movie with one track and levels; mehd_mode 0, so that every option of the walk gives the same bytes.
struct MvexSample {
    MbxTrack track = {};
    MbxMovie movie = {};

    MvexSample() {
        track.header.trackId = 7;
        track.defaults = kTrexParams.defaults;
        movie.tracks = {&track, &track};
        movie.levels = {&levels[0], &levels[4]};
    }
};
const MvexSample kMvexSample;

const BoxRegistration kMehd = RegisterBox<MbxMehdBox>(
    {.name = "Mehd",
     .code = "mehd",
     .parents = "mvex",
     .clause = "ISO/IEC 14496-12 8.8.2",
     .presence = Presence::kOptional,
     .golden = Hex("00000010 'mehd'"  // size, type
                   "00 000000"        // version, flags
                   "01020304"),       // fragment_duration
     .build = [](MbxContext* context, const MbxOptions* options,
                 MbxMehdBox* box) { return MbxBuildMehd(context, options, &kDuration, box); },
     .write = MbxWriteMehdBox,
     .free = MbxFreeMehd});

const BoxRegistration kTrex = RegisterBox<MbxTrexBox>(
    {.name = "Trex",
     .code = "trex",
     .parents = "mvex",
     .clause = "ISO/IEC 14496-12 8.8.3",
     .presence = Presence::kMandatory,
     .golden = kTrexGolden,
     .build = [](MbxContext* context, const MbxOptions* options,
                 MbxTrexBox* box) { return MbxBuildTrex(context, options, &kTrexParams, box); },
     .write = MbxWriteTrexBox,
     .free = MbxFreeTrex});

const BoxRegistration kLeva = RegisterBox<MbxLevaBox>(
    {.name = "Leva",
     .code = "leva",
     .parents = "mvex",
     .clause = "ISO/IEC 14496-12 8.8.13",
     .presence = Presence::kOptional,
     .golden = kLevaGolden,
     .build = [](MbxContext* context, const MbxOptions* options,
                 MbxLevaBox* box) { return MbxBuildLeva(context, options, levels, box); },
     .write = MbxWriteLevaBox,
     .free = MbxFreeLeva});

const BoxRegistration kMvex = RegisterBox<MbxMvexBox>(
    {.name = "Mvex",
     .code = "mvex",
     .parents = "moov",
     .clause = "ISO/IEC 14496-12 8.8.1",
     .presence = Presence::kOptional,
     .golden = Hex("0000005E 'mvex'") + kTrexGolden + kLevaGolden,
     .build = [](MbxContext* context, const MbxOptions* options,
                 MbxMvexBox* box) { return MbxBuildMvex(context, options, &kMvexSample.movie, box); },
     .write = MbxWriteMvexBox,
     .free = MbxFreeMvex});

class MovieExtendsTest : public SampleTest {
 protected:
    MbxStatus mehd(uint32_t mode, uint64_t duration) {
        options.mehd_mode = mode;
        const MbxMehdParams params = {duration};
        MbxMehdBox box = {};
        file.bytes.clear();
        MBX_TRY(MbxBuildMehd(context, &options, &params, &box));
        return MbxWriteMehdBox(context, &options, &file, 0, &box, nullptr, nullptr);
    }

    uint64_t duration() {
        uint64_t value = 0;
        EXPECT_EQ(MbxComputeFragmentDuration(&movie, &value), MBX_OK);
        return value;
    }
};

TEST_F(MovieExtendsTest, MehdWidthInEachModeAtTheEdge) {
    constexpr uint64_t kFits = 0xFFFFFFFF;
    constexpr uint64_t kWide = 0x100000000;
    const Bytes narrow = Hex("00000010 'mehd' 00000000 FFFFFFFF");
    EXPECT_EQ(mehd(1, kFits), MBX_OK);
    EXPECT_BYTES(file.bytes, narrow);
    EXPECT_EQ(mehd(1, kWide), MBX_OK);
    EXPECT_BYTES(file.bytes, Hex("00000014 'mehd' 01000000 0000000100000000"));
    EXPECT_EQ(mehd(2, kFits), MBX_OK);
    EXPECT_BYTES(file.bytes, narrow);
    EXPECT_EQ(mehd(2, kWide), MBX_ERR_BAD_STATE);
    EXPECT_EQ(mehd(3, kFits), MBX_OK);
    EXPECT_BYTES(file.bytes, Hex("00000014 'mehd' 01000000 00000000FFFFFFFF"));
    EXPECT_EQ(mehd(4, kFits), MBX_OK);  // unknown: as mode 1
    EXPECT_BYTES(file.bytes, narrow);
    EXPECT_EQ(mehd(4, kWide), MBX_OK);
    EXPECT_EQ(file.bytes[8], 1U);
}

TEST_F(MovieExtendsTest, FragmentDurationIsTheLargestEndOfALastSegment) {
    EXPECT_EQ(duration(), 0U);
    addTrack(90000);
    addTrack(48000);
    addTrack();
    EXPECT_EQ(duration(), 0U);
    addChunk(3, 0, sample(1, 90000), 1);  // 3 seconds
    ASSERT_EQ(MbxAppendSegments(context, &movie), MBX_OK);
    addChunk(4, 0, sample(1, 48000), 2);  // 4 seconds, in the second segment
    EXPECT_EQ(duration(), 4000U);
    addChunk(3, 0, sample(1, 45000), 1);  // 4.5 seconds now
    EXPECT_EQ(duration(), 4500U);
}

TEST_F(MovieExtendsTest, FragmentDurationThatWrapsOverflows) {
    MbxTrack* track = addTrack();
    addChunk(1, 0, sample(1, 10));
    track->segments.last->firstDecodeTime = UINT64_MAX - 9;
    uint64_t value = 77;
    EXPECT_EQ(MbxComputeFragmentDuration(&movie, &value), MBX_ERR_OVERFLOW);
    track->segments.last->firstDecodeTime = UINT64_MAX - 10;
    EXPECT_EQ(MbxComputeFragmentDuration(&movie, &value), MBX_OK);
    EXPECT_EQ(value, UINT64_MAX);
    movie.header.timescale = 1001;  // of the track: 1000
    EXPECT_EQ(MbxComputeFragmentDuration(&movie, &value), MBX_ERR_OVERFLOW);
    EXPECT_EQ(MbxComputeFragmentDuration(nullptr, &value), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxComputeFragmentDuration(&movie, nullptr), MBX_ERR_INVALID_ARG);
}

TEST_F(MovieExtendsTest, MvexHoldsMehdFirstUnlessItsModeIsZero) {
    MbxTrack* track = addTrack();
    track->defaults = {1, 2, 3, 4};
    addChunk(5, 0);
    const Bytes trex = Hex("00000020 'trex' 00000000 0000000A 00000001 00000002 00000003 00000004");
    for (const uint32_t mode : {0U, 1U}) {
        options.mehd_mode = mode;
        MbxMvexBox* box = nullptr;
        ASSERT_EQ(MbxMakeBox(context, &options, &box, &movie, MbxBuildMvex, MbxFreeMvex), MBX_OK);
        MemoryFile target;
        EXPECT_EQ(MbxWriteMvexBox(context, &options, &target, 0, box, nullptr, nullptr), MBX_OK);
        EXPECT_BYTES(target.bytes, mode == 0
                                       ? Hex("00000028 'mvex'") + trex
                                       : Hex("00000038 'mvex' 00000010 'mehd' 00000000 00000032") + trex);
        EXPECT_EQ(MbxFreeMvex(context, box), MBX_OK);
    }
}

TEST_F(MovieExtendsTest, LevaOfAnUnknownAssignmentTypeIsInternal) {
    MbxLevel level = {1, 0, 5, 0, 0, 0, nullptr};
    MbxLevaBox box = {};
    EXPECT_EQ(MbxBuildLeva(context, &options, &level, &box), MBX_ERR_INTERNAL);
}

TEST_F(MovieExtendsTest, LevaCutsACountAboveItsByteAndRefusesOneAbove65535) {
    std::vector<MbxLevel> many(65536);
    for (size_t i = 0; i < many.size(); i++) {
        many[i].assignmentType = 2;
        many[i].next = i + 1 < many.size() ? &many[i + 1] : nullptr;
    }
    MbxLevaBox box = {};
    EXPECT_EQ(MbxBuildLeva(context, &options, &many[0], &box), MBX_ERR_OVERFLOW);
    EXPECT_EQ(MbxBuildLeva(context, &options, &many[1], &box), MBX_OK);
    EXPECT_EQ(box.size, 13U + 65535 * 5);
    many[256].next = nullptr;
    EXPECT_EQ(MbxBuildLeva(context, &options, &many[0], &box), MBX_OK);
    ASSERT_EQ(MbxWriteLevaBox(context, &options, &file, 0, &box, nullptr, nullptr), MBX_OK);
    EXPECT_EQ(file.bytes[12], 1U);  // 257 levels
    EXPECT_EQ(file.bytes.size(), 13U + 257 * 5);
}

TEST_F(MovieExtendsTest, LevelsAreReleasedWithTheMovie) {
    MbxMovie* owner = nullptr;
    MbxLevel* level = nullptr;
    const size_t before = host.live.size();
    ASSERT_EQ(MbxNewMovie(context, 1000, &owner), MBX_OK);
    ASSERT_EQ(MbxNew(context, &level), MBX_OK);
    MbxListAppend(&owner->levels, level);
    EXPECT_EQ(MbxFreeMovie(context, owner), MBX_OK);
    EXPECT_EQ(host.live.size(), before);
}

TEST_F(MovieExtendsTest, FreeingLevelsIsSafeTwice) {
    MbxLevel* level = nullptr;
    ASSERT_EQ(MbxNew(context, &level), MBX_OK);
    MbxListAppend(&movie.levels, level);
    EXPECT_EQ(MbxFreeLevels(context, &movie), MBX_OK);
    EXPECT_EQ(movie.levels.first, nullptr);
    EXPECT_EQ(MbxFreeLevels(context, &movie), MBX_OK);
}

}  // namespace
