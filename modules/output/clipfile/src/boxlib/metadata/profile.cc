#include "boxlib/metadata/profile.h"

#include "boxlib/core/uuid.h"

// ---- PROF ----

namespace {

MbxStatus buildEntry(MbxContext* context, const MbxOptions* options, const MbxProfileEntry* entry,
                     MbxProfileEntryBox* box) {
    switch (entry->code) {
        case MbxCode("APRF"):
            return MbxBuildAprf(context, options, entry, box);
        case MbxCode("VPRF"):
            return MbxBuildVprf(context, options, entry, box);
        case MbxCode("BPRF"):
            return MbxBuildBprf(context, options, entry, box);
        case MbxCode("PPRF"):
            return MbxBuildPprf(context, options, entry, box);
        default:
            return MBX_ERR_INTERNAL;
    }
}

MbxStatus writeEntry(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                     const MbxProfileEntryBox* box, uint64_t* written, uint64_t* accumulated) {
    switch (box->code) {
        case MbxCode("APRF"):
            return MbxWriteAprfBox(context, options, file, position, box, written, accumulated);
        case MbxCode("VPRF"):
            return MbxWriteVprfBox(context, options, file, position, box, written, accumulated);
        case MbxCode("BPRF"):
            return MbxWriteBprfBox(context, options, file, position, box, written, accumulated);
        case MbxCode("PPRF"):
            return MbxWritePprfBox(context, options, file, position, box, written, accumulated);
        default:
            return MBX_ERR_INTERNAL;
    }
}

MbxStatus freeEntryBox(MbxContext* context, MbxProfileEntryBox* box) {
    return MbxFreeBox(context, box);
}

}  // namespace

MbxStatus MbxBuildProf(MbxContext* context, const MbxOptions* options, const MbxProfile* profile,
                       MbxProfBox* box) {
    if (MbxAnyNull(context, options, box)) return MBX_ERR_INVALID_ARG;
    if (profile != nullptr) {
        MBX_TRY(MbxMakeBox(context, options, &box->fprf, profile, MbxBuildFprf, MbxFreeFprf));
        MBX_TRY(
            MbxMakeBoxes(context, options, &box->entries, profile->entries.first, buildEntry, freeEntryBox));
        MBX_TRY(
            MbxMakeBoxes(context, options, &box->extras, profile->extras.first, MbxBuildPrex, MbxFreePrex));
    }
    return MbxMeasureBox(context, options, box, MbxWriteProfPayload);
}

MbxStatus MbxWriteProfPayload(MbxContext* context, const MbxOptions* options, MbxFile* file,
                              uint64_t position, const MbxProfBox* box, uint64_t* written,
                              uint64_t* accumulated) {
    uint64_t count = 0;
    uint32_t entryCount = 0;
    uint32_t extraCount = 0;
    MBX_TRY(MbxListCount(box->entries.first, &entryCount));
    MBX_TRY(MbxListCount(box->extras.first, &extraCount));

    MBX_TRY(MbxSeek(context, file, position));
    MBX_TRY(MbxWriteUuid(context, file, position, MBX_UUID_PROF, nullptr, &count));
    MbxBytes bytes;
    MbxBeginBytes(context, &bytes);
    MbxPutVersionFlags(&bytes, 0, 0);
    // unsigned int(32) entry_count
    MbxPut32(&bytes, box->fprf != nullptr ? 1 + entryCount + extraCount : 0);
    MBX_TRY(MbxWriteComposed(context, file, &bytes, &count));
    if (box->fprf != nullptr) {
        MBX_TRY(MbxWriteFprfBox(context, options, file, position + count, box->fprf, nullptr, &count));
    }
    MBX_TRY(MbxWriteBoxes(context, options, file, position, box->entries.first, writeEntry, &count));
    MBX_TRY(MbxWriteBoxes(context, options, file, position, box->extras.first, MbxWritePrexBox, &count));
    return MbxReportBytes(count, written, accumulated);
}

MbxStatus MbxWriteProfBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxProfBox* box, uint64_t* written, uint64_t* accumulated) {
    return MbxWriteBox(context, options, file, position, MbxCode("uuid"), box, MbxWriteProfPayload, written,
                       accumulated);
}

MbxStatus MbxFreeProf(MbxContext* context, MbxProfBox* box) {
    return MbxFreeBox(context, box, [&] {
        MBX_TRY(MbxFreeFprf(context, box->fprf));
        MBX_TRY(MbxFreeList(context, &box->entries, freeEntryBox));
        return MbxFreeList(context, &box->extras, MbxFreePrex);
    });
}

// ---- FPRF ----

