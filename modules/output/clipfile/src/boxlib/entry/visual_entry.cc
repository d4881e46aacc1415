#include "boxlib/entry/visual_entry.h"

#include "boxlib/entry/entry_head.h"

namespace {

// Makes the box that kinds 2 and 11 cannot do without.
MbxStatus makeConfig(MbxContext* context, const MbxOptions* options, const MbxSampleEntry& entry,
                     MbxVisualEntryBox* box) {
    const MbxVisualEntry& visual = entry.visual;
    switch (entry.kind) {
        case MBX_ENTRY_MP4V:
            return MBX_OK;
        case MBX_ENTRY_AVC1:
            if (visual.avcConfig == nullptr) return MBX_ERR_BAD_STATE;
            return MbxMakeBox(context, options, &box->avcC, visual.avcConfig, MbxBuildAvcC, MbxFreeAvcC);
        case MBX_ENTRY_HVC1:
            if (visual.hvcConfig == nullptr) return MBX_ERR_BAD_STATE;
            return MbxMakeBox(context, options, &box->hvcC, visual.hvcConfig, MbxBuildHvcC, MbxFreeHvcC);
        default:
            return MBX_ERR_INTERNAL;
    }
}

MbxStatus writeConfig(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                      const MbxVisualEntryBox* box, uint64_t* accumulated) {
    switch (box->entry->kind) {
        case MBX_ENTRY_MP4V:
            return MBX_OK;
        case MBX_ENTRY_AVC1:
            return MbxWriteAvcCBox(context, options, file, position, box->avcC, nullptr, accumulated);
        case MBX_ENTRY_HVC1:
            return MbxWriteHvcCBox(context, options, file, position, box->hvcC, nullptr, accumulated);
        default:
            return MBX_ERR_INTERNAL;
    }
}

const char* compressorName(uint32_t kind) {
    switch (kind) {
        case MBX_ENTRY_AVC1:
            return "AVC Coding";
        case MBX_ENTRY_HVC1:
            return "HEVC Coding";
        default:
            return "";
    }
}

// A text in a field of 32 bytes, of which the first is its length.
void putName(MbxBytes* bytes, const char* name) {
    uint32_t length = 0;
    while (name[length] != 0) length++;
    MbxPut8(bytes, length);
    for (uint32_t i = 0; i < length; i++) MbxPut8(bytes, static_cast<uint8_t>(name[i]));
    MbxPutZeros(bytes, 31 - length);
}

}  // namespace

MbxStatus MbxBuildVisualEntry(MbxContext* context, const MbxOptions* options, const MbxSampleEntry* entry,
                              MbxVisualEntryBox* box) {
    if (MbxAnyNull(context, options, entry, box)) return MBX_ERR_INVALID_ARG;
    box->entry = entry;
    MBX_TRY(makeConfig(context, options, *entry, box));
    MBX_TRY(MbxMakeOptionalBox(context, options, &box->esds, entry->esds, MbxBuildEsds, MbxFreeEsds));
    const MbxBuffer* stereo = entry->visual.stereo.size != 0 ? &entry->visual.stereo : nullptr;
    const MbxBuffer* restricted = entry->visual.restricted.size != 0 ? &entry->visual.restricted : nullptr;
    MBX_TRY(MbxMakeOptionalBox(context, options, &box->stereo, stereo, MbxBuild3dds, MbxFree3dds));
    MBX_TRY(MbxMakeOptionalBox(context, options, &box->rinf, restricted, MbxBuildRinf, MbxFreeRinf));
    MBX_TRY(MbxMakeBoxes(context, options, &box->sinf, entry->sinf.first, MbxBuildSinf, MbxFreeSinf));
    return MbxMeasureBox(context, options, box, MbxWriteVisualEntryPayload);
}

// 12.1.3 VisualSampleEntry
MbxStatus MbxWriteVisualEntryPayload(MbxContext* context, const MbxOptions* options, MbxFile* file,
                                     uint64_t position, const MbxVisualEntryBox* box, uint64_t* written,
                                     uint64_t* accumulated) {
    const MbxVisualEntryParams& params = box->entry->visual.params;
    MbxBytes bytes;
    MbxBeginBytes(context, &bytes);
    MbxPutEntryHead(&bytes, box->entry);
    MbxPutZeros(&bytes, 16);                        // unsigned int(16)[2], unsigned int(32)[3] = 0
    MbxPut16(&bytes, params.width);                 // unsigned int(16) width
    MbxPut16(&bytes, params.height);                // unsigned int(16) height
    MbxPut16(&bytes, params.horizontalResolution);  // unsigned int(32) horizresolution, 16.16
    MbxPut16(&bytes, params.horizontalResolutionFraction);
    MbxPut16(&bytes, params.verticalResolution);  // unsigned int(32) vertresolution, 16.16
    MbxPut16(&bytes, params.verticalResolutionFraction);
    MbxPutZeros(&bytes, 4);                             // const unsigned int(32) reserved = 0
    MbxPut16(&bytes, 1);                                // unsigned int(16) frame_count = 1
    putName(&bytes, compressorName(box->entry->kind));  // string[32] compressorname
    MbxPut16(&bytes, 24);                               // unsigned int(16) depth = 24
    MbxPut16(&bytes, 0xFFFF);                           // int(16) pre_defined = -1
    uint64_t count = 0;
    MBX_TRY(MbxSeek(context, file, position));
    MBX_TRY(MbxWriteComposed(context, file, &bytes, &count));
    MBX_TRY(writeConfig(context, options, file, position + count, box, &count));
    MBX_TRY(MbxWriteEsdsBox(context, options, file, position + count, box->esds, nullptr, &count));
    MBX_TRY(MbxWrite3ddsBox(context, options, file, position + count, box->stereo, nullptr, &count));
    MBX_TRY(MbxWriteRinfBox(context, options, file, position + count, box->rinf, nullptr, &count));
    MBX_TRY(MbxWriteBoxes(context, options, file, position, box->sinf.first, MbxWriteSinfBox, &count));
    return MbxReportBytes(count, written, accumulated);
}

MbxStatus MbxWriteVisualEntryBox(MbxContext* context, const MbxOptions* options, MbxFile* file,
                                 uint64_t position, const MbxVisualEntryBox* box, uint64_t* written,
                                 uint64_t* accumulated) {
    return MbxWriteBox(context, options, file, position, MbxEntryCode(box), box, MbxWriteVisualEntryPayload,
                       written, accumulated);
}

MbxStatus MbxFreeVisualEntry(MbxContext* context, MbxVisualEntryBox* box) {
    return MbxFreeBox(context, box, [&] {
        MBX_TRY(MbxFreeAvcC(context, box->avcC));
        MBX_TRY(MbxFreeHvcC(context, box->hvcC));
        MBX_TRY(MbxFreeEsds(context, box->esds));
        MBX_TRY(MbxFree3dds(context, box->stereo));
        MBX_TRY(MbxFreeRinf(context, box->rinf));
        return MbxFreeList(context, &box->sinf, MbxFreeSinf);
    });
}
