#include "boxlib/entry/sample_entry.h"

#include "boxlib/entry/codec_config.h"
#include "boxlib/entry/elementary_stream.h"
#include "boxlib/protection/protection.h"

namespace {

// The code of the kinds that have one of their own, otherwise the caller's. MBX_ERR_INTERNAL for an unknown
// kind.
MbxStatus chooseCode(const MbxSampleEntryRequest& request, uint32_t* code) {
    switch (request.kind) {
        case MBX_ENTRY_MP4V:
            *code = MbxCode("mp4v");
            return MBX_OK;
        case MBX_ENTRY_AVC1:
            *code = MbxCode("avc1");
            return MBX_OK;
        case MBX_ENTRY_HVC1:
            *code = MbxCode("hvc1");
            return MBX_OK;
        case MBX_ENTRY_MP4A:
            *code = MbxCode("mp4a");
            return MBX_OK;
        case MBX_ENTRY_RTMD:
            *code = MbxCode("rtmd");
            return MBX_OK;
        case MBX_ENTRY_TMCD:
            *code = MbxCode("tmcd");
            return MBX_OK;
        case MBX_ENTRY_SYSTEMS:
        case MBX_ENTRY_PLAIN:
        case MBX_ENTRY_PLAIN2:
        case MBX_ENTRY_GRAPHICS:
        case MBX_ENTRY_GRAPHICS_3D:
        case MBX_ENTRY_TEXT:
            *code = request.code;
            return MBX_OK;
        default:
            return MBX_ERR_INTERNAL;
    }
}

// A copy of an optional parameter record.
template <typename Params>
MbxStatus copyRecord(MbxContext* context, const Params* source, Params** copy) {
    if (source == nullptr) return MBX_OK;
    MBX_TRY(MbxNew(context, copy));
    **copy = *source;
    return MBX_OK;
}

MbxStatus fillGraphics(MbxContext* context, const MbxGraphicsEntry& source, MbxGraphicsEntry* graphics) {
    *graphics = source;
    graphics->step = nullptr;
    return copyRecord(context, source.step, &graphics->step);
}

MbxStatus fillText(MbxContext* context, const MbxSampleEntryRequest& request, MbxTextEntry* text) {
    MBX_TRY(MbxBufferAssignText(context, &text->texts[0], request.texts[0], request.textSizes[0]));
    for (int i = 1; i < 3; i++) {
        MBX_TRY(MbxBufferAssign(context, 1, &text->texts[i], request.texts[i], request.textSizes[i]));
    }
    return copyRecord(context, request.btrt, &text->btrt);
}

MbxStatus fillEntry(MbxContext* context, const MbxSampleEntryRequest& request, MbxSampleEntry* entry) {
    MBX_TRY(chooseCode(request, &entry->code));
    entry->kind = request.kind;
    entry->dataReferenceIndex = request.dataReferenceIndex;
    switch (request.kind) {
        case MBX_ENTRY_MP4V:
        case MBX_ENTRY_AVC1:
        case MBX_ENTRY_HVC1:
            entry->visual.params = request.visual;
            return MBX_OK;
        case MBX_ENTRY_MP4A:
            entry->audio.fieldsSet = MBX_AUDIO_DATA_REFERENCE | MBX_AUDIO_CHANNELS | MBX_AUDIO_SAMPLE_SIZE;
            entry->audio.params = request.audio;
            return MBX_OK;
        case MBX_ENTRY_GRAPHICS:
        case MBX_ENTRY_GRAPHICS_3D:
            return fillGraphics(context, request.graphics, &entry->graphics);
        case MBX_ENTRY_TEXT:
            return fillText(context, request, &entry->text);
        case MBX_ENTRY_TMCD:
            entry->timecode = request.timecode;
            return MBX_OK;
        default:
            return MBX_OK;
    }
}

void releaseVisual(MbxContext* context, MbxVisualEntry* visual) {
    MbxBufferRelease(context, &visual->stereo);
    MbxBufferRelease(context, &visual->restricted);
}

void releaseAudio(MbxContext* context, MbxAudioEntry* audio) {
    MbxFree(context, audio->srat);
    MbxFree(context, audio->ddts);
    MbxFree(context, audio->dac3);
    MbxFree(context, audio->dec3);
    MbxFree(context, audio->fcfg);
}

MbxStatus freeModelEntry(MbxContext* context, MbxSampleEntry* entry) {
    return MbxFreeBox(context, entry, [&] {
        MBX_TRY(MbxFreeAvcConfig(context, entry->visual.avcConfig));
        MBX_TRY(MbxFreeHvcConfig(context, entry->visual.hvcConfig));
        releaseVisual(context, &entry->visual);
        releaseAudio(context, &entry->audio);
        MbxFree(context, entry->graphics.step);
        for (MbxBuffer& text : entry->text.texts) MbxBufferRelease(context, &text);
        MbxFree(context, entry->text.btrt);
        MBX_TRY(MbxFreeEsdsValues(context, entry->esds));
        MbxBufferRelease(context, &entry->rawTail);
        return MbxFreeList(context, &entry->sinf, MbxFreeSinfParams);
    });
}

}  // namespace

MbxStatus MbxAddSampleEntry(MbxContext* context, MbxSampleEntryList* list,
                            const MbxSampleEntryRequest* request, uint32_t* index) {
    if (MbxAnyNull(context, list, request, index)) return MBX_ERR_INVALID_ARG;
    MBX_TRY(MbxMakeListItem(
        context, &list->entries, [&](MbxSampleEntry* entry) { return fillEntry(context, *request, entry); },
        freeModelEntry));
    return MbxListCount<MbxSampleEntry>(list->entries.first, index);
}

MbxStatus MbxReleaseSampleEntries(MbxContext* context, MbxSampleEntryList* list) {
    if (MbxAnyNull(context, list)) return MBX_ERR_INVALID_ARG;
    return MbxFreeList(context, &list->entries, freeModelEntry);
}
