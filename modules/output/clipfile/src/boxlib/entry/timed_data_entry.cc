#include "boxlib/entry/timed_data_entry.h"

#include "boxlib/entry/entry_head.h"

MbxStatus MbxBuildSystemsEntry(MbxContext* context, const MbxOptions* options, const MbxSampleEntry* entry,
                               MbxSystemsEntryBox* box) {
    if (MbxAnyNull(context, options, entry, box)) return MBX_ERR_INVALID_ARG;
    box->entry = entry;
    MBX_TRY(MbxMakeOptionalBox(context, options, &box->esds, entry->esds, MbxBuildEsds, MbxFreeEsds));
    return MbxMeasureBox(context, options, box, MbxWriteSystemsEntryPayload);
}

// ISO/IEC 14496-14 5.6 MpegSampleEntry
MbxStatus MbxWriteSystemsEntryPayload(MbxContext* context, const MbxOptions* options, MbxFile* file,
                                      uint64_t position, const MbxSystemsEntryBox* box, uint64_t* written,
                                      uint64_t* accumulated) {
    MbxBytes bytes;
    MbxBeginBytes(context, &bytes);
    MbxPutEntryHead(&bytes, box->entry);
    uint64_t count = 0;
    MBX_TRY(MbxSeek(context, file, position));
    MBX_TRY(MbxWriteComposed(context, file, &bytes, &count));
    MBX_TRY(MbxWriteEsdsBox(context, options, file, position + count, box->esds, nullptr, &count));
    return MbxReportBytes(count, written, accumulated);
}

MbxStatus MbxWriteSystemsEntryBox(MbxContext* context, const MbxOptions* options, MbxFile* file,
                                  uint64_t position, const MbxSystemsEntryBox* box, uint64_t* written,
                                  uint64_t* accumulated) {
    return MbxWriteBox(context, options, file, position, MbxEntryCode(box), box, MbxWriteSystemsEntryPayload,
                       written, accumulated);
}

MbxStatus MbxFreeSystemsEntry(MbxContext* context, MbxSystemsEntryBox* box) {
    return MbxFreeBox(context, box, [&] { return MbxFreeEsds(context, box->esds); });
}

MbxStatus MbxBuildPlainEntry(MbxContext* context, const MbxOptions* options, const MbxSampleEntry* entry,
                             MbxPlainEntryBox* box) {
    if (MbxAnyNull(context, options, entry, box)) return MBX_ERR_INVALID_ARG;
    box->entry = entry;
    return MbxMeasureBox(context, options, box, MbxWritePlainEntryPayload);
}

// 8.5.2 SampleEntry, and four bytes that are reserved
MbxStatus MbxWritePlainEntryPayload(MbxContext* context, MbxFile* file, uint64_t position,
                                    const MbxPlainEntryBox* box, uint64_t* written, uint64_t* accumulated) {
    MbxBytes bytes;
    MbxBeginBytes(context, &bytes);
    MbxPutEntryHead(&bytes, box->entry);
    MbxPutZeros(&bytes, 4);  // unsigned int(32) reserved = 0
    return MbxWriteFixedPayload(context, file, position, &bytes, written, accumulated);
}

MbxStatus MbxWritePlainEntryBox(MbxContext* context, const MbxOptions* options, MbxFile* file,
                                uint64_t position, const MbxPlainEntryBox* box, uint64_t* written,
                                uint64_t* accumulated) {
    return MbxWriteBox(context, options, file, position, MbxEntryCode(box), box, MbxWritePlainEntryPayload,
                       written, accumulated);
}

MbxStatus MbxFreePlainEntry(MbxContext* context, MbxPlainEntryBox* box) {
    return MbxFreeBox(context, box);
}

MbxStatus MbxBuildMetaEntry(MbxContext* context, const MbxOptions* options, const MbxSampleEntry* entry,
                            MbxMetaEntryBox* box) {
    if (MbxAnyNull(context, options, entry, box)) return MBX_ERR_INVALID_ARG;
    box->entry = entry;
    if (entry->rawTail.size == 0) {
        MBX_TRY(MbxMakeBoxes(context, options, &box->sinf, entry->sinf.first, MbxBuildSinf, MbxFreeSinf));
    }
    return MbxMeasureBox(context, options, box, MbxWriteMetaEntryPayload);
}

