#include "boxlib/fragment/track_fragment.h"

#include "boxlib/core/row_table.h"
#include "boxlib/support/fragment_sample.h"
#include "boxlib/support/registry.h"

namespace {

const FragmentSample kSample;
const MbxTfhdParams kTfhdParams = {&kSample.track, &kSample.segment, 0};
const MbxTfdtParams kTfdtParams = {0x01020304};

const BoxRegistration kTfhd = RegisterBox<MbxTfhdBox>(
    {.name = "Tfhd",
     .code = "tfhd",
     .parents = "traf",
     .clause = "ISO/IEC 14496-12 8.8.7",
     .presence = Presence::kMandatory,
     .golden = FragmentSample::Tfhd(),
     .build = [](MbxContext* context, const MbxOptions* options,
                 MbxTfhdBox* box) { return MbxBuildTfhd(context, options, &kTfhdParams, box); },
     .write = MbxWriteTfhdBox,
     .free = MbxFreeTfhd});

const BoxRegistration kTfdt = RegisterBox<MbxTfdtBox>(
    {.name = "Tfdt",
     .code = "tfdt",
     .parents = "traf",
     .clause = "ISO/IEC 14496-12 8.8.12",
     .presence = Presence::kOptional,
     .golden = Hex("00000010 'tfdt'"  // size, type
                   "00 000000"        // version, flags
                   "01020304"),       // baseMediaDecodeTime
     .build = [](MbxContext* context, const MbxOptions* options,
                 MbxTfdtBox* box) { return MbxBuildTfdt(context, options, &kTfdtParams, box); },
     .write = MbxWriteTfdtBox,
     .free = MbxFreeTfdt});

const BoxRegistration kTrik =
    RegisterBox<MbxTrikBox>({.name = "Trik",
                             .code = "trik",
                             .parents = "traf",
                             .clause = "own: trick play bytes",
                             .presence = Presence::kOptional,
                             .golden = FragmentSample::Trik(),
                             .build =
                                 [](MbxContext* context, const MbxOptions* options, MbxTrikBox* box) {
                                     return MbxBuildTrik(context, options, &kSample.segment.trickBytes, box);
                                 },
                             .write = MbxWriteTrikBox,
                             .free = MbxFreeTrik});

const BoxRegistration kAvcn = RegisterBox<MbxAvcnBox>(
    {.name = "Avcn",
     .code = "avcn",
     .parents = "traf",
     .clause = "own: the payload of ISO/IEC 14496-15 5.2.4.1",
     .presence = Presence::kOptional,
     .golden = FragmentSample::Avcn(),
     .build = [](MbxContext* context, const MbxOptions* options,
                 MbxAvcnBox* box) { return MbxBuildAvcn(context, options, &kSample.avc, box); },
     .write = MbxWriteAvcnBox,
     .free = MbxFreeAvcn});

const BoxRegistration kTraf = RegisterBox<MbxTrafBox>(
    {.name = "Traf",
     .code = "traf",
     .parents = "moof",
     .clause = "ISO/IEC 14496-12 8.8.6",
     .presence = Presence::kMandatory,
     .golden = FragmentSample::Traf(),
     .build =
         [](MbxContext* context, const MbxOptions* options, MbxTrafBox* box) {
             uint64_t runningBase = 0;
             const MbxTrafParams params = {&kSample.track, &kSample.segment, &runningBase};
             return MbxBuildTraf(context, nullptr, options, &params, box);
         },
     .write = MbxWithScratch(nullptr, MbxWriteTrafBox),
     .free = MbxFreeTraf});

class TrackFragmentTest : public SampleTest {
 protected:
    void SetUp() override {
        SampleTest::SetUp();
        track = addTrack();
        track->defaults = {1, 10, 100, 0};
        addChunk(2, 1000);
    }

    MbxSampleSegment* segment() const { return track->segments.first; }

