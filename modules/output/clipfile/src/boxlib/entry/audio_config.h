// Codec configuration of sound entries: `srat`, `dac3`, `dec3`, `ddts`, `fcfg`. All values come from the
// caller; each box is optional.
#pragma once

#include "boxlib/core/box.h"
#include "boxlib/model/entry_model.h"

struct MbxSratBox {
    uint64_t size;
    MbxSratParams params;
};

struct MbxDac3Box {
    uint64_t size;
    MbxDac3Params params;
};

struct MbxDec3Box {
    uint64_t size;
    MbxDec3Params params;
};

struct MbxDdtsBox {
    uint64_t size;
    MbxDdtsParams params;
};

struct MbxFcfgBox {
    uint64_t size;
    MbxFcfgParams params;
};

MbxStatus MbxBuildSrat(MbxContext* context, const MbxOptions* options, const MbxSratParams* params,
                       MbxSratBox* box);
MbxStatus MbxWriteSratPayload(MbxContext* context, MbxFile* file, uint64_t position, const MbxSratBox* box,
                              uint64_t* written, uint64_t* accumulated);
MbxStatus MbxWriteSratBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxSratBox* box, uint64_t* written, uint64_t* accumulated);
MbxStatus MbxFreeSrat(MbxContext* context, MbxSratBox* box);

MbxStatus MbxBuildDac3(MbxContext* context, const MbxOptions* options, const MbxDac3Params* params,
                       MbxDac3Box* box);
MbxStatus MbxWriteDac3Payload(MbxContext* context, MbxFile* file, uint64_t position, const MbxDac3Box* box,
                              uint64_t* written, uint64_t* accumulated);
MbxStatus MbxWriteDac3Box(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxDac3Box* box, uint64_t* written, uint64_t* accumulated);
MbxStatus MbxFreeDac3(MbxContext* context, MbxDac3Box* box);

// Only one substream is described, whatever `num_ind_sub` says.
MbxStatus MbxBuildDec3(MbxContext* context, const MbxOptions* options, const MbxDec3Params* params,
                       MbxDec3Box* box);
MbxStatus MbxWriteDec3Payload(MbxContext* context, MbxFile* file, uint64_t position, const MbxDec3Box* box,
                              uint64_t* written, uint64_t* accumulated);
MbxStatus MbxWriteDec3Box(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxDec3Box* box, uint64_t* written, uint64_t* accumulated);
MbxStatus MbxFreeDec3(MbxContext* context, MbxDec3Box* box);

MbxStatus MbxBuildDdts(MbxContext* context, const MbxOptions* options, const MbxDdtsParams* params,
                       MbxDdtsBox* box);
MbxStatus MbxWriteDdtsPayload(MbxContext* context, MbxFile* file, uint64_t position, const MbxDdtsBox* box,
                              uint64_t* written, uint64_t* accumulated);
MbxStatus MbxWriteDdtsBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxDdtsBox* box, uint64_t* written, uint64_t* accumulated);
MbxStatus MbxFreeDdts(MbxContext* context, MbxDdtsBox* box);

MbxStatus MbxBuildFcfg(MbxContext* context, const MbxOptions* options, const MbxFcfgParams* params,
                       MbxFcfgBox* box);
MbxStatus MbxWriteFcfgPayload(MbxContext* context, MbxFile* file, uint64_t position, const MbxFcfgBox* box,
                              uint64_t* written, uint64_t* accumulated);
MbxStatus MbxWriteFcfgBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxFcfgBox* box, uint64_t* written, uint64_t* accumulated);
MbxStatus MbxFreeFcfg(MbxContext* context, MbxFcfgBox* box);
