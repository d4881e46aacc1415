#include "boxlib/item/movie_items.h"

#include "boxlib/core/bits.h"
#include "boxlib/core/descriptor.h"

MbxStatus MbxFreeAinfParams(MbxContext* context, MbxAinfParams* params) {
    return MbxFreeBox(context, params, [&] {
        MbxBufferRelease(context, &params->apid);
        return MBX_OK;
    });
}

MbxStatus MbxFreeIodsParams(MbxContext* context, MbxIodsParams* params) {
    return MbxFreeBox(context, params);
}

MbxStatus MbxBuildAinf(MbxContext* context, const MbxOptions* options, const MbxAinfParams* params,
                       MbxAinfBox* box) {
    if (MbxAnyNull(context, options, params, box)) return MBX_ERR_INVALID_ARG;
    box->params = params;
    return MbxMeasureBox(context, options, box, MbxWriteAinfPayload);
}

// Asset Information Box of the Common File Format
MbxStatus MbxWriteAinfPayload(MbxContext* context, MbxFile* file, uint64_t position, const MbxAinfBox* box,
                              uint64_t* written, uint64_t* accumulated) {
    const MbxAinfParams& params = *box->params;
    MbxBytes bytes;
    MbxBeginBytes(context, &bytes);
    MbxPutVersionFlags(&bytes, 0, params.flags);
    MbxPut32(&bytes, params.profileVersion);  // unsigned int(32) profile_version
    uint64_t count = 0;
    MBX_TRY(MbxSeek(context, file, position));
    MBX_TRY(MbxWriteComposed(context, file, &bytes, &count));
    MBX_TRY(MbxWriteBuffer(context, file, &params.apid, &count));  // string APID
    return MbxReportBytes(count, written, accumulated);
}

MbxStatus MbxWriteAinfBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxAinfBox* box, uint64_t* written, uint64_t* accumulated) {
    return MbxWriteOptionalBox(context, options, file, position, MbxCode("ainf"), box, MbxWriteAinfPayload,
                               written, accumulated);
}

MbxStatus MbxFreeAinf(MbxContext* context, MbxAinfBox* box) {
    return MbxFreeBox(context, box);
}

namespace {

// ISO/IEC 14496-14 3.1.2 ES_ID_Inc
MbxStatus writeEsIdInc(MbxContext* context, MbxFile* file, uint64_t position, uint32_t trackId,
                       uint64_t* accumulated) {
    const auto body = [&](MbxFile* target, uint64_t, uint64_t* counter) {
        MbxBytes bytes;
        MbxBeginBytes(context, &bytes);
        MbxPut32(&bytes, trackId);  // unsigned int(32) Track_ID
        return MbxWriteComposed(context, target, &bytes, counter);
    };
    return MbxWriteDescriptor(context, file, position, MBX_TAG_ES_ID_INC, body, accumulated);
}

// ISO/IEC 14496-14 3.1.1 MP4_IOD
MbxStatus writeInitialObjectDescriptor(MbxContext* context, MbxFile* file, uint64_t position,
                                       const MbxIodsParams& params, uint64_t* accumulated) {
    const auto body = [&](MbxFile* target, uint64_t at, uint64_t* counter) {
        uint64_t bits = 0;
        MbxPutBits(&bits, 10, params.objectDescriptorId);            // bit(10) ObjectDescriptorID
        MbxPutBits(&bits, 1, 0);                                     // bit(1) URL_Flag = 0
        MbxPutBits(&bits, 1, params.includeInlineProfileLevelFlag);  // bit(1) includeInlineProfileLevelFlag
        MbxPutBits(&bits, 4, 0xF);                                   // const bit(4) reserved = 1111
        MbxBytes bytes;
        MbxBeginBytes(context, &bytes);
        MbxPut(&bytes, bits, 2);
        // bit(8) ODProfileLevelIndication, then those of scene, audio, visual and graphics
        for (const uint8_t level : params.profileLevels) MbxPut8(&bytes, level);
        uint64_t count = 0;
        MBX_TRY(MbxWriteComposed(context, target, &bytes, &count));
        MBX_TRY(writeEsIdInc(context, target, at + count, params.trackId, &count));
        return MbxReportBytes(count, nullptr, counter);
    };
    return MbxWriteDescriptor(context, file, position, MBX_TAG_INITIAL_OBJECT, body, accumulated);
}

}  // namespace

MbxStatus MbxBuildIods(MbxContext* context, const MbxOptions* options, const MbxIodsParams* params,
                       MbxIodsBox* box) {
    if (MbxAnyNull(context, options, params, box)) return MBX_ERR_INVALID_ARG;
    box->params = *params;
    return MbxMeasureBox(context, options, box, MbxWriteIodsPayload);
}

// ISO/IEC 14496-14 5.1 Object Descriptor Box
MbxStatus MbxWriteIodsPayload(MbxContext* context, MbxFile* file, uint64_t position, const MbxIodsBox* box,
                              uint64_t* written, uint64_t* accumulated) {
    MbxBytes bytes;
    MbxBeginBytes(context, &bytes);
    MbxPutVersionFlags(&bytes, 0, 0);
    uint64_t count = 0;
    MBX_TRY(MbxSeek(context, file, position));
    MBX_TRY(MbxWriteComposed(context, file, &bytes, &count));
    MBX_TRY(
        writeInitialObjectDescriptor(context, file, position + count, box->params, &count));  // MP4_IOD OD
    return MbxReportBytes(count, written, accumulated);
}

MbxStatus MbxWriteIodsBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxIodsBox* box, uint64_t* written, uint64_t* accumulated) {
    return MbxWriteOptionalBox(context, options, file, position, MbxCode("iods"), box, MbxWriteIodsPayload,
                               written, accumulated);
}

MbxStatus MbxFreeIods(MbxContext* context, MbxIodsBox* box) {
    return MbxFreeBox(context, box);
}

MbxStatus MbxBuildFree(MbxContext* context, const MbxOptions* options, uint32_t count, MbxFreeSpaceBox* box) {
    if (MbxAnyNull(context, options, box)) return MBX_ERR_INVALID_ARG;
    box->count = count;
    return MbxMeasureBox(context, options, box, MbxWriteFreePayload);
}

// 8.1.2 Free Space Box
MbxStatus MbxWriteFreePayload(MbxContext* context, MbxFile* file, uint64_t position,
                              const MbxFreeSpaceBox* box, uint64_t* written, uint64_t* accumulated) {
    // MbxWriteZeros tells what its last write moved, which here is of no use.
    MBX_TRY(MbxWriteZeros(context, file, position, box->count, nullptr, nullptr));  // unsigned int(8) data[]
    return MbxReportBytes(box->count, written, accumulated);
}

MbxStatus MbxWriteFreeBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxFreeSpaceBox* box, uint64_t* written, uint64_t* accumulated) {
    return MbxWriteOptionalBox(context, options, file, position, MbxCode("free"), box, MbxWriteFreePayload,
                               written, accumulated);
}

MbxStatus MbxFreeFree(MbxContext* context, MbxFreeSpaceBox* box) {
    return MbxFreeBox(context, box);
}

MbxStatus MbxMakeFree(MbxContext* context, const MbxOptions* options, uint32_t count,
                      MbxFreeSpaceBox** slot) {
    if (count == 0) return MBX_OK;
    return MbxMakeChild(
        context, slot, [&](MbxFreeSpaceBox* box) { return MbxBuildFree(context, options, count, box); },
        MbxFreeFree);
}
