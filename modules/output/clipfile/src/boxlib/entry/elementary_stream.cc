#include "boxlib/entry/elementary_stream.h"

#include "boxlib/core/descriptor.h"

namespace {

bool isRange(const uint8_t* data, uint64_t size) {
    return data != nullptr || size == 0;
}

MbxStatus checkParams(const MbxEsdsParams& params) {
    switch (params.form) {
        case MBX_ESDS_FIELDS:
            return params.streamType < 64 && params.upStream < 2 && params.bufferSizeDB < 0x1000000 &&
                           isRange(params.decoderSpecificInfo, params.decoderSpecificInfoSize)
                       ? MBX_OK
                       : MBX_ERR_INVALID_ARG;
        case MBX_ESDS_RAW:
            return isRange(params.raw, params.rawSize) ? MBX_OK : MBX_ERR_INVALID_ARG;
        default:
            return MBX_ERR_INTERNAL;
    }
}

// Whether an entry can carry a descriptor, given what it carries already.
bool takesDescriptor(const MbxSampleEntry& entry) {
    switch (entry.kind) {
        case MBX_ENTRY_MP4V:
        case MBX_ENTRY_SYSTEMS:
            return true;
        case MBX_ENTRY_MP4A:
            return entry.rawTail.size == 0 && entry.audio.ddts == nullptr && entry.audio.dac3 == nullptr &&
                   entry.audio.dec3 == nullptr && entry.audio.fcfg == nullptr;
        default:
            return false;
    }
}

MbxStatus copyParams(MbxContext* context, const MbxEsdsParams& params, MbxEsdsValues* values) {
    values->form = params.form;
    if (params.form == MBX_ESDS_RAW)
        return MbxBufferAssign(context, 0, &values->raw, params.raw, params.rawSize);
    values->objectTypeIndication = params.objectTypeIndication;
    values->streamType = params.streamType;
    values->upStream = params.upStream;
    values->bufferSizeDB = params.bufferSizeDB;
    values->maxBitrate = params.maxBitrate;
    values->avgBitrate = params.avgBitrate;
    return MbxBufferAssign(context, 0, &values->decoderSpecificInfo, params.decoderSpecificInfo,
                           params.decoderSpecificInfoSize);
}

// ISO/IEC 14496-1 7.2.6.6 DecoderConfigDescriptor
MbxStatus writeDecoderConfig(MbxContext* context, MbxFile* file, uint64_t position,
                             const MbxEsdsValues& values, uint64_t* accumulated) {
    const auto body = [&](MbxFile* target, uint64_t at, uint64_t* counter) {
        MbxBytes bytes;
        MbxBeginBytes(context, &bytes);
        MbxPut8(&bytes, values.objectTypeIndication);                        // bit(8) objectTypeIndication
        MbxPut32(&bytes, static_cast<uint32_t>(values.streamType) << 26 |    // bit(6) streamType
                             static_cast<uint32_t>(values.upStream) << 25 |  // bit(1) upStream
                             1U << 24 |                                      // bit(1) reserved = 1
                             values.bufferSizeDB);                           // bit(24) bufferSizeDB
        MbxPut32(&bytes, values.maxBitrate);                                 // bit(32) maxBitrate
        MbxPut32(&bytes, values.avgBitrate);                                 // bit(32) avgBitrate
        uint64_t count = 0;
        MBX_TRY(MbxWriteComposed(context, target, &bytes, &count));
        if (values.decoderSpecificInfo.size != 0) {
            // 7.2.6.7 DecoderSpecificInfo
            const auto info = [&](MbxFile* infoTarget, uint64_t, uint64_t* infoCounter) {
                return MbxWriteBuffer(context, infoTarget, &values.decoderSpecificInfo, infoCounter);
            };
            MBX_TRY(
                MbxWriteDescriptor(context, target, at + count, MBX_TAG_DECODER_SPECIFIC_INFO, info, &count));
        }
        return MbxReportBytes(count, nullptr, counter);
    };
    return MbxWriteDescriptor(context, file, position, MBX_TAG_DECODER_CONFIG, body, accumulated);
}

// ISO/IEC 14496-1 7.3.2.3 SLConfigDescriptor
MbxStatus writeSlConfig(MbxContext* context, MbxFile* file, uint64_t position, uint64_t* accumulated) {
    const auto body = [&](MbxFile* target, uint64_t, uint64_t* counter) {
        MbxBytes bytes;
        MbxBeginBytes(context, &bytes);
        MbxPut8(&bytes, 2);  // bit(8) predefined = MP4 file
        return MbxWriteComposed(context, target, &bytes, counter);
    };
    return MbxWriteDescriptor(context, file, position, MBX_TAG_SL_CONFIG, body, accumulated);
}

// ISO/IEC 14496-1 7.2.6.5 ES_Descriptor
MbxStatus writeEsDescriptor(MbxContext* context, MbxFile* file, uint64_t position,
                            const MbxEsdsValues& values, uint64_t* accumulated) {
    const auto body = [&](MbxFile* target, uint64_t at, uint64_t* counter) {
        MbxBytes bytes;
        MbxBeginBytes(context, &bytes);
        MbxPut16(&bytes, 0);  // bit(16) ES_ID = 0: the track tells it
        MbxPut8(&bytes, 0);   // bit(1) streamDependenceFlag, URL_Flag, OCRstreamFlag, bit(5) streamPriority
        uint64_t count = 0;
        MBX_TRY(MbxWriteComposed(context, target, &bytes, &count));
        MBX_TRY(writeDecoderConfig(context, target, at + count, values, &count));
        MBX_TRY(writeSlConfig(context, target, at + count, &count));
        return MbxReportBytes(count, nullptr, counter);
    };
    return MbxWriteDescriptor(context, file, position, MBX_TAG_ES_DESCRIPTOR, body, accumulated);
}

}  // namespace

