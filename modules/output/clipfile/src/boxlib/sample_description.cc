#include "boxlib/sample_description.h"

namespace {

// Makes the box that the kind stands for.
MbxStatus buildEntry(MbxContext* context, const MbxOptions* options, uint32_t timescale, uint32_t version,
                     const MbxSampleEntry* entry, MbxSampleEntryBox* box) {
    box->kind = entry->kind;
    switch (box->kind) {
        case MBX_ENTRY_MP4V:
        case MBX_ENTRY_AVC1:
        case MBX_ENTRY_HVC1:
            return MbxMakeBox(context, options, &box->body.visual, entry, MbxBuildVisualEntry,
                              MbxFreeVisualEntry);
        case MBX_ENTRY_MP4A:
            return MbxMakeChild(
                context, &box->body.audio,
                [&](MbxAudioEntryBox* audio) {
                    return MbxBuildAudioEntry(context, options, timescale, version, entry, audio);
                },
                MbxFreeAudioEntry);
        case MBX_ENTRY_SYSTEMS:
            return MbxMakeBox(context, options, &box->body.systems, entry, MbxBuildSystemsEntry,
                              MbxFreeSystemsEntry);
        case MBX_ENTRY_PLAIN:
        case MBX_ENTRY_PLAIN2:
            return MbxMakeBox(context, options, &box->body.plain, entry, MbxBuildPlainEntry,
                              MbxFreePlainEntry);
        case MBX_ENTRY_RTMD:
            return MbxMakeBox(context, options, &box->body.meta, entry, MbxBuildMetaEntry, MbxFreeMetaEntry);
        case MBX_ENTRY_GRAPHICS:
        case MBX_ENTRY_GRAPHICS_3D:
            return MbxMakeBox(context, options, &box->body.graphics, entry, MbxBuildGraphicsEntry,
                              MbxFreeGraphicsEntry);
        case MBX_ENTRY_TEXT:
            return MbxMakeBox(context, options, &box->body.text, entry, MbxBuildTextEntry, MbxFreeTextEntry);
        case MBX_ENTRY_TMCD:
            return MbxMakeBox(context, options, &box->body.timecode, entry, MbxBuildTimecodeEntry,
                              MbxFreeTimecodeEntry);
        default:
            return MBX_ERR_INTERNAL;
    }
}

MbxStatus writeEntry(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                     const MbxSampleEntryBox* box, uint64_t* written, uint64_t* accumulated) {
    switch (box->kind) {
        case MBX_ENTRY_MP4V:
        case MBX_ENTRY_AVC1:
        case MBX_ENTRY_HVC1:
            return MbxWriteVisualEntryBox(context, options, file, position, box->body.visual, written,
                                          accumulated);
        case MBX_ENTRY_MP4A:
            return MbxWriteAudioEntryBox(context, options, file, position, box->body.audio, written,
                                         accumulated);
        case MBX_ENTRY_SYSTEMS:
            return MbxWriteSystemsEntryBox(context, options, file, position, box->body.systems, written,
                                           accumulated);
        case MBX_ENTRY_PLAIN:
        case MBX_ENTRY_PLAIN2:
            return MbxWritePlainEntryBox(context, options, file, position, box->body.plain, written,
                                         accumulated);
        case MBX_ENTRY_RTMD:
            return MbxWriteMetaEntryBox(context, options, file, position, box->body.meta, written,
                                        accumulated);
        case MBX_ENTRY_GRAPHICS:
        case MBX_ENTRY_GRAPHICS_3D:
            return MbxWriteGraphicsEntryBox(context, options, file, position, box->body.graphics, written,
                                            accumulated);
        case MBX_ENTRY_TEXT:
            return MbxWriteTextEntryBox(context, options, file, position, box->body.text, written,
                                        accumulated);
        case MBX_ENTRY_TMCD:
            return MbxWriteTimecodeEntryBox(context, options, file, position, box->body.timecode, written,
                                            accumulated);
        default:
            return MBX_ERR_INTERNAL;
    }
}

MbxStatus freeBody(MbxContext* context, const MbxSampleEntryBox& box) {
    switch (box.kind) {
        case MBX_ENTRY_MP4V:
        case MBX_ENTRY_AVC1:
        case MBX_ENTRY_HVC1:
            return MbxFreeVisualEntry(context, box.body.visual);
        case MBX_ENTRY_MP4A:
            return MbxFreeAudioEntry(context, box.body.audio);
        case MBX_ENTRY_SYSTEMS:
            return MbxFreeSystemsEntry(context, box.body.systems);
        case MBX_ENTRY_PLAIN:
        case MBX_ENTRY_PLAIN2:
            return MbxFreePlainEntry(context, box.body.plain);
        case MBX_ENTRY_RTMD:
            return MbxFreeMetaEntry(context, box.body.meta);
        case MBX_ENTRY_GRAPHICS:
        case MBX_ENTRY_GRAPHICS_3D:
            return MbxFreeGraphicsEntry(context, box.body.graphics);
        case MBX_ENTRY_TEXT:
            return MbxFreeTextEntry(context, box.body.text);
        case MBX_ENTRY_TMCD:
            return MbxFreeTimecodeEntry(context, box.body.timecode);
        default:
            return MBX_ERR_INTERNAL;
    }
}

// An entry of unknown kind owns no body, so its record goes all the same.
MbxStatus freeEntry(MbxContext* context, MbxSampleEntryBox* box) {
    if (box == nullptr) return MBX_OK;
    const MbxStatus status = freeBody(context, *box);
    MbxFree(context, box);
    return status;
}

}  // namespace

