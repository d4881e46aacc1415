// Boxes of visual entries beside the codec's configuration: `3STP`, the uuid box `3DDS`, `rinf`.
#pragma once

#include "boxlib/core/box.h"
#include "boxlib/model/entry_model.h"

struct Mbx3stpBox {
    uint64_t size;
    Mbx3stpParams params;
};

struct Mbx3ddsBox {
    uint64_t size;
    const MbxBuffer* data;
};

struct MbxRinfBox {
    uint64_t size;
    const MbxBuffer* data;
};

// `3STP`, mandatory in entries of kind 9.
MbxStatus MbxBuild3stp(MbxContext* context, const MbxOptions* options, const Mbx3stpParams* params,
                       Mbx3stpBox* box);
MbxStatus MbxWrite3stpPayload(MbxContext* context, MbxFile* file, uint64_t position, const Mbx3stpBox* box,
                              uint64_t* written, uint64_t* accumulated);
MbxStatus MbxWrite3stpBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const Mbx3stpBox* box, uint64_t* written, uint64_t* accumulated);
MbxStatus MbxFree3stp(MbxContext* context, Mbx3stpBox* box);

// The uuid box `3DDS`, optional. `data` is borrowed, as in the next.
MbxStatus MbxBuild3dds(MbxContext* context, const MbxOptions* options, const MbxBuffer* data,
                       Mbx3ddsBox* box);
MbxStatus MbxWrite3ddsPayload(MbxContext* context, MbxFile* file, uint64_t position, const Mbx3ddsBox* box,
                              uint64_t* written, uint64_t* accumulated);
MbxStatus MbxWrite3ddsBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const Mbx3ddsBox* box, uint64_t* written, uint64_t* accumulated);
MbxStatus MbxFree3dds(MbxContext* context, Mbx3ddsBox* box);

// `rinf`, optional.
MbxStatus MbxBuildRinf(MbxContext* context, const MbxOptions* options, const MbxBuffer* data,
                       MbxRinfBox* box);
MbxStatus MbxWriteRinfPayload(MbxContext* context, MbxFile* file, uint64_t position, const MbxRinfBox* box,
                              uint64_t* written, uint64_t* accumulated);
MbxStatus MbxWriteRinfBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxRinfBox* box, uint64_t* written, uint64_t* accumulated);
MbxStatus MbxFreeRinf(MbxContext* context, MbxRinfBox* box);
