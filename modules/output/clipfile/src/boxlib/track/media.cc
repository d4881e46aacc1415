#include "boxlib/track/media.h"

#include "boxlib/model/version.h"

// ---- mdia ----

MbxStatus MbxBuildMdia(MbxContext* context, const MbxOptions* options, const MbxTrack* track,
                       MbxMdiaBox* box) {
    if (MbxAnyNull(context, options, track, box)) return MBX_ERR_INVALID_ARG;
    MBX_TRY(MbxMakeBox(context, options, &box->mdhd, track, MbxBuildMdhd, MbxFreeMdhd));
    MBX_TRY(MbxMakeBox(context, options, &box->hdlr, &track->handler, MbxBuildHdlr, MbxFreeHdlr));
    MBX_TRY(MbxMakeBox(context, options, &box->minf, track, MbxBuildMinf, MbxFreeMinf));
    return MbxMeasureBox(context, options, box, MbxWriteMdiaPayload);
}

// 8.4.1 Media Box
MbxStatus MbxWriteMdiaPayload(MbxContext* context, const MbxOptions* options, MbxFile* file,
                              uint64_t position, const MbxMdiaBox* box, uint64_t* written,
                              uint64_t* accumulated) {
    uint64_t count = 0;
    MBX_TRY(MbxSeek(context, file, position));
    MBX_TRY(MbxWriteMdhdBox(context, options, file, position + count, box->mdhd, nullptr, &count));
    MBX_TRY(MbxWriteHdlrBox(context, options, file, position + count, box->hdlr, nullptr, &count));
    MBX_TRY(MbxWriteMinfBox(context, options, file, position + count, box->minf, nullptr, &count));
    return MbxReportBytes(count, written, accumulated);
}

MbxStatus MbxWriteMdiaBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxMdiaBox* box, uint64_t* written, uint64_t* accumulated) {
    return MbxWriteBox(context, options, file, position, MbxCode("mdia"), box, MbxWriteMdiaPayload, written,
                       accumulated);
}

MbxStatus MbxFreeMdia(MbxContext* context, MbxMdiaBox* box) {
    return MbxFreeBox(context, box, [&] {
        MBX_TRY(MbxFreeMdhd(context, box->mdhd));
        MBX_TRY(MbxFreeHdlr(context, box->hdlr));
        return MbxFreeMinf(context, box->minf);
    });
}

// ---- mdhd ----

MbxStatus MbxBuildMdhd(MbxContext* context, const MbxOptions* options, const MbxTrack* track,
                       MbxMdhdBox* box) {
    if (MbxAnyNull(context, options, track, box)) return MBX_ERR_INVALID_ARG;
    box->values = track->mediaHeader;
    MBX_TRY(MbxComputeMediaDuration(track, &box->values.duration));
    MBX_TRY(MbxChooseTimeVersion(options, box->values.creationTime, box->values.modificationTime,
                                 box->values.duration, &box->version));
    return MbxMeasureBox(context, options, box, MbxWriteMdhdPayload);
}

// 8.4.2 Media Header Box
MbxStatus MbxWriteMdhdPayload(MbxContext* context, MbxFile* file, uint64_t position, const MbxMdhdBox* box,
                              uint64_t* written, uint64_t* accumulated) {
    const MbxMediaHeader& values = box->values;
    MbxBytes bytes;
    MbxBeginBytes(context, &bytes);
    MbxPutVersionFlags(&bytes, box->version, 0);
    MbxPutByVersion(&bytes, box->version, values.creationTime);  // unsigned int(64 or 32) creation_time
    MbxPutByVersion(&bytes, box->version,
                    values.modificationTime);                // unsigned int(64 or 32) modification_time
    MbxPut32(&bytes, values.timescale);                      // unsigned int(32) timescale
    MbxPutByVersion(&bytes, box->version, values.duration);  // unsigned int(64 or 32) duration
    MbxPut16(&bytes, values.language & 0x7FFF);              // bit(1) pad, unsigned int(5)[3] language
    MbxPutZeros(&bytes, 2);                                  // unsigned int(16) pre_defined
    return MbxWriteFixedPayload(context, file, position, &bytes, written, accumulated);
}

MbxStatus MbxWriteMdhdBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxMdhdBox* box, uint64_t* written, uint64_t* accumulated) {
    return MbxWriteBox(context, options, file, position, MbxCode("mdhd"), box, MbxWriteMdhdPayload, written,
                       accumulated);
}

MbxStatus MbxFreeMdhd(MbxContext* context, MbxMdhdBox* box) {
    return MbxFreeBox(context, box);
}

