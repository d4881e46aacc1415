#include "boxlib/protection/protection.h"

namespace {

MbxStatus freeSchmParams(MbxContext* context, MbxSchmParams* params) {
    return MbxFreeBox(context, params, [&] {
        MbxBufferRelease(context, &params->url);
        return MBX_OK;
    });
}

MbxStatus freeSchiParams(MbxContext* context, MbxSchiParams* params) {
    return MbxFreeBox(context, params, [&] {
        MbxFree(context, params->tenc);
        return MBX_OK;
    });
}

MbxStatus freeKeyId(MbxContext* context, MbxKeyId* keyId) {
    return MbxFreeBox(context, keyId);
}

}  // namespace

MbxStatus MbxFreeSinfParams(MbxContext* context, MbxSinfParams* params) {
    return MbxFreeBox(context, params, [&] {
        MbxFree(context, params->frma);
        MBX_TRY(freeSchmParams(context, params->schm));
        MBX_TRY(freeSchiParams(context, params->schi));
        MbxBufferRelease(context, &params->raw);
        return MBX_OK;
    });
}

MbxStatus MbxFreePsshParams(MbxContext* context, MbxPsshParams* params) {
    return MbxFreeBox(context, params, [&] {
        MBX_TRY(MbxFreeList(context, &params->keyIds, freeKeyId));
        MbxBufferRelease(context, &params->data);
        return MBX_OK;
    });
}

MbxStatus MbxBuildFrma(MbxContext* context, const MbxOptions* options, const MbxFrmaParams* params,
                       MbxFrmaBox* box) {
    if (MbxAnyNull(context, options, params, box)) return MBX_ERR_INVALID_ARG;
    box->params = *params;
    return MbxMeasureBox(context, options, box, MbxWriteFrmaPayload);
}

// 8.12.2 Original Format Box
MbxStatus MbxWriteFrmaPayload(MbxContext* context, MbxFile* file, uint64_t position, const MbxFrmaBox* box,
                              uint64_t* written, uint64_t* accumulated) {
    MbxBytes bytes;
    MbxBeginBytes(context, &bytes);
    MbxPut32(&bytes, box->params.dataFormat);  // unsigned int(32) data_format
    return MbxWriteFixedPayload(context, file, position, &bytes, written, accumulated);
}

MbxStatus MbxWriteFrmaBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxFrmaBox* box, uint64_t* written, uint64_t* accumulated) {
    return MbxWriteBox(context, options, file, position, MbxCode("frma"), box, MbxWriteFrmaPayload, written,
                       accumulated);
}

MbxStatus MbxFreeFrma(MbxContext* context, MbxFrmaBox* box) {
    return MbxFreeBox(context, box);
}

MbxStatus MbxBuildSchm(MbxContext* context, const MbxOptions* options, const MbxSchmParams* params,
                       MbxSchmBox* box) {
    if (MbxAnyNull(context, options, params, box)) return MBX_ERR_INVALID_ARG;
    box->params = params;
    return MbxMeasureBox(context, options, box, MbxWriteSchmPayload);
}

// 8.12.5 Scheme Type Box
MbxStatus MbxWriteSchmPayload(MbxContext* context, MbxFile* file, uint64_t position, const MbxSchmBox* box,
                              uint64_t* written, uint64_t* accumulated) {
    const MbxSchmParams& params = *box->params;
    MbxBytes bytes;
    MbxBeginBytes(context, &bytes);
    MbxPutVersionFlags(&bytes, 0, params.url.size != 0 ? 1 : 0);
    MbxPut32(&bytes, params.schemeType);     // unsigned int(32) scheme_type
    MbxPut32(&bytes, params.schemeVersion);  // unsigned int(32) scheme_version
    uint64_t count = 0;
    MBX_TRY(MbxSeek(context, file, position));
    MBX_TRY(MbxWriteComposed(context, file, &bytes, &count));
    MBX_TRY(MbxWriteBuffer(context, file, &params.url, &count));  // unsigned int(8) scheme_uri[]
    return MbxReportBytes(count, written, accumulated);
}