MbxStatus MbxBuildFprf(MbxContext* context, const MbxOptions* options, const MbxProfile* profile,
                       MbxFprfBox* box) {
    if (MbxAnyNull(context, options, profile, box)) return MBX_ERR_INVALID_ARG;
    box->format = profile->format;
    return MbxMeasureBox(context, options, box, MbxWriteFprfPayload);
}

MbxStatus MbxWriteFprfPayload(MbxContext* context, MbxFile* file, uint64_t position, const MbxFprfBox* box,
                              uint64_t* written, uint64_t* accumulated) {
    MbxBytes bytes;
    MbxBeginBytes(context, &bytes);
    MbxPutVersionFlags(&bytes, 0, 0);
    MbxPut32(&bytes, box->format);  // unsigned int(32) format
    MbxPutZeros(&bytes, 4);         // unsigned int(32) reserved
    return MbxWriteFixedPayload(context, file, position, &bytes, written, accumulated);
}

MbxStatus MbxWriteFprfBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxFprfBox* box, uint64_t* written, uint64_t* accumulated) {
    return MbxWriteBox(context, options, file, position, MbxCode("FPRF"), box, MbxWriteFprfPayload, written,
                       accumulated);
}

MbxStatus MbxFreeFprf(MbxContext* context, MbxFprfBox* box) {
    return MbxFreeBox(context, box);
}

// ---- APRF, VPRF, BPRF, PPRF ----

namespace {

template <typename Payload>
MbxStatus buildValues(MbxContext* context, const MbxOptions* options, uint32_t code,
                      const MbxProfileEntry* entry, MbxProfileEntryBox* box, Payload&& payload) {
    if (MbxAnyNull(context, options, entry, box)) return MBX_ERR_INVALID_ARG;
    if (entry->code != code) return MBX_ERR_INTERNAL;
    box->code = entry->code;
    MBX_TRY(MbxCopy(context, box->values, sizeof(box->values), entry->values, sizeof(entry->values)));
    return MbxMeasureBox(context, options, box, payload);
}

MbxStatus writeValues(MbxContext* context, MbxFile* file, uint64_t position, uint32_t code,
                      uint32_t valueCount, const MbxProfileEntryBox* box, uint64_t* written,
                      uint64_t* accumulated) {
    if (box->code != code) return MBX_ERR_INTERNAL;
    MbxBytes bytes;
    MbxBeginBytes(context, &bytes);
    MbxPutVersionFlags(&bytes, 0, 0);
    for (uint32_t i = 0; i < valueCount; i++) MbxPut32(&bytes, box->values[i]);  // unsigned int(32) values[]
    return MbxWriteFixedPayload(context, file, position, &bytes, written, accumulated);
}

}  // namespace

MbxStatus MbxBuildAprf(MbxContext* context, const MbxOptions* options, const MbxProfileEntry* entry,
                       MbxProfileEntryBox* box) {
    return buildValues(context, options, MbxCode("APRF"), entry, box, MbxWriteAprfPayload);
}

MbxStatus MbxWriteAprfPayload(MbxContext* context, MbxFile* file, uint64_t position,
                              const MbxProfileEntryBox* box, uint64_t* written, uint64_t* accumulated) {
    return writeValues(context, file, position, MbxCode("APRF"), 8, box, written, accumulated);
}

MbxStatus MbxWriteAprfBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxProfileEntryBox* box, uint64_t* written, uint64_t* accumulated) {
    return MbxWriteBox(context, options, file, position, MbxCode("APRF"), box, MbxWriteAprfPayload, written,
                       accumulated);
}

MbxStatus MbxFreeAprf(MbxContext* context, MbxProfileEntryBox* box) {
    return MbxFreeBox(context, box);
}

MbxStatus MbxBuildVprf(MbxContext* context, const MbxOptions* options, const MbxProfileEntry* entry,
                       MbxProfileEntryBox* box) {
    return buildValues(context, options, MbxCode("VPRF"), entry, box, MbxWriteVprfPayload);
}

MbxStatus MbxWriteVprfPayload(MbxContext* context, MbxFile* file, uint64_t position,
                              const MbxProfileEntryBox* box, uint64_t* written, uint64_t* accumulated) {
    return writeValues(context, file, position, MbxCode("VPRF"), 10, box, written, accumulated);
}

MbxStatus MbxWriteVprfBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxProfileEntryBox* box, uint64_t* written, uint64_t* accumulated) {
    return MbxWriteBox(context, options, file, position, MbxCode("VPRF"), box, MbxWriteVprfPayload, written,
                       accumulated);
}

MbxStatus MbxFreeVprf(MbxContext* context, MbxProfileEntryBox* box) {
    return MbxFreeBox(context, box);
}

MbxStatus MbxBuildBprf(MbxContext* context, const MbxOptions* options, const MbxProfileEntry* entry,
                       MbxProfileEntryBox* box) {
    return buildValues(context, options, MbxCode("BPRF"), entry, box, MbxWriteBprfPayload);
}

