#include "boxlib/movie/file.h"

MbxStatus MbxBuildFtyp(MbxContext* context, const MbxOptions* options, const MbxFileType* fileType,
                       MbxFtypBox* box) {
    if (MbxAnyNull(context, options, fileType, box)) return MBX_ERR_INVALID_ARG;
    box->fileType = fileType;
    return MbxMeasureBox(context, options, box, MbxWriteFtypPayload);
}

// 4.3 File Type Box, 8.16.2 Segment Type Box
MbxStatus MbxWriteFtypPayload(MbxContext* context, MbxFile* file, uint64_t position, const MbxFtypBox* box,
                              uint64_t* written, uint64_t* accumulated) {
    uint64_t count = 0;
    MBX_TRY(MbxSeek(context, file, position));
    MbxBytes bytes;
    MbxBeginBytes(context, &bytes);
    MbxPut32(&bytes, box->fileType->majorBrand);    // unsigned int(32) major_brand
    MbxPut32(&bytes, box->fileType->minorVersion);  // unsigned int(32) minor_version
    MBX_TRY(MbxWriteComposed(context, file, &bytes, &count));
    MBX_TRY(MbxWriteEach(box->fileType->compatibleBrands.first, position, &count,
                         [&](const MbxBrand* brand, uint64_t, uint64_t* counter) {
                             MbxBeginBytes(context, &bytes);
                             MbxPut32(&bytes, brand->brand);  // unsigned int(32) compatible_brands[]
                             return MbxWriteComposed(context, file, &bytes, counter);
                         }));
    return MbxReportBytes(count, written, accumulated);
}

MbxStatus MbxWriteFtypBox(MbxContext* context, const MbxOptions* options, uint32_t selector, MbxFile* file,
                          uint64_t position, const MbxFtypBox* box, uint64_t* written,
                          uint64_t* accumulated) {
    uint32_t code = 0;
    switch (selector) {
        case MBX_SELECT_FTYP:
            code = MbxCode("ftyp");
            break;
        case MBX_SELECT_STYP:
            code = MbxCode("styp");
            break;
        default:
            return MBX_ERR_INTERNAL;
    }
    return MbxWriteBox(context, options, file, position, code, box, MbxWriteFtypPayload, written,
                       accumulated);
}

MbxStatus MbxFreeFtyp(MbxContext* context, MbxFtypBox* box) {
    return MbxFreeBox(context, box);
}

MbxStatus MbxAddBrand(MbxContext* context, MbxFileType* fileType, uint32_t brand) {
    MbxBrand* added = nullptr;
    MBX_TRY(MbxNew(context, &added));
    added->brand = brand;
    MbxListAppend(&fileType->compatibleBrands, added);
    return MBX_OK;
}

MbxStatus MbxFreeFileType(MbxContext* context, MbxFileType* fileType) {
    return MbxFreeBox(context, fileType, [&] {
        return MbxFreeList(context, &fileType->compatibleBrands,
                           [](MbxContext* owner, MbxBrand* brand) { return MbxFreeBox(owner, brand); });
    });
}
