// The index of a fragmented file: `mfra` with `tfra` and `mfro`.
#pragma once

#include "boxlib/core/box.h"
#include "boxlib/model/model.h"

// What the session's operation of the same name does to the movie. MBX_ERR_INVALID_ARG for a null argument.
MbxStatus MbxMovieWriteMfra(MbxContext* context, const MbxScratch* scratch, const MbxOptions* options,
                            const MbxMovie* movie, MbxFile* file, uint64_t position, uint64_t* size);

struct MbxTfraParams {
    const MbxMovie* movie;
    const MbxTrack* track;  // with at least one row in its fragment index
};

struct MbxMfroParams {
    uint32_t parentSize;  // of the whole `mfra`, in bytes
};

struct MbxTfraBox {
    uint64_t size;
    MbxTfraParams params;
    uint32_t version;
    uint32_t trafLength;  // of the three numbers in a row: bytes less one, in two bits
    uint32_t trunLength;
    uint32_t sampleLength;
    MbxTfraBox* next;
};

struct MbxMfroBox {
    uint64_t size;
    MbxMfroParams params;
};

struct MbxMfraBox {
    uint64_t size;
    MbxList<MbxTfraBox> tfra;
    MbxMfroBox* mfro;
};

// `tfra`, mandatory where it stands in a list. MBX_ERR_NOT_FOUND for a row whose fragment the track does not
// have, MBX_ERR_BAD_STATE for a time or position that time_version_mode cannot carry. The rows are composed
// in the scratch when they fit in it.
MbxStatus MbxBuildTfra(MbxContext* context, const MbxScratch* scratch, const MbxOptions* options,
                       const MbxTfraParams* params, MbxTfraBox* box);
MbxStatus MbxWriteTfraPayload(MbxContext* context, const MbxScratch* scratch, MbxFile* file,
                              uint64_t position, const MbxTfraBox* box, uint64_t* written,
                              uint64_t* accumulated);
MbxStatus MbxWriteTfraBox(MbxContext* context, const MbxScratch* scratch, const MbxOptions* options,
                          MbxFile* file, uint64_t position, const MbxTfraBox* box, uint64_t* written,
                          uint64_t* accumulated);
MbxStatus MbxFreeTfra(MbxContext* context, MbxTfraBox* box);

// `mfro`, mandatory.
MbxStatus MbxBuildMfro(MbxContext* context, const MbxOptions* options, const MbxMfroParams* params,
                       MbxMfroBox* box);
MbxStatus MbxWriteMfroPayload(MbxContext* context, MbxFile* file, uint64_t position, const MbxMfroBox* box,
                              uint64_t* written, uint64_t* accumulated);
MbxStatus MbxWriteMfroBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxMfroBox* box, uint64_t* written, uint64_t* accumulated);
MbxStatus MbxFreeMfro(MbxContext* context, MbxMfroBox* box);

// Tells `mfro` the size of the whole `mfra`, in bytes. MBX_ERR_BAD_STATE for one that needs more than 32
// bits.
MbxStatus MbxSetMfroParentSize(MbxMfroBox* box, uint64_t size);

// `mfra`, mandatory: a `tfra` for every track with rows, then `mfro`. MBX_ERR_BAD_STATE when it needs more
// than 32 bits to tell its size.
MbxStatus MbxBuildMfra(MbxContext* context, const MbxScratch* scratch, const MbxOptions* options,
                       const MbxMovie* params, MbxMfraBox* box);
MbxStatus MbxWriteMfraPayload(MbxContext* context, const MbxScratch* scratch, const MbxOptions* options,
                              MbxFile* file, uint64_t position, const MbxMfraBox* box, uint64_t* written,
                              uint64_t* accumulated);
MbxStatus MbxWriteMfraBox(MbxContext* context, const MbxScratch* scratch, const MbxOptions* options,
                          MbxFile* file, uint64_t position, const MbxMfraBox* box, uint64_t* written,
                          uint64_t* accumulated);
MbxStatus MbxFreeMfra(MbxContext* context, MbxMfraBox* box);