MbxStatus MbxWriteBprfPayload(MbxContext* context, MbxFile* file, uint64_t position,
                              const MbxProfileEntryBox* box, uint64_t* written, uint64_t* accumulated) {
    return writeValues(context, file, position, MbxCode("BPRF"), 3, box, written, accumulated);
}

MbxStatus MbxWriteBprfBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxProfileEntryBox* box, uint64_t* written, uint64_t* accumulated) {
    return MbxWriteBox(context, options, file, position, MbxCode("BPRF"), box, MbxWriteBprfPayload, written,
                       accumulated);
}

MbxStatus MbxFreeBprf(MbxContext* context, MbxProfileEntryBox* box) {
    return MbxFreeBox(context, box);
}

MbxStatus MbxBuildPprf(MbxContext* context, const MbxOptions* options, const MbxProfileEntry* entry,
                       MbxProfileEntryBox* box) {
    return buildValues(context, options, MbxCode("PPRF"), entry, box, MbxWritePprfPayload);
}

MbxStatus MbxWritePprfPayload(MbxContext* context, MbxFile* file, uint64_t position,
                              const MbxProfileEntryBox* box, uint64_t* written, uint64_t* accumulated) {
    return writeValues(context, file, position, MbxCode("PPRF"), 3, box, written, accumulated);
}

MbxStatus MbxWritePprfBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxProfileEntryBox* box, uint64_t* written, uint64_t* accumulated) {
    return MbxWriteBox(context, options, file, position, MbxCode("PPRF"), box, MbxWritePprfPayload, written,
                       accumulated);
}

MbxStatus MbxFreePprf(MbxContext* context, MbxProfileEntryBox* box) {
    return MbxFreeBox(context, box);
}

// ---- PREX ----

MbxStatus MbxBuildPrex(MbxContext* context, const MbxOptions* options, const MbxProfileExtra* extra,
                       MbxPrexBox* box) {
    if (MbxAnyNull(context, options, extra, box)) return MBX_ERR_INVALID_ARG;
    box->extra = extra;
    return MbxMeasureBox(context, options, box, MbxWritePrexPayload);
}

MbxStatus MbxWritePrexPayload(MbxContext* context, MbxFile* file, uint64_t position, const MbxPrexBox* box,
                              uint64_t* written, uint64_t* accumulated) {
    const MbxProfileExtra& extra = *box->extra;
    uint64_t count = 0;
    MBX_TRY(MbxSeek(context, file, position));
    MbxBytes bytes;
    MbxBeginBytes(context, &bytes);
    MbxPutVersionFlags(&bytes, 0, 0);
    MbxPut32(&bytes, extra.subType);  // unsigned int(32) sub_type
    if (extra.subType == MbxCode("VPRF") || extra.subType == MbxCode("APRF")) {
        MbxPut32(&bytes, extra.values[0]);  // unsigned int(32) values[2]
        MbxPut32(&bytes, extra.values[1]);
    }
    MBX_TRY(MbxWriteComposed(context, file, &bytes, &count));
    MBX_TRY(MbxWriteBytes(context, file, extra.data.data, extra.data.size, nullptr, &count));
    return MbxReportBytes(count, written, accumulated);
}

MbxStatus MbxWritePrexBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxPrexBox* box, uint64_t* written, uint64_t* accumulated) {
    return MbxWriteBox(context, options, file, position, MbxCode("PREX"), box, MbxWritePrexPayload, written,
                       accumulated);
}

MbxStatus MbxFreePrex(MbxContext* context, MbxPrexBox* box) {
    return MbxFreeBox(context, box);
}

// ---- The record ----

MbxStatus MbxAddProfileEntry(MbxContext* context, MbxProfile* profile, uint32_t code, const uint32_t* values,
                             uint32_t count) {
    MbxProfileEntry* entry = nullptr;
    MBX_TRY(MbxNew(context, &entry));
    const MbxStatus status =
        MbxCopy(context, entry->values, sizeof(entry->values), values, count * sizeof(uint32_t));
    if (status != MBX_OK) {
        MbxFree(context, entry);
        return status;
    }
    entry->code = code;
    MbxListAppend(&profile->entries, entry);
    return MBX_OK;
}

MbxStatus MbxFreeProfile(MbxContext* context, MbxProfile* profile) {
    return MbxFreeBox(context, profile, [&] {
        MBX_TRY(MbxFreeList(context, &profile->entries, [](MbxContext* owner, MbxProfileEntry* entry) {
            return MbxFreeBox(owner, entry);
        }));
        return MbxFreeList(context, &profile->extras, [](MbxContext* owner, MbxProfileExtra* extra) {
            MbxBufferRelease(owner, &extra->data);
            return MbxFreeBox(owner, extra);
        });
    });
}
