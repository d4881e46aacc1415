// `moov` and `mvhd`, and the record of a movie.
#pragma once

#include "boxlib/fragment/movie_extends.h"
#include "boxlib/item/item.h"
#include "boxlib/item/movie_items.h"
#include "boxlib/protection/protection.h"
#include "boxlib/track/track.h"

struct MbxMvhdBox {
    uint64_t size;
    uint32_t version;
    MbxMovieHeader values;
};

struct MbxMoovBox {
    uint64_t size;
    MbxMvhdBox* mvhd;
    MbxAinfBox* ainf;  // null for none, as are all that follow but the lists
    MbxIodsBox* iods;
    MbxMetaBox* meta;
    MbxList<MbxTrakBox> tracks;
    MbxMvexBox* mvex;
    MbxUserMetadataBox* userMetadata;
    MbxList<MbxPsshBox> pssh;
    MbxFreeSpaceBox* freeSpace;
};

MbxStatus MbxBuildMoov(MbxContext* context, const MbxOptions* options, const MbxMovie* movie,
                       MbxMoovBox* box);
MbxStatus MbxWriteMoovPayload(MbxContext* context, const MbxOptions* options, MbxFile* file,
                              uint64_t position, const MbxMoovBox* box, uint64_t* written,
                              uint64_t* accumulated);
MbxStatus MbxWriteMoovBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxMoovBox* box, uint64_t* written, uint64_t* accumulated);
MbxStatus MbxFreeMoov(MbxContext* context, MbxMoovBox* box);

// Duration and next track identifier are computed unless they were given.
MbxStatus MbxBuildMvhd(MbxContext* context, const MbxOptions* options, const MbxMovie* movie,
                       MbxMvhdBox* box);
MbxStatus MbxWriteMvhdPayload(MbxContext* context, MbxFile* file, uint64_t position, const MbxMvhdBox* box,
                              uint64_t* written, uint64_t* accumulated);
MbxStatus MbxWriteMvhdBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxMvhdBox* box, uint64_t* written, uint64_t* accumulated);
MbxStatus MbxFreeMvhd(MbxContext* context, MbxMvhdBox* box);

// Makes a movie without tracks. MBX_ERR_INVALID_ARG for a timescale of 0.
MbxStatus MbxNewMovie(MbxContext* context, uint32_t timescale, MbxMovie** movie);

// As the public MbxSetMovieTimes: with `trackIndex` 0 on movie, tracks and metadata tracks, otherwise on one
// track.
MbxStatus MbxSetMovieTimes(MbxContext* context, const MbxOptions* options, MbxMovie* movie,
                           uint32_t trackIndex, uint32_t selector, uint64_t creation, uint64_t modification);

// Releases the movie with all that it holds; null is allowed.
MbxStatus MbxFreeMovie(MbxContext* context, MbxMovie* movie);