MbxStatus MbxComputeMediaDuration(const MbxTrack* track, uint64_t* duration) {
    if (MbxAnyNull(track, duration)) return MBX_ERR_INVALID_ARG;
    const MbxSampleSegment* segment = track->segments.first;
    if ((track->mediaHeader.fieldsSet & MBX_MEDIA_DURATION) != 0) {
        *duration = track->mediaHeader.duration;
    } else if (segment == nullptr) {
        *duration = 0;
    } else {
        if (segment->decodeDuration > UINT64_MAX - segment->firstDecodeTime) return MBX_ERR_OVERFLOW;
        *duration = segment->firstDecodeTime + segment->decodeDuration;
    }
    return MBX_OK;
}

// ---- hdlr ----

MbxStatus MbxBuildHdlr(MbxContext* context, const MbxOptions* options, const MbxHandler* handler,
                       MbxHdlrBox* box) {
    if (MbxAnyNull(context, options, handler, box)) return MBX_ERR_INVALID_ARG;
    box->handler = handler;
    return MbxMeasureBox(context, options, box, MbxWriteHdlrPayload);
}

// 8.4.3 Handler Reference Box
MbxStatus MbxWriteHdlrPayload(MbxContext* context, MbxFile* file, uint64_t position, const MbxHdlrBox* box,
                              uint64_t* written, uint64_t* accumulated) {
    const MbxHandler& handler = *box->handler;
    uint64_t count = 0;
    MBX_TRY(MbxSeek(context, file, position));
    MbxBytes bytes;
    MbxBeginBytes(context, &bytes);
    MbxPutVersionFlags(&bytes, 0, 0);
    MbxPutZeros(&bytes, 4);          // unsigned int(32) pre_defined
    MbxPut32(&bytes, handler.type);  // unsigned int(32) handler_type
    MbxPutZeros(&bytes, 12);         // unsigned int(32)[3] reserved
    MBX_TRY(MbxWriteComposed(context, file, &bytes, &count));
    MBX_TRY(
        MbxWriteBytes(context, file, handler.name.data, handler.name.size, nullptr, &count));  // string name
    return MbxReportBytes(count, written, accumulated);
}

MbxStatus MbxWriteHdlrBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxHdlrBox* box, uint64_t* written, uint64_t* accumulated) {
    return MbxWriteBox(context, options, file, position, MbxCode("hdlr"), box, MbxWriteHdlrPayload, written,
                       accumulated);
}

MbxStatus MbxFreeHdlr(MbxContext* context, MbxHdlrBox* box) {
    return MbxFreeBox(context, box);
}

// ---- minf ----

MbxStatus MbxBuildMinf(MbxContext* context, const MbxOptions* options, const MbxTrack* track,
                       MbxMinfBox* box) {
    if (MbxAnyNull(context, options, track, box)) return MBX_ERR_INVALID_ARG;
    MBX_TRY(MbxMakeBox(context, options, &box->mediaInformation, &track->mediaInformation,
                       MbxMakeMediaInformation, MbxFreeMediaInformation));
    MBX_TRY(MbxMakeBox(context, options, &box->dinf, &track->dataEntries, MbxBuildDinf, MbxFreeDinf));
    MBX_TRY(MbxMakeBox(context, options, &box->stbl, track, MbxBuildStbl, MbxFreeStbl));
    return MbxMeasureBox(context, options, box, MbxWriteMinfPayload);
}

// 8.4.4 Media Information Box
MbxStatus MbxWriteMinfPayload(MbxContext* context, const MbxOptions* options, MbxFile* file,
                              uint64_t position, const MbxMinfBox* box, uint64_t* written,
                              uint64_t* accumulated) {
    uint64_t count = 0;
    MBX_TRY(MbxSeek(context, file, position));
    MBX_TRY(MbxWriteMediaInformation(context, options, file, position + count, box->mediaInformation, nullptr,
                                     &count));
    MBX_TRY(MbxWriteDinfBox(context, options, file, position + count, box->dinf, nullptr, &count));
    MBX_TRY(MbxWriteStblBox(context, options, file, position + count, box->stbl, nullptr, &count));
    return MbxReportBytes(count, written, accumulated);
}

MbxStatus MbxWriteMinfBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxMinfBox* box, uint64_t* written, uint64_t* accumulated) {
    return MbxWriteBox(context, options, file, position, MbxCode("minf"), box, MbxWriteMinfPayload, written,
                       accumulated);
}

MbxStatus MbxFreeMinf(MbxContext* context, MbxMinfBox* box) {
    return MbxFreeBox(context, box, [&] {
        MBX_TRY(MbxFreeMediaInformation(context, box->mediaInformation));
        MBX_TRY(MbxFreeDinf(context, box->dinf));
        return MbxFreeStbl(context, box->stbl);
    });
}
