// File level: `ftyp` and `styp`.
#pragma once

#include "boxlib/core/box.h"
#include "boxlib/model/model.h"

// Which of the two boxes is written: they differ in their code alone.
enum MbxFileTypeSelector : uint32_t {
    MBX_SELECT_FTYP = 0,
    MBX_SELECT_STYP = 1,
};

struct MbxFtypBox {
    uint64_t size;
    const MbxFileType* fileType;  // borrowed
};

MbxStatus MbxBuildFtyp(MbxContext* context, const MbxOptions* options, const MbxFileType* fileType,
                       MbxFtypBox* box);
MbxStatus MbxWriteFtypPayload(MbxContext* context, MbxFile* file, uint64_t position, const MbxFtypBox* box,
                              uint64_t* written, uint64_t* accumulated);
// MBX_ERR_INTERNAL for an unknown selector.
MbxStatus MbxWriteFtypBox(MbxContext* context, const MbxOptions* options, uint32_t selector, MbxFile* file,
                          uint64_t position, const MbxFtypBox* box, uint64_t* written, uint64_t* accumulated);
MbxStatus MbxFreeFtyp(MbxContext* context, MbxFtypBox* box);

// Appends a compatible brand.
MbxStatus MbxAddBrand(MbxContext* context, MbxFileType* fileType, uint32_t brand);

// Releases the record with its brands; null is allowed.
MbxStatus MbxFreeFileType(MbxContext* context, MbxFileType* fileType);