    // The `tfhd` of the first segment, without its header.
    MbxStatus tfhd(Bytes* bytes, uint64_t base = 0) {
        const MbxTfhdParams params = {track, segment(), base};
        MbxTfhdBox box = {};
        MBX_TRY(MbxBuildTfhd(context, &options, &params, &box));
        MemoryFile target;
        EXPECT_EQ(MbxWriteTfhdBox(context, &options, &target, 0, &box, nullptr, nullptr), MBX_OK);
        values = box.values;
        *bytes = Bytes(target.bytes.begin() + 8, target.bytes.end());
        return MBX_OK;
    }

    Bytes tfhd() {
        Bytes bytes;
        EXPECT_EQ(tfhd(&bytes), MBX_OK);
        return bytes;
    }

    Bytes tfdt(uint32_t mode, uint64_t time, MbxStatus expected) {
        options.time_version_mode = mode;
        const MbxTfdtParams params = {time};
        MbxTfdtBox box = {};
        EXPECT_EQ(MbxBuildTfdt(context, &options, &params, &box), expected) << mode << " " << time;
        if (expected != MBX_OK) return {};
        MemoryFile target;
        EXPECT_EQ(MbxWriteTfdtBox(context, &options, &target, 0, &box, nullptr, nullptr), MBX_OK);
        return target.bytes;
    }

    // The codes of the children of the first segment's `traf`, in the order of the file.
    std::string children() {
        MbxTrafBox* box = nullptr;
        const MbxTrafParams params = {track, segment(), &runningBase};
        const auto build = [&](MbxTrafBox* made) {
            return MbxBuildTraf(context, &session.scratch, &options, &params, made);
        };
        EXPECT_EQ(MbxMakeChild(context, &box, build, MbxFreeTraf), MBX_OK);
        MemoryFile target;
        EXPECT_EQ(MbxWriteTrafBox(context, &session.scratch, &options, &target, 0, box, nullptr, nullptr),
                  MBX_OK);
        EXPECT_EQ(box->size, target.bytes.size());
        EXPECT_EQ(MbxFreeTraf(context, box), MBX_OK);
        std::string codes;
        for (size_t at = 8; at + 8 <= target.bytes.size(); at += MbxGet32(&target.bytes[at])) {
            codes += (codes.empty() ? "" : " ") + std::string(&target.bytes[at + 4], &target.bytes[at + 8]);
        }
        return codes;
    }

