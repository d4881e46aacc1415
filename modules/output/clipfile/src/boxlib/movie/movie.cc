#include "boxlib/movie/movie.h"

#include "boxlib/model/version.h"

// ---- moov ----

// Contract: built-in-another-order. `pssh` before `USMT`, tracks before `mvhd`; files have it otherwise.
MbxStatus MbxBuildMoov(MbxContext* context, const MbxOptions* options, const MbxMovie* movie,
                       MbxMoovBox* box) {
    if (MbxAnyNull(context, options, movie, box)) return MBX_ERR_INVALID_ARG;
    for (const MbxTrack* track = movie->tracks.first; track != nullptr; track = track->next) {
        const MbxTrackInMovie inMovie = {track, movie->header.timescale};
        MBX_TRY(MbxMakeListItem(
            context, &box->tracks,
            [&](MbxTrakBox* trak) { return MbxBuildTrak(context, options, &inMovie, trak); }, MbxFreeTrak));
    }
    MBX_TRY(MbxMakeBox(context, options, &box->mvhd, movie, MbxBuildMvhd, MbxFreeMvhd));
    MBX_TRY(MbxMakeOptionalBox(context, options, &box->ainf, movie->ainf, MbxBuildAinf, MbxFreeAinf));
    MBX_TRY(MbxMakeOptionalBox(context, options, &box->iods, movie->iods, MbxBuildIods, MbxFreeIods));
    MBX_TRY(MbxMakeOptionalBox(context, options, &box->meta, movie->meta, MbxBuildMeta, MbxFreeMeta));
    if (movie->fragmentCount != 0) {
        MBX_TRY(MbxMakeBox(context, options, &box->mvex, movie, MbxBuildMvex, MbxFreeMvex));
    }
    MBX_TRY(MbxMakeBoxes(context, options, &box->pssh, movie->pssh.first, MbxBuildPssh, MbxFreePssh));
    if (MbxHasUserMetadata(&movie->userMetadata)) {
        MBX_TRY(MbxMakeBox(context, options, &box->userMetadata, &movie->userMetadata, MbxBuildUserMetadata,
                           MbxFreeUserMetadata));
    }
    MBX_TRY(MbxMakeFree(context, options, movie->freeBytes, &box->freeSpace));
    return MbxMeasureBox(context, options, box, MbxWriteMoovPayload);
}

// 8.2.1 Movie Box
MbxStatus MbxWriteMoovPayload(MbxContext* context, const MbxOptions* options, MbxFile* file,
                              uint64_t position, const MbxMoovBox* box, uint64_t* written,
                              uint64_t* accumulated) {
    uint64_t count = 0;
    MBX_TRY(MbxSeek(context, file, position));
    MBX_TRY(MbxWriteMvhdBox(context, options, file, position + count, box->mvhd, nullptr, &count));
    MBX_TRY(MbxWriteAinfBox(context, options, file, position + count, box->ainf, nullptr, &count));
    MBX_TRY(MbxWriteIodsBox(context, options, file, position + count, box->iods, nullptr, &count));
    MBX_TRY(MbxWriteMetaBox(context, options, file, position + count, box->meta, nullptr, &count));
    MBX_TRY(MbxWriteBoxes(context, options, file, position, box->tracks.first, MbxWriteTrakBox, &count));
    MBX_TRY(MbxWriteMvexBox(context, options, file, position + count, box->mvex, nullptr, &count));
    MBX_TRY(MbxWriteUserMetadataBox(context, options, file, position + count, box->userMetadata, nullptr,
                                    &count));
    MBX_TRY(MbxWriteBoxes(context, options, file, position, box->pssh.first, MbxWritePsshBox, &count));
    MBX_TRY(MbxWriteFreeBox(context, options, file, position + count, box->freeSpace, nullptr, &count));
    return MbxReportBytes(count, written, accumulated);
}

MbxStatus MbxWriteMoovBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxMoovBox* box, uint64_t* written, uint64_t* accumulated) {
    return MbxWriteBox(context, options, file, position, MbxCode("moov"), box, MbxWriteMoovPayload, written,
                       accumulated);
}

