// When samples are decoded and shown, and which of them stand alone: `stts`, `ctts`, `stss`, `sdtp`.
#pragma once

#include "boxlib/core/box.h"
#include "boxlib/model/sample_model.h"

struct MbxSttsBox {
    uint64_t size;
    const MbxRunList* durations;  // borrowed, as are the following
};

struct MbxCttsBox {
    uint64_t size;
    uint32_t version;
    const MbxCompositionList* offsets;
};

struct MbxStssBox {
    uint64_t size;
    const MbxSyncList* syncs;
};

struct MbxSdtpBox {
    uint64_t size;
    const MbxDependencyList* dependencies;
};

// `stts`, mandatory.
MbxStatus MbxBuildStts(MbxContext* context, const MbxOptions* options, const MbxRunList* params,
                       MbxSttsBox* box);
MbxStatus MbxWriteSttsPayload(MbxContext* context, MbxFile* file, uint64_t position, const MbxSttsBox* box,
                              uint64_t* written, uint64_t* accumulated);
MbxStatus MbxWriteSttsBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxSttsBox* box, uint64_t* written, uint64_t* accumulated);
MbxStatus MbxFreeStts(MbxContext* context, MbxSttsBox* box);

// `ctts`, optional. Version 1 when the offsets are signed or trun_version_mode is 1.
MbxStatus MbxBuildCtts(MbxContext* context, const MbxOptions* options, const MbxCompositionList* params,
                       MbxCttsBox* box);
MbxStatus MbxWriteCttsPayload(MbxContext* context, MbxFile* file, uint64_t position, const MbxCttsBox* box,
                              uint64_t* written, uint64_t* accumulated);
MbxStatus MbxWriteCttsBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxCttsBox* box, uint64_t* written, uint64_t* accumulated);
MbxStatus MbxFreeCtts(MbxContext* context, MbxCttsBox* box);

// `stss`, optional.
MbxStatus MbxBuildStss(MbxContext* context, const MbxOptions* options, const MbxSyncList* params,
                       MbxStssBox* box);
MbxStatus MbxWriteStssPayload(MbxContext* context, MbxFile* file, uint64_t position, const MbxStssBox* box,
                              uint64_t* written, uint64_t* accumulated);
MbxStatus MbxWriteStssBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxStssBox* box, uint64_t* written, uint64_t* accumulated);
MbxStatus MbxFreeStss(MbxContext* context, MbxStssBox* box);

// `sdtp`, optional.
MbxStatus MbxBuildSdtp(MbxContext* context, const MbxOptions* options, const MbxDependencyList* params,
                       MbxSdtpBox* box);
MbxStatus MbxWriteSdtpPayload(MbxContext* context, MbxFile* file, uint64_t position, const MbxSdtpBox* box,
                              uint64_t* written, uint64_t* accumulated);
MbxStatus MbxWriteSdtpBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxSdtpBox* box, uint64_t* written, uint64_t* accumulated);
MbxStatus MbxFreeSdtp(MbxContext* context, MbxSdtpBox* box);
