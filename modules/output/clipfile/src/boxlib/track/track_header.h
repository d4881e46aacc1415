// What stands in `trak` beside the media: `tkhd`, `tref`, `edts` and `elst`.
#pragma once

#include "boxlib/core/box.h"
#include "boxlib/model/model.h"

struct MbxTkhdBox {
    uint64_t size;
    uint32_t version;
    MbxTrackHeader values;
};

struct MbxElstBox {
    uint64_t size;
    uint32_t version;
    const MbxEditList* editList;  // borrowed
};

struct MbxEdtsBox {
    uint64_t size;
    MbxElstBox* elst;
};

// All references of one type; the type is the code of the box.
struct MbxTrefGroupBox {
    uint64_t size;
    const MbxReferenceGroup* group;  // borrowed
    MbxTrefGroupBox* next;
};

struct MbxTrefBox {
    uint64_t size;
    MbxList<MbxTrefGroupBox> groups;
};

// What the duration of a track is computed from.
struct MbxTrackInMovie {
    const MbxTrack* track;
    uint32_t movieTimescale;  // ticks per second
};

// The duration is computed unless it was given. MBX_ERR_INVALID_ARG for flags above 24 bits.
MbxStatus MbxBuildTkhd(MbxContext* context, const MbxOptions* options, const MbxTrackInMovie* track,
                       MbxTkhdBox* box);
MbxStatus MbxWriteTkhdPayload(MbxContext* context, MbxFile* file, uint64_t position, const MbxTkhdBox* box,
                              uint64_t* written, uint64_t* accumulated);
MbxStatus MbxWriteTkhdBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxTkhdBox* box, uint64_t* written, uint64_t* accumulated);
MbxStatus MbxFreeTkhd(MbxContext* context, MbxTkhdBox* box);

// Optional: a track without an edit list holder has no `edts`.
MbxStatus MbxBuildEdts(MbxContext* context, const MbxOptions* options, const MbxEditList* editList,
                       MbxEdtsBox* box);
MbxStatus MbxWriteEdtsPayload(MbxContext* context, const MbxOptions* options, MbxFile* file,
                              uint64_t position, const MbxEdtsBox* box, uint64_t* written,
                              uint64_t* accumulated);
MbxStatus MbxWriteEdtsBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxEdtsBox* box, uint64_t* written, uint64_t* accumulated);
MbxStatus MbxFreeEdts(MbxContext* context, MbxEdtsBox* box);

MbxStatus MbxBuildElst(MbxContext* context, const MbxOptions* options, const MbxEditList* editList,
                       MbxElstBox* box);
MbxStatus MbxWriteElstPayload(MbxContext* context, MbxFile* file, uint64_t position, const MbxElstBox* box,
                              uint64_t* written, uint64_t* accumulated);
MbxStatus MbxWriteElstBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxElstBox* box, uint64_t* written, uint64_t* accumulated);
MbxStatus MbxFreeElst(MbxContext* context, MbxElstBox* box);

// Optional: a track without references has no `tref`.
MbxStatus MbxBuildTref(MbxContext* context, const MbxOptions* options,
                       const MbxList<MbxReferenceGroup>* groups, MbxTrefBox* box);
MbxStatus MbxWriteTrefPayload(MbxContext* context, const MbxOptions* options, MbxFile* file,
                              uint64_t position, const MbxTrefBox* box, uint64_t* written,
                              uint64_t* accumulated);
MbxStatus MbxWriteTrefBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxTrefBox* box, uint64_t* written, uint64_t* accumulated);
MbxStatus MbxFreeTref(MbxContext* context, MbxTrefBox* box);

// MBX_ERR_INTERNAL for a group without a type.
MbxStatus MbxBuildTrefGroup(MbxContext* context, const MbxOptions* options, const MbxReferenceGroup* group,
                            MbxTrefGroupBox* box);
MbxStatus MbxWriteTrefGroupPayload(MbxContext* context, MbxFile* file, uint64_t position,
                                   const MbxTrefGroupBox* box, uint64_t* written, uint64_t* accumulated);
MbxStatus MbxWriteTrefGroupBox(MbxContext* context, const MbxOptions* options, MbxFile* file,
                               uint64_t position, const MbxTrefGroupBox* box, uint64_t* written,
                               uint64_t* accumulated);
MbxStatus MbxFreeTrefGroup(MbxContext* context, MbxTrefGroupBox* box);

// The track's duration in ticks of the movie: the sum of its edits, or without an edit its media duration
// rescaled. MBX_ERR_OVERFLOW beyond 64 bits.
MbxStatus MbxComputeTrackDuration(const MbxTrackInMovie* track, uint64_t* duration);
