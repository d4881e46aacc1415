#include "boxlib/sample/auxiliary_information.h"

#include "boxlib/core/row_table.h"
#include "boxlib/model/version.h"

namespace {

// The fields that `saio` and `saiz` begin with.
void putAuxInfo(MbxBytes* bytes, uint32_t version, const MbxAuxInfo& info) {
    MbxPutVersionFlags(bytes, version, info.flags);
    if ((info.flags & 1) != 0) {
        MbxPut32(bytes, info.type);       // unsigned int(32) aux_info_type
        MbxPut32(bytes, info.parameter);  // unsigned int(32) aux_info_type_parameter
    }
}

uint64_t relativeOffset(const MbxAuxOffset& entry, uint64_t base) {
    return entry.offset > base ? entry.offset - base : 0;
}

// Calls `visit(entry)` for the first `count` entries. MBX_ERR_INTERNAL when the list holds fewer.
template <typename Visit>
MbxStatus visitOffsets(const MbxBlockList* offsets, uint32_t count, Visit&& visit) {
    for (const MbxBlock* block = offsets->first; block != nullptr && count != 0; block = block->next) {
        const auto* entries = MbxBlockEntries<MbxAuxOffset>(block);
        for (uint32_t i = 0; i < block->count && count != 0; i++, count--) MBX_TRY(visit(entries[i]));
    }
    return count == 0 ? MBX_OK : MBX_ERR_INTERNAL;
}

}  // namespace

MbxStatus MbxBuildSenc(MbxContext* context, const MbxOptions* options, const MbxSencParams* params,
                       MbxSencBox* box) {
    if (MbxAnyNull(context, options, params, box) || params->sizes == nullptr) return MBX_ERR_INVALID_ARG;
    box->params = *params;
    uint64_t payloadSize = 0;
    MBX_TRY(MbxWriteSencPayload(context, nullptr, 0, box, &payloadSize, nullptr));
    MBX_TRY(MbxBoxTotalSize(context, options, payloadSize, &box->size));
    if (box->size < payloadSize) return MBX_ERR_INTERNAL;
    box->headerLength = box->size - payloadSize;
    return MBX_OK;
}

// ISO/IEC 23001-7 7.2.1 Sample Encryption Box, of samples as they were handed in
MbxStatus MbxWriteSencPayload(MbxContext* context, MbxFile* file, uint64_t position, const MbxSencBox* box,
                              uint64_t* written, uint64_t* accumulated) {
    const MbxAuxSizeList& sizes = *box->params.sizes;
    MbxBytes bytes;
    MbxBeginBytes(context, &bytes);
    MbxPutVersionFlags(&bytes, 0, box->params.flags);
    MbxPut32(&bytes, sizes.count);  // unsigned int(32) sample_count
    uint64_t count = 0;
    MBX_TRY(MbxSeek(context, file, position));
    MBX_TRY(MbxWriteComposed(context, file, &bytes, &count));
    for (const MbxBlock* block = sizes.list.first; block != nullptr; block = block->next) {
        const auto* samples = MbxBlockEntries<MbxAuxSize>(block);
        for (uint32_t i = 0; i < block->count; i++) {
            MBX_TRY(MbxWriteBytes(context, file, samples[i].data, samples[i].size, nullptr, &count));
        }
    }
    return MbxReportBytes(count, written, accumulated);
}

MbxStatus MbxWriteSencBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxSencBox* box, uint64_t* written, uint64_t* accumulated) {
    return MbxWriteOptionalBox(context, options, file, position, MbxCode("senc"), box, MbxWriteSencPayload,
                               written, accumulated);
}

MbxStatus MbxFreeSenc(MbxContext* context, MbxSencBox* box) {
    return MbxFreeBox(context, box);
}

MbxStatus MbxBuildSaio(MbxContext* context, const MbxScratch* scratch, const MbxOptions* options,
                       const MbxSaioParams* params, MbxSaioBox* box) {
    if (MbxAnyNull(context, options, params, box) || params->offsets == nullptr) return MBX_ERR_INVALID_ARG;
    box->params = *params;
    MBX_TRY(MbxBlockListCount(params->offsets, &box->entryCount));
    bool needsWide = false;
    MBX_TRY(visitOffsets(params->offsets, box->entryCount, [&](const MbxAuxOffset& entry) {
        needsWide |= relativeOffset(entry, params->base) > UINT32_MAX;
        return MBX_OK;
    }));
    MBX_TRY(MbxChooseValueVersion(options, needsWide, &box->version));
    return MbxMeasureBox(context, options, box, MbxWithScratch(scratch, MbxWriteSaioPayload));
}