MbxStatus MbxWriteSchmBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxSchmBox* box, uint64_t* written, uint64_t* accumulated) {
    return MbxWriteOptionalBox(context, options, file, position, MbxCode("schm"), box, MbxWriteSchmPayload,
                               written, accumulated);
}

MbxStatus MbxFreeSchm(MbxContext* context, MbxSchmBox* box) {
    return MbxFreeBox(context, box);
}

MbxStatus MbxBuildTenc(MbxContext* context, const MbxOptions* options, const MbxTencParams* params,
                       MbxTencBox* box) {
    if (MbxAnyNull(context, options, params, box)) return MBX_ERR_INVALID_ARG;
    box->params = *params;
    return MbxMeasureBox(context, options, box, MbxWriteTencPayload);
}

// ISO/IEC 23001-7 8.2 Track Encryption Box
MbxStatus MbxWriteTencPayload(MbxContext* context, MbxFile* file, uint64_t position, const MbxTencBox* box,
                              uint64_t* written, uint64_t* accumulated) {
    MbxBytes bytes;
    MbxBeginBytes(context, &bytes);
    MbxPutVersionFlags(&bytes, 0, 0);
    MbxPut24(&bytes, box->params.isEncrypted);  // unsigned int(24) default_IsEncrypted
    MbxPut8(&bytes, box->params.ivSize);        // unsigned int(8) default_IV_size
    for (const uint8_t byte : box->params.keyId) MbxPut8(&bytes, byte);  // unsigned int(8)[16] default_KID
    return MbxWriteFixedPayload(context, file, position, &bytes, written, accumulated);
}

MbxStatus MbxWriteTencBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxTencBox* box, uint64_t* written, uint64_t* accumulated) {
    return MbxWriteBox(context, options, file, position, MbxCode("tenc"), box, MbxWriteTencPayload, written,
                       accumulated);
}

MbxStatus MbxFreeTenc(MbxContext* context, MbxTencBox* box) {
    return MbxFreeBox(context, box);
}

MbxStatus MbxBuildSchi(MbxContext* context, const MbxOptions* options, const MbxSchiParams* params,
                       MbxSchiBox* box) {
    if (MbxAnyNull(context, options, params, box)) return MBX_ERR_INVALID_ARG;
    MBX_TRY(MbxMakeBox(context, options, &box->tenc, params->tenc, MbxBuildTenc, MbxFreeTenc));
    return MbxMeasureBox(context, options, box, MbxWriteSchiPayload);
}

// 8.12.6 Scheme Information Box
MbxStatus MbxWriteSchiPayload(MbxContext* context, const MbxOptions* options, MbxFile* file,
                              uint64_t position, const MbxSchiBox* box, uint64_t* written,
                              uint64_t* accumulated) {
    uint64_t count = 0;
    MBX_TRY(MbxSeek(context, file, position));
    MBX_TRY(MbxWriteTencBox(context, options, file, position + count, box->tenc, nullptr, &count));
    return MbxReportBytes(count, written, accumulated);
}

MbxStatus MbxWriteSchiBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxSchiBox* box, uint64_t* written, uint64_t* accumulated) {
    return MbxWriteOptionalBox(context, options, file, position, MbxCode("schi"), box, MbxWriteSchiPayload,
                               written, accumulated);
}

MbxStatus MbxFreeSchi(MbxContext* context, MbxSchiBox* box) {
    return MbxFreeBox(context, box, [&] { return MbxFreeTenc(context, box->tenc); });
}

MbxStatus MbxBuildSinf(MbxContext* context, const MbxOptions* options, const MbxSinfParams* params,
                       MbxSinfBox* box) {
    if (MbxAnyNull(context, options, params, box)) return MBX_ERR_INVALID_ARG;
    box->params = params;
    if (params->frma != nullptr) {
        MBX_TRY(MbxMakeBox(context, options, &box->frma, params->frma, MbxBuildFrma, MbxFreeFrma));
        MBX_TRY(MbxMakeOptionalBox(context, options, &box->schm, params->schm, MbxBuildSchm, MbxFreeSchm));
        MBX_TRY(MbxMakeOptionalBox(context, options, &box->schi, params->schi, MbxBuildSchi, MbxFreeSchi));
    }
    return MbxMeasureBox(context, options, box, MbxWriteSinfPayload);
}