// 8.5.2 SampleEntry, of timed metadata
MbxStatus MbxWriteMetaEntryPayload(MbxContext* context, const MbxOptions* options, MbxFile* file,
                                   uint64_t position, const MbxMetaEntryBox* box, uint64_t* written,
                                   uint64_t* accumulated) {
    MbxBytes bytes;
    MbxBeginBytes(context, &bytes);
    MbxPutEntryHead(&bytes, box->entry);
    uint64_t count = 0;
    MBX_TRY(MbxSeek(context, file, position));
    MBX_TRY(MbxWriteComposed(context, file, &bytes, &count));
    MBX_TRY(MbxWriteBuffer(context, file, &box->entry->rawTail, &count));
    MBX_TRY(MbxWriteBoxes(context, options, file, position, box->sinf.first, MbxWriteSinfBox, &count));
    return MbxReportBytes(count, written, accumulated);
}

MbxStatus MbxWriteMetaEntryBox(MbxContext* context, const MbxOptions* options, MbxFile* file,
                               uint64_t position, const MbxMetaEntryBox* box, uint64_t* written,
                               uint64_t* accumulated) {
    return MbxWriteBox(context, options, file, position, MbxEntryCode(box), box, MbxWriteMetaEntryPayload,
                       written, accumulated);
}

MbxStatus MbxFreeMetaEntry(MbxContext* context, MbxMetaEntryBox* box) {
    return MbxFreeBox(context, box, [&] { return MbxFreeList(context, &box->sinf, MbxFreeSinf); });
}

MbxStatus MbxBuildGraphicsEntry(MbxContext* context, const MbxOptions* options, const MbxSampleEntry* entry,
                                MbxGraphicsEntryBox* box) {
    if (MbxAnyNull(context, options, entry, box)) return MBX_ERR_INVALID_ARG;
    box->entry = entry;
    if (entry->kind == MBX_ENTRY_GRAPHICS_3D) {
        if (entry->graphics.step == nullptr) return MBX_ERR_BAD_STATE;
        MBX_TRY(MbxMakeBox(context, options, &box->step, entry->graphics.step, MbxBuild3stp, MbxFree3stp));
    }
    return MbxMeasureBox(context, options, box, MbxWriteGraphicsEntryPayload);
}

// 8.5.2 SampleEntry, of graphics: values that pass through
MbxStatus MbxWriteGraphicsEntryPayload(MbxContext* context, const MbxOptions* options, MbxFile* file,
                                       uint64_t position, const MbxGraphicsEntryBox* box, uint64_t* written,
                                       uint64_t* accumulated) {
    MbxBytes bytes;
    MbxBeginBytes(context, &bytes);
    const MbxGraphicsEntry& graphics = box->entry->graphics;
    MbxPutEntryHead(&bytes, box->entry);
    MbxPut16(&bytes, graphics.words8[0]);
    MbxPutZeros(&bytes, 2);  // reserved = 0
    MbxPut16(&bytes, graphics.words8[1]);
    MbxPut16(&bytes, graphics.words8[2]);
    for (const uint32_t word : graphics.words16) MbxPut32(&bytes, word);
    for (const uint16_t word : graphics.words24) MbxPut16(&bytes, word);
    MbxPut8(&bytes, graphics.byte28);
    MbxPutZeros(&bytes, 3);  // reserved = 0
    uint64_t count = 0;
    MBX_TRY(MbxSeek(context, file, position));
    MBX_TRY(MbxWriteComposed(context, file, &bytes, &count));
    if (box->entry->kind == MBX_ENTRY_GRAPHICS_3D) {
        MBX_TRY(MbxWrite3stpBox(context, options, file, position + count, box->step, nullptr, &count));
    }
    return MbxReportBytes(count, written, accumulated);
}

MbxStatus MbxWriteGraphicsEntryBox(MbxContext* context, const MbxOptions* options, MbxFile* file,
                                   uint64_t position, const MbxGraphicsEntryBox* box, uint64_t* written,
                                   uint64_t* accumulated) {
    return MbxWriteBox(context, options, file, position, MbxEntryCode(box), box, MbxWriteGraphicsEntryPayload,
                       written, accumulated);
}

MbxStatus MbxFreeGraphicsEntry(MbxContext* context, MbxGraphicsEntryBox* box) {
    return MbxFreeBox(context, box, [&] { return MbxFree3stp(context, box->step); });
}