MbxStatus MbxFreeMoov(MbxContext* context, MbxMoovBox* box) {
    return MbxFreeBox(context, box, [&] {
        MBX_TRY(MbxFreeMvhd(context, box->mvhd));
        MBX_TRY(MbxFreeAinf(context, box->ainf));
        MBX_TRY(MbxFreeIods(context, box->iods));
        MBX_TRY(MbxFreeMeta(context, box->meta));
        MBX_TRY(MbxFreeList(context, &box->tracks, MbxFreeTrak));
        MBX_TRY(MbxFreeMvex(context, box->mvex));
        MBX_TRY(MbxFreeUserMetadata(context, box->userMetadata));
        MBX_TRY(MbxFreeList(context, &box->pssh, MbxFreePssh));
        return MbxFreeFree(context, box->freeSpace);
    });
}

// ---- mvhd ----

namespace {

MbxStatus longestTrackDuration(const MbxMovie* movie, uint64_t* duration) {
    *duration = 0;
    for (const MbxTrack* track = movie->tracks.first; track != nullptr; track = track->next) {
        const MbxTrackInMovie inMovie = {track, movie->header.timescale};
        uint64_t own = track->header.duration;
        if ((track->header.fieldsSet & MBX_TRACK_DURATION) == 0)
            MBX_TRY(MbxComputeTrackDuration(&inMovie, &own));
        if (own > *duration) *duration = own;
    }
    return MBX_OK;
}

// Passes over the identifiers between the two ordinary ranges; all ones means that a reader must search.
uint32_t nextTrackIdField(const MbxMovie* movie) {
    uint32_t highest = 0;
    for (const MbxTrack* track = movie->tracks.first; track != nullptr; track = track->next) {
        if (track->header.trackId > highest) highest = track->header.trackId;
    }
    if (highest >= MBX_TRACK_ID_HIGH_END) return UINT32_MAX;
    if (highest >= MBX_TRACK_ID_LOW_END && highest < MBX_TRACK_ID_HIGH_BEGIN) return MBX_TRACK_ID_HIGH_BEGIN;
    return highest + 1;
}

}  // namespace

MbxStatus MbxBuildMvhd(MbxContext* context, const MbxOptions* options, const MbxMovie* movie,
                       MbxMvhdBox* box) {
    if (MbxAnyNull(context, options, movie, box)) return MBX_ERR_INVALID_ARG;
    box->values = movie->header;
    if ((box->values.fieldsSet & MBX_MOVIE_DURATION) == 0) {
        MBX_TRY(longestTrackDuration(movie, &box->values.duration));
    }
    if ((box->values.fieldsSet & MBX_MOVIE_NEXT_TRACK_ID) == 0)
        box->values.nextTrackId = nextTrackIdField(movie);
    MBX_TRY(MbxChooseTimeVersion(options, box->values.creationTime, box->values.modificationTime,
                                 box->values.duration, &box->version));
    return MbxMeasureBox(context, options, box, MbxWriteMvhdPayload);
}

// 8.2.2 Movie Header Box
MbxStatus MbxWriteMvhdPayload(MbxContext* context, MbxFile* file, uint64_t position, const MbxMvhdBox* box,
                              uint64_t* written, uint64_t* accumulated) {
    const MbxMovieHeader& values = box->values;
    MbxBytes bytes;
    MbxBeginBytes(context, &bytes);
    MbxPutVersionFlags(&bytes, box->version, 0);
    MbxPutByVersion(&bytes, box->version, values.creationTime);  // unsigned int(64 or 32) creation_time
    MbxPutByVersion(&bytes, box->version,
                    values.modificationTime);                // unsigned int(64 or 32) modification_time
    MbxPut32(&bytes, values.timescale);                      // unsigned int(32) timescale
    MbxPutByVersion(&bytes, box->version, values.duration);  // unsigned int(64 or 32) duration
    MbxPut32(&bytes, values.rate);                           // int(32) rate
    MbxPut16(&bytes, values.volume);                         // int(16) volume
    MbxPutZeros(&bytes, 10);                                 // bit(16) reserved, unsigned int(32)[2] reserved
    for (const uint32_t element : values.matrix) MbxPut32(&bytes, element);  // int(32)[9] matrix
    MbxPutZeros(&bytes, 24);                                                 // bit(32)[6] pre_defined
    MbxPut32(&bytes, values.nextTrackId);                                    // unsigned int(32) next_track_ID
    return MbxWriteFixedPayload(context, file, position, &bytes, written, accumulated);
}

