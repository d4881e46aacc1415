// Where samples stand in the file: `stsc`, `stsz`, `stco`, `co64`.
#pragma once

#include "boxlib/core/box.h"
#include "boxlib/model/sample_model.h"

struct MbxStscBox {
    uint64_t size;
    const MbxChunkState* chunks;  // borrowed, as are the following
};

struct MbxStszBox {
    uint64_t size;
    const MbxSizeList* sizes;
};

struct MbxStcoBox {
    uint64_t size;
    const MbxChunkOffsetList* offsets;
};

struct MbxCo64Box {
    uint64_t size;
    const MbxChunkOffsetList* offsets;
};

// `stsc`, mandatory.
MbxStatus MbxBuildStsc(MbxContext* context, const MbxOptions* options, const MbxChunkState* params,
                       MbxStscBox* box);
MbxStatus MbxWriteStscPayload(MbxContext* context, MbxFile* file, uint64_t position, const MbxStscBox* box,
                              uint64_t* written, uint64_t* accumulated);
MbxStatus MbxWriteStscBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxStscBox* box, uint64_t* written, uint64_t* accumulated);
MbxStatus MbxFreeStsc(MbxContext* context, MbxStscBox* box);

// `stsz`, mandatory.
MbxStatus MbxBuildStsz(MbxContext* context, const MbxOptions* options, const MbxSizeList* params,
                       MbxStszBox* box);
MbxStatus MbxWriteStszPayload(MbxContext* context, MbxFile* file, uint64_t position, const MbxStszBox* box,
                              uint64_t* written, uint64_t* accumulated);
MbxStatus MbxWriteStszBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxStszBox* box, uint64_t* written, uint64_t* accumulated);
MbxStatus MbxFreeStsz(MbxContext* context, MbxStszBox* box);

// Whether the offsets go to `stco` (4 bytes each) or `co64` (8), by chunk_offset_mode. MBX_ERR_BAD_STATE in
// mode 0 for an offset of 2^32 or more.
MbxStatus MbxChooseOffsetWidth(const MbxOptions* options, const MbxChunkOffsetList* offsets, uint32_t* width);

// `stco`, optional: its place is taken by `co64`. Offsets are cut to 32 bits; MbxChooseOffsetWidth tells
// whether they fit.
MbxStatus MbxBuildStco(MbxContext* context, const MbxOptions* options, const MbxChunkOffsetList* params,
                       MbxStcoBox* box);
MbxStatus MbxWriteStcoPayload(MbxContext* context, MbxFile* file, uint64_t position, const MbxStcoBox* box,
                              uint64_t* written, uint64_t* accumulated);
MbxStatus MbxWriteStcoBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxStcoBox* box, uint64_t* written, uint64_t* accumulated);
MbxStatus MbxFreeStco(MbxContext* context, MbxStcoBox* box);

// `co64`, optional: its place is taken by `stco`.
MbxStatus MbxBuildCo64(MbxContext* context, const MbxOptions* options, const MbxChunkOffsetList* params,
                       MbxCo64Box* box);
MbxStatus MbxWriteCo64Payload(MbxContext* context, MbxFile* file, uint64_t position, const MbxCo64Box* box,
                              uint64_t* written, uint64_t* accumulated);
MbxStatus MbxWriteCo64Box(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxCo64Box* box, uint64_t* written, uint64_t* accumulated);
MbxStatus MbxFreeCo64(MbxContext* context, MbxCo64Box* box);
