// Protection of samples: what was done to an entry, and keys (ISO/IEC 14496-12 8.12, ISO/IEC 23001-7).
#pragma once

#include "boxlib/core/box.h"
#include "boxlib/model/protection_model.h"

struct MbxFrmaBox {
    uint64_t size;
    MbxFrmaParams params;
};

struct MbxSchmBox {
    uint64_t size;
    const MbxSchmParams* params;
};

struct MbxTencBox {
    uint64_t size;
    MbxTencParams params;
};

struct MbxSchiBox {
    uint64_t size;
    MbxTencBox* tenc;
};

// Either `frma` with what follows it, or the raw bytes of its parameters.
struct MbxSinfBox {
    uint64_t size;
    const MbxSinfParams* params;
    MbxFrmaBox* frma;
    MbxSchmBox* schm;
    MbxSchiBox* schi;
    MbxSinfBox* next;
};

struct MbxPsshBox {
    uint64_t size;
    const MbxPsshParams* params;
    MbxPsshBox* next;
};

// `frma`, mandatory in `sinf` unless that holds raw bytes.
MbxStatus MbxBuildFrma(MbxContext* context, const MbxOptions* options, const MbxFrmaParams* params,
                       MbxFrmaBox* box);
MbxStatus MbxWriteFrmaPayload(MbxContext* context, MbxFile* file, uint64_t position, const MbxFrmaBox* box,
                              uint64_t* written, uint64_t* accumulated);
MbxStatus MbxWriteFrmaBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxFrmaBox* box, uint64_t* written, uint64_t* accumulated);
MbxStatus MbxFreeFrma(MbxContext* context, MbxFrmaBox* box);

// `schm`, optional. Flags 1 when there is a URL.
MbxStatus MbxBuildSchm(MbxContext* context, const MbxOptions* options, const MbxSchmParams* params,
                       MbxSchmBox* box);
MbxStatus MbxWriteSchmPayload(MbxContext* context, MbxFile* file, uint64_t position, const MbxSchmBox* box,
                              uint64_t* written, uint64_t* accumulated);
MbxStatus MbxWriteSchmBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxSchmBox* box, uint64_t* written, uint64_t* accumulated);
MbxStatus MbxFreeSchm(MbxContext* context, MbxSchmBox* box);

// `tenc`, mandatory in `schi`.
MbxStatus MbxBuildTenc(MbxContext* context, const MbxOptions* options, const MbxTencParams* params,
                       MbxTencBox* box);
MbxStatus MbxWriteTencPayload(MbxContext* context, MbxFile* file, uint64_t position, const MbxTencBox* box,
                              uint64_t* written, uint64_t* accumulated);
MbxStatus MbxWriteTencBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxTencBox* box, uint64_t* written, uint64_t* accumulated);
MbxStatus MbxFreeTenc(MbxContext* context, MbxTencBox* box);

// `schi`, optional: `tenc`. MBX_ERR_INVALID_ARG without its parameters.
MbxStatus MbxBuildSchi(MbxContext* context, const MbxOptions* options, const MbxSchiParams* params,
                       MbxSchiBox* box);
MbxStatus MbxWriteSchiPayload(MbxContext* context, const MbxOptions* options, MbxFile* file,
                              uint64_t position, const MbxSchiBox* box, uint64_t* written,
                              uint64_t* accumulated);
MbxStatus MbxWriteSchiBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxSchiBox* box, uint64_t* written, uint64_t* accumulated);
MbxStatus MbxFreeSchi(MbxContext* context, MbxSchiBox* box);

// `sinf`, repeated: `frma`, `schm`, `schi`, or raw bytes. `params` is borrowed.
MbxStatus MbxBuildSinf(MbxContext* context, const MbxOptions* options, const MbxSinfParams* params,
                       MbxSinfBox* box);
MbxStatus MbxWriteSinfPayload(MbxContext* context, const MbxOptions* options, MbxFile* file,
                              uint64_t position, const MbxSinfBox* box, uint64_t* written,
                              uint64_t* accumulated);
MbxStatus MbxWriteSinfBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxSinfBox* box, uint64_t* written, uint64_t* accumulated);
MbxStatus MbxFreeSinf(MbxContext* context, MbxSinfBox* box);

// `pssh`, repeated. `params` is borrowed. MBX_ERR_OVERFLOW for data above 32 bits.
MbxStatus MbxBuildPssh(MbxContext* context, const MbxOptions* options, const MbxPsshParams* params,
                       MbxPsshBox* box);
MbxStatus MbxWritePsshPayload(MbxContext* context, MbxFile* file, uint64_t position, const MbxPsshBox* box,
                              uint64_t* written, uint64_t* accumulated);
MbxStatus MbxWritePsshBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxPsshBox* box, uint64_t* written, uint64_t* accumulated);
MbxStatus MbxFreePssh(MbxContext* context, MbxPsshBox* box);