MbxStatus MbxWriteMvhdBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxMvhdBox* box, uint64_t* written, uint64_t* accumulated) {
    return MbxWriteBox(context, options, file, position, MbxCode("mvhd"), box, MbxWriteMvhdPayload, written,
                       accumulated);
}

MbxStatus MbxFreeMvhd(MbxContext* context, MbxMvhdBox* box) {
    return MbxFreeBox(context, box);
}

// ---- The record ----

MbxStatus MbxNewMovie(MbxContext* context, uint32_t timescale, MbxMovie** movie) {
    if (MbxAnyNull(context, movie) || timescale == 0) return MBX_ERR_INVALID_ARG;
    MBX_TRY(MbxNew(context, movie));
    (*movie)->header = {
        .fieldsSet = MBX_MOVIE_TIMESCALE,
        .creationTime = 0,
        .modificationTime = 0,
        .timescale = timescale,
        .duration = 0,
        .rate = 0x00010000,
        .volume = 0x0100,
        .matrix = {0x00010000, 0, 0, 0, 0x00010000, 0, 0, 0, 0x40000000},
        .nextTrackId = 1,
    };
    return MBX_OK;
}

MbxStatus MbxSetMovieTimes(MbxContext* context, const MbxOptions* options, MbxMovie* movie,
                           uint32_t trackIndex, uint32_t selector, uint64_t creation, uint64_t modification) {
    if (MbxAnyNull(context, options, movie)) return MBX_ERR_INVALID_ARG;
    if (trackIndex != 0) {
        MbxTrack* track = nullptr;
        MBX_TRY(MbxListRequire(movie->tracks.first, trackIndex, &track));
        return MbxSetTrackTimes(options, track, selector, creation, modification);
    }
    const MbxTimePair movieTimes = {MBX_TIME_MOVIE_CREATION, MBX_MOVIE_CREATION, &movie->header.creationTime,
                                    &movie->header.modificationTime, &movie->header.fieldsSet};
    MBX_TRY(MbxSetTimePair(options, movieTimes, selector, creation, modification));
    for (MbxTrack* track = movie->tracks.first; track != nullptr; track = track->next) {
        MBX_TRY(MbxSetTrackTimes(options, track, selector, creation, modification));
    }
    for (MbxMetadataTrack* t = movie->userMetadata.tracks.first; t != nullptr; t = t->next) {
        MBX_TRY(MbxSetMetadataTrackTimes(t, selector, creation, modification));
    }
    for (MbxTrack* track = movie->tracks.first; track != nullptr; track = track->next) {
        for (MbxMetadataTrack* t = track->userMetadata.tracks.first; t != nullptr; t = t->next) {
            MBX_TRY(MbxSetMetadataTrackTimes(t, selector, creation, modification));
        }
    }
    return MBX_OK;
}

MbxStatus MbxFreeMovie(MbxContext* context, MbxMovie* movie) {
    return MbxFreeBox(context, movie, [&] {
        MBX_TRY(MbxFreeAinfParams(context, movie->ainf));
        MBX_TRY(MbxFreeMetaParams(context, movie->meta));
        MBX_TRY(MbxFreeList(context, &movie->tracks, MbxFreeTrack));
        MBX_TRY(MbxFreeIodsParams(context, movie->iods));
        MBX_TRY(MbxFreeList(context, &movie->pssh, MbxFreePsshParams));
        MBX_TRY(MbxFreeLevels(context, movie));
        return MbxReleaseUserMetadata(context, &movie->userMetadata);
    });
}