    MbxTrack* track = nullptr;
    MbxTfhdValues values = {};
    uint64_t runningBase = 0;
};

// ---- `tfhd`, field by field
// ----------------------------------------------------------------------------------------

TEST_F(TrackFragmentTest, TfhdOfTrexDefaultsCarriesTheBaseAlone) {
    EXPECT_BYTES(tfhd(), Hex("00 000001 0000000A 00000000000003E8"));
}

TEST_F(TrackFragmentTest, TfhdCarriesEachValueThatDiffersFromTrex) {
    track->defaults.descriptionIndex = 2;
    EXPECT_BYTES(tfhd(), Hex("00 000003 0000000A 00000000000003E8 00000001"));
    track->defaults = {1, 9, 100, 0};
    EXPECT_BYTES(tfhd(), Hex("00 000009 0000000A 00000000000003E8 0000000A"));
    track->defaults = {1, 10, 99, 0};
    EXPECT_BYTES(tfhd(), Hex("00 000011 0000000A 00000000000003E8 00000064"));
    track->defaults = {1, 10, 100, 0x00010000};
    EXPECT_BYTES(tfhd(), Hex("00 000021 0000000A 00000000000003E8 00000000"));
    track->defaults = {2, 9, 99, 0x00010000};
    EXPECT_BYTES(tfhd(), Hex("00 00003B 0000000A 00000000000003E8 00000001 0000000A 00000064 00000000"));
}

TEST_F(TrackFragmentTest, TfhdCarriesWhatIsForcedAlways) {
    const char* const fields[] = {
        "00 000003 0000000A 00000000000003E8 00000001", "00 000009 0000000A 00000000000003E8 0000000A",
        "00 000011 0000000A 00000000000003E8 00000064", "00 000021 0000000A 00000000000003E8 00000000"};
    for (size_t i = 0; i < 4; i++) {
        for (size_t word = 0; word < 4; word++) track->defaultsForced[word] = word == i ? 1 : 0;
        EXPECT_BYTES(tfhd(), Hex(fields[i]));
    }
}

TEST_F(TrackFragmentTest, AForcedWordAboveOneIsInvalid) {
    for (size_t i = 0; i < 4; i++) {
        for (size_t word = 0; word < 4; word++) track->defaultsForced[word] = word == i ? 2 : 0;
        Bytes bytes;
        EXPECT_EQ(tfhd(&bytes), MBX_ERR_INVALID_ARG);
    }
}

TEST_F(TrackFragmentTest, OverridesTakeThePlaceOfTheSegmentsValues) {
    segment()->overrides = {0x0102030405060708, 2, 3, 4, 5};
    segment()->overridesSet = MBX_OVERRIDE_BASE_OFFSET;
    EXPECT_BYTES(tfhd(), Hex("00 000001 0000000A 0102030405060708"));
    segment()->overridesSet = MBX_OVERRIDE_DESCRIPTION;
    EXPECT_BYTES(tfhd(), Hex("00 000003 0000000A 00000000000003E8 00000002"));
    segment()->overridesSet = MBX_OVERRIDE_DURATION;
    EXPECT_BYTES(tfhd(), Hex("00 000009 0000000A 00000000000003E8 00000003"));
    segment()->overridesSet = MBX_OVERRIDE_SIZE;
    EXPECT_BYTES(tfhd(), Hex("00 000011 0000000A 00000000000003E8 00000004"));
    segment()->overridesSet = MBX_OVERRIDE_FLAGS;
    EXPECT_BYTES(tfhd(), Hex("00 000021 0000000A 00000000000003E8 00000005"));
    segment()->overridesSet = 0;
    EXPECT_BYTES(tfhd(), Hex("00 000001 0000000A 00000000000003E8"));
}

TEST_F(TrackFragmentTest, BaseOffsetModesChooseFlagAndValue) {
    Bytes bytes;
    options.base_offset_mode = 1;
    ASSERT_EQ(tfhd(&bytes, 0x77), MBX_OK);
    EXPECT_BYTES(bytes, Hex("00 000000 0000000A"));
    EXPECT_EQ(values.baseDataOffset, 0x77U);
    options.base_offset_mode = 2;
    ASSERT_EQ(tfhd(&bytes, 0x77), MBX_OK);
    EXPECT_BYTES(bytes, Hex("00 020000 0000000A"));
    EXPECT_EQ(values.baseDataOffset, 0U);
    options.base_offset_mode = 3;
    EXPECT_EQ(tfhd(&bytes), MBX_ERR_INVALID_ARG);
}

TEST_F(TrackFragmentTest, DefaultFlagsAreNonSyncOnceOneSampleIs) {
    addChunk(1, 1200, sample(100, 10, 0));
    EXPECT_BYTES(tfhd(), Hex("00 000021 0000000A 00000000000003E8 00010000"));
}

TEST_F(TrackFragmentTest, DefaultSizeIsTheFirstThatIsListed) {
    addChunk(1, 1200, sample(7));
    EXPECT_BYTES(tfhd(), Hex("00 000001 0000000A 00000000000003E8"));
    EXPECT_EQ(values.defaultSampleSize, 100U);
}

// ---- `tfdt`
// --------------------------------------------------------------------------------------------------------

TEST_F(TrackFragmentTest, TfdtVersionInEachModeAtTheEdge) {
    constexpr uint64_t kFits = 0xFFFFFFFF;
    constexpr uint64_t kWide = 0x100000000;
    const Bytes narrow = Hex("00000010 'tfdt' 00000000 FFFFFFFF");
    const Bytes fitsWide = Hex("00000014 'tfdt' 01000000 00000000FFFFFFFF");
    const Bytes wide = Hex("00000014 'tfdt' 01000000 0000000100000000");
    EXPECT_BYTES(tfdt(0, kFits, MBX_OK), narrow);
    tfdt(0, kWide, MBX_ERR_BAD_STATE);
    EXPECT_BYTES(tfdt(1, kFits, MBX_OK), narrow);
    EXPECT_BYTES(tfdt(1, kWide, MBX_OK), wide);
    EXPECT_BYTES(tfdt(2, kFits, MBX_OK), narrow);
    tfdt(2, kWide, MBX_ERR_BAD_STATE);
    EXPECT_BYTES(tfdt(3, kFits, MBX_OK), fitsWide);
    EXPECT_BYTES(tfdt(3, kWide, MBX_OK), wide);
}

// ---- `trik`
// --------------------------------------------------------------------------------------------------------

TEST_F(TrackFragmentTest, TrikRunsOverBlocks) {
    track->trickEnabled = 1;
    ASSERT_EQ(MbxFreeSegments(context, track), MBX_OK);
    Bytes expected = Hex("000003FD 'trik' 00000000");
    for (uint32_t i = 0; i < 1009; i++) {
        MbxSampleInfo info = sample();
        info.pictureType = static_cast<uint8_t>(i % 4);
        info.dependencyLevel = static_cast<uint8_t>(i % 64);
        ASSERT_EQ(add(info), MBX_OK);
        expected.push_back(static_cast<uint8_t>(i % 4 * 64 + i % 64));
    }
    MbxTrikBox box = {};
    ASSERT_EQ(MbxBuildTrik(context, &options, &segment()->trickBytes, &box), MBX_OK);
    EXPECT_EQ(MbxWriteTrikBox(context, &options, &file, 0, &box, nullptr, nullptr), MBX_OK);
    EXPECT_BYTES(file.bytes, expected);
}

// ---- `traf`
// --------------------------------------------------------------------------------------------------------

TEST_F(TrackFragmentTest, TrafHasOneRunPerChunkAndOptionalBoxesOnlyWhereAskedFor) {
    EXPECT_EQ(children(), "tfhd trun");
    addChunk(1, 5000);
    addChunk(3, 6000);
    EXPECT_EQ(children(), "tfhd trun trun trun");
    options.tfdt_mode = 1;
    EXPECT_EQ(children(), "tfhd tfdt trun trun trun");
    options.tfdt_mode = 2;
    EXPECT_EQ(children(), "tfhd trun trun trun");
    track->trickEnabled = 1;
    EXPECT_EQ(children(), "tfhd trik trun trun trun");
    track->auxEnabled = 1;  // but no information was entered
    EXPECT_EQ(children(), "tfhd trik trun trun trun");
}

TEST_F(TrackFragmentTest, TfdtStandsBetweenTfhdAndTrik) {
    options.tfdt_mode = 1;
    track->trickEnabled = 1;
    EXPECT_EQ(children(), "tfhd tfdt trik trun");
}

TEST_F(TrackFragmentTest, TrafMovesTheRunningBaseToTheEndOfItsData) {
    addChunk(1, 5000);
    options.base_offset_mode = 1;
    runningBase = 50;
    EXPECT_EQ(children(), "tfhd trun trun");
    EXPECT_EQ(runningBase, 5100U);
}

TEST_F(TrackFragmentTest, BuildersRefuseNullArguments) {
    MbxTfhdBox box = {};
    MbxTrafBox traf = {};
    const MbxTfhdParams params = {track, segment(), 0};
    EXPECT_EQ(MbxBuildTfhd(nullptr, &options, &params, &box), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxBuildTfhd(context, nullptr, &params, &box), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxBuildTfhd(context, &options, nullptr, &box), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxBuildTfhd(context, &options, &params, nullptr), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxBuildTraf(context, nullptr, &options, nullptr, &traf), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxBuildTrik(context, &options, nullptr, nullptr), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxBuildAvcn(context, &options, nullptr, nullptr), MBX_ERR_INVALID_ARG);
}

}  // namespace