// 8.12.1 Protection Scheme Information Box
MbxStatus MbxWriteSinfPayload(MbxContext* context, const MbxOptions* options, MbxFile* file,
                              uint64_t position, const MbxSinfBox* box, uint64_t* written,
                              uint64_t* accumulated) {
    uint64_t count = 0;
    MBX_TRY(MbxSeek(context, file, position));
    if (box->frma != nullptr) {
        MBX_TRY(MbxWriteFrmaBox(context, options, file, position + count, box->frma, nullptr, &count));
        MBX_TRY(MbxWriteSchmBox(context, options, file, position + count, box->schm, nullptr, &count));
        MBX_TRY(MbxWriteSchiBox(context, options, file, position + count, box->schi, nullptr, &count));
    } else {
        MBX_TRY(MbxWriteBuffer(context, file, &box->params->raw, &count));
    }
    return MbxReportBytes(count, written, accumulated);
}

MbxStatus MbxWriteSinfBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxSinfBox* box, uint64_t* written, uint64_t* accumulated) {
    return MbxWriteBox(context, options, file, position, MbxCode("sinf"), box, MbxWriteSinfPayload, written,
                       accumulated);
}

MbxStatus MbxFreeSinf(MbxContext* context, MbxSinfBox* box) {
    return MbxFreeBox(context, box, [&] {
        MBX_TRY(MbxFreeFrma(context, box->frma));
        MBX_TRY(MbxFreeSchm(context, box->schm));
        return MbxFreeSchi(context, box->schi);
    });
}

MbxStatus MbxBuildPssh(MbxContext* context, const MbxOptions* options, const MbxPsshParams* params,
                       MbxPsshBox* box) {
    if (MbxAnyNull(context, options, params, box)) return MBX_ERR_INVALID_ARG;
    box->params = params;
    return MbxMeasureBox(context, options, box, MbxWritePsshPayload);
}

// ISO/IEC 23001-7 8.1 Protection System Specific Header Box
MbxStatus MbxWritePsshPayload(MbxContext* context, MbxFile* file, uint64_t position, const MbxPsshBox* box,
                              uint64_t* written, uint64_t* accumulated) {
    const MbxPsshParams& params = *box->params;
    if (params.data.size > UINT32_MAX) return MBX_ERR_OVERFLOW;
    uint32_t keyIds = 0;
    MBX_TRY(MbxListCount(params.keyIds.first, &keyIds));

    MbxBytes head;
    MbxBeginBytes(context, &head);
    MbxPutVersionFlags(&head, params.version, 0);
    for (const uint8_t byte : params.systemId) MbxPut8(&head, byte);  // unsigned int(8)[16] SystemID
    if (params.version != 0) MbxPut32(&head, keyIds);                 // unsigned int(32) KID_count
    uint64_t count = 0;
    MBX_TRY(MbxSeek(context, file, position));
    MBX_TRY(MbxWriteComposed(context, file, &head, &count));
    if (params.version != 0) {
        for (const MbxKeyId* keyId = params.keyIds.first; keyId != nullptr; keyId = keyId->next) {
            // unsigned int(8)[16] KID
            MBX_TRY(MbxWriteBytes(context, file, keyId->bytes, sizeof(keyId->bytes), nullptr, &count));
        }
    }

    MbxBytes size;
    MbxBeginBytes(context, &size);
    MbxPut32(&size, static_cast<uint32_t>(params.data.size));  // unsigned int(32) DataSize
    MBX_TRY(MbxWriteComposed(context, file, &size, &count));
    MBX_TRY(MbxWriteBuffer(context, file, &params.data, &count));  // unsigned int(8)[DataSize] Data
    return MbxReportBytes(count, written, accumulated);
}

MbxStatus MbxWritePsshBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxPsshBox* box, uint64_t* written, uint64_t* accumulated) {
    return MbxWriteBox(context, options, file, position, MbxCode("pssh"), box, MbxWritePsshPayload, written,
                       accumulated);
}

MbxStatus MbxFreePssh(MbxContext* context, MbxPsshBox* box) {
    return MbxFreeBox(context, box);
}
