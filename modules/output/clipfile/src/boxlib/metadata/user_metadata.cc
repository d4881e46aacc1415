#include "boxlib/metadata/user_metadata.h"

#include "boxlib/core/uuid.h"

// ---- USMT ----

MbxStatus MbxBuildUserMetadata(MbxContext* context, const MbxOptions* options, const MbxUserMetadata* lists,
                               MbxUserMetadataBox* box) {
    if (MbxAnyNull(context, options, lists, box)) return MBX_ERR_INVALID_ARG;
    if (lists->items.first != nullptr) {
        MBX_TRY(MbxMakeBox(context, options, &box->mtdt, &lists->items, MbxBuildMtdt, MbxFreeMtdt));
    }
    if (lists->fileItems.first != nullptr) {
        MBX_TRY(MbxMakeBox(context, options, &box->mtdf, &lists->fileItems, MbxBuildMtdf, MbxFreeMtdf));
    }
    MBX_TRY(MbxMakeBoxes(context, options, &box->tracks, lists->tracks.first, MbxBuildMtsm, MbxFreeMtsm));
    return MbxMeasureBox(context, options, box, MbxWriteUserMetadataPayload);
}

MbxStatus MbxWriteUserMetadataPayload(MbxContext* context, const MbxOptions* options, MbxFile* file,
                                      uint64_t position, const MbxUserMetadataBox* box, uint64_t* written,
                                      uint64_t* accumulated) {
    uint64_t count = 0;
    MBX_TRY(MbxSeek(context, file, position));
    MBX_TRY(MbxWriteUuid(context, file, position, MBX_UUID_USMT, nullptr, &count));
    MBX_TRY(MbxWriteMtdfBox(context, options, file, position + count, box->mtdf, nullptr, &count));
    MBX_TRY(MbxWriteMtdtBox(context, options, file, position + count, box->mtdt, nullptr, &count));
    MBX_TRY(MbxWriteBoxes(context, options, file, position, box->tracks.first, MbxWriteMtsmBox, &count));
    return MbxReportBytes(count, written, accumulated);
}

MbxStatus MbxWriteUserMetadataBox(MbxContext* context, const MbxOptions* options, MbxFile* file,
                                  uint64_t position, const MbxUserMetadataBox* box, uint64_t* written,
                                  uint64_t* accumulated) {
    return MbxWriteOptionalBox(context, options, file, position, MbxCode("uuid"), box,
                               MbxWriteUserMetadataPayload, written, accumulated);
}

MbxStatus MbxFreeUserMetadata(MbxContext* context, MbxUserMetadataBox* box) {
    return MbxFreeBox(context, box, [&] {
        MBX_TRY(MbxFreeMtdf(context, box->mtdf));
        MBX_TRY(MbxFreeMtdt(context, box->mtdt));
        return MbxFreeList(context, &box->tracks, MbxFreeMtsm);
    });
}

// ---- MTDT, MTDF ----

namespace {

template <typename Payload>
MbxStatus buildItems(MbxContext* context, const MbxOptions* options, const MbxList<MbxMetadataItem>* items,
                     MbxMetadataItemsBox* box, Payload&& payload) {
    if (MbxAnyNull(context, options, items, box)) return MBX_ERR_INVALID_ARG;
    box->first = items->first;
    return MbxMeasureBox(context, options, box, payload);
}

MbxStatus writeItem(MbxContext* context, MbxFile* file, uint64_t position, bool withFlag,
                    const MbxMetadataItem* item, uint64_t* accumulated) {
    uint64_t count = 0;
    uint64_t size = 0;
    MBX_TRY(MbxShortTotalSize(context, item->data.size + 4, &size));
    // unsigned int(16) size, unsigned int(32) type
    MBX_TRY(MbxWriteShortHeader(context, file, position, size, item->type, nullptr, &count));
    // Contract: mtdf-has-no-flag. The bit stays 0.
    const uint32_t flag = withFlag ? item->flag & 1U : 0;
    MbxBytes bytes;
    MbxBeginBytes(context, &bytes);
    MbxPut16(&bytes, flag << 15 | (item->language & 0x7FFFU));  // bit(1) flag, unsigned int(5)[3] language
    MbxPut16(&bytes, item->encoding);                           // unsigned int(16) encoding
    MBX_TRY(MbxWriteComposed(context, file, &bytes, &count));
    MBX_TRY(MbxWriteBytes(context, file, item->data.data, item->data.size, nullptr, &count));
    return MbxReportBytes(count, nullptr, accumulated);
}

MbxStatus writeItems(MbxContext* context, MbxFile* file, uint64_t position, bool withFlag,
                     const MbxMetadataItemsBox* box, uint64_t* written, uint64_t* accumulated) {
    uint64_t count = 0;
    uint32_t itemCount = 0;
    MBX_TRY(MbxListCount(box->first, &itemCount));
    if (itemCount > UINT16_MAX) return MBX_ERR_OVERFLOW;
    MBX_TRY(MbxSeek(context, file, position));
    MbxBytes bytes;
    MbxBeginBytes(context, &bytes);
    MbxPut16(&bytes, itemCount);  // unsigned int(16) item_count
    MBX_TRY(MbxWriteComposed(context, file, &bytes, &count));
    MBX_TRY(MbxWriteEach(box->first, position, &count,
                         [&](const MbxMetadataItem* item, uint64_t at, uint64_t* counter) {
                             return writeItem(context, file, at, withFlag, item, counter);
                         }));
    return MbxReportBytes(count, written, accumulated);
}

}  // namespace

