// Bytes and records that the tests of media, tracks and movies share.
#pragma once

#include "boxlib/movie/movie.h"
#include "boxlib/support/fixture.h"

// `stbl` of a track without entries and samples.
inline Bytes EmptyStbl() {
    return Hex(
        "0000005C 'stbl'"
        "00000010 'stsd' 00000000 00000000"           // no entries
        "00000010 'stts' 00000000 00000000"           // no entries
        "00000010 'stsc' 00000000 00000000"           // no entries
        "00000014 'stsz' 00000000 00000000 00000000"  // sample_size, no samples
        "00000010 'stco' 00000000 00000000");         // no entries
}

// `dinf` with one reference to the file itself.
inline Bytes SelfDinf() {
    return Hex("00000024 'dinf' 0000001C 'dref' 00000000 00000001 0000000C 'url ' 00000001");
}

inline Bytes IdentityMatrix() {
    return Hex("00010000 00000000 00000000  00000000 00010000 00000000  00000000 00000000 40000000");
}

// Track parameters as a caller gives them.
inline MbxTrackParams TrackParams(uint32_t trackId, uint32_t timescale) {
    MbxTrackParams params = {};
    params.trackId = trackId;
    params.timescale = timescale;
    params.language = 0x15C7;  // eng
    params.enable_mode = 1;
    return params;
}

// A movie, released at the end.
class MovieTest : public BoxTest {
 protected:
    void SetUp() override {
        BoxTest::SetUp();
        ASSERT_EQ(MbxNewMovie(context, 1000, &movie), MBX_OK);
    }

    void TearDown() override {
        EXPECT_EQ(MbxFreeMovie(context, movie), MBX_OK);
        BoxTest::TearDown();
    }

    MbxStatus create(uint32_t handler, const MbxTrackParams& params) {
        const MbxHandlerRequest request = {handler, params};
        return MbxCreateTrack(context, movie, &request, &trackIndex);
    }

    // Gives the track a segment of that duration, as its samples would.
    MbxSampleSegment* addSegment(MbxTrack* track, uint64_t duration) {
        MbxSampleSegment* segment = nullptr;
        EXPECT_EQ(MbxNew(context, &segment), MBX_OK);
        segment->decodeDuration = duration;
        segment->earliestPresentation = MBX_NO_PRESENTATION;
        MbxListAppend(&track->segments, segment);
        return segment;
    }

    MbxTrack* last() const { return movie->tracks.last; }

    Bytes writeMoov() {
        MbxMoovBox* box = nullptr;
        EXPECT_EQ(MbxNew(context, &box), MBX_OK);
        EXPECT_EQ(MbxBuildMoov(context, &options, movie, box), MBX_OK);
        MemoryFile target;
        EXPECT_EQ(MbxWriteMoovBox(context, &options, &target, 0, box, nullptr, nullptr), MBX_OK);
        EXPECT_EQ(target.bytes.size(), box->size);
        EXPECT_EQ(MbxFreeMoov(context, box), MBX_OK);
        return target.bytes;
    }

    MbxMovie* movie = nullptr;
    uint32_t trackIndex = 7;
};
