// Boxes of `moov` beside its tracks: `ainf`, `iods`, `free`.
#pragma once

#include "boxlib/core/box.h"
#include "boxlib/model/item_model.h"

struct MbxAinfBox {
    uint64_t size;
    const MbxAinfParams* params;
};

struct MbxIodsBox {
    uint64_t size;
    MbxIodsParams params;
};

// `free`. (MbxFreeBox is what releases a record.)
struct MbxFreeSpaceBox {
    uint64_t size;
    uint32_t count;  // of zero bytes
};

// `ainf`, optional. `params` is borrowed.
MbxStatus MbxBuildAinf(MbxContext* context, const MbxOptions* options, const MbxAinfParams* params,
                       MbxAinfBox* box);
MbxStatus MbxWriteAinfPayload(MbxContext* context, MbxFile* file, uint64_t position, const MbxAinfBox* box,
                              uint64_t* written, uint64_t* accumulated);
MbxStatus MbxWriteAinfBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxAinfBox* box, uint64_t* written, uint64_t* accumulated);
MbxStatus MbxFreeAinf(MbxContext* context, MbxAinfBox* box);

// `iods`, optional.
MbxStatus MbxBuildIods(MbxContext* context, const MbxOptions* options, const MbxIodsParams* params,
                       MbxIodsBox* box);
MbxStatus MbxWriteIodsPayload(MbxContext* context, MbxFile* file, uint64_t position, const MbxIodsBox* box,
                              uint64_t* written, uint64_t* accumulated);
MbxStatus MbxWriteIodsBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxIodsBox* box, uint64_t* written, uint64_t* accumulated);
MbxStatus MbxFreeIods(MbxContext* context, MbxIodsBox* box);

// `free`, optional, the last box of `moov`: `count` zero bytes.
MbxStatus MbxBuildFree(MbxContext* context, const MbxOptions* options, uint32_t count, MbxFreeSpaceBox* box);
MbxStatus MbxWriteFreePayload(MbxContext* context, MbxFile* file, uint64_t position,
                              const MbxFreeSpaceBox* box, uint64_t* written, uint64_t* accumulated);
MbxStatus MbxWriteFreeBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxFreeSpaceBox* box, uint64_t* written, uint64_t* accumulated);
MbxStatus MbxFreeFree(MbxContext* context, MbxFreeSpaceBox* box);

// Makes the box of a movie that reserves `count` bytes; for 0 it makes none.
MbxStatus MbxMakeFree(MbxContext* context, const MbxOptions* options, uint32_t count, MbxFreeSpaceBox** slot);