MbxStatus MbxBuildMtdt(MbxContext* context, const MbxOptions* options, const MbxList<MbxMetadataItem>* items,
                       MbxMetadataItemsBox* box) {
    return buildItems(context, options, items, box, MbxWriteMtdtPayload);
}

MbxStatus MbxWriteMtdtPayload(MbxContext* context, MbxFile* file, uint64_t position,
                              const MbxMetadataItemsBox* box, uint64_t* written, uint64_t* accumulated) {
    return writeItems(context, file, position, true, box, written, accumulated);
}

MbxStatus MbxWriteMtdtBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxMetadataItemsBox* box, uint64_t* written, uint64_t* accumulated) {
    return MbxWriteOptionalBox(context, options, file, position, MbxCode("MTDT"), box, MbxWriteMtdtPayload,
                               written, accumulated);
}

MbxStatus MbxFreeMtdt(MbxContext* context, MbxMetadataItemsBox* box) {
    return MbxFreeBox(context, box);
}

MbxStatus MbxBuildMtdf(MbxContext* context, const MbxOptions* options, const MbxList<MbxMetadataItem>* items,
                       MbxMetadataItemsBox* box) {
    return buildItems(context, options, items, box, MbxWriteMtdfPayload);
}

MbxStatus MbxWriteMtdfPayload(MbxContext* context, MbxFile* file, uint64_t position,
                              const MbxMetadataItemsBox* box, uint64_t* written, uint64_t* accumulated) {
    return writeItems(context, file, position, false, box, written, accumulated);
}

MbxStatus MbxWriteMtdfBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxMetadataItemsBox* box, uint64_t* written, uint64_t* accumulated) {
    return MbxWriteOptionalBox(context, options, file, position, MbxCode("MTDF"), box, MbxWriteMtdfPayload,
                               written, accumulated);
}

MbxStatus MbxFreeMtdf(MbxContext* context, MbxMetadataItemsBox* box) {
    return MbxFreeBox(context, box);
}

// ---- MTSM ----

MbxStatus MbxBuildMtsm(MbxContext* context, const MbxOptions* options, const MbxMetadataTrack* track,
                       MbxMtsmBox* box) {
    if (MbxAnyNull(context, options, track, box)) return MBX_ERR_INVALID_ARG;
    MBX_TRY(MbxMakeBox(context, options, &box->mthd, &track->header, MbxBuildMthd, MbxFreeMthd));
    MBX_TRY(MbxMakeBox(context, options, &box->dinf, &track->dataEntries, MbxBuildDinf, MbxFreeDinf));
    // A metadata track has no timescale, so an audio entry in it would need a sample rate of its own.
    const auto buildStsd = [&](MbxStsdBox* stsd) {
        return MbxBuildStsd(context, options, 0, &track->sampleEntries, stsd);
    };
    MBX_TRY(MbxMakeChild(context, &box->stsd, buildStsd, MbxFreeStsd));
    MBX_TRY(MbxMakeBox(context, options, &box->mdst, &track->entries, MbxBuildMdst, MbxFreeMdst));
    return MbxMeasureBox(context, options, box, MbxWriteMtsmPayload);
}

MbxStatus MbxWriteMtsmPayload(MbxContext* context, const MbxOptions* options, MbxFile* file,
                              uint64_t position, const MbxMtsmBox* box, uint64_t* written,
                              uint64_t* accumulated) {
    uint64_t count = 0;
    MBX_TRY(MbxSeek(context, file, position));
    MBX_TRY(MbxWriteMthdBox(context, options, file, position + count, box->mthd, nullptr, &count));
    MBX_TRY(MbxWriteDinfBox(context, options, file, position + count, box->dinf, nullptr, &count));
    MBX_TRY(MbxWriteStsdBox(context, options, file, position + count, box->stsd, nullptr, &count));
    MBX_TRY(MbxWriteMdstBox(context, options, file, position + count, box->mdst, nullptr, &count));
    return MbxReportBytes(count, written, accumulated);
}

