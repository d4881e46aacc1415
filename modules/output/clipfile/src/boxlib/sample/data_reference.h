// Where media data stands: `dinf`, `dref`, `url ` and `urn `.
#pragma once

#include "boxlib/core/box.h"
#include "boxlib/model/model.h"

// The record of `url ` and `urn `.
struct MbxDataEntryBox {
    uint64_t size;
    uint32_t code;
    const MbxDataEntry* entry;  // borrowed
    MbxDataEntryBox* next;
};

struct MbxDrefBox {
    uint64_t size;
    MbxList<MbxDataEntryBox> entries;
};

struct MbxDinfBox {
    uint64_t size;
    MbxDrefBox* dref;
};

MbxStatus MbxBuildDinf(MbxContext* context, const MbxOptions* options, const MbxList<MbxDataEntry>* entries,
                       MbxDinfBox* box);
MbxStatus MbxWriteDinfPayload(MbxContext* context, const MbxOptions* options, MbxFile* file,
                              uint64_t position, const MbxDinfBox* box, uint64_t* written,
                              uint64_t* accumulated);
MbxStatus MbxWriteDinfBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxDinfBox* box, uint64_t* written, uint64_t* accumulated);
MbxStatus MbxFreeDinf(MbxContext* context, MbxDinfBox* box);

// MBX_ERR_INTERNAL for an entry that is neither `url ` nor `urn `.
MbxStatus MbxBuildDref(MbxContext* context, const MbxOptions* options, const MbxList<MbxDataEntry>* entries,
                       MbxDrefBox* box);
MbxStatus MbxWriteDrefPayload(MbxContext* context, const MbxOptions* options, MbxFile* file,
                              uint64_t position, const MbxDrefBox* box, uint64_t* written,
                              uint64_t* accumulated);
MbxStatus MbxWriteDrefBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxDrefBox* box, uint64_t* written, uint64_t* accumulated);
MbxStatus MbxFreeDref(MbxContext* context, MbxDrefBox* box);

// Both are MBX_ERR_INTERNAL for an entry or record of the other code.
MbxStatus MbxBuildUrl(MbxContext* context, const MbxOptions* options, const MbxDataEntry* entry,
                      MbxDataEntryBox* box);
MbxStatus MbxWriteUrlPayload(MbxContext* context, MbxFile* file, uint64_t position,
                             const MbxDataEntryBox* box, uint64_t* written, uint64_t* accumulated);
MbxStatus MbxWriteUrlBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                         const MbxDataEntryBox* box, uint64_t* written, uint64_t* accumulated);
MbxStatus MbxFreeUrl(MbxContext* context, MbxDataEntryBox* box);

MbxStatus MbxBuildUrn(MbxContext* context, const MbxOptions* options, const MbxDataEntry* entry,
                      MbxDataEntryBox* box);
MbxStatus MbxWriteUrnPayload(MbxContext* context, MbxFile* file, uint64_t position,
                             const MbxDataEntryBox* box, uint64_t* written, uint64_t* accumulated);
MbxStatus MbxWriteUrnBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                         const MbxDataEntryBox* box, uint64_t* written, uint64_t* accumulated);
MbxStatus MbxFreeUrn(MbxContext* context, MbxDataEntryBox* box);

// What MbxAddDataEntry adds. Texts need no terminator; name is used by `urn ` alone.
struct MbxDataEntryParams {
    uint32_t code;  // `url ` or `urn `
    const char* name;
    uint64_t nameLength;
    const char* location;
    uint64_t locationLength;
};

// Appends an entry; `index` receives its 1-based place. A `urn ` with an empty name stores one terminator.
// MBX_ERR_INVALID_ARG for a null argument or a length without a text, MBX_ERR_INTERNAL for another code.
MbxStatus MbxAddDataEntry(MbxContext* context, MbxList<MbxDataEntry>* list, const MbxDataEntryParams* params,
                          uint32_t* index);

// Releases one entry; null is allowed.
MbxStatus MbxFreeDataEntry(MbxContext* context, MbxDataEntry* entry);
