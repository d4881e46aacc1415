#include "boxlib/model/session_model.h"

#include "boxlib/support/track_fixture.h"

namespace {

// Tracks 1 to 4: video, sound, timecode, metadata, each with one data reference.
class SessionEntryTest : public SessionTest {
 protected:
    void SetUp() override {
        SessionTest::SetUp();
        CreateSession();
        ASSERT_EQ(MbxCreateMovie(session, 1000), MBX_OK);
        MbxTrackParams params = TrackParams(1, 24000);
        ASSERT_EQ(MbxAddVideoTrack(session, &params, &number), MBX_OK);
        params.trackId = 2;
        ASSERT_EQ(MbxAddSoundTrack(session, &params, &number), MBX_OK);
        params.trackId = 3;
        ASSERT_EQ(MbxAddTimecodeTrack(session, &params, &number), MBX_OK);
        params.trackId = 4;
        ASSERT_EQ(MbxAddMetaTrack(session, &params, &number), MBX_OK);
        for (uint32_t track = 1; track <= 4; track++) {
            ASSERT_EQ(MbxAddDataReference(session, track, nullptr, 0, &number), MBX_OK);
        }
        number = 7;
    }

    // Adds the entry of that kind to the video track.
    MbxStatus addVideo(uint32_t kind, uint32_t reference = 1) {
        const MbxVisualEntryParams params = {kind, reference, 1920, 1080, 72, 0, 72, 0};
        return MbxAddVideoEntry(session, 1, &params, &number);
    }

