#include "boxlib/sample/sample_group.h"

#include "boxlib/core/row_table.h"
#include "boxlib/model/version.h"

MbxStatus MbxBuildSbgp(MbxContext* context, const MbxScratch* scratch, const MbxOptions* options,
                       const MbxSampleGroupParams* params, MbxSbgpBox* box) {
    if (MbxAnyNull(context, options, params, box)) return MBX_ERR_INVALID_ARG;
    box->params = params;
    return MbxMeasureBox(context, options, box, MbxWithScratch(scratch, MbxWriteSbgpPayload));
}

// 8.9.2 Sample to Group Box
MbxStatus MbxWriteSbgpPayload(MbxContext* context, const MbxScratch* scratch, MbxFile* file,
                              uint64_t position, const MbxSbgpBox* box, uint64_t* written,
                              uint64_t* accumulated) {
    const MbxSampleGroupParams& params = *box->params;
    uint32_t entries = 0;
    MBX_TRY(MbxBlockListCount(&params.rows, &entries));
    MbxBytes bytes;
    MbxBeginBytes(context, &bytes);
    MbxPutVersionFlags(&bytes, params.version, params.flags);
    MbxPut32(&bytes, params.groupingType);  // unsigned int(32) grouping_type
    if (params.version == 1) {
        MbxPut32(&bytes, params.groupingTypeParameter);  // unsigned int(32) grouping_type_parameter
    }
    MbxPut32(&bytes, entries);  // unsigned int(32) entry_count

    uint64_t count = 0;
    MBX_TRY(MbxSeek(context, file, position));
    MBX_TRY(MbxWriteComposed(context, file, &bytes, &count));
    const auto fill = [&](uint8_t* data) {
        MbxRowBytes rows = {data};
        for (const MbxBlock* block = params.rows.first; block != nullptr; block = block->next) {
            const auto* row = MbxBlockEntries<MbxSampleGroupRow>(block);
            for (uint32_t i = 0; i < block->count; i++) {
                MbxAppend(&rows, row[i].sampleCount, 4);  // unsigned int(32) sample_count
                MbxAppend(&rows, row[i].groupDescriptionIndex,
                          4);  // unsigned int(32) group_description_index
            }
        }
        return MBX_OK;
    };
    MBX_TRY(MbxWriteRows(context, scratch, file, entries, 8, fill, &count));
    return MbxReportBytes(count, written, accumulated);
}

MbxStatus MbxWriteSbgpBox(MbxContext* context, const MbxScratch* scratch, const MbxOptions* options,
                          MbxFile* file, uint64_t position, const MbxSbgpBox* box, uint64_t* written,
                          uint64_t* accumulated) {
    return MbxWriteBox(context, options, file, position, MbxCode("sbgp"), box,
                       MbxWithScratch(scratch, MbxWriteSbgpPayload), written, accumulated);
}

MbxStatus MbxFreeSbgp(MbxContext* context, MbxSbgpBox* box) {
    return MbxFreeBox(context, box);
}

MbxStatus MbxBuildSgpd(MbxContext* context, const MbxScratch* scratch, const MbxOptions* options,
                       const MbxGroupDescriptionParams* params, MbxSgpdBox* box) {
    if (MbxAnyNull(context, options, params, box)) return MBX_ERR_INVALID_ARG;
    box->params = params;
    return MbxMeasureBox(context, options, box, MbxWithScratch(scratch, MbxWriteSgpdPayload));
}

