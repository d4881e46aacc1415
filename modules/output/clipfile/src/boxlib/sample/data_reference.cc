#include "boxlib/sample/data_reference.h"

// ---- dinf ----

MbxStatus MbxBuildDinf(MbxContext* context, const MbxOptions* options, const MbxList<MbxDataEntry>* entries,
                       MbxDinfBox* box) {
    if (MbxAnyNull(context, options, entries, box)) return MBX_ERR_INVALID_ARG;
    MBX_TRY(MbxMakeBox(context, options, &box->dref, entries, MbxBuildDref, MbxFreeDref));
    return MbxMeasureBox(context, options, box, MbxWriteDinfPayload);
}

// 8.7.1 Data Information Box
MbxStatus MbxWriteDinfPayload(MbxContext* context, const MbxOptions* options, MbxFile* file,
                              uint64_t position, const MbxDinfBox* box, uint64_t* written,
                              uint64_t* accumulated) {
    uint64_t count = 0;
    MBX_TRY(MbxSeek(context, file, position));
    MBX_TRY(MbxWriteDrefBox(context, options, file, position + count, box->dref, nullptr, &count));
    return MbxReportBytes(count, written, accumulated);
}

MbxStatus MbxWriteDinfBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxDinfBox* box, uint64_t* written, uint64_t* accumulated) {
    return MbxWriteBox(context, options, file, position, MbxCode("dinf"), box, MbxWriteDinfPayload, written,
                       accumulated);
}

MbxStatus MbxFreeDinf(MbxContext* context, MbxDinfBox* box) {
    return MbxFreeBox(context, box, [&] { return MbxFreeDref(context, box->dref); });
}

// ---- dref ----

namespace {

MbxStatus buildEntry(MbxContext* context, const MbxOptions* options, const MbxDataEntry* entry,
                     MbxDataEntryBox* box) {
    switch (entry->code) {
        case MbxCode("url "):
            return MbxBuildUrl(context, options, entry, box);
        case MbxCode("urn "):
            return MbxBuildUrn(context, options, entry, box);
        default:
            return MBX_ERR_INTERNAL;
    }
}

MbxStatus writeEntry(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                     const MbxDataEntryBox* box, uint64_t* written, uint64_t* accumulated) {
    switch (box->code) {
        case MbxCode("url "):
            return MbxWriteUrlBox(context, options, file, position, box, written, accumulated);
        case MbxCode("urn "):
            return MbxWriteUrnBox(context, options, file, position, box, written, accumulated);
        default:
            return MBX_ERR_INTERNAL;
    }
}

MbxStatus freeEntryBox(MbxContext* context, MbxDataEntryBox* box) {
    return MbxFreeBox(context, box);
}

}  // namespace

MbxStatus MbxBuildDref(MbxContext* context, const MbxOptions* options, const MbxList<MbxDataEntry>* entries,
                       MbxDrefBox* box) {
    if (MbxAnyNull(context, options, entries, box)) return MBX_ERR_INVALID_ARG;
    MBX_TRY(MbxMakeBoxes(context, options, &box->entries, entries->first, buildEntry, freeEntryBox));
    return MbxMeasureBox(context, options, box, MbxWriteDrefPayload);
}

// 8.7.2 Data Reference Box
MbxStatus MbxWriteDrefPayload(MbxContext* context, const MbxOptions* options, MbxFile* file,
                              uint64_t position, const MbxDrefBox* box, uint64_t* written,
                              uint64_t* accumulated) {
    uint64_t count = 0;
    uint32_t entryCount = 0;
    MBX_TRY(MbxListCount(box->entries.first, &entryCount));
    MBX_TRY(MbxSeek(context, file, position));
    MbxBytes bytes;
    MbxBeginBytes(context, &bytes);
    MbxPutVersionFlags(&bytes, 0, 0);
    MbxPut32(&bytes, entryCount);  // unsigned int(32) entry_count
    MBX_TRY(MbxWriteComposed(context, file, &bytes, &count));
    MBX_TRY(MbxWriteBoxes(context, options, file, position, box->entries.first, writeEntry, &count));
    return MbxReportBytes(count, written, accumulated);
}

MbxStatus MbxWriteDrefBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxDrefBox* box, uint64_t* written, uint64_t* accumulated) {
    return MbxWriteBox(context, options, file, position, MbxCode("dref"), box, MbxWriteDrefPayload, written,
                       accumulated);
}

MbxStatus MbxFreeDref(MbxContext* context, MbxDrefBox* box) {
    return MbxFreeBox(context, box, [&] { return MbxFreeList(context, &box->entries, freeEntryBox); });
}

// ---- url , urn ----

namespace {

template <typename Payload>
MbxStatus buildLocation(MbxContext* context, const MbxOptions* options, uint32_t code,
                        const MbxDataEntry* entry, MbxDataEntryBox* box, Payload&& payload) {
    if (MbxAnyNull(context, options, entry, box)) return MBX_ERR_INVALID_ARG;
    if (entry->code != code) return MBX_ERR_INTERNAL;
    box->code = entry->code;
    box->entry = entry;
    return MbxMeasureBox(context, options, box, payload);
}

}  // namespace

