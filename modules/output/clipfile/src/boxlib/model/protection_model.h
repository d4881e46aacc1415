// Protection parameters as the movie keeps them. The library attaches no meaning to them.
#pragma once

#include "boxlib/core/buffer.h"
#include "boxlib/core/list.h"

struct MbxFrmaParams {
    uint32_t dataFormat;  // code of the entry before it was transformed
};

struct MbxSchmParams {
    uint32_t schemeType;
    uint32_t schemeVersion;
    MbxBuffer url;  // terminator included; empty for none
};

struct MbxTencParams {
    uint32_t isEncrypted;  // low 24 bits
    uint8_t ivSize;        // in bytes
    uint8_t keyId[16];
};

struct MbxSchiParams {
    MbxTencParams* tenc;  // owned, required
};

struct MbxSinfParams {
    MbxFrmaParams* frma;  // owned; null: the box holds `raw`
    MbxSchmParams* schm;  // owned, null for none
    MbxSchiParams* schi;  // owned, null for none
    MbxBuffer raw;        // ready bytes, written when there is no `frma`
    MbxSinfParams* next;
};

struct MbxKeyId {
    uint8_t bytes[16];
    MbxKeyId* next;
};

struct MbxPsshParams {
    uint8_t version;
    uint8_t systemId[16];
    MbxList<MbxKeyId> keyIds;  // written unless `version` is 0
    MbxBuffer data;
    MbxPsshParams* next;
};

// Release the parameters with what they own. MBX_ERR_INVALID_ARG for a null context; a null record is MBX_OK.
MbxStatus MbxFreeSinfParams(MbxContext* context, MbxSinfParams* params);
MbxStatus MbxFreePsshParams(MbxContext* context, MbxPsshParams* params);
