#include "boxlib/entry/audio_entry.h"

#include "boxlib/entry/entry_head.h"

namespace {

MbxStatus chooseSampleRate(const MbxAudioEntry& audio, uint32_t timescale, uint32_t* sampleRate) {
    if ((audio.fieldsSet & MBX_AUDIO_SAMPLE_RATE) != 0) {
        *sampleRate = audio.sampleRate;
        return MBX_OK;
    }
    if (timescale > UINT16_MAX) return MBX_ERR_BAD_STATE;
    *sampleRate = timescale << 16;
    return MBX_OK;
}

MbxStatus makeChildren(MbxContext* context, const MbxOptions* options, const MbxSampleEntry* entry,
                       MbxAudioEntryBox* box) {
    const MbxAudioEntry& audio = entry->audio;
    MBX_TRY(MbxMakeOptionalBox(context, options, &box->srat, audio.srat, MbxBuildSrat, MbxFreeSrat));
    MBX_TRY(MbxMakeOptionalBox(context, options, &box->esds, entry->esds, MbxBuildEsds, MbxFreeEsds));
    MBX_TRY(MbxMakeOptionalBox(context, options, &box->ddts, audio.ddts, MbxBuildDdts, MbxFreeDdts));
    MBX_TRY(MbxMakeOptionalBox(context, options, &box->dac3, audio.dac3, MbxBuildDac3, MbxFreeDac3));
    MBX_TRY(MbxMakeOptionalBox(context, options, &box->dec3, audio.dec3, MbxBuildDec3, MbxFreeDec3));
    MBX_TRY(MbxMakeOptionalBox(context, options, &box->fcfg, audio.fcfg, MbxBuildFcfg, MbxFreeFcfg));
    return MbxMakeBoxes(context, options, &box->sinf, entry->sinf.first, MbxBuildSinf, MbxFreeSinf);
}

}  // namespace

MbxStatus MbxBuildAudioEntry(MbxContext* context, const MbxOptions* options, uint32_t timescale,
                             uint32_t version, const MbxSampleEntry* entry, MbxAudioEntryBox* box) {
    if (MbxAnyNull(context, options, entry, box)) return MBX_ERR_INVALID_ARG;
    box->entry = entry;
    box->version = version;
    MBX_TRY(chooseSampleRate(entry->audio, timescale, &box->sampleRate));
    if (entry->rawTail.size == 0) MBX_TRY(makeChildren(context, options, entry, box));
    return MbxMeasureBox(context, options, box, MbxWriteAudioEntryPayload);
}

// 12.2.3 AudioSampleEntry
MbxStatus MbxWriteAudioEntryPayload(MbxContext* context, const MbxOptions* options, MbxFile* file,
                                    uint64_t position, const MbxAudioEntryBox* box, uint64_t* written,
                                    uint64_t* accumulated) {
    const MbxAudioEntryParams& params = box->entry->audio.params;
    MbxBytes bytes;
    MbxBeginBytes(context, &bytes);
    MbxPutEntryHead(&bytes, box->entry);
    MbxPut16(&bytes, box->version);         // unsigned int(16) entry_version
    MbxPutZeros(&bytes, 6);                 // const unsigned int(16)[3] reserved = 0
    MbxPut16(&bytes, params.channelCount);  // unsigned int(16) channelcount
    MbxPut16(&bytes, params.sampleSize);    // unsigned int(16) samplesize
    MbxPutZeros(&bytes, 4);                 // unsigned int(16) pre_defined = 0, reserved = 0
    MbxPut32(&bytes, box->sampleRate);      // unsigned int(32) samplerate
    uint64_t count = 0;
    MBX_TRY(MbxSeek(context, file, position));
    MBX_TRY(MbxWriteComposed(context, file, &bytes, &count));
    MBX_TRY(MbxWriteBuffer(context, file, &box->entry->rawTail, &count));
    MBX_TRY(MbxWriteSratBox(context, options, file, position + count, box->srat, nullptr, &count));
    MBX_TRY(MbxWriteEsdsBox(context, options, file, position + count, box->esds, nullptr, &count));
    MBX_TRY(MbxWriteDdtsBox(context, options, file, position + count, box->ddts, nullptr, &count));
    MBX_TRY(MbxWriteDac3Box(context, options, file, position + count, box->dac3, nullptr, &count));
    MBX_TRY(MbxWriteDec3Box(context, options, file, position + count, box->dec3, nullptr, &count));
    MBX_TRY(MbxWriteFcfgBox(context, options, file, position + count, box->fcfg, nullptr, &count));
    MBX_TRY(MbxWriteBoxes(context, options, file, position, box->sinf.first, MbxWriteSinfBox, &count));
    return MbxReportBytes(count, written, accumulated);
}

MbxStatus MbxWriteAudioEntryBox(MbxContext* context, const MbxOptions* options, MbxFile* file,
                                uint64_t position, const MbxAudioEntryBox* box, uint64_t* written,
                                uint64_t* accumulated) {
    return MbxWriteBox(context, options, file, position, MbxEntryCode(box), box, MbxWriteAudioEntryPayload,
                       written, accumulated);
}

MbxStatus MbxFreeAudioEntry(MbxContext* context, MbxAudioEntryBox* box) {
    return MbxFreeBox(context, box, [&] {
        MBX_TRY(MbxFreeSrat(context, box->srat));
        MBX_TRY(MbxFreeEsds(context, box->esds));
        MBX_TRY(MbxFreeDdts(context, box->ddts));
        MBX_TRY(MbxFreeDac3(context, box->dac3));
        MBX_TRY(MbxFreeDec3(context, box->dec3));
        MBX_TRY(MbxFreeFcfg(context, box->fcfg));
        return MbxFreeList(context, &box->sinf, MbxFreeSinf);
    });
}