MbxStatus MbxBuildUrl(MbxContext* context, const MbxOptions* options, const MbxDataEntry* entry,
                      MbxDataEntryBox* box) {
    return buildLocation(context, options, MbxCode("url "), entry, box, MbxWriteUrlPayload);
}

// 8.7.2 DataEntryUrlBox
MbxStatus MbxWriteUrlPayload(MbxContext* context, MbxFile* file, uint64_t position,
                             const MbxDataEntryBox* box, uint64_t* written, uint64_t* accumulated) {
    if (box->code != MbxCode("url ")) return MBX_ERR_INTERNAL;
    const MbxBuffer& location = box->entry->location;
    uint64_t count = 0;
    MBX_TRY(MbxSeek(context, file, position));
    MbxBytes bytes;
    MbxBeginBytes(context, &bytes);
    MbxPutVersionFlags(&bytes, 0, location.size == 0 ? 1 : 0);  // 1: the media is in this file
    MBX_TRY(MbxWriteComposed(context, file, &bytes, &count));
    MBX_TRY(MbxWriteBytes(context, file, location.data, location.size, nullptr, &count));  // string location
    return MbxReportBytes(count, written, accumulated);
}

MbxStatus MbxWriteUrlBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                         const MbxDataEntryBox* box, uint64_t* written, uint64_t* accumulated) {
    return MbxWriteBox(context, options, file, position, MbxCode("url "), box, MbxWriteUrlPayload, written,
                       accumulated);
}

MbxStatus MbxFreeUrl(MbxContext* context, MbxDataEntryBox* box) {
    return freeEntryBox(context, box);
}

MbxStatus MbxBuildUrn(MbxContext* context, const MbxOptions* options, const MbxDataEntry* entry,
                      MbxDataEntryBox* box) {
    return buildLocation(context, options, MbxCode("urn "), entry, box, MbxWriteUrnPayload);
}

// 8.7.2 DataEntryUrnBox
MbxStatus MbxWriteUrnPayload(MbxContext* context, MbxFile* file, uint64_t position,
                             const MbxDataEntryBox* box, uint64_t* written, uint64_t* accumulated) {
    if (box->code != MbxCode("urn ")) return MBX_ERR_INTERNAL;
    const MbxDataEntry& entry = *box->entry;
    uint64_t count = 0;
    MBX_TRY(MbxSeek(context, file, position));
    MbxBytes bytes;
    MbxBeginBytes(context, &bytes);
    MbxPutVersionFlags(&bytes, 0, 0);
    MBX_TRY(MbxWriteComposed(context, file, &bytes, &count));
    MBX_TRY(MbxWriteBytes(context, file, entry.name.data, entry.name.size, nullptr, &count));  // string name
    // string location
    MBX_TRY(MbxWriteBytes(context, file, entry.location.data, entry.location.size, nullptr, &count));
    return MbxReportBytes(count, written, accumulated);
}

MbxStatus MbxWriteUrnBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                         const MbxDataEntryBox* box, uint64_t* written, uint64_t* accumulated) {
    return MbxWriteBox(context, options, file, position, MbxCode("urn "), box, MbxWriteUrnPayload, written,
                       accumulated);
}

MbxStatus MbxFreeUrn(MbxContext* context, MbxDataEntryBox* box) {
    return freeEntryBox(context, box);
}

// ---- The records ----

namespace {

// A location without text, which to an `url ` is the same as none: the media is in this file.
bool isTerminatorAlone(const MbxDataEntryParams& params) {
    return params.location != nullptr && params.locationLength != 0 && *params.location == 0;
}

}  // namespace

MbxStatus MbxAddDataEntry(MbxContext* context, MbxList<MbxDataEntry>* list, const MbxDataEntryParams* params,
                          uint32_t* index) {
    if (MbxAnyNull(context, list, params, index)) return MBX_ERR_INVALID_ARG;
    const bool isUrn = params->code == MbxCode("urn ");
    if (!isUrn && params->code != MbxCode("url ")) return MBX_ERR_INTERNAL;
    const auto fill = [&](MbxDataEntry* entry) {
        entry->code = params->code;
        if (isUrn) MBX_TRY(MbxBufferAssignText(context, &entry->name, params->name, params->nameLength));
        if (!isUrn && isTerminatorAlone(*params)) return MBX_OK;
        return MbxBufferAssign(context, 1, &entry->location, params->location, params->locationLength);
    };
    MBX_TRY(MbxMakeListItem(context, list, fill, MbxFreeDataEntry));
    return MbxListCount(list->first, index);
}

MbxStatus MbxFreeDataEntry(MbxContext* context, MbxDataEntry* entry) {
    return MbxFreeBox(context, entry, [&] {
        MbxBufferRelease(context, &entry->name);
        MbxBufferRelease(context, &entry->location);
        return MBX_OK;
    });
}