MbxStatus MbxBuildEsds(MbxContext* context, const MbxOptions* options, const MbxEsdsValues* values,
                       MbxEsdsBox* box) {
    if (MbxAnyNull(context, options, values, box)) return MBX_ERR_INVALID_ARG;
    box->values = values;
    return MbxMeasureBox(context, options, box, MbxWriteEsdsPayload);
}

// ISO/IEC 14496-14 5.6 ESDBox
MbxStatus MbxWriteEsdsPayload(MbxContext* context, MbxFile* file, uint64_t position, const MbxEsdsBox* box,
                              uint64_t* written, uint64_t* accumulated) {
    const MbxEsdsValues& values = *box->values;
    MbxBytes bytes;
    MbxBeginBytes(context, &bytes);
    MbxPutVersionFlags(&bytes, 0, 0);
    uint64_t count = 0;
    MBX_TRY(MbxSeek(context, file, position));
    MBX_TRY(MbxWriteComposed(context, file, &bytes, &count));
    switch (values.form) {
        case MBX_ESDS_FIELDS:
            MBX_TRY(writeEsDescriptor(context, file, position + count, values, &count));  // ES_Descriptor ES
            break;
        case MBX_ESDS_RAW:
            MBX_TRY(MbxWriteBuffer(context, file, &values.raw, &count));
            break;
        default:
            return MBX_ERR_INTERNAL;
    }
    return MbxReportBytes(count, written, accumulated);
}

MbxStatus MbxWriteEsdsBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxEsdsBox* box, uint64_t* written, uint64_t* accumulated) {
    return MbxWriteOptionalBox(context, options, file, position, MbxCode("esds"), box, MbxWriteEsdsPayload,
                               written, accumulated);
}

MbxStatus MbxFreeEsds(MbxContext* context, MbxEsdsBox* box) {
    return MbxFreeBox(context, box);
}

MbxStatus MbxBuildBtrt(MbxContext* context, const MbxOptions* options, const MbxBtrtParams* params,
                       MbxBtrtBox* box) {
    if (MbxAnyNull(context, options, params, box)) return MBX_ERR_INVALID_ARG;
    box->params = *params;
    return MbxMeasureBox(context, options, box, MbxWriteBtrtPayload);
}

// 8.5.2.2 BitRateBox
MbxStatus MbxWriteBtrtPayload(MbxContext* context, MbxFile* file, uint64_t position, const MbxBtrtBox* box,
                              uint64_t* written, uint64_t* accumulated) {
    MbxBytes bytes;
    MbxBeginBytes(context, &bytes);
    MbxPut32(&bytes, box->params.bufferSizeDB);  // unsigned int(32) bufferSizeDB
    MbxPut32(&bytes, box->params.maxBitrate);    // unsigned int(32) maxBitrate
    MbxPut32(&bytes, box->params.avgBitrate);    // unsigned int(32) avgBitrate
    return MbxWriteFixedPayload(context, file, position, &bytes, written, accumulated);
}

MbxStatus MbxWriteBtrtBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxBtrtBox* box, uint64_t* written, uint64_t* accumulated) {
    return MbxWriteOptionalBox(context, options, file, position, MbxCode("btrt"), box, MbxWriteBtrtPayload,
                               written, accumulated);
}

MbxStatus MbxFreeBtrt(MbxContext* context, MbxBtrtBox* box) {
    return MbxFreeBox(context, box);
}

MbxStatus MbxEntrySetEsds(MbxContext* context, MbxSampleEntry* entry, const MbxEsdsParams* params) {
    if (MbxAnyNull(context, entry, params)) return MBX_ERR_INVALID_ARG;
    MBX_TRY(checkParams(*params));
    if (!takesDescriptor(*entry)) return MBX_ERR_BAD_STATE;
    MbxEsdsValues* values = nullptr;
    MBX_TRY(MbxMakeChild(
        context, &values, [&](MbxEsdsValues* made) { return copyParams(context, *params, made); },
        MbxFreeEsdsValues));
    MBX_TRY(MbxFreeEsdsValues(context, entry->esds));
    entry->esds = values;
    return MBX_OK;
}

MbxStatus MbxFreeEsdsValues(MbxContext* context, MbxEsdsValues* values) {
    return MbxFreeBox(context, values, [&] {
        MbxBufferRelease(context, &values->decoderSpecificInfo);
        MbxBufferRelease(context, &values->raw);
        return MBX_OK;
    });
}
