#include "boxlib/model/session_model.h"

#include "boxlib/support/track_fixture.h"

namespace {

class SessionMovieTest : public SessionTest {
 protected:
    void SetUp() override {
        SessionTest::SetUp();
        CreateSession();
    }

    uint32_t number = 7;
    uint64_t size = 7;
};

TEST_F(SessionMovieTest, SecondMovieIsRefusedAndTheFirstUntouched) {
    ASSERT_EQ(MbxCreateMovie(session, 1000), MBX_OK);
    const MbxMovie* first = session->movie;
    EXPECT_EQ(MbxCreateMovie(session, 2000), MBX_ERR_BAD_STATE);
    EXPECT_EQ(session->movie, first);
    EXPECT_EQ(session->movie->header.timescale, 1000U);
}

TEST_F(SessionMovieTest, MovieNeedsATimescale) {
    EXPECT_EQ(MbxCreateMovie(session, 0), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxCreateMovie(nullptr, 1000), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(session->movie, nullptr);
}

TEST_F(SessionMovieTest, EveryCallThatNeedsAMovieSaysSo) {
    const MbxTrackParams track = TrackParams(1, 1000);
    const MbxMetadataItemParams item = {};
    const MbxTrackReferenceParams reference = {MbxCode("cdsc"), 1};
    EXPECT_EQ(MbxAddVideoTrack(session, &track, &number), MBX_ERR_BAD_STATE);
    EXPECT_EQ(MbxAddSoundTrack(session, &track, &number), MBX_ERR_BAD_STATE);
    EXPECT_EQ(MbxAddTimecodeTrack(session, &track, &number), MBX_ERR_BAD_STATE);
    EXPECT_EQ(MbxAddMetaTrack(session, &track, &number), MBX_ERR_BAD_STATE);
    EXPECT_EQ(MbxGetNextTrackId(session, &number), MBX_ERR_BAD_STATE);
    EXPECT_EQ(MbxAddDataReference(session, 1, nullptr, 0, &number), MBX_ERR_BAD_STATE);
    EXPECT_EQ(MbxAddTrackMetadata(session, 0, &item), MBX_ERR_BAD_STATE);
    EXPECT_EQ(MbxAddTrackReference(session, 1, &reference, &number), MBX_ERR_BAD_STATE);
    EXPECT_EQ(MbxAddEdit(session, 1, 0), MBX_ERR_BAD_STATE);
    EXPECT_EQ(MbxSetEditDuration(session, 1, 0), MBX_ERR_BAD_STATE);
    EXPECT_EQ(MbxSetMovieTimes(session, 0, 1, 0, 0), MBX_ERR_BAD_STATE);
    EXPECT_EQ(MbxSetSignedOffsets(session, 1, 1), MBX_ERR_BAD_STATE);
    EXPECT_EQ(MbxWriteMoov(session, nullptr, 0, &size), MBX_ERR_BAD_STATE);
    EXPECT_EQ(number, 7U);
    EXPECT_EQ(size, 7U);
}

TEST_F(SessionMovieTest, NullSessionOrResultIsAnInvalidArgument) {
    ASSERT_EQ(MbxCreateMovie(session, 1000), MBX_OK);
    const MbxTrackParams track = TrackParams(1, 1000);
    const MbxMetadataItemParams item = {};
    const MbxTrackReferenceParams reference = {MbxCode("cdsc"), 1};
    EXPECT_EQ(MbxAddVideoTrack(nullptr, &track, &number), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxAddSoundTrack(session, nullptr, &number), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxAddTimecodeTrack(session, &track, nullptr), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxAddMetaTrack(nullptr, &track, &number), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxGetNextTrackId(nullptr, &number), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxGetNextTrackId(session, nullptr), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxAddDataReference(nullptr, 1, nullptr, 0, &number), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxAddDataReference(session, 1, nullptr, 0, nullptr), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxAddTrackMetadata(nullptr, 0, &item), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxAddTrackMetadata(session, 0, nullptr), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxAddTrackReference(nullptr, 1, &reference, &number), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxAddTrackReference(session, 1, nullptr, &number), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxAddTrackReference(session, 1, &reference, nullptr), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxAddEdit(nullptr, 1, 0), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxSetEditDuration(nullptr, 1, 0), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxSetMovieTimes(nullptr, 0, 1, 0, 0), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxSetSignedOffsets(nullptr, 1, 1), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxWriteMoov(nullptr, nullptr, 0, &size), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxWriteMoov(session, nullptr, 0, nullptr), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(number, 7U);
    EXPECT_EQ(size, 7U);
}

class SessionTrackTest : public SessionMovieTest {
 protected:
    void SetUp() override {
        SessionMovieTest::SetUp();
        ASSERT_EQ(MbxCreateMovie(session, 1000), MBX_OK);
        const MbxTrackParams params = TrackParams(5, 24000);
        ASSERT_EQ(MbxAddVideoTrack(session, &params, &number), MBX_OK);
        ASSERT_EQ(number, 1U);
    }
};

TEST_F(SessionTrackTest, EachOperationMakesATrackOfItsHandler) {
    MbxTrackParams params = TrackParams(6, 48000);
    EXPECT_EQ(MbxAddSoundTrack(session, &params, &number), MBX_OK);
    EXPECT_EQ(number, 2U);
    params.trackId = 7;
    EXPECT_EQ(MbxAddTimecodeTrack(session, &params, &number), MBX_OK);
    EXPECT_EQ(number, 3U);
    params.trackId = 8;
    EXPECT_EQ(MbxAddMetaTrack(session, &params, &number), MBX_OK);
    EXPECT_EQ(number, 4U);
    std::vector<uint32_t> handlers;
    for (const MbxTrack* t = session->movie->tracks.first; t != nullptr; t = t->next) {
        handlers.push_back(t->handler.type);
    }
    EXPECT_EQ(handlers,
              std::vector<uint32_t>({MbxCode("vide"), MbxCode("soun"), MbxCode("tmcd"), MbxCode("meta")}));
}

TEST_F(SessionTrackTest, RefusedParametersGiveNoTrack) {
    MbxTrackParams params = TrackParams(5, 24000);
    EXPECT_EQ(MbxAddVideoTrack(session, &params, &number), MBX_ERR_INVALID_ARG);  // in use
    params = TrackParams(6, 0);
    EXPECT_EQ(MbxAddVideoTrack(session, &params, &number), MBX_ERR_INVALID_ARG);
    params = TrackParams(6, 24000);
    params.language = 0x8000;
    EXPECT_EQ(MbxAddVideoTrack(session, &params, &number), MBX_ERR_INVALID_ARG);
    params = TrackParams(6, 24000);
    params.enable_mode = 5;
    EXPECT_EQ(MbxAddVideoTrack(session, &params, &number), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(session->movie->tracks.first, session->movie->tracks.last);
}

TEST_F(SessionTrackTest, NextTrackIdWith1And639InUseIs1024) {
    MbxTrackParams params = TrackParams(1, 24000);
    ASSERT_EQ(MbxAddVideoTrack(session, &params, &number), MBX_OK);
    params.trackId = 639;
    ASSERT_EQ(MbxAddVideoTrack(session, &params, &number), MBX_OK);
    EXPECT_EQ(MbxGetNextTrackId(session, &number), MBX_OK);
    EXPECT_EQ(number, 1024U);
}

TEST_F(SessionTrackTest, DataReferencesAreCounted) {
    EXPECT_EQ(MbxAddDataReference(session, 1, nullptr, 0, &number), MBX_OK);
    EXPECT_EQ(number, 1U);
    EXPECT_EQ(MbxAddDataReference(session, 1, "a/b", 3, &number), MBX_OK);
    EXPECT_EQ(number, 2U);
    EXPECT_EQ(MbxAddDataReference(session, 1, nullptr, 3, &number), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxAddDataReference(session, 0, nullptr, 0, &number), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxAddDataReference(session, 2, nullptr, 0, &number), MBX_ERR_NOT_FOUND);
    EXPECT_EQ(number, 2U);
}

TEST_F(SessionTrackTest, MetadataGoesToTheTrackOrTheMovie) {
    const uint8_t data[] = {1, 2};
    const MbxMetadataItemParams item = {1, 0, 0x15C7, 0, data, 2};
    EXPECT_EQ(MbxAddTrackMetadata(session, 0, &item), MBX_OK);
    EXPECT_EQ(MbxAddTrackMetadata(session, 1, &item), MBX_OK);
    EXPECT_EQ(MbxAddTrackMetadata(session, 2, &item), MBX_ERR_NOT_FOUND);
    ASSERT_NE(session->movie->userMetadata.items.first, nullptr);
    EXPECT_EQ(session->movie->userMetadata.items.first->type, 1U);
    EXPECT_EQ(session->movie->tracks.first->userMetadata.items.last->type, 1U);
    const MbxMetadataItemParams bad = {1, 2, 0x15C7, 0, data, 2};
    EXPECT_EQ(MbxAddTrackMetadata(session, 1, &bad), MBX_ERR_INVALID_ARG);
}

TEST_F(SessionTrackTest, ReferencesEditsAndTimesReachTheTrack) {
    const MbxTrackParams params = TrackParams(6, 24000);
    ASSERT_EQ(MbxAddMetaTrack(session, &params, &number), MBX_OK);
    const MbxTrackReferenceParams reference = {MbxCode("cdsc"), 5};
    EXPECT_EQ(MbxAddTrackReference(session, 2, &reference, &number), MBX_OK);
    EXPECT_EQ(number, 1U);
    EXPECT_EQ(MbxAddTrackReference(session, 1, &reference, &number), MBX_ERR_INVALID_ARG);  // itself
    EXPECT_EQ(MbxAddTrackReference(session, 3, &reference, &number), MBX_ERR_NOT_FOUND);
    EXPECT_EQ(MbxAddEdit(session, 2, 0), MBX_OK);
    EXPECT_EQ(MbxSetEditDuration(session, 2, 7), MBX_OK);
    EXPECT_EQ(MbxAddEdit(session, 3, 0), MBX_ERR_NOT_FOUND);
    EXPECT_EQ(MbxSetEditDuration(session, 3, 0), MBX_ERR_NOT_FOUND);
    EXPECT_EQ(MbxAddEdit(session, 0, 0), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxSetMovieTimes(session, 0, UINT32_MAX, 11, 22), MBX_OK);
    EXPECT_EQ(MbxSetMovieTimes(session, 2, MBX_TIME_TRACK_CREATION, 33, 44), MBX_OK);
    EXPECT_EQ(MbxSetMovieTimes(session, 3, UINT32_MAX, 11, 22), MBX_ERR_NOT_FOUND);
    EXPECT_EQ(session->movie->header.creationTime, 11U);
    EXPECT_EQ(session->movie->tracks.last->header.creationTime, 33U);
    EXPECT_EQ(session->movie->tracks.last->header.modificationTime, 22U);
    EXPECT_NE(session->movie->tracks.last->editList->edits.first, nullptr);
}

TEST_F(SessionTrackTest, SignedOffsetsAreSetPerTrack) {
    EXPECT_EQ(MbxSetSignedOffsets(session, 1, 1), MBX_OK);
    EXPECT_EQ(MbxSetSignedOffsets(session, 1, 2), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxSetSignedOffsets(session, 0, 1), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxSetSignedOffsets(session, 2, 1), MBX_ERR_NOT_FOUND);
}

TEST_F(SessionTrackTest, MoovMeasuresWhatItWrites) {
    for (uint32_t mode = 0; mode <= 2; mode++) {
        SCOPED_TRACE(mode);
        session->config.box_size_mode = mode;
        const size_t live = host.live.size();
        uint64_t measured = 0;
        ASSERT_EQ(MbxWriteMoov(session, nullptr, 0, &measured), MBX_OK);
        MemoryFile target;
        ASSERT_EQ(MbxWriteMoov(session, &target, 100, &size), MBX_OK);
        EXPECT_EQ(size, measured);
        EXPECT_EQ(target.bytes.size(), 100 + size);
        EXPECT_EQ(host.live.size(), live);
    }
}

TEST_F(SessionTrackTest, MoovWaitsForTheEndOfEveryChunk) {
    ASSERT_EQ(MbxAddDataReference(session, 1, nullptr, 0, &number), MBX_OK);
    const MbxVisualEntryParams entry = {1, 1, 16, 16, 72, 0, 72, 0};
    ASSERT_EQ(MbxAddVideoEntry(session, 1, &entry, &number), MBX_OK);
    MbxSampleInfo sample = {};
    sample.size = 10;
    sample.duration = 1000;
    sample.isSync = 1;
    sample.descriptionIndex = 1;
    ASSERT_EQ(MbxAddSample(session, 1, &sample, 0), MBX_OK);
    EXPECT_EQ(MbxWriteMoov(session, nullptr, 0, &size), MBX_ERR_BAD_STATE);
    ASSERT_EQ(MbxEndChunk(session, 1), MBX_OK);
    EXPECT_EQ(MbxWriteMoov(session, nullptr, 0, &size), MBX_OK);
}

TEST_F(SessionTrackTest, ChunkOffsetModeDecidesTheWidthOfOffsets) {
    ASSERT_EQ(MbxAddDataReference(session, 1, nullptr, 0, &number), MBX_OK);
    const MbxVisualEntryParams entry = {1, 1, 16, 16, 72, 0, 72, 0};
    ASSERT_EQ(MbxAddVideoEntry(session, 1, &entry, &number), MBX_OK);
    MbxSampleInfo sample = {};
    sample.size = 10;
    sample.offset = 100;
    sample.duration = 1000;
    sample.isSync = 1;
    sample.descriptionIndex = 1;
    ASSERT_EQ(MbxAddSample(session, 1, &sample, 0), MBX_OK);
    ASSERT_EQ(MbxEndChunk(session, 1), MBX_OK);
    const auto holds = [this](const char* code) {
        MemoryFile target;
        EXPECT_EQ(MbxWriteMoov(session, &target, 0, &size), MBX_OK);
        const Bytes pattern = Hex(code);
        return std::search(target.bytes.begin(), target.bytes.end(), pattern.begin(), pattern.end()) !=
               target.bytes.end();
    };
    EXPECT_TRUE(holds("00000014 'stco' 00000000 00000001 00000064"));
    session->config.chunk_offset_mode = 2;
    EXPECT_TRUE(holds("00000018 'co64' 00000000 00000001 0000000000000064"));
    ASSERT_EQ(MbxShiftChunkOffsets(session, 0, 0, (1LL << 32) - 100), MBX_OK);
    EXPECT_TRUE(holds("00000018 'co64' 00000000 00000001 0000000100000000"));
    session->config.chunk_offset_mode = 0;
    size = 7;
    EXPECT_EQ(MbxWriteMoov(session, nullptr, 0, &size), MBX_ERR_BAD_STATE);
    EXPECT_EQ(size, 7U);
}

TEST_F(SessionTrackTest, SessionSurvivesAFailedWrite) {
    MemoryFile whole;
    ASSERT_EQ(MbxWriteMoov(session, &whole, 0, &size), MBX_OK);
    const size_t live = host.live.size();
    for (uint64_t n = 1; n <= whole.writes; n++) {
        MemoryFile failing;
        failing.failWrite = n;
        ASSERT_EQ(MbxWriteMoov(session, &failing, 0, &size), MBX_ERR_IO) << n;
        ASSERT_EQ(host.live.size(), live);
    }
    MemoryFile again;
    EXPECT_EQ(MbxWriteMoov(session, &again, 0, &size), MBX_OK);
    EXPECT_EQ(again.bytes, whole.bytes);
}

}  // namespace
