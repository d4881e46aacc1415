#include "boxlib/entry/visual_config.h"

#include "boxlib/core/bits.h"
#include "boxlib/core/uuid.h"

MbxStatus MbxBuild3stp(MbxContext* context, const MbxOptions* options, const Mbx3stpParams* params,
                       Mbx3stpBox* box) {
    if (MbxAnyNull(context, options, params, box)) return MBX_ERR_INVALID_ARG;
    box->params = *params;
    return MbxMeasureBox(context, options, box, MbxWrite3stpPayload);
}

// A box of this system's own: a mode of three bits and a value of five, and in modes 1 and 2 three words
MbxStatus MbxWrite3stpPayload(MbxContext* context, MbxFile* file, uint64_t position, const Mbx3stpBox* box,
                              uint64_t* written, uint64_t* accumulated) {
    MbxBytes bytes;
    MbxBeginBytes(context, &bytes);
    uint64_t bits = 0;
    MbxPutBits(&bits, 3, box->params.mode);
    MbxPutBits(&bits, 5, box->params.value);
    MbxPut(&bytes, bits, 1);
    if (box->params.mode == 1 || box->params.mode == 2) {
        for (const uint16_t detail : box->params.details) MbxPut16(&bytes, detail);
    }
    return MbxWriteFixedPayload(context, file, position, &bytes, written, accumulated);
}

MbxStatus MbxWrite3stpBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const Mbx3stpBox* box, uint64_t* written, uint64_t* accumulated) {
    return MbxWriteBox(context, options, file, position, MbxCode("3STP"), box, MbxWrite3stpPayload, written,
                       accumulated);
}

MbxStatus MbxFree3stp(MbxContext* context, Mbx3stpBox* box) {
    return MbxFreeBox(context, box);
}

MbxStatus MbxBuild3dds(MbxContext* context, const MbxOptions* options, const MbxBuffer* data,
                       Mbx3ddsBox* box) {
    if (MbxAnyNull(context, options, data, box)) return MBX_ERR_INVALID_ARG;
    box->data = data;
    return MbxMeasureBox(context, options, box, MbxWrite3ddsPayload);
}

// A uuid box of this system's own: bytes from the caller
MbxStatus MbxWrite3ddsPayload(MbxContext* context, MbxFile* file, uint64_t position, const Mbx3ddsBox* box,
                              uint64_t* written, uint64_t* accumulated) {
    uint64_t count = 0;
    MBX_TRY(MbxWriteUuid(context, file, position, MBX_UUID_3DDS, nullptr, &count));
    MBX_TRY(MbxWriteBuffer(context, file, box->data, &count));
    return MbxReportBytes(count, written, accumulated);
}

MbxStatus MbxWrite3ddsBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const Mbx3ddsBox* box, uint64_t* written, uint64_t* accumulated) {
    return MbxWriteOptionalBox(context, options, file, position, MbxCode("uuid"), box, MbxWrite3ddsPayload,
                               written, accumulated);
}

MbxStatus MbxFree3dds(MbxContext* context, Mbx3ddsBox* box) {
    return MbxFreeBox(context, box);
}

MbxStatus MbxBuildRinf(MbxContext* context, const MbxOptions* options, const MbxBuffer* data,
                       MbxRinfBox* box) {
    if (MbxAnyNull(context, options, data, box)) return MBX_ERR_INVALID_ARG;
    box->data = data;
    return MbxMeasureBox(context, options, box, MbxWriteRinfPayload);
}

// 8.15.3 Restricted Scheme Information Box, as ready bytes
MbxStatus MbxWriteRinfPayload(MbxContext* context, MbxFile* file, uint64_t position, const MbxRinfBox* box,
                              uint64_t* written, uint64_t* accumulated) {
    uint64_t count = 0;
    MBX_TRY(MbxSeek(context, file, position));
    MBX_TRY(MbxWriteBuffer(context, file, box->data, &count));
    return MbxReportBytes(count, written, accumulated);
}

MbxStatus MbxWriteRinfBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxRinfBox* box, uint64_t* written, uint64_t* accumulated) {
    return MbxWriteOptionalBox(context, options, file, position, MbxCode("rinf"), box, MbxWriteRinfPayload,
                               written, accumulated);
}

MbxStatus MbxFreeRinf(MbxContext* context, MbxRinfBox* box) {
    return MbxFreeBox(context, box);
}