MbxStatus MbxBuildTextEntry(MbxContext* context, const MbxOptions* options, const MbxSampleEntry* entry,
                            MbxTextEntryBox* box) {
    if (MbxAnyNull(context, options, entry, box)) return MBX_ERR_INVALID_ARG;
    box->entry = entry;
    MBX_TRY(MbxMakeOptionalBox(context, options, &box->btrt, entry->text.btrt, MbxBuildBtrt, MbxFreeBtrt));
    MBX_TRY(MbxMakeBoxes(context, options, &box->sinf, entry->sinf.first, MbxBuildSinf, MbxFreeSinf));
    return MbxMeasureBox(context, options, box, MbxWriteTextEntryPayload);
}

// 8.5.2 SampleEntry, of text: three texts with their terminators
MbxStatus MbxWriteTextEntryPayload(MbxContext* context, const MbxOptions* options, MbxFile* file,
                                   uint64_t position, const MbxTextEntryBox* box, uint64_t* written,
                                   uint64_t* accumulated) {
    MbxBytes bytes;
    MbxBeginBytes(context, &bytes);
    MbxPutEntryHead(&bytes, box->entry);
    uint64_t count = 0;
    MBX_TRY(MbxSeek(context, file, position));
    MBX_TRY(MbxWriteComposed(context, file, &bytes, &count));
    for (const MbxBuffer& text : box->entry->text.texts)
        MBX_TRY(MbxWriteBuffer(context, file, &text, &count));
    MBX_TRY(MbxWriteBtrtBox(context, options, file, position + count, box->btrt, nullptr, &count));
    MBX_TRY(MbxWriteBoxes(context, options, file, position, box->sinf.first, MbxWriteSinfBox, &count));
    return MbxReportBytes(count, written, accumulated);
}

MbxStatus MbxWriteTextEntryBox(MbxContext* context, const MbxOptions* options, MbxFile* file,
                               uint64_t position, const MbxTextEntryBox* box, uint64_t* written,
                               uint64_t* accumulated) {
    return MbxWriteBox(context, options, file, position, MbxEntryCode(box), box, MbxWriteTextEntryPayload,
                       written, accumulated);
}

MbxStatus MbxFreeTextEntry(MbxContext* context, MbxTextEntryBox* box) {
    return MbxFreeBox(context, box, [&] {
        MBX_TRY(MbxFreeBtrt(context, box->btrt));
        return MbxFreeList(context, &box->sinf, MbxFreeSinf);
    });
}

MbxStatus MbxBuildTimecodeEntry(MbxContext* context, const MbxOptions* options, const MbxSampleEntry* entry,
                                MbxTimecodeEntryBox* box) {
    if (MbxAnyNull(context, options, entry, box)) return MBX_ERR_INVALID_ARG;
    box->entry = entry;
    return MbxMeasureBox(context, options, box, MbxWriteTimecodeEntryPayload);
}

// 8.5.2 SampleEntry, of timecode
MbxStatus MbxWriteTimecodeEntryPayload(MbxContext* context, MbxFile* file, uint64_t position,
                                       const MbxTimecodeEntryBox* box, uint64_t* written,
                                       uint64_t* accumulated) {
    MbxBytes bytes;
    MbxBeginBytes(context, &bytes);
    const MbxTimecodeEntryParams& params = box->entry->timecode;
    MbxPutEntryHead(&bytes, box->entry);
    MbxPutZeros(&bytes, 4);                  // unsigned int(32) reserved = 0
    MbxPut32(&bytes, params.flags);          // unsigned int(32) flags
    MbxPut32(&bytes, params.timescale);      // unsigned int(32) timescale
    MbxPut32(&bytes, params.frameDuration);  // unsigned int(32) frame_duration
    MbxPut8(&bytes, params.frameCount);      // unsigned int(8) number_of_frames
    MbxPutZeros(&bytes, 1);                  // unsigned int(8) reserved = 0
    uint64_t count = 0;
    MBX_TRY(MbxSeek(context, file, position));
    MBX_TRY(MbxWriteComposed(context, file, &bytes, &count));
    MBX_TRY(MbxWriteBuffer(context, file, &box->entry->rawTail, &count));
    return MbxReportBytes(count, written, accumulated);
}

MbxStatus MbxWriteTimecodeEntryBox(MbxContext* context, const MbxOptions* options, MbxFile* file,
                                   uint64_t position, const MbxTimecodeEntryBox* box, uint64_t* written,
                                   uint64_t* accumulated) {
    return MbxWriteBox(context, options, file, position, MbxEntryCode(box), box, MbxWriteTimecodeEntryPayload,
                       written, accumulated);
}

MbxStatus MbxFreeTimecodeEntry(MbxContext* context, MbxTimecodeEntryBox* box) {
    return MbxFreeBox(context, box);
}
