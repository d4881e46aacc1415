// What stands in `traf` before and beside its runs: `tfhd`, `tfdt`, `trik`, `avcn`.
#pragma once

#include "boxlib/entry/codec_config.h"
#include "boxlib/fragment/track_run.h"

struct MbxTfhdParams {
    const MbxTrack* track;
    const MbxSampleSegment* segment;
    uint64_t runningBase;  // base_offset_mode 1: the end of the track fragment before
};

struct MbxTfdtParams {
    uint64_t baseMediaDecodeTime;  // in ticks of the track
};

struct MbxTfhdBox {
    uint64_t size;
    MbxTfhdValues values;
};

struct MbxTfdtBox {
    uint64_t size;
    uint32_t version;
    MbxTfdtParams params;
};

struct MbxTrikBox {
    uint64_t size;
    const MbxBlockList* bytes;  // borrowed
};

struct MbxAvcnBox {
    uint64_t size;
    MbxAvcCBox avcC;  // the payload
};

// `tfhd`, mandatory. MBX_ERR_INVALID_ARG for a base_offset_mode above 2 or a word of defaultsForced above 1,
// MBX_ERR_NOT_FOUND for a segment without a chunk in base_offset_mode 0.
MbxStatus MbxBuildTfhd(MbxContext* context, const MbxOptions* options, const MbxTfhdParams* params,
                       MbxTfhdBox* box);
MbxStatus MbxWriteTfhdPayload(MbxContext* context, MbxFile* file, uint64_t position, const MbxTfhdBox* box,
                              uint64_t* written, uint64_t* accumulated);
MbxStatus MbxWriteTfhdBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxTfhdBox* box, uint64_t* written, uint64_t* accumulated);
MbxStatus MbxFreeTfhd(MbxContext* context, MbxTfhdBox* box);

// `tfdt`, optional. MBX_ERR_BAD_STATE for a time that time_version_mode cannot carry.
MbxStatus MbxBuildTfdt(MbxContext* context, const MbxOptions* options, const MbxTfdtParams* params,
                       MbxTfdtBox* box);
MbxStatus MbxWriteTfdtPayload(MbxContext* context, MbxFile* file, uint64_t position, const MbxTfdtBox* box,
                              uint64_t* written, uint64_t* accumulated);
MbxStatus MbxWriteTfdtBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxTfdtBox* box, uint64_t* written, uint64_t* accumulated);
MbxStatus MbxFreeTfdt(MbxContext* context, MbxTfdtBox* box);

// `trik`, optional: a byte per sample, the picture type in the top two bits and the dependency level below.
MbxStatus MbxBuildTrik(MbxContext* context, const MbxOptions* options, const MbxBlockList* params,
                       MbxTrikBox* box);
MbxStatus MbxWriteTrikPayload(MbxContext* context, MbxFile* file, uint64_t position, const MbxTrikBox* box,
                              uint64_t* written, uint64_t* accumulated);
MbxStatus MbxWriteTrikBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxTrikBox* box, uint64_t* written, uint64_t* accumulated);
MbxStatus MbxFreeTrik(MbxContext* context, MbxTrikBox* box);

// `avcn`, optional: the payload of `avcC`, and the same failures.
MbxStatus MbxBuildAvcn(MbxContext* context, const MbxOptions* options, const MbxAvcConfig* params,
                       MbxAvcnBox* box);
MbxStatus MbxWriteAvcnPayload(MbxContext* context, MbxFile* file, uint64_t position, const MbxAvcnBox* box,
                              uint64_t* written, uint64_t* accumulated);
MbxStatus MbxWriteAvcnBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxAvcnBox* box, uint64_t* written, uint64_t* accumulated);
MbxStatus MbxFreeAvcn(MbxContext* context, MbxAvcnBox* box);
