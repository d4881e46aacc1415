#include "boxlib/track/media_header.h"

MbxStatus MbxMakeMediaInformation(MbxContext* context, const MbxOptions* options,
                                  const MbxMediaInformation* information, MbxMediaInformationBox* box) {
    if (information == nullptr) return MBX_ERR_INVALID_ARG;
    switch (information->code) {
        case MbxCode("vmhd"):
            return MbxBuildVmhd(context, options, information, box);
        case MbxCode("smhd"):
            return MbxBuildSmhd(context, options, information, box);
        case MbxCode("sthd"):
            return MbxBuildSthd(context, options, information, box);
        case MbxCode("nmhd"):
            return MbxBuildNmhd(context, options, information, box);
        default:
            return MBX_ERR_INTERNAL;
    }
}

MbxStatus MbxWriteMediaInformation(MbxContext* context, const MbxOptions* options, MbxFile* file,
                                   uint64_t position, const MbxMediaInformationBox* box, uint64_t* written,
                                   uint64_t* accumulated) {
    if (box == nullptr) return MBX_ERR_INVALID_ARG;
    switch (box->values.code) {
        case MbxCode("vmhd"):
            return MbxWriteVmhdBox(context, options, file, position, box, written, accumulated);
        case MbxCode("smhd"):
            return MbxWriteSmhdBox(context, options, file, position, box, written, accumulated);
        case MbxCode("sthd"):
            return MbxWriteSthdBox(context, options, file, position, box, written, accumulated);
        case MbxCode("nmhd"):
            return MbxWriteNmhdBox(context, options, file, position, box, written, accumulated);
        default:
            return MBX_ERR_INTERNAL;
    }
}

MbxStatus MbxFreeMediaInformation(MbxContext* context, MbxMediaInformationBox* box) {
    return MbxFreeBox(context, box);
}

namespace {

template <typename Payload>
MbxStatus buildHeader(MbxContext* context, const MbxOptions* options, uint32_t code,
                      const MbxMediaInformation* information, MbxMediaInformationBox* box,
                      Payload&& payload) {
    if (MbxAnyNull(context, options, information, box)) return MBX_ERR_INVALID_ARG;
    if (information->code != code) return MBX_ERR_INTERNAL;
    box->values = *information;
    return MbxMeasureBox(context, options, box, payload);
}

// A full box with nothing in it.
MbxStatus writeEmpty(MbxContext* context, MbxFile* file, uint64_t position, uint32_t code,
                     const MbxMediaInformationBox* box, uint64_t* written, uint64_t* accumulated) {
    if (box->values.code != code) return MBX_ERR_INTERNAL;
    MbxBytes bytes;
    MbxBeginBytes(context, &bytes);
    MbxPutVersionFlags(&bytes, 0, 0);
    return MbxWriteFixedPayload(context, file, position, &bytes, written, accumulated);
}

}  // namespace

// ---- vmhd ----

MbxStatus MbxBuildVmhd(MbxContext* context, const MbxOptions* options, const MbxMediaInformation* information,
                       MbxMediaInformationBox* box) {
    return buildHeader(context, options, MbxCode("vmhd"), information, box, MbxWriteVmhdPayload);
}

// 12.1.2 Video Media Header Box
MbxStatus MbxWriteVmhdPayload(MbxContext* context, MbxFile* file, uint64_t position,
                              const MbxMediaInformationBox* box, uint64_t* written, uint64_t* accumulated) {
    if (box->values.code != MbxCode("vmhd")) return MBX_ERR_INTERNAL;
    MbxBytes bytes;
    MbxBeginBytes(context, &bytes);
    MbxPutVersionFlags(&bytes, 0, 1);
    MbxPut16(&bytes, box->values.graphicsMode);  // unsigned int(16) graphicsmode
    for (const uint16_t color : box->values.opcolor) MbxPut16(&bytes, color);  // unsigned int(16)[3] opcolor
    return MbxWriteFixedPayload(context, file, position, &bytes, written, accumulated);
}

