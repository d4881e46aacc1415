#include "boxlib/entry/sample_description.h"

namespace {

// Which box each kind stands for: calls `visit(slot, build, writeBox, release)` with the place of the box in
// the union and the box's functions. MBX_ERR_INTERNAL for an unknown kind.
template <typename Body, typename Visit>
MbxStatus visitBody(uint32_t kind, Body& body, Visit&& visit) {
    switch (kind) {
        case MBX_ENTRY_MP4V:
        case MBX_ENTRY_AVC1:
        case MBX_ENTRY_HVC1:
            return visit(&body.visual, MbxBuildVisualEntry, MbxWriteVisualEntryBox, MbxFreeVisualEntry);
        case MBX_ENTRY_MP4A:
            return visit(&body.audio, MbxBuildAudioEntry, MbxWriteAudioEntryBox, MbxFreeAudioEntry);
        case MBX_ENTRY_SYSTEMS:
            return visit(&body.systems, MbxBuildSystemsEntry, MbxWriteSystemsEntryBox, MbxFreeSystemsEntry);
        case MBX_ENTRY_PLAIN:
        case MBX_ENTRY_PLAIN2:
            return visit(&body.plain, MbxBuildPlainEntry, MbxWritePlainEntryBox, MbxFreePlainEntry);
        case MBX_ENTRY_RTMD:
            return visit(&body.meta, MbxBuildMetaEntry, MbxWriteMetaEntryBox, MbxFreeMetaEntry);
        case MBX_ENTRY_GRAPHICS:
        case MBX_ENTRY_GRAPHICS_3D:
            return visit(&body.graphics, MbxBuildGraphicsEntry, MbxWriteGraphicsEntryBox,
                         MbxFreeGraphicsEntry);
        case MBX_ENTRY_TEXT:
            return visit(&body.text, MbxBuildTextEntry, MbxWriteTextEntryBox, MbxFreeTextEntry);
        case MBX_ENTRY_TMCD:
            return visit(&body.timecode, MbxBuildTimecodeEntry, MbxWriteTimecodeEntryBox,
                         MbxFreeTimecodeEntry);
        default:
            return MBX_ERR_INTERNAL;
    }
}

MbxStatus buildEntry(MbxContext* context, const MbxOptions* options, uint32_t timescale, uint32_t version,
                     const MbxSampleEntry* entry, MbxSampleEntryBox* box) {
    box->kind = entry->kind;
    return visitBody(box->kind, box->body, [&](auto** slot, auto build, auto, auto release) {
        const auto fill = [&](auto* made) {
            if constexpr (std::is_same_v<decltype(made), MbxAudioEntryBox*>) {
                return build(context, options, timescale, version, entry, made);
            } else {
                return build(context, options, entry, made);
            }
        };
        return MbxMakeChild(context, slot, fill, release);
    });
}

MbxStatus writeEntry(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                     const MbxSampleEntryBox* box, uint64_t* written, uint64_t* accumulated) {
    return visitBody(box->kind, box->body, [&](auto* slot, auto, auto writeBox, auto) {
        return writeBox(context, options, file, position, *slot, written, accumulated);
    });
}

MbxStatus freeBody(MbxContext* context, const MbxSampleEntryBox& box) {
    return visitBody(box.kind, box.body,
                     [&](auto* slot, auto, auto, auto release) { return release(context, *slot); });
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
