// Descriptions of an elementary stream that stand in sample entries of several kinds: `esds` and `btrt`.
#pragma once

#include "boxlib/core/box.h"
#include "boxlib/model/entry_model.h"

struct MbxEsdsBox {
    uint64_t size;
    const MbxEsdsValues* values;
};

struct MbxBtrtBox {
    uint64_t size;
    MbxBtrtParams params;
};

// `esds`, optional. `values` is borrowed. MBX_ERR_INTERNAL for an unknown form, MBX_ERR_OVERFLOW for a
// descriptor of 2^28 bytes or more.
MbxStatus MbxBuildEsds(MbxContext* context, const MbxOptions* options, const MbxEsdsValues* values,
                       MbxEsdsBox* box);
MbxStatus MbxWriteEsdsPayload(MbxContext* context, MbxFile* file, uint64_t position, const MbxEsdsBox* box,
                              uint64_t* written, uint64_t* accumulated);
MbxStatus MbxWriteEsdsBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxEsdsBox* box, uint64_t* written, uint64_t* accumulated);
MbxStatus MbxFreeEsds(MbxContext* context, MbxEsdsBox* box);

// `btrt`, optional.
MbxStatus MbxBuildBtrt(MbxContext* context, const MbxOptions* options, const MbxBtrtParams* params,
                       MbxBtrtBox* box);
MbxStatus MbxWriteBtrtPayload(MbxContext* context, MbxFile* file, uint64_t position, const MbxBtrtBox* box,
                              uint64_t* written, uint64_t* accumulated);
MbxStatus MbxWriteBtrtBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxBtrtBox* box, uint64_t* written, uint64_t* accumulated);
MbxStatus MbxFreeBtrt(MbxContext* context, MbxBtrtBox* box);

// What MbxSetEsds does to an entry: sets its descriptor or replaces it; a call that fails leaves it as it
// was. MBX_ERR_INVALID_ARG for a value out of its range or a length without a pointer, MBX_ERR_INTERNAL for
// an unknown form. MBX_ERR_BAD_STATE for an entry of another kind than 1, 3 and 4, and for one of kind 3 that
// has a raw tail or the configuration of another codec.
MbxStatus MbxEntrySetEsds(MbxContext* context, MbxSampleEntry* entry, const MbxEsdsParams* params);

// Releases the values with their bytes.
MbxStatus MbxFreeEsdsValues(MbxContext* context, MbxEsdsValues* values);