MbxStatus MbxBuildStsd(MbxContext* context, const MbxOptions* options, uint32_t timescale,
                       const MbxSampleEntryList* entries, MbxStsdBox* box) {
    if (MbxAnyNull(context, options, entries, box)) return MBX_ERR_INVALID_ARG;
    box->version = entries->version == 1 ? 1 : 0;
    for (const MbxSampleEntry* entry = entries->entries.first; entry != nullptr; entry = entry->next) {
        MBX_TRY(MbxMakeListItem(
            context, &box->entries,
            [&](MbxSampleEntryBox* made) {
                return buildEntry(context, options, timescale, box->version, entry, made);
            },
            freeEntry));
    }
    return MbxMeasureBox(context, options, box, MbxWriteStsdPayload);
}

// 8.5.2 Sample Description Box
MbxStatus MbxWriteStsdPayload(MbxContext* context, const MbxOptions* options, MbxFile* file,
                              uint64_t position, const MbxStsdBox* box, uint64_t* written,
                              uint64_t* accumulated) {
    uint32_t entryCount = 0;
    MBX_TRY(MbxListCount<MbxSampleEntryBox>(box->entries.first, &entryCount));
    MbxBytes bytes;
    MbxBeginBytes(context, &bytes);
    MbxPutVersionFlags(&bytes, box->version, 0);
    MbxPut32(&bytes, entryCount);  // unsigned int(32) entry_count
    uint64_t count = 0;
    MBX_TRY(MbxSeek(context, file, position));
    MBX_TRY(MbxWriteComposed(context, file, &bytes, &count));
    MBX_TRY(MbxWriteBoxes(context, options, file, position, box->entries.first, writeEntry, &count));
    return MbxReportBytes(count, written, accumulated);
}

MbxStatus MbxWriteStsdBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxStsdBox* box, uint64_t* written, uint64_t* accumulated) {
    return MbxWriteBox(context, options, file, position, MbxCode("stsd"), box, MbxWriteStsdPayload, written,
                       accumulated);
}

MbxStatus MbxFreeStsd(MbxContext* context, MbxStsdBox* box) {
    return MbxFreeBox(context, box, [&] { return MbxFreeList(context, &box->entries, freeEntry); });
}
