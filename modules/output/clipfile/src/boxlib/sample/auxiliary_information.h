// Auxiliary information of samples: `senc`, `saio`, `saiz`. What the library writes comes from the lists of a
// sample segment, which are borrowed. Offsets and sizes are composed in the scratch when they fit in it; a
// null scratch makes every table allocate.
#pragma once

#include "boxlib/core/box.h"
#include "boxlib/model/sample_model.h"

struct MbxSencParams {
    uint32_t flags;  // low 24 bits
    const MbxAuxSizeList* sizes;
};

struct MbxSencBox {
    uint64_t size;
    MbxSencParams params;
    uint64_t headerLength;  // in bytes: what stands before the payload
};

// What `saio` and `saiz` say about the kind of information. Flag 1: type and parameter are written.
struct MbxAuxInfo {
    uint32_t flags;  // low 24 bits
    uint32_t type;
    uint32_t parameter;
};

struct MbxSaioParams {
    MbxAuxInfo info;
    uint64_t base;  // taken off each offset: in `traf` the base data offset when `tfhd` has one, else 0
    const MbxBlockList* offsets;  // of MbxAuxOffset
};

struct MbxSaioBox {
    uint64_t size;
    uint32_t version;
    uint32_t entryCount;
    MbxSaioParams params;
};

struct MbxSaizParams {
    MbxAuxInfo info;
    const MbxAuxSizeList* sizes;
};

struct MbxSaizBox {
    uint64_t size;
    MbxSaizParams params;
};

// `senc`, optional in `trak` and `traf`.
MbxStatus MbxBuildSenc(MbxContext* context, const MbxOptions* options, const MbxSencParams* params,
                       MbxSencBox* box);
MbxStatus MbxWriteSencPayload(MbxContext* context, MbxFile* file, uint64_t position, const MbxSencBox* box,
                              uint64_t* written, uint64_t* accumulated);
MbxStatus MbxWriteSencBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxSencBox* box, uint64_t* written, uint64_t* accumulated);
MbxStatus MbxFreeSenc(MbxContext* context, MbxSencBox* box);

// `saio`, optional in `stbl` and `traf`. A list of one entry when it was built stays one. MBX_ERR_BAD_STATE
// for an offset that the mode cannot carry, MBX_ERR_OVERFLOW when it is written with an offset below the
// base, which measured counts as 0.
MbxStatus MbxBuildSaio(MbxContext* context, const MbxScratch* scratch, const MbxOptions* options,
                       const MbxSaioParams* params, MbxSaioBox* box);
MbxStatus MbxWriteSaioPayload(MbxContext* context, const MbxScratch* scratch, MbxFile* file,
                              uint64_t position, const MbxSaioBox* box, uint64_t* written,
                              uint64_t* accumulated);
MbxStatus MbxWriteSaioBox(MbxContext* context, const MbxScratch* scratch, const MbxOptions* options,
                          MbxFile* file, uint64_t position, const MbxSaioBox* box, uint64_t* written,
                          uint64_t* accumulated);
MbxStatus MbxFreeSaio(MbxContext* context, MbxSaioBox* box);

// `saiz`, optional in `stbl` and `traf`. MBX_ERR_INTERNAL for a list whose count and entries disagree.
MbxStatus MbxBuildSaiz(MbxContext* context, const MbxScratch* scratch, const MbxOptions* options,
                       const MbxSaizParams* params, MbxSaizBox* box);
MbxStatus MbxWriteSaizPayload(MbxContext* context, const MbxScratch* scratch, MbxFile* file,
                              uint64_t position, const MbxSaizBox* box, uint64_t* written,
                              uint64_t* accumulated);
MbxStatus MbxWriteSaizBox(MbxContext* context, const MbxScratch* scratch, const MbxOptions* options,
                          MbxFile* file, uint64_t position, const MbxSaizBox* box, uint64_t* written,
                          uint64_t* accumulated);
MbxStatus MbxFreeSaiz(MbxContext* context, MbxSaizBox* box);