MbxStatus MbxWriteVmhdBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxMediaInformationBox* box, uint64_t* written, uint64_t* accumulated) {
    return MbxWriteBox(context, options, file, position, MbxCode("vmhd"), box, MbxWriteVmhdPayload, written,
                       accumulated);
}

MbxStatus MbxFreeVmhd(MbxContext* context, MbxMediaInformationBox* box) {
    return MbxFreeMediaInformation(context, box);
}

// ---- smhd ----

MbxStatus MbxBuildSmhd(MbxContext* context, const MbxOptions* options, const MbxMediaInformation* information,
                       MbxMediaInformationBox* box) {
    return buildHeader(context, options, MbxCode("smhd"), information, box, MbxWriteSmhdPayload);
}

// 12.2.2 Sound Media Header Box
MbxStatus MbxWriteSmhdPayload(MbxContext* context, MbxFile* file, uint64_t position,
                              const MbxMediaInformationBox* box, uint64_t* written, uint64_t* accumulated) {
    if (box->values.code != MbxCode("smhd")) return MBX_ERR_INTERNAL;
    MbxBytes bytes;
    MbxBeginBytes(context, &bytes);
    MbxPutVersionFlags(&bytes, 0, 0);
    MbxPut16(&bytes, static_cast<uint16_t>(box->values.balance));  // int(16) balance
    MbxPutZeros(&bytes, 2);                                        // unsigned int(16) reserved
    return MbxWriteFixedPayload(context, file, position, &bytes, written, accumulated);
}

MbxStatus MbxWriteSmhdBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxMediaInformationBox* box, uint64_t* written, uint64_t* accumulated) {
    return MbxWriteBox(context, options, file, position, MbxCode("smhd"), box, MbxWriteSmhdPayload, written,
                       accumulated);
}

MbxStatus MbxFreeSmhd(MbxContext* context, MbxMediaInformationBox* box) {
    return MbxFreeMediaInformation(context, box);
}

// ---- sthd ----

MbxStatus MbxBuildSthd(MbxContext* context, const MbxOptions* options, const MbxMediaInformation* information,
                       MbxMediaInformationBox* box) {
    return buildHeader(context, options, MbxCode("sthd"), information, box, MbxWriteSthdPayload);
}

// 12.6.2 Subtitle Media Header Box
MbxStatus MbxWriteSthdPayload(MbxContext* context, MbxFile* file, uint64_t position,
                              const MbxMediaInformationBox* box, uint64_t* written, uint64_t* accumulated) {
    return writeEmpty(context, file, position, MbxCode("sthd"), box, written, accumulated);
}

MbxStatus MbxWriteSthdBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxMediaInformationBox* box, uint64_t* written, uint64_t* accumulated) {
    return MbxWriteBox(context, options, file, position, MbxCode("sthd"), box, MbxWriteSthdPayload, written,
                       accumulated);
}

MbxStatus MbxFreeSthd(MbxContext* context, MbxMediaInformationBox* box) {
    return MbxFreeMediaInformation(context, box);
}

// ---- nmhd ----

MbxStatus MbxBuildNmhd(MbxContext* context, const MbxOptions* options, const MbxMediaInformation* information,
                       MbxMediaInformationBox* box) {
    return buildHeader(context, options, MbxCode("nmhd"), information, box, MbxWriteNmhdPayload);
}

// 8.4.5.2 Null Media Header Box
MbxStatus MbxWriteNmhdPayload(MbxContext* context, MbxFile* file, uint64_t position,
                              const MbxMediaInformationBox* box, uint64_t* written, uint64_t* accumulated) {
    return writeEmpty(context, file, position, MbxCode("nmhd"), box, written, accumulated);
}

MbxStatus MbxWriteNmhdBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxMediaInformationBox* box, uint64_t* written, uint64_t* accumulated) {
    return MbxWriteBox(context, options, file, position, MbxCode("nmhd"), box, MbxWriteNmhdPayload, written,
                       accumulated);
}

MbxStatus MbxFreeNmhd(MbxContext* context, MbxMediaInformationBox* box) {
    return MbxFreeMediaInformation(context, box);
}
