#include "boxlib/sample/sample_layout.h"

#include "boxlib/core/counted_table.h"

MbxStatus MbxBuildStsc(MbxContext* context, const MbxOptions* options, const MbxChunkState* params,
                       MbxStscBox* box) {
    if (MbxAnyNull(context, options, params, box)) return MBX_ERR_INVALID_ARG;
    box->chunks = params;
    return MbxMeasureBox(context, options, box, MbxWriteStscPayload);
}

// 8.7.4 Sample To Chunk Box
MbxStatus MbxWriteStscPayload(MbxContext* context, MbxFile* file, uint64_t position, const MbxStscBox* box,
                              uint64_t* written, uint64_t* accumulated) {
    const auto convert = [](const MbxChunkRun& run, uint32_t* row) {
        row[0] = MbxBig32(run.firstChunk);        // unsigned int(32) first_chunk
        row[1] = MbxBig32(run.samplesPerChunk);   // unsigned int(32) samples_per_chunk
        row[2] = MbxBig32(run.descriptionIndex);  // unsigned int(32) sample_description_index
    };
    return MbxWriteCountedTable<MbxChunkRun, uint32_t, 3>(context, file, position, 0, &box->chunks->list,
                                                          convert, written, accumulated);
}

MbxStatus MbxWriteStscBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxStscBox* box, uint64_t* written, uint64_t* accumulated) {
    return MbxWriteBox(context, options, file, position, MbxCode("stsc"), box, MbxWriteStscPayload, written,
                       accumulated);
}

MbxStatus MbxFreeStsc(MbxContext* context, MbxStscBox* box) {
    return MbxFreeBox(context, box);
}

MbxStatus MbxBuildStsz(MbxContext* context, const MbxOptions* options, const MbxSizeList* params,
                       MbxStszBox* box) {
    if (MbxAnyNull(context, options, params, box)) return MBX_ERR_INVALID_ARG;
    box->sizes = params;
    return MbxMeasureBox(context, options, box, MbxWriteStszPayload);
}

// 8.7.3.2 Sample Size Box
MbxStatus MbxWriteStszPayload(MbxContext* context, MbxFile* file, uint64_t position, const MbxStszBox* box,
                              uint64_t* written, uint64_t* accumulated) {
    uint32_t listed = 0;
    MBX_TRY(MbxBlockListCount(&box->sizes->list, &listed));
    const uint32_t uniformSize = box->sizes->uniformSize;
    MbxBytes bytes;
    MbxBeginBytes(context, &bytes);
    MbxPutVersionFlags(&bytes, 0, 0);
    MbxPut32(&bytes, uniformSize);                                    // unsigned int(32) sample_size
    MbxPut32(&bytes, uniformSize != 0 ? box->sizes->count : listed);  // unsigned int(32) sample_count

    uint64_t count = 0;
    MBX_TRY(MbxSeek(context, file, position));
    MBX_TRY(MbxWriteComposed(context, file, &bytes, &count));
    const auto convert = [](uint32_t size, uint32_t* row) {
        *row = MbxBig32(size);  // unsigned int(32) entry_size
    };
    MBX_TRY((MbxWriteTable<uint32_t, uint32_t, 1>(context, file, &box->sizes->list, convert, &count)));
    return MbxReportBytes(count, written, accumulated);
}

MbxStatus MbxWriteStszBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxStszBox* box, uint64_t* written, uint64_t* accumulated) {
    return MbxWriteBox(context, options, file, position, MbxCode("stsz"), box, MbxWriteStszPayload, written,
                       accumulated);
}

MbxStatus MbxFreeStsz(MbxContext* context, MbxStszBox* box) {
    return MbxFreeBox(context, box);
}

MbxStatus MbxChooseOffsetWidth(const MbxOptions* options, const MbxChunkOffsetList* offsets,
                               uint32_t* width) {
    if (MbxAnyNull(options, offsets, width)) return MBX_ERR_INVALID_ARG;
    if (options->chunk_offset_mode == MBX_OFFSETS_64) {
        *width = 8;  // whatever the offsets are
        return MBX_OK;
    }
    uint64_t bits = 0;
    for (const MbxBlock* block = offsets->list.first; block != nullptr; block = block->next) {
        const auto* entries = MbxBlockEntries<uint64_t>(block);
        for (uint32_t i = 0; i < block->count; i++) bits |= entries[i];
    }
    const bool wide = bits > UINT32_MAX;
    if (wide && options->chunk_offset_mode == MBX_OFFSETS_32) return MBX_ERR_BAD_STATE;
    *width = wide ? 8 : 4;
    return MBX_OK;
}

MbxStatus MbxBuildStco(MbxContext* context, const MbxOptions* options, const MbxChunkOffsetList* params,
                       MbxStcoBox* box) {
    if (MbxAnyNull(context, options, params, box)) return MBX_ERR_INVALID_ARG;
    box->offsets = params;
    return MbxMeasureBox(context, options, box, MbxWriteStcoPayload);
}

// 8.7.5 Chunk Offset Box
MbxStatus MbxWriteStcoPayload(MbxContext* context, MbxFile* file, uint64_t position, const MbxStcoBox* box,
                              uint64_t* written, uint64_t* accumulated) {
    const auto convert = [](uint64_t offset, uint32_t* row) {
        *row = MbxBig32(static_cast<uint32_t>(offset));  // unsigned int(32) chunk_offset
    };
    return MbxWriteCountedTable<uint64_t, uint32_t, 1>(context, file, position, 0, &box->offsets->list,
                                                       convert, written, accumulated);
}

MbxStatus MbxWriteStcoBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxStcoBox* box, uint64_t* written, uint64_t* accumulated) {
    return MbxWriteOptionalBox(context, options, file, position, MbxCode("stco"), box, MbxWriteStcoPayload,
                               written, accumulated);
}

MbxStatus MbxFreeStco(MbxContext* context, MbxStcoBox* box) {
    return MbxFreeBox(context, box);
}

MbxStatus MbxBuildCo64(MbxContext* context, const MbxOptions* options, const MbxChunkOffsetList* params,
                       MbxCo64Box* box) {
    if (MbxAnyNull(context, options, params, box)) return MBX_ERR_INVALID_ARG;
    box->offsets = params;
    return MbxMeasureBox(context, options, box, MbxWriteCo64Payload);
}

// 8.7.5 Chunk Large Offset Box
MbxStatus MbxWriteCo64Payload(MbxContext* context, MbxFile* file, uint64_t position, const MbxCo64Box* box,
                              uint64_t* written, uint64_t* accumulated) {
    const auto convert = [](uint64_t offset, uint64_t* row) {
        *row = MbxBig64(offset);  // unsigned int(64) chunk_offset
    };
    return MbxWriteCountedTable<uint64_t, uint64_t, 1>(context, file, position, 0, &box->offsets->list,
                                                       convert, written, accumulated);
}

MbxStatus MbxWriteCo64Box(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxCo64Box* box, uint64_t* written, uint64_t* accumulated) {
    return MbxWriteOptionalBox(context, options, file, position, MbxCode("co64"), box, MbxWriteCo64Payload,
                               written, accumulated);
}

MbxStatus MbxFreeCo64(MbxContext* context, MbxCo64Box* box) {
    return MbxFreeBox(context, box);
}