namespace {

// Length of an entry that is not raw, by its grouping type; 0 for a type that is not known.
constexpr uint32_t kSeigLength = 20;
constexpr uint32_t kTeleLength = 1;

uint32_t typeLength(uint32_t groupingType) {
    if (groupingType == MbxCode("seig")) return kSeigLength;
    return groupingType == MbxCode("tele") ? kTeleLength : 0;
}

// What the head of `sgpd` says, and the bytes of all its rows.
struct DescriptionSizes {
    uint32_t entries;
    uint32_t defaultLength;
    uint64_t rowBytes;
};

MbxStatus sizeDescriptions(const MbxGroupDescriptionParams& params, DescriptionSizes* sizes) {
    *sizes = {};
    MBX_TRY(MbxListCount(params.entries.first, &sizes->entries));
    if (params.hasRawEntries == 0) {
        sizes->defaultLength = typeLength(params.groupingType);
        if (sizes->defaultLength == 0 && sizes->entries != 0) return MBX_ERR_INTERNAL;
        sizes->rowBytes = uint64_t{sizes->entries} * sizes->defaultLength;
        return MBX_OK;
    }
    const MbxGroupDescription* first = params.entries.first;
    bool equal = true;
    for (const MbxGroupDescription* entry = first; entry != nullptr; entry = entry->next) {
        if (entry->raw.size > UINT32_MAX) return MBX_ERR_OVERFLOW;
        equal &= entry->raw.size == first->raw.size;
        sizes->rowBytes += entry->raw.size;
    }
    if (equal && first != nullptr) sizes->defaultLength = static_cast<uint32_t>(first->raw.size);
    if (sizes->defaultLength == 0) sizes->rowBytes += uint64_t{sizes->entries} * 4;
    return MBX_OK;
}

MbxStatus composeDescription(MbxContext* context, const MbxGroupDescriptionParams& params,
                             const MbxGroupDescription& entry, uint32_t defaultLength, MbxRowBytes* rows) {
    if (params.hasRawEntries != 0) {
        if (defaultLength == 0) MbxAppend(rows, entry.raw.size, 4);  // unsigned int(32) description_length
        if (entry.raw.size == 0) return MBX_OK;
        MBX_TRY(MbxCopy(context, rows->next, entry.raw.size, entry.raw.data, entry.raw.size));
        rows->next += entry.raw.size;
        return MBX_OK;
    }
    if (params.groupingType == MbxCode("seig")) {  // ISO/IEC 23001-7 6
        MbxAppend(rows, entry.isEncrypted, 3);     // unsigned int(24) IsEncrypted
        MbxAppend(rows, entry.ivSize, 1);          // unsigned int(8) IV_size
        MBX_TRY(MbxCopy(context, rows->next, sizeof(entry.keyId), entry.keyId, sizeof(entry.keyId)));
        rows->next += sizeof(entry.keyId);  // unsigned int(8)[16] KID
    } else {                                // 10.5 Temporal Level Sample Grouping
        // bit(1) level_independently_decodable, bit(7) reserved = 0
        MbxAppend(rows, entry.levelIndependentlyDecodable << 7, 1);
    }
    return MBX_OK;
}

}  // namespace

// 8.9.3 Sample Group Description Box
MbxStatus MbxWriteSgpdPayload(MbxContext* context, const MbxScratch* scratch, MbxFile* file,
                              uint64_t position, const MbxSgpdBox* box, uint64_t* written,
                              uint64_t* accumulated) {
    const MbxGroupDescriptionParams& params = *box->params;
    DescriptionSizes sizes;
    MBX_TRY(sizeDescriptions(params, &sizes));
    MbxBytes bytes;
    MbxBeginBytes(context, &bytes);
    MbxPutVersionFlags(&bytes, 1, 0);
    MbxPut32(&bytes, params.groupingType);  // unsigned int(32) grouping_type
    MbxPut32(&bytes, sizes.defaultLength);  // unsigned int(32) default_length
    MbxPut32(&bytes, sizes.entries);        // unsigned int(32) entry_count

    uint64_t count = 0;
    MBX_TRY(MbxSeek(context, file, position));
    MBX_TRY(MbxWriteComposed(context, file, &bytes, &count));
    const auto fill = [&](uint8_t* data) {
        MbxRowBytes rows = {data};
        const MbxGroupDescription* entry = params.entries.first;
        for (; entry != nullptr; entry = entry->next) {
            MBX_TRY(composeDescription(context, params, *entry, sizes.defaultLength, &rows));
        }
        return MBX_OK;
    };
    MBX_TRY(MbxWriteRows(context, scratch, file, 1, sizes.rowBytes, fill, &count));
    return MbxReportBytes(count, written, accumulated);
}

MbxStatus MbxWriteSgpdBox(MbxContext* context, const MbxScratch* scratch, const MbxOptions* options,
                          MbxFile* file, uint64_t position, const MbxSgpdBox* box, uint64_t* written,
                          uint64_t* accumulated) {
    return MbxWriteBox(context, options, file, position, MbxCode("sgpd"), box,
                       MbxWithScratch(scratch, MbxWriteSgpdPayload), written, accumulated);
}

