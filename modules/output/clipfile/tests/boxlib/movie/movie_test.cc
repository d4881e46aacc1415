#include "boxlib/movie/movie.h"

#include "boxlib/sample/sample_store.h"
#include "boxlib/support/registry.h"
#include "boxlib/support/track_fixture.h"

namespace {

uint8_t kName[] = "";
uint8_t kTitle[] = {'A'};

// A movie with two bare tracks and an item of user metadata.
const MbxMovie* sampleMovie() {
    static const MbxMovie instance = [] {
        static MbxTrack tracks[2] = {};
        static MbxMetadataItem item = {1, 0, 0x15C7, 0, {kTitle, 1}, nullptr};
        for (uint32_t i = 0; i < 2; i++) {
            tracks[i].header.trackId = i + 1;
            tracks[i].header.flags = 7;
            tracks[i].mediaHeader = {20, 0, 0, 90000, 0, 0x15C7};
            tracks[i].handler = {MbxCode("meta"), {kName, 1}};
            tracks[i].mediaInformation.code = MbxCode("nmhd");
        }
        tracks[0].next = &tracks[1];
        MbxMovie made = {};
        made.header = {.fieldsSet = 4,
                       .creationTime = 0x01020304,
                       .modificationTime = 0x05060708,
                       .timescale = 90000,
                       .duration = 0,
                       .rate = 0x00010000,
                       .volume = 0x0100,
                       .matrix = {0x00010000, 0, 0, 0, 0x00010000, 0, 0, 0, 0x40000000},
                       .nextTrackId = 1};
        made.tracks = {&tracks[0], &tracks[1]};
        made.userMetadata.items = {&item, &item};
        return made;
    }();
    return &instance;
}

const Bytes kMvhd = Hex("0000006C 'mvhd'"
                        "00 000000"                  // version, flags
                        "01020304"                   // creation_time
                        "05060708"                   // modification_time
                        "00015F90"                   // timescale
                        "00000000"                   // duration
                        "00010000"                   // rate
                        "0100"                       // volume
                        "0000 00000000 00000000") +  // reserved
                    IdentityMatrix() +               // matrix
                    Repeat(0, 24) +                  // pre_defined
                    Hex("00000003");                 // next_track_ID

Bytes bareTrak(const char* trackId) {
    return Hex("00000135 'trak'"
               "0000005C 'tkhd' 00000007 00000000 00000000") +
           Hex(trackId) + Hex("00000000 00000000 00000000 00000000 0000 0000 0000 0000") + Repeat(0, 36) +
           Hex("00000000 00000000"
               "000000D1 'mdia'"
               "00000020 'mdhd' 00000000 00000000 00000000 00015F90 00000000 15C7 0000"
               "00000021 'hdlr' 00000000 00000000 'meta' 00000000 00000000 00000000 00"
               "00000088 'minf' 0000000C 'nmhd' 00000000"
               "00000018 'dinf' 00000010 'dref' 00000000 00000000") +
           EmptyStbl();
}

const BoxRegistration kRows[] = {
    RegisterBox<MbxMoovBox>(
        {.name = "Moov",
         .code = "moov",
         .parents = "file",
         .clause = "ISO/IEC 14496-12 8.2.1",
         .presence = Presence::kMandatory,
         // 8 + 108 + 2 * 309 + 45 bytes
         .golden = Hex("0000030B 'moov'") + kMvhd + bareTrak("00000001") + bareTrak("00000002") +
                   Hex("0000002D 'uuid' 55534D54 21D24FCE BB88695C FAC9C740"
                       "00000015 'MTDT' 0001 000B 00000001 15C7 0000 'A'"),
         .build = [](MbxContext* context, const MbxOptions* options,
                     MbxMoovBox* box) { return MbxBuildMoov(context, options, sampleMovie(), box); },
         .write = MbxWriteMoovBox,
         .free = MbxFreeMoov}),
    RegisterBox<MbxMvhdBox>(
        {.name = "Mvhd",
         .code = "mvhd",
         .parents = "moov",
         .clause = "ISO/IEC 14496-12 8.2.2",
         .presence = Presence::kMandatory,
         .golden = kMvhd,
         .build = [](MbxContext* context, const MbxOptions* options,
                     MbxMvhdBox* box) { return MbxBuildMvhd(context, options, sampleMovie(), box); },
         .write = MbxWriteMvhdBox,
         .free = MbxFreeMvhd}),
};

class MovieHeaderTest : public MovieTest {
 protected:
    MbxMvhdBox build() {
        MbxMvhdBox box = {};
        EXPECT_EQ(MbxBuildMvhd(context, &options, movie, &box), MBX_OK);
        return box;
    }