    uint32_t number = 0;
};

TEST_F(SessionEntryTest, EachOperationAddsItsEntry) {
    const MbxAudioEntryParams audio = {1, 2, 16};
    const MbxTimecodeEntryParams timecode = {1, 0, 24000, 1001, 24, {}};
    const MbxMetaEntryParams meta = {1};
    EXPECT_EQ(addVideo(2), MBX_OK);
    EXPECT_EQ(number, 1U);
    EXPECT_EQ(addVideo(1), MBX_OK);
    EXPECT_EQ(number, 2U);
    EXPECT_EQ(addVideo(11), MBX_OK);
    EXPECT_EQ(number, 3U);
    EXPECT_EQ(MbxAddSoundEntry(session, 2, &audio, &number), MBX_OK);
    EXPECT_EQ(MbxAddTimecodeEntry(session, 3, &timecode, &number), MBX_OK);
    EXPECT_EQ(MbxAddMetaEntry(session, 4, &meta, &number), MBX_OK);
    EXPECT_EQ(number, 1U);
    std::vector<uint32_t> kinds;
    for (const MbxTrack* t = session->movie->tracks.first; t != nullptr; t = t->next) {
        for (const MbxSampleEntry* e = t->sampleEntries.entries.first; e != nullptr; e = e->next) {
            kinds.push_back(e->kind);
        }
    }
    EXPECT_EQ(kinds, std::vector<uint32_t>({2, 1, 11, 3, 12, 6}));
}

TEST_F(SessionEntryTest, OtherVideoKindsAreRefused) {
    for (const uint32_t kind : {0U, 3U, 6U, 10U, 12U, 13U})
        EXPECT_EQ(addVideo(kind), MBX_ERR_INVALID_ARG) << kind;
    EXPECT_EQ(number, 7U);
}

TEST_F(SessionEntryTest, DataReferenceMustBeInRangeAndExist) {
    EXPECT_EQ(addVideo(2, 0), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(addVideo(2, 2), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(addVideo(2, 65536), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(session->movie->tracks.first->sampleEntries.entries.first, nullptr);
}

TEST_F(SessionEntryTest, HandlerMustSuitTheEntry) {
    const MbxVisualEntryParams video = {2, 1, 1920, 1080, 72, 0, 72, 0};
    const MbxAudioEntryParams audio = {1, 2, 16};
    const MbxTimecodeEntryParams timecode = {1, 0, 24000, 1001, 24, {}};
    const MbxMetaEntryParams meta = {1};
    EXPECT_EQ(MbxAddVideoEntry(session, 2, &video, &number), MBX_ERR_BAD_STATE);
    EXPECT_EQ(MbxAddSoundEntry(session, 3, &audio, &number), MBX_ERR_BAD_STATE);
    EXPECT_EQ(MbxAddTimecodeEntry(session, 4, &timecode, &number), MBX_ERR_BAD_STATE);
    EXPECT_EQ(MbxAddMetaEntry(session, 1, &meta, &number), MBX_ERR_BAD_STATE);
    EXPECT_EQ(number, 7U);
}

TEST_F(SessionEntryTest, TrackMustExist) {
    const MbxMetaEntryParams meta = {1};
    EXPECT_EQ(MbxAddMetaEntry(session, 5, &meta, &number), MBX_ERR_NOT_FOUND);
    EXPECT_EQ(MbxAddMetaEntry(session, 0, &meta, &number), MBX_ERR_INVALID_ARG);
}

TEST_F(SessionEntryTest, NullSessionRecordOrResultIsAnInvalidArgument) {
    const MbxVisualEntryParams video = {2, 1, 1920, 1080, 72, 0, 72, 0};
    const MbxAudioEntryParams audio = {1, 2, 16};
    const MbxTimecodeEntryParams timecode = {1, 0, 24000, 1001, 24, {}};
    const MbxMetaEntryParams meta = {1};
    const MbxAvcConfigParams avc = {};
    const MbxHvcCValues hevc = {};
    const MbxEsdsParams esds = {};
    const uint8_t byte = 0;
    EXPECT_EQ(MbxAddVideoEntry(nullptr, 1, &video, &number), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxAddVideoEntry(session, 1, nullptr, &number), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxAddVideoEntry(session, 1, &video, nullptr), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxAddSoundEntry(nullptr, 2, &audio, &number), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxAddSoundEntry(session, 2, nullptr, &number), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxAddSoundEntry(session, 2, &audio, nullptr), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxAddTimecodeEntry(nullptr, 3, &timecode, &number), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxAddTimecodeEntry(session, 3, nullptr, &number), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxAddTimecodeEntry(session, 3, &timecode, nullptr), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxAddMetaEntry(nullptr, 4, &meta, &number), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxAddMetaEntry(session, 4, nullptr, &number), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxAddMetaEntry(session, 4, &meta, nullptr), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxSetAvcConfig(nullptr, 1, 1, &avc), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxAddAvcSps(nullptr, 1, 1, &byte, 1), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxAddAvcPps(nullptr, 1, 1, &byte, 1), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxSetHvcConfig(nullptr, 1, 1, &hevc), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxAddHvcNalUnit(nullptr, 1, 1, 32, 1, &byte, 1), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxSetEsds(nullptr, 1, 1, &esds), MBX_ERR_INVALID_ARG);
    ASSERT_EQ(addVideo(2), MBX_OK);
    EXPECT_EQ(MbxSetAvcConfig(session, 1, 1, nullptr), MBX_ERR_INVALID_ARG);
    ASSERT_EQ(MbxSetAvcConfig(session, 1, 1, &avc), MBX_OK);
    EXPECT_EQ(MbxAddAvcSps(session, 1, 1, nullptr, 1), MBX_ERR_INVALID_ARG);
}

TEST_F(SessionEntryTest, ConfigurationNeedsAnEntryOfItsKind) {
    const MbxAvcConfigParams avc = {1, 100, 0, 41, 3, 0, 0, 0, 0};
    const MbxHvcCValues hevc = {};
    const MbxEsdsParams esds = {};
    const uint8_t byte = 0;
    ASSERT_EQ(addVideo(1), MBX_OK);
    ASSERT_EQ(addVideo(2), MBX_OK);
    ASSERT_EQ(addVideo(11), MBX_OK);
    EXPECT_EQ(MbxSetAvcConfig(session, 1, 2, &avc), MBX_OK);
    EXPECT_EQ(MbxSetAvcConfig(session, 1, 1, &avc), MBX_ERR_BAD_STATE);
    EXPECT_EQ(MbxSetAvcConfig(session, 1, 3, &avc), MBX_ERR_BAD_STATE);
    EXPECT_EQ(MbxSetHvcConfig(session, 1, 3, &hevc), MBX_OK);
    EXPECT_EQ(MbxSetHvcConfig(session, 1, 2, &hevc), MBX_ERR_BAD_STATE);
    EXPECT_EQ(MbxAddHvcNalUnit(session, 1, 3, 32, 1, &byte, 1), MBX_OK);
    EXPECT_EQ(MbxAddHvcNalUnit(session, 1, 2, 32, 1, &byte, 1), MBX_ERR_BAD_STATE);
    EXPECT_EQ(MbxSetEsds(session, 1, 1, &esds), MBX_OK);
    EXPECT_EQ(MbxSetEsds(session, 1, 2, &esds), MBX_ERR_BAD_STATE);
}

TEST_F(SessionEntryTest, EntryLookedUpByNumberMustExist) {
    const MbxAvcConfigParams avc = {};
    const uint8_t byte = 0;
    EXPECT_EQ(MbxSetAvcConfig(session, 1, 1, &avc), MBX_ERR_NOT_FOUND);
    EXPECT_EQ(MbxSetAvcConfig(session, 1, 0, &avc), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxSetAvcConfig(session, 9, 1, &avc), MBX_ERR_NOT_FOUND);
    EXPECT_EQ(MbxAddAvcSps(session, 1, 1, &byte, 1), MBX_ERR_NOT_FOUND);
    EXPECT_EQ(MbxAddAvcPps(session, 1, 1, &byte, 1), MBX_ERR_NOT_FOUND);
}

TEST_F(SessionEntryTest, ConfiguredEntriesAreWrittenIntoMoov) {
    ASSERT_EQ(addVideo(11), MBX_OK);
    MbxHvcCValues hevc = {};
    hevc.configurationVersion = 1;
    hevc.lengthSizeMinusOne = 3;
    const uint8_t vps[] = {0x40, 0x01};
    ASSERT_EQ(MbxSetHvcConfig(session, 1, 1, &hevc), MBX_OK);
    ASSERT_EQ(MbxAddHvcNalUnit(session, 1, 1, 32, 1, vps, 2), MBX_OK);
    uint64_t size = 0;
    ASSERT_EQ(MbxWriteMoov(session, &file, 0, &size), MBX_OK);
    const Bytes hvcC =
        Hex("00000026 'hvcC'"
            "01"                   // configurationVersion
            "00"                   // profile space, tier, profile
            "00000000"             // compatibility flags
            "000000000000"         // constraint flags
            "00"                   // level
            "F000"                 // min_spatial_segmentation_idc
            "FC FC F8 F8"          // parallelism, chroma, luma and chroma depth
            "0000"                 // avgFrameRate
            "03"                   // lengthSizeMinusOne
            "01"                   // arrays
            "A0 0001 0002 4001");  // complete, type 32, one NAL unit
    EXPECT_NE(std::search(file.bytes.begin(), file.bytes.end(), hvcC.begin(), hvcC.end()), file.bytes.end());
}

TEST_F(SessionEntryTest, Hvc1EntryWithoutItsConfigurationCannotBeBuilt) {
    ASSERT_EQ(addVideo(11), MBX_OK);
    uint64_t size = 7;
    EXPECT_EQ(MbxWriteMoov(session, nullptr, 0, &size), MBX_ERR_BAD_STATE);
    EXPECT_EQ(size, 7U);
}

}  // namespace