MbxStatus MbxFreeSgpd(MbxContext* context, MbxSgpdBox* box) {
    return MbxFreeBox(context, box);
}

MbxStatus MbxBuildSubs(MbxContext* context, const MbxScratch* scratch, const MbxOptions* options,
                       const MbxSubSampleParams* params, MbxSubsBox* box) {
    if (MbxAnyNull(context, options, params, box)) return MBX_ERR_INVALID_ARG;
    box->first = params;
    bool needsWide = false;
    for (const MbxSubSampleParams* entry = params; entry != nullptr; entry = entry->next) {
        for (const MbxSubSample* sub = entry->subSamples.first; sub != nullptr; sub = sub->next) {
            needsWide |= sub->size > UINT16_MAX;
        }
    }
    MBX_TRY(MbxChooseValueVersion(options, needsWide, &box->version));
    return MbxMeasureBox(context, options, box, MbxWithScratch(scratch, MbxWriteSubsPayload));
}

// 8.7.7 Sub-Sample Information Box
MbxStatus MbxWriteSubsPayload(MbxContext* context, const MbxScratch* scratch, MbxFile* file,
                              uint64_t position, const MbxSubsBox* box, uint64_t* written,
                              uint64_t* accumulated) {
    const uint32_t sizeWidth = box->version == 1 ? 4 : 2;
    uint32_t entries = 0;
    uint64_t rowBytes = 0;
    for (const MbxSubSampleParams* entry = box->first; entry != nullptr; entry = entry->next) {
        uint32_t subSamples = 0;
        MBX_TRY(MbxListCount(entry->subSamples.first, &subSamples));
        if (subSamples > UINT16_MAX) return MBX_ERR_OVERFLOW;
        entries++;
        rowBytes += 6 + uint64_t{subSamples} * (sizeWidth + 6);
    }
    MbxBytes bytes;
    MbxBeginBytes(context, &bytes);
    MbxPutVersionFlags(&bytes, box->version, 0);
    MbxPut32(&bytes, entries);  // unsigned int(32) entry_count

    uint64_t count = 0;
    MBX_TRY(MbxSeek(context, file, position));
    MBX_TRY(MbxWriteComposed(context, file, &bytes, &count));
    const auto fill = [&](uint8_t* data) {
        MbxRowBytes rows = {data};
        for (const MbxSubSampleParams* entry = box->first; entry != nullptr; entry = entry->next) {
            uint32_t subSamples = 0;
            MBX_TRY(MbxListCount(entry->subSamples.first, &subSamples));
            MbxAppend(&rows, entry->sampleDelta, 4);  // unsigned int(32) sample_delta
            MbxAppend(&rows, subSamples, 2);          // unsigned int(16) subsample_count
            for (const MbxSubSample* sub = entry->subSamples.first; sub != nullptr; sub = sub->next) {
                MbxAppend(&rows, sub->size, sizeWidth);  // unsigned int(32) or (16) subsample_size
                MbxAppend(&rows, sub->priority, 1);      // unsigned int(8) subsample_priority
                MbxAppend(&rows, sub->discardable, 1);   // unsigned int(8) discardable
                MbxAppend(&rows, 0, 4);                  // unsigned int(32) reserved = 0
            }
        }
        return MBX_OK;
    };
    MBX_TRY(MbxWriteRows(context, scratch, file, 1, rowBytes, fill, &count));
    return MbxReportBytes(count, written, accumulated);
}

MbxStatus MbxWriteSubsBox(MbxContext* context, const MbxScratch* scratch, const MbxOptions* options,
                          MbxFile* file, uint64_t position, const MbxSubsBox* box, uint64_t* written,
                          uint64_t* accumulated) {
    return MbxWriteOptionalBox(context, options, file, position, MbxCode("subs"), box,
                               MbxWithScratch(scratch, MbxWriteSubsPayload), written, accumulated);
}

MbxStatus MbxFreeSubs(MbxContext* context, MbxSubsBox* box) {
    return MbxFreeBox(context, box);
}