// 8.7.9 Sample Auxiliary Information Offsets Box
MbxStatus MbxWriteSaioPayload(MbxContext* context, const MbxScratch* scratch, MbxFile* file,
                              uint64_t position, const MbxSaioBox* box, uint64_t* written,
                              uint64_t* accumulated) {
    const MbxSaioParams& params = box->params;
    MbxBytes bytes;
    MbxBeginBytes(context, &bytes);
    putAuxInfo(&bytes, box->version, params.info);
    MbxPut32(&bytes, box->entryCount);  // unsigned int(32) entry_count
    uint64_t count = 0;
    MBX_TRY(MbxSeek(context, file, position));
    MBX_TRY(MbxWriteComposed(context, file, &bytes, &count));

    const uint32_t width = box->version == 1 ? 8 : 4;
    const auto fill = [&](uint8_t* data) {
        MbxRowBytes rows = {data};
        return visitOffsets(params.offsets, box->entryCount, [&](const MbxAuxOffset& entry) {
            // Contract: low-offset-fails-late. Measuring counts it as 0.
            if (file != nullptr && entry.offset < params.base) return MBX_ERR_OVERFLOW;
            MbxAppend(&rows, relativeOffset(entry, params.base), width);  // unsigned int(32 or 64) offset
            return MBX_OK;
        });
    };
    MBX_TRY(MbxWriteRows(context, scratch, file, box->entryCount, width, fill, &count));
    return MbxReportBytes(count, written, accumulated);
}

MbxStatus MbxWriteSaioBox(MbxContext* context, const MbxScratch* scratch, const MbxOptions* options,
                          MbxFile* file, uint64_t position, const MbxSaioBox* box, uint64_t* written,
                          uint64_t* accumulated) {
    return MbxWriteOptionalBox(context, options, file, position, MbxCode("saio"), box,
                               MbxWithScratch(scratch, MbxWriteSaioPayload), written, accumulated);
}

MbxStatus MbxFreeSaio(MbxContext* context, MbxSaioBox* box) {
    return MbxFreeBox(context, box);
}

MbxStatus MbxBuildSaiz(MbxContext* context, const MbxScratch* scratch, const MbxOptions* options,
                       const MbxSaizParams* params, MbxSaizBox* box) {
    if (MbxAnyNull(context, options, params, box) || params->sizes == nullptr) return MBX_ERR_INVALID_ARG;
    box->params = *params;
    return MbxMeasureBox(context, options, box, MbxWithScratch(scratch, MbxWriteSaizPayload));
}

// 8.7.8 Sample Auxiliary Information Sizes Box
MbxStatus MbxWriteSaizPayload(MbxContext* context, const MbxScratch* scratch, MbxFile* file,
                              uint64_t position, const MbxSaizBox* box, uint64_t* written,
                              uint64_t* accumulated) {
    const MbxAuxSizeList& sizes = *box->params.sizes;
    MbxBytes bytes;
    MbxBeginBytes(context, &bytes);
    putAuxInfo(&bytes, 0, box->params.info);
    MbxPut8(&bytes, sizes.defaultSize);  // unsigned int(8) default_sample_info_size
    MbxPut32(&bytes, sizes.count);       // unsigned int(32) sample_count
    uint64_t count = 0;
    MBX_TRY(MbxSeek(context, file, position));
    MBX_TRY(MbxWriteComposed(context, file, &bytes, &count));
    if (sizes.defaultSize != 0) return MbxReportBytes(count, written, accumulated);

    uint32_t entries = 0;
    MBX_TRY(MbxBlockListCount(&sizes.list, &entries));
    if (entries != sizes.count) return MBX_ERR_INTERNAL;
    const auto fill = [&](uint8_t* data) {
        for (const MbxBlock* block = sizes.list.first; block != nullptr; block = block->next) {
            const auto* samples = MbxBlockEntries<MbxAuxSize>(block);
            for (uint32_t i = 0; i < block->count; i++)
                *data++ = samples[i].size;  // unsigned int(8) sample_info_size
        }
        return MBX_OK;
    };
    MBX_TRY(MbxWriteRows(context, scratch, file, entries, 1, fill, &count));
    return MbxReportBytes(count, written, accumulated);
}

MbxStatus MbxWriteSaizBox(MbxContext* context, const MbxScratch* scratch, const MbxOptions* options,
                          MbxFile* file, uint64_t position, const MbxSaizBox* box, uint64_t* written,
                          uint64_t* accumulated) {
    return MbxWriteOptionalBox(context, options, file, position, MbxCode("saiz"), box,
                               MbxWithScratch(scratch, MbxWriteSaizPayload), written, accumulated);
}

MbxStatus MbxFreeSaiz(MbxContext* context, MbxSaizBox* box) {
    return MbxFreeBox(context, box);
}
