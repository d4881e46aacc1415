// What `moov` says about fragments: `mvex` with `mehd`, `trex` and `leva`.
#pragma once

#include "boxlib/core/box.h"
#include "boxlib/model/model.h"

// How the samples of one level are told apart (`leva`). No session operation fills it: whoever needs levels
// hangs them on the movie's list, which owns them from then on.
struct MbxLevel {
    uint32_t trackId;
    uint8_t paddingFlag;             // below 2
    uint8_t assignmentType;          // 0 to 4
    uint32_t groupingType;           // types 0 and 1
    uint32_t groupingTypeParameter;  // type 1
    uint32_t subTrackId;             // type 4
    MbxLevel* next;
};

struct MbxMehdParams {
    uint64_t fragmentDuration;  // in ticks of the movie
};

struct MbxTrexParams {
    uint32_t trackId;
    MbxSampleDefaults defaults;
};

struct MbxMehdBox {
    uint64_t size;
    uint32_t version;
    MbxMehdParams params;
};

struct MbxTrexBox {
    uint64_t size;
    MbxTrexParams params;
    MbxTrexBox* next;
};

struct MbxLevaBox {
    uint64_t size;
    const MbxLevel* levels;  // borrowed
};

struct MbxMvexBox {
    uint64_t size;
    MbxMehdBox* mehd;
    MbxList<MbxTrexBox> trex;
    MbxLevaBox* leva;
};

// The duration of all fragments: over the tracks the largest end of their last segment, in ticks of the
// movie. MBX_ERR_OVERFLOW when it leaves 64 bits.
MbxStatus MbxComputeFragmentDuration(const MbxMovie* movie, uint64_t* duration);

// Releases a movie's levels. Safe to call twice.
MbxStatus MbxFreeLevels(MbxContext* context, MbxMovie* movie);

// `mehd`, optional. The version by mehd_mode: 2 is version 0, MBX_ERR_BAD_STATE for a duration above 32 bits;
// 3 is version 1; any other takes version 1 when the duration needs it.
MbxStatus MbxBuildMehd(MbxContext* context, const MbxOptions* options, const MbxMehdParams* params,
                       MbxMehdBox* box);
MbxStatus MbxWriteMehdPayload(MbxContext* context, MbxFile* file, uint64_t position, const MbxMehdBox* box,
                              uint64_t* written, uint64_t* accumulated);
MbxStatus MbxWriteMehdBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxMehdBox* box, uint64_t* written, uint64_t* accumulated);
MbxStatus MbxFreeMehd(MbxContext* context, MbxMehdBox* box);

// `trex`, mandatory for every track.
MbxStatus MbxBuildTrex(MbxContext* context, const MbxOptions* options, const MbxTrexParams* params,
                       MbxTrexBox* box);
MbxStatus MbxWriteTrexPayload(MbxContext* context, MbxFile* file, uint64_t position, const MbxTrexBox* box,
                              uint64_t* written, uint64_t* accumulated);
MbxStatus MbxWriteTrexBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxTrexBox* box, uint64_t* written, uint64_t* accumulated);
MbxStatus MbxFreeTrex(MbxContext* context, MbxTrexBox* box);

// `leva` over all levels from `params` on, optional. MBX_ERR_INTERNAL for an unknown assignment type.
// MBX_ERR_OVERFLOW for more than 65535 levels; the field has 8 bits and takes the count cut.
MbxStatus MbxBuildLeva(MbxContext* context, const MbxOptions* options, const MbxLevel* params,
                       MbxLevaBox* box);
MbxStatus MbxWriteLevaPayload(MbxContext* context, MbxFile* file, uint64_t position, const MbxLevaBox* box,
                              uint64_t* written, uint64_t* accumulated);
MbxStatus MbxWriteLevaBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxLevaBox* box, uint64_t* written, uint64_t* accumulated);
MbxStatus MbxFreeLeva(MbxContext* context, MbxLevaBox* box);

// `mvex`, optional in `moov`: built for a movie with fragments. `mehd` is left out in mehd_mode 0.
MbxStatus MbxBuildMvex(MbxContext* context, const MbxOptions* options, const MbxMovie* params,
                       MbxMvexBox* box);
MbxStatus MbxWriteMvexPayload(MbxContext* context, const MbxOptions* options, MbxFile* file,
                              uint64_t position, const MbxMvexBox* box, uint64_t* written,
                              uint64_t* accumulated);
MbxStatus MbxWriteMvexBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxMvexBox* box, uint64_t* written, uint64_t* accumulated);
MbxStatus MbxFreeMvex(MbxContext* context, MbxMvexBox* box);
