// Session operations on the sample entries of a track.
#include "boxlib/entry/codec_config.h"
#include "boxlib/entry/elementary_stream.h"
#include "boxlib/entry/sample_entry.h"
#include "boxlib/model/session_model.h"

namespace {

MbxStatus addEntry(MbxSession* session, uint32_t track, uint32_t handler,
                   const MbxSampleEntryRequest& request, uint32_t* index) {
    MbxTrack* found = nullptr;
    MbxDataEntry* reference = nullptr;
    MBX_TRY(MbxRequireTrack(session, track, &found));
    if (found->handler.type != handler) return MBX_ERR_BAD_STATE;
    if (request.dataReferenceIndex == 0 || request.dataReferenceIndex > UINT16_MAX)
        return MBX_ERR_INVALID_ARG;
    MBX_TRY(MbxListAt(found->dataEntries.first, request.dataReferenceIndex, &reference));
    if (reference == nullptr) return MBX_ERR_INVALID_ARG;
    return MbxAddSampleEntry(session->context, &found->sampleEntries, &request, index);
}

MbxStatus requireEntry(const MbxSession* session, uint32_t track, uint32_t index, MbxSampleEntry** entry) {
    MbxTrack* found = nullptr;
    MBX_TRY(MbxRequireTrack(session, track, &found));
    return MbxListRequire(found->sampleEntries.entries.first, index, entry);
}

}  // namespace

MbxStatus MbxAddVideoEntry(MbxSession* session, uint32_t track, const MbxVisualEntryParams* params,
                           uint32_t* index) {
    if (MbxAnyNull(session, params, index)) return MBX_ERR_INVALID_ARG;
    if (params->kind != MBX_ENTRY_MP4V && params->kind != MBX_ENTRY_AVC1 && params->kind != MBX_ENTRY_HVC1) {
        return MBX_ERR_INVALID_ARG;
    }
    MbxSampleEntryRequest request = {};
    request.kind = params->kind;
    request.dataReferenceIndex = params->dataReferenceIndex;
    request.visual = *params;
    return addEntry(session, track, MBX_HANDLER_VIDEO, request, index);
}

MbxStatus MbxAddSoundEntry(MbxSession* session, uint32_t track, const MbxAudioEntryParams* params,
                           uint32_t* index) {
    if (MbxAnyNull(session, params, index)) return MBX_ERR_INVALID_ARG;
    MbxSampleEntryRequest request = {};
    request.kind = MBX_ENTRY_MP4A;
    request.dataReferenceIndex = params->dataReferenceIndex;
    request.audio = *params;
    return addEntry(session, track, MBX_HANDLER_SOUND, request, index);
}

MbxStatus MbxAddTimecodeEntry(MbxSession* session, uint32_t track, const MbxTimecodeEntryParams* params,
                              uint32_t* index) {
    if (MbxAnyNull(session, params, index)) return MBX_ERR_INVALID_ARG;
    MbxSampleEntryRequest request = {};
    request.kind = MBX_ENTRY_TMCD;
    request.dataReferenceIndex = params->dataReferenceIndex;
    request.timecode = *params;
    return addEntry(session, track, MBX_HANDLER_TIMECODE, request, index);
}

MbxStatus MbxAddMetaEntry(MbxSession* session, uint32_t track, const MbxMetaEntryParams* params,
                          uint32_t* index) {
    if (MbxAnyNull(session, params, index)) return MBX_ERR_INVALID_ARG;
    MbxSampleEntryRequest request = {};
    request.kind = MBX_ENTRY_RTMD;
    request.dataReferenceIndex = params->dataReferenceIndex;
    return addEntry(session, track, MBX_HANDLER_META, request, index);
}

MbxStatus MbxSetAvcConfig(MbxSession* session, uint32_t track, uint32_t entry,
                          const MbxAvcConfigParams* params) {
    MbxSampleEntry* found = nullptr;
    MBX_TRY(requireEntry(session, track, entry, &found));
    return MbxEntrySetAvcConfig(session->context, found, params);
}

MbxStatus MbxAddAvcSps(MbxSession* session, uint32_t track, uint32_t entry, const uint8_t* data,
                       uint64_t size) {
    MbxSampleEntry* found = nullptr;
    MBX_TRY(requireEntry(session, track, entry, &found));
    return MbxEntryAddAvcSps(session->context, found, data, size);
}

MbxStatus MbxAddAvcPps(MbxSession* session, uint32_t track, uint32_t entry, const uint8_t* data,
                       uint64_t size) {
    MbxSampleEntry* found = nullptr;
    MBX_TRY(requireEntry(session, track, entry, &found));
    return MbxEntryAddAvcPps(session->context, found, data, size);
}

// Contract: operations-for-others. The module records AVC alone.
MbxStatus MbxSetHvcConfig(MbxSession* session, uint32_t track, uint32_t entry, const MbxHvcCValues* params) {
    MbxSampleEntry* found = nullptr;
    MBX_TRY(requireEntry(session, track, entry, &found));
    return MbxEntrySetHvcConfig(session->context, found, params);
}

MbxStatus MbxAddHvcNalUnit(MbxSession* session, uint32_t track, uint32_t entry, uint8_t nalType,
                           uint8_t completeness, const uint8_t* data, uint64_t size) {
    MbxSampleEntry* found = nullptr;
    MBX_TRY(requireEntry(session, track, entry, &found));
    return MbxEntryAddHvcNalUnit(session->context, found, nalType, completeness, data, size);
}

MbxStatus MbxSetEsds(MbxSession* session, uint32_t track, uint32_t entry, const MbxEsdsParams* params) {
    MbxSampleEntry* found = nullptr;
    MBX_TRY(requireEntry(session, track, entry, &found));
    return MbxEntrySetEsds(session->context, found, params);
}