    Bytes write() {
        const MbxMvhdBox box = build();
        MemoryFile target;
        EXPECT_EQ(MbxWriteMvhdBox(context, &options, &target, 0, &box, nullptr, nullptr), MBX_OK);
        return target.bytes;
    }

    // A track of the movie's timescale with media of that duration and no edit.
    void addTrack(uint32_t trackId, uint64_t duration) {
        MbxTrackParams params = TrackParams(trackId, 1000);
        params.noEditList = 1;
        params.noUsageEntry = 1;
        ASSERT_EQ(create(MbxCode("vide"), params), MBX_OK);
        addSegment(last(), duration);
    }
};

TEST_F(MovieHeaderTest, NewMovieHasItsDefaults) {
    EXPECT_EQ(movie->header.fieldsSet, 4U);
    EXPECT_EQ(movie->header.timescale, 1000U);
    EXPECT_EQ(movie->header.rate, 65536U);
    EXPECT_EQ(movie->header.volume, 256U);
    EXPECT_EQ(movie->header.nextTrackId, 1U);
    MbxMovie* other = nullptr;
    EXPECT_EQ(MbxNewMovie(context, 0, &other), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxNewMovie(nullptr, 1, &other), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxNewMovie(context, 1, nullptr), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(other, nullptr);
}

TEST_F(MovieHeaderTest, MovieWithoutTracksHasDuration0AndNextTrackId1) {
    EXPECT_BYTES(writeMoov(), Hex("00000074 'moov'"
                                  "0000006C 'mvhd' 00000000 00000000 00000000 000003E8 00000000 00010000 0100"
                                  "0000 00000000 00000000") +
                                  IdentityMatrix() + Repeat(0, 24) + Hex("00000001"));
}

TEST_F(MovieHeaderTest, Version1HasWideTimes) {
    options.time_version_mode = 3;
    EXPECT_BYTES(write(), Hex("00000078 'mvhd' 01000000 0000000000000000 0000000000000000 000003E8"
                              "0000000000000000 00010000 0100 0000 00000000 00000000") +
                              IdentityMatrix() + Repeat(0, 24) + Hex("00000001"));
}

TEST_F(MovieHeaderTest, DurationIsTheLongestTrackDuration) {
    addTrack(1, 500);
    addTrack(2, 700);
    addTrack(3, 600);
    EXPECT_EQ(build().values.duration, 700U);
    movie->tracks.first->header.duration = 900;
    EXPECT_EQ(build().values.duration, 700U);
    movie->tracks.first->header.fieldsSet |= MBX_TRACK_DURATION;
    EXPECT_EQ(build().values.duration, 900U);
    movie->header.fieldsSet |= MBX_MOVIE_DURATION;
    movie->header.duration = 5;
    EXPECT_EQ(build().values.duration, 5U);
}

TEST_F(MovieHeaderTest, NextTrackIdPassesOverTheGapAndEndsInAllOnes) {
    const struct {
        uint32_t highest;
        uint32_t next;
    } kCases[] = {{1, 2}, {638, 639}, {639, 1024}, {1024, 1025}, {63486, 63487}, {63487, UINT32_MAX}};
    for (const auto& c : kCases) {
        addTrack(c.highest, 0);
        EXPECT_EQ(build().values.nextTrackId, c.next) << c.highest;
    }
    movie->header.fieldsSet |= MBX_MOVIE_NEXT_TRACK_ID;
    movie->header.nextTrackId = 77;
    EXPECT_EQ(build().values.nextTrackId, 77U);
}

TEST_F(MovieHeaderTest, TrackId639MakesNextTrackId1024) {
    addTrack(639, 0);
    EXPECT_EQ(build().values.nextTrackId, 1024U);
}

TEST_F(MovieHeaderTest, TrackId63487MakesNextTrackIdAllOnes) {
    addTrack(63487, 0);
    EXPECT_EQ(build().values.nextTrackId, 0xFFFFFFFFU);
}

TEST_F(MovieHeaderTest, ComputedWideDurationInMode0StaysVersion0WithItsLowBits) {
    addTrack(1, 0x123456789);
    EXPECT_BYTES(write(), Hex("0000006C 'mvhd' 00000000 00000000 00000000 000003E8 23456789 00010000 0100"
                              "0000 00000000 00000000") +
                              IdentityMatrix() + Repeat(0, 24) + Hex("00000002"));
}

TEST_F(MovieHeaderTest, WideTimesAndDurationTogetherAreRefusedInMode0) {
    addTrack(1, 1ULL << 32);
    movie->header.creationTime = 1ULL << 32;
    movie->header.modificationTime = 1ULL << 32;
    MbxMvhdBox box = {};
    EXPECT_EQ(MbxBuildMvhd(context, &options, movie, &box), MBX_ERR_BAD_STATE);
}

TEST_F(MovieHeaderTest, WideCreationTimeInMode1MakesThatOneBoxVersion1) {
    options.time_version_mode = 1;
    addTrack(1, 100);
    movie->header.creationTime = 1ULL << 32;
    const Bytes moov = writeMoov();
    // Behind moov's header: mvhd of 120 bytes in version 1, then trak, then tkhd in version 0.
    EXPECT_BYTES(Bytes(moov.begin() + 8, moov.begin() + 20), Hex("00000078 'mvhd' 01000000"));
    EXPECT_BYTES(Bytes(moov.begin() + 136, moov.begin() + 148), Hex("0000005C 'tkhd' 00000007"));
    // Behind tkhd: mdia, then mdhd in version 0.
    EXPECT_BYTES(Bytes(moov.begin() + 236, moov.begin() + 248), Hex("00000020 'mdhd' 00000000"));
}

// The bytes of a box, or none for a build that was refused as the mode's bad state.
template <typename Box, typename Build, typename Write>
Bytes writtenOrRefused(Build&& build, Write&& write) {
    Box box = {};
    const MbxStatus status = build(&box);
    if (status == MBX_ERR_BAD_STATE) return {};
    EXPECT_EQ(status, MBX_OK);
    MemoryFile target;
    EXPECT_EQ(write(&target, &box), MBX_OK);
    return target.bytes;
}

TEST_F(MovieHeaderTest, TimeBoxesTakeTheirVersionInEachModeAtTheEdge) {
    constexpr uint64_t kFits = UINT32_MAX;
    constexpr uint64_t kWide = 0x100000005;
    constexpr int kRefused = -1;
    struct Case {
        uint64_t creation, modification, duration;
        int version[4];  // by mode
    };
    addTrack(1, 0);
    MbxTrack* track = last();
    const MbxTrackInMovie inMovie = {track, 1000};
    for (const Case& c :
         {Case{kFits, kFits, kFits, {0, 0, 0, 1}}, Case{kWide, kFits, kFits, {0, 1, 0, 1}},
          Case{kFits, kWide, kFits, {0, 1, 0, 1}}, Case{kFits, kFits, kWide, {0, 1, 0, 1}},
          Case{kFits, kWide, kWide, {0, 1, 0, 1}}, Case{kWide, kWide, kWide, {kRefused, 1, kRefused, 1}}}) {
        movie->header.fieldsSet |= MBX_MOVIE_DURATION;
        track->header.fieldsSet |= MBX_TRACK_DURATION;
        track->mediaHeader.fieldsSet |= MBX_MEDIA_DURATION;
        movie->header.creationTime = track->header.creationTime = track->mediaHeader.creationTime =
            c.creation;
        movie->header.modificationTime = track->header.modificationTime =
            track->mediaHeader.modificationTime = c.modification;
        movie->header.duration = track->header.duration = track->mediaHeader.duration = c.duration;
        for (uint32_t mode = 0; mode < 4; mode++) {
            SCOPED_TRACE(testing::Message() << "mode " << mode << ", times " << c.creation << " "
                                            << c.modification << " " << c.duration);
            options.time_version_mode = mode;
            const Bytes mvhd = writtenOrRefused<MbxMvhdBox>(
                [&](MbxMvhdBox* box) { return MbxBuildMvhd(context, &options, movie, box); },
                [&](MbxFile* target, const MbxMvhdBox* box) {
                    return MbxWriteMvhdBox(context, &options, target, 0, box, nullptr, nullptr);
                });
            const Bytes tkhd = writtenOrRefused<MbxTkhdBox>(
                [&](MbxTkhdBox* box) { return MbxBuildTkhd(context, &options, &inMovie, box); },
                [&](MbxFile* target, const MbxTkhdBox* box) {
                    return MbxWriteTkhdBox(context, &options, target, 0, box, nullptr, nullptr);
                });
            const Bytes mdhd = writtenOrRefused<MbxMdhdBox>(
                [&](MbxMdhdBox* box) { return MbxBuildMdhd(context, &options, track, box); },
                [&](MbxFile* target, const MbxMdhdBox* box) {
                    return MbxWriteMdhdBox(context, &options, target, 0, box, nullptr, nullptr);
                });
            if (c.version[mode] == kRefused) {
                EXPECT_TRUE(mvhd.empty() && tkhd.empty() && mdhd.empty());
                continue;
            }
            const bool isWide = c.version[mode] == 1;
            ASSERT_EQ(mvhd.size(), isWide ? 120U : 108U);
            ASSERT_EQ(tkhd.size(), isWide ? 104U : 92U);
            ASSERT_EQ(mdhd.size(), isWide ? 44U : 32U);
            // Version 0 holds the low 32 bits.
            const auto creation = static_cast<uint32_t>(c.creation);
            const Bytes expected =
                isWide ? Words({static_cast<uint32_t>(c.creation >> 32), creation}) : Words({creation});
            for (const Bytes* box : {&mvhd, &tkhd, &mdhd}) {
                EXPECT_EQ((*box)[8], isWide ? 1U : 0U);
                EXPECT_BYTES(Bytes(box->begin() + 12, box->begin() + (isWide ? 20 : 16)), expected);
            }
        }
    }
}

TEST_F(MovieHeaderTest, MovieWithEmptyUserMetadataHasNoUuidBox) {
    addTrack(1, 100);
    const Bytes moov = writeMoov();
    const Bytes code = Hex("'uuid'");
    EXPECT_EQ(std::search(moov.begin(), moov.end(), code.begin(), code.end()), moov.end());
}

TEST_F(MovieHeaderTest, FragmentedMovieHasMvexBehindItsTracks) {
    options.mehd_mode = 0;
    addTrack(1, 100);
    last()->defaults = {1, 1000, 0, 0x00010000};
    const size_t unfragmented = writeMoov().size();
    movie->fragmentCount = 1;
    const Bytes moov = writeMoov();
    ASSERT_EQ(moov.size(), unfragmented + 40);
    EXPECT_BYTES(Bytes(moov.end() - 40, moov.end()), Hex("00000028 'mvex' 00000020 'trex' 00000000 00000001"
                                                         "00000001 000003E8 00000000 00010000"));
}

TEST_F(MovieHeaderTest, TrackDurationOverflowEndsTheBuild) {
    addTrack(1, UINT64_MAX);
    movie->header.timescale = 1001;
    MbxMvhdBox box = {};
    EXPECT_EQ(MbxBuildMvhd(context, &options, movie, &box), MBX_ERR_OVERFLOW);
}

// The codes of the boxes that stand one behind the other in a range.
std::vector<std::string> childCodes(const Bytes& bytes, size_t begin, size_t end) {
    std::vector<std::string> codes;
    while (begin + 8 <= end) {
        codes.emplace_back(bytes.begin() + static_cast<std::ptrdiff_t>(begin) + 4,
                           bytes.begin() + static_cast<std::ptrdiff_t>(begin) + 8);
        begin += MbxGet32(bytes.data() + begin);
    }
    EXPECT_EQ(begin, end);
    return codes;
}

class WholeMovieTest : public MovieTest {
 protected:
    // A movie with every part that `moov` knows. Its records are released with it.
    void SetUp() override {
        MovieTest::SetUp();
        MbxTrackParams params = TrackParams(1, 1000);
        params.auxEnabled = 1;
        ASSERT_EQ(create(MbxCode("vide"), params), MBX_OK);
        params.trackId = 2;
        params.auxEnabled = 0;
        ASSERT_EQ(create(MbxCode("meta"), params), MBX_OK);
        const MbxTrackReferenceParams reference = {MbxCode("cdsc"), 2};
        uint32_t index = 0;
        ASSERT_EQ(MbxAddTrackReference(context, movie, movie->tracks.first, &reference, &index), MBX_OK);
        MbxSampleSegment* segment = addSegment(movie->tracks.first, 100);
        segment->auxSizes.list.capacity = MBX_BLOCK_CAPACITY;
        ASSERT_EQ(MbxAddAuxSize(context, &segment->auxSizes, 2, kTitlePair), MBX_OK);
        ASSERT_EQ(MbxNew(context, &movie->ainf), MBX_OK);
        ASSERT_EQ(MbxNew(context, &movie->iods), MBX_OK);
        ASSERT_EQ(MbxNew(context, &movie->meta), MBX_OK);
        ASSERT_EQ(MbxNew(context, &movie->meta->handler), MBX_OK);
        MbxPsshParams* pssh = nullptr;
        ASSERT_EQ(MbxNew(context, &pssh), MBX_OK);
        MbxListAppend(&movie->pssh, pssh);
        const MbxMetadataItemParams item = {1, 0, 0x15C7, 0, kTitlePair, 2};
        ASSERT_EQ(MbxPutMetadataItem(context, &movie->userMetadata.items, &item, &index), MBX_OK);
        movie->fragmentCount = 1;
        movie->freeBytes = 20;
    }

    static constexpr uint8_t kTitlePair[2] = {'A', 'B'};
};

TEST_F(WholeMovieTest, ChildrenOfMoovStandInTheirOrder) {
    const Bytes moov = writeMoov();
    EXPECT_EQ(childCodes(moov, 8, moov.size()),
              std::vector<std::string>(
                  {"mvhd", "ainf", "iods", "meta", "trak", "trak", "mvex", "uuid", "pssh", "free"}));
    EXPECT_BYTES(Bytes(moov.end() - 28, moov.end()), Hex("0000001C 'free'") + Repeat(0, 20));
}

TEST_F(WholeMovieTest, ChildrenOfTrakStandInTheirOrder) {
    MbxTrakBox* box = nullptr;
    ASSERT_EQ(MbxNew(context, &box), MBX_OK);
    const MbxTrackInMovie inMovie = {movie->tracks.first, 1000};
    ASSERT_EQ(MbxBuildTrak(context, &options, &inMovie, box), MBX_OK);
    EXPECT_EQ(MbxWriteTrakBox(context, &options, &file, 0, box, nullptr, nullptr), MBX_OK);
    EXPECT_EQ(MbxFreeTrak(context, box), MBX_OK);
    EXPECT_EQ(childCodes(file.bytes, 8, file.bytes.size()),
              std::vector<std::string>({"tkhd", "senc", "tref", "edts", "mdia", "uuid"}));
    EXPECT_BYTES(Bytes(file.bytes.begin() + 100, file.bytes.begin() + 118),
                 Hex("00000012 'senc' 00000000 00000001 'AB'"));
}

TEST_F(WholeMovieTest, TrackWithoutAuxiliarySamplesHasNoSenc) {
    MbxTrakBox* box = nullptr;
    ASSERT_EQ(MbxNew(context, &box), MBX_OK);
    movie->tracks.first->auxEnabled = 0;
    const MbxTrackInMovie inMovie = {movie->tracks.first, 1000};
    ASSERT_EQ(MbxBuildTrak(context, &options, &inMovie, box), MBX_OK);
    EXPECT_EQ(box->senc, nullptr);
    EXPECT_EQ(MbxFreeTrak(context, box), MBX_OK);
}

TEST_F(WholeMovieTest, EveryRefusedAllocationIsReportedAndLeaksNothing) {
    const size_t live = host.live.size();
    for (uint64_t n = 1;; n++) {
        ASSERT_LT(n, 1000U);
        MbxMoovBox* box = nullptr;
        ASSERT_EQ(MbxNew(context, &box), MBX_OK);
        host.allocations = 0;
        host.failAllocation = n;
        const MbxStatus status = MbxBuildMoov(context, &options, movie, box);
        const bool isComplete = host.allocations < n;
        host.failAllocation = 0;
        EXPECT_EQ(MbxFreeMoov(context, box), MBX_OK);
        EXPECT_EQ(host.live.size(), live);
        ASSERT_EQ(status, isComplete ? MBX_OK : MBX_ERR_NO_MEMORY) << n;
        if (isComplete) break;
    }
}

class MovieTimesTest : public MovieTest {
 protected:
    void SetUp() override {
        MovieTest::SetUp();
        for (const uint32_t id : {1U, 2U}) ASSERT_EQ(create(MbxCode("vide"), TrackParams(id, 1000)), MBX_OK);
        first = movie->tracks.first;
        second = movie->tracks.last;
        ofMovie = addMetadataTrack(&movie->userMetadata);
        ofTrack = addMetadataTrack(&second->userMetadata);
    }

    MbxMetadataTrack* addMetadataTrack(MbxUserMetadata* lists) {
        MbxMetadataTrack* made = nullptr;
        EXPECT_EQ(MbxNew(context, &made), MBX_OK);
        MbxListAppend(&lists->tracks, made);
        return made;
    }

    MbxStatus set(uint32_t track, uint32_t selector, uint64_t creation, uint64_t modification) {
        return MbxSetMovieTimes(context, &options, movie, track, selector, creation, modification);
    }

    // All ten pairs of times, in the order of the selector's bits.
    std::vector<uint64_t> times() const {
        return {movie->header.creationTime,       movie->header.modificationTime,
                first->header.creationTime,       first->header.modificationTime,
                second->header.creationTime,      second->header.modificationTime,
                first->mediaHeader.creationTime,  first->mediaHeader.modificationTime,
                second->mediaHeader.creationTime, second->mediaHeader.modificationTime,
                ofMovie->header.creationTime,     ofMovie->header.modificationTime,
                ofTrack->header.creationTime,     ofTrack->header.modificationTime};
    }

    MbxTrack* first = nullptr;
    MbxTrack* second = nullptr;
    MbxMetadataTrack* ofMovie = nullptr;
    MbxMetadataTrack* ofTrack = nullptr;
};

TEST_F(MovieTimesTest, AllOnesSetEveryTime) {
    EXPECT_EQ(set(0, UINT32_MAX, 11, 22), MBX_OK);
    EXPECT_EQ(times(), std::vector<uint64_t>({11, 22, 11, 22, 11, 22, 11, 22, 11, 22, 11, 22, 11, 22}));
    EXPECT_EQ(movie->header.fieldsSet, 4U | 3U);
    EXPECT_EQ(first->header.fieldsSet, 0x3C08U | 6U);
    EXPECT_EQ(first->mediaHeader.fieldsSet, 20U | 3U);
}

TEST_F(MovieTimesTest, EachBitSelectsOneTime) {
    const std::vector<std::vector<size_t>> kPlaces = {{0},    {1},    {2, 4},   {3, 5},
                                                      {6, 8}, {7, 9}, {10, 12}, {11, 13}};
    for (size_t bit = 0; bit < kPlaces.size(); bit++) {
        SCOPED_TRACE(bit);
        ASSERT_EQ(set(0, UINT32_MAX, 0, 0), MBX_OK);
        ASSERT_EQ(set(0, 1U << bit, 11, 22), MBX_OK);
        std::vector<uint64_t> expected(14, 0);
        for (const size_t place : kPlaces[bit]) expected[place] = place % 2 == 0 ? 11 : 22;
        EXPECT_EQ(times(), expected);
    }
}

TEST_F(MovieTimesTest, TrackIndexSetsThatTracksHeadersAlone) {
    EXPECT_EQ(set(2, UINT32_MAX, 11, 22), MBX_OK);
    EXPECT_EQ(times(), std::vector<uint64_t>({0, 0, 0, 0, 11, 22, 0, 0, 11, 22, 0, 0, 0, 0}));
}

TEST_F(MovieTimesTest, TrackBeyondTheEndIsNotFound) {
    EXPECT_EQ(set(3, UINT32_MAX, 11, 22), MBX_ERR_NOT_FOUND);
    EXPECT_EQ(times(), std::vector<uint64_t>(14, 0));
}

TEST_F(MovieTimesTest, WideTimesAreRefusedOneByOneInModes0And2) {
    const uint64_t wide = 1ULL << 32;
    for (const uint32_t mode : {0U, 2U}) {
        options.time_version_mode = mode;
        for (uint32_t bit = 0; bit < 8; bit++) {
            const bool isCreation = bit % 2 == 0;
            EXPECT_EQ(set(0, 1U << bit, isCreation ? wide : 0, isCreation ? 0 : wide), MBX_ERR_BAD_STATE);
            EXPECT_EQ(set(0, 1U << bit, isCreation ? 0 : wide, isCreation ? wide : 0), MBX_OK);
        }
    }
    EXPECT_EQ(times(), std::vector<uint64_t>(14, 0));
}

TEST_F(MovieTimesTest, WideTimesPassInModes1And3ButForMetadataTracks) {
    const uint64_t wide = 1ULL << 32;
    for (const uint32_t mode : {1U, 3U}) {
        options.time_version_mode = mode;
        EXPECT_EQ(set(0, 0x3F, wide, wide), MBX_OK);
        EXPECT_EQ(set(0, 64, wide, 0), MBX_ERR_BAD_STATE);
        EXPECT_EQ(set(0, 128, 0, wide), MBX_ERR_BAD_STATE);
    }
    EXPECT_EQ(times(), std::vector<uint64_t>(
                           {wide, wide, wide, wide, wide, wide, wide, wide, wide, wide, 0, 0, 0, 0}));
}

TEST_F(MovieTimesTest, NullArgumentsAreRefused) {
    EXPECT_EQ(MbxSetMovieTimes(nullptr, &options, movie, 0, 1, 1, 1), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxSetMovieTimes(context, nullptr, movie, 0, 1, 1, 1), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxSetMovieTimes(context, &options, nullptr, 0, 1, 1, 1), MBX_ERR_INVALID_ARG);
}

}  // namespace