MbxStatus MbxWriteMtsmBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxMtsmBox* box, uint64_t* written, uint64_t* accumulated) {
    return MbxWriteOptionalBox(context, options, file, position, MbxCode("MTSM"), box, MbxWriteMtsmPayload,
                               written, accumulated);
}

MbxStatus MbxFreeMtsm(MbxContext* context, MbxMtsmBox* box) {
    return MbxFreeBox(context, box, [&] {
        MBX_TRY(MbxFreeMthd(context, box->mthd));
        MBX_TRY(MbxFreeDinf(context, box->dinf));
        MBX_TRY(MbxFreeStsd(context, box->stsd));
        return MbxFreeMdst(context, box->mdst);
    });
}

// ---- MTHD ----

MbxStatus MbxBuildMthd(MbxContext* context, const MbxOptions* options, const MbxMetadataTrackHeader* header,
                       MbxMthdBox* box) {
    if (MbxAnyNull(context, options, header, box)) return MBX_ERR_INVALID_ARG;
    box->values = *header;
    return MbxMeasureBox(context, options, box, MbxWriteMthdPayload);
}

MbxStatus MbxWriteMthdPayload(MbxContext* context, MbxFile* file, uint64_t position, const MbxMthdBox* box,
                              uint64_t* written, uint64_t* accumulated) {
    const MbxMetadataTrackHeader& values = box->values;
    MbxBytes bytes;
    MbxBeginBytes(context, &bytes);
    MbxPutVersionFlags(&bytes, values.version, 0);
    MbxPutByVersion(&bytes, values.version, values.creationTime);  // unsigned int(64 or 32) creation_time
    MbxPutByVersion(&bytes, values.version,
                    values.modificationTime);  // unsigned int(64 or 32) modification_time
    MbxPut32(&bytes, values.trackId);          // unsigned int(32) track_ID
    MbxPutZeros(&bytes, 8);                    // unsigned int(32)[2] reserved
    return MbxWriteFixedPayload(context, file, position, &bytes, written, accumulated);
}

MbxStatus MbxWriteMthdBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxMthdBox* box, uint64_t* written, uint64_t* accumulated) {
    return MbxWriteBox(context, options, file, position, MbxCode("MTHD"), box, MbxWriteMthdPayload, written,
                       accumulated);
}

MbxStatus MbxFreeMthd(MbxContext* context, MbxMthdBox* box) {
    return MbxFreeBox(context, box);
}

// ---- MDST ----

MbxStatus MbxBuildMdst(MbxContext* context, const MbxOptions* options,
                       const MbxList<MbxMetadataTrackEntry>* entries, MbxMdstBox* box) {
    if (MbxAnyNull(context, options, entries, box)) return MBX_ERR_INVALID_ARG;
    box->first = entries->first;
    return MbxMeasureBox(context, options, box, MbxWriteMdstPayload);
}

MbxStatus MbxWriteMdstPayload(MbxContext* context, MbxFile* file, uint64_t position, const MbxMdstBox* box,
                              uint64_t* written, uint64_t* accumulated) {
    uint64_t count = 0;
    uint32_t entryCount = 0;
    MBX_TRY(MbxListCount(box->first, &entryCount));
    MBX_TRY(MbxSeek(context, file, position));
    MbxBytes bytes;
    MbxBeginBytes(context, &bytes);
    MbxPutVersionFlags(&bytes, 0, 0);
    MbxPut32(&bytes, entryCount);  // unsigned int(32) entry_count
    MBX_TRY(MbxWriteComposed(context, file, &bytes, &count));
    for (const MbxMetadataTrackEntry* entry = box->first; entry != nullptr; entry = entry->next) {
        MbxBeginBytes(context, &bytes);
        for (const uint32_t value : entry->values) MbxPut32(&bytes, value);  // unsigned int(32)[3] values
        MbxPutZeros(&bytes, 8);                                              // unsigned int(32)[2] reserved
        MBX_TRY(MbxWriteComposed(context, file, &bytes, &count));
    }
    return MbxReportBytes(count, written, accumulated);
}

MbxStatus MbxWriteMdstBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxMdstBox* box, uint64_t* written, uint64_t* accumulated) {
    return MbxWriteBox(context, options, file, position, MbxCode("MDST"), box, MbxWriteMdstPayload, written,
                       accumulated);
}

MbxStatus MbxFreeMdst(MbxContext* context, MbxMdstBox* box) {
    return MbxFreeBox(context, box);
}
