#include "boxlib/sample/sample_times.h"

#include "boxlib/core/counted_table.h"

namespace {

// The row that `stts` and `ctts` share.
void convertRun(const MbxRun& run, uint32_t* row) {
    row[0] = MbxBig32(run.count);  // unsigned int(32) sample_count
    row[1] = MbxBig32(run.value);  // unsigned int(32) sample_delta, or int(32) sample_offset
}

}  // namespace

MbxStatus MbxBuildStts(MbxContext* context, const MbxOptions* options, const MbxRunList* params,
                       MbxSttsBox* box) {
    if (MbxAnyNull(context, options, params, box)) return MBX_ERR_INVALID_ARG;
    box->durations = params;
    return MbxMeasureBox(context, options, box, MbxWriteSttsPayload);
}

// 8.6.1.2 Decoding Time to Sample Box
MbxStatus MbxWriteSttsPayload(MbxContext* context, MbxFile* file, uint64_t position, const MbxSttsBox* box,
                              uint64_t* written, uint64_t* accumulated) {
    return MbxWriteCountedTable<MbxRun, uint32_t, 2>(context, file, position, 0, &box->durations->list,
                                                     convertRun, written, accumulated);
}

MbxStatus MbxWriteSttsBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxSttsBox* box, uint64_t* written, uint64_t* accumulated) {
    return MbxWriteBox(context, options, file, position, MbxCode("stts"), box, MbxWriteSttsPayload, written,
                       accumulated);
}

MbxStatus MbxFreeStts(MbxContext* context, MbxSttsBox* box) {
    return MbxFreeBox(context, box);
}

MbxStatus MbxBuildCtts(MbxContext* context, const MbxOptions* options, const MbxCompositionList* params,
                       MbxCttsBox* box) {
    if (MbxAnyNull(context, options, params, box)) return MBX_ERR_INVALID_ARG;
    box->version = options->trun_version_mode == MBX_TRUN_VERSION_1 || params->signedOffsets == 1 ? 1 : 0;
    box->offsets = params;
    return MbxMeasureBox(context, options, box, MbxWriteCttsPayload);
}

// 8.6.1.3 Composition Time to Sample Box
MbxStatus MbxWriteCttsPayload(MbxContext* context, MbxFile* file, uint64_t position, const MbxCttsBox* box,
                              uint64_t* written, uint64_t* accumulated) {
    return MbxWriteCountedTable<MbxRun, uint32_t, 2>(
        context, file, position, box->version, &box->offsets->runs.list, convertRun, written, accumulated);
}

MbxStatus MbxWriteCttsBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxCttsBox* box, uint64_t* written, uint64_t* accumulated) {
    return MbxWriteOptionalBox(context, options, file, position, MbxCode("ctts"), box, MbxWriteCttsPayload,
                               written, accumulated);
}

MbxStatus MbxFreeCtts(MbxContext* context, MbxCttsBox* box) {
    return MbxFreeBox(context, box);
}

MbxStatus MbxBuildStss(MbxContext* context, const MbxOptions* options, const MbxSyncList* params,
                       MbxStssBox* box) {
    if (MbxAnyNull(context, options, params, box)) return MBX_ERR_INVALID_ARG;
    box->syncs = params;
    return MbxMeasureBox(context, options, box, MbxWriteStssPayload);
}

// 8.6.2 Sync Sample Box
MbxStatus MbxWriteStssPayload(MbxContext* context, MbxFile* file, uint64_t position, const MbxStssBox* box,
                              uint64_t* written, uint64_t* accumulated) {
    const auto convert = [](uint32_t number, uint32_t* row) {
        *row = MbxBig32(number);  // unsigned int(32) sample_number
    };
    return MbxWriteCountedTable<uint32_t, uint32_t, 1>(context, file, position, 0, &box->syncs->list, convert,
                                                       written, accumulated);
}

MbxStatus MbxWriteStssBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxStssBox* box, uint64_t* written, uint64_t* accumulated) {
    return MbxWriteOptionalBox(context, options, file, position, MbxCode("stss"), box, MbxWriteStssPayload,
                               written, accumulated);
}

MbxStatus MbxFreeStss(MbxContext* context, MbxStssBox* box) {
    return MbxFreeBox(context, box);
}

MbxStatus MbxBuildSdtp(MbxContext* context, const MbxOptions* options, const MbxDependencyList* params,
                       MbxSdtpBox* box) {
    if (MbxAnyNull(context, options, params, box)) return MBX_ERR_INVALID_ARG;
    box->dependencies = params;
    return MbxMeasureBox(context, options, box, MbxWriteSdtpPayload);
}

namespace {

// Collects bytes and writes them whenever the buffer is full.
struct ByteCollector {
    MbxContext* context;
    MbxFile* file;
    uint8_t* data;
    uint64_t capacity;
    uint64_t length;
    uint64_t* accumulated;
};

MbxStatus flush(ByteCollector* collector) {
    MBX_TRY(MbxWriteBytes(collector->context, collector->file, collector->data, collector->length, nullptr,
                          collector->accumulated));
    collector->length = 0;
    return MBX_OK;
}

MbxStatus collect(ByteCollector* collector, uint8_t byte) {
    if (collector->length == collector->capacity) MBX_TRY(flush(collector));
    collector->data[collector->length++] = byte;
    return MBX_OK;
}

MbxStatus collectDependencies(ByteCollector* collector, const MbxDependencyList& dependencies) {
    if (dependencies.first != nullptr) MBX_TRY(collect(collector, *dependencies.first));
    for (uint32_t i = 0; i < dependencies.runCount; i++) MBX_TRY(collect(collector, *dependencies.second));
    for (const MbxBlock* block = dependencies.list.first; block != nullptr; block = block->next) {
        const auto* bytes = MbxBlockEntries<uint8_t>(block);
        for (uint32_t i = 0; i < block->count; i++) MBX_TRY(collect(collector, bytes[i]));
    }
    return flush(collector);
}

}  // namespace

// 8.6.4 Independent and Disposable Samples Box
MbxStatus MbxWriteSdtpPayload(MbxContext* context, MbxFile* file, uint64_t position, const MbxSdtpBox* box,
                              uint64_t* written, uint64_t* accumulated) {
    const MbxDependencyList& dependencies = *box->dependencies;
    MbxBytes bytes;
    MbxBeginBytes(context, &bytes);
    MbxPutVersionFlags(&bytes, 0, 0);
    uint64_t count = 0;
    MBX_TRY(MbxSeek(context, file, position));
    MBX_TRY(MbxWriteComposed(context, file, &bytes, &count));

    // unsigned int(2) is_leading, sample_depends_on, sample_is_depended_on, sample_has_redundancy, per sample
    const uint64_t run = uint64_t{dependencies.runCount} + 1;
    const uint64_t block = dependencies.list.first != nullptr ? dependencies.list.first->count : 0;
    ByteCollector collector = {context, file, nullptr, run > block ? run : block, 0, &count};
    MBX_TRY(MbxNewArray(context, collector.capacity, &collector.data));
    const MbxStatus status = collectDependencies(&collector, dependencies);
    MbxFree(context, collector.data);
    MBX_TRY(status);
    return MbxReportBytes(count, written, accumulated);
}

MbxStatus MbxWriteSdtpBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxSdtpBox* box, uint64_t* written, uint64_t* accumulated) {
    return MbxWriteOptionalBox(context, options, file, position, MbxCode("sdtp"), box, MbxWriteSdtpPayload,
                               written, accumulated);
}

MbxStatus MbxFreeSdtp(MbxContext* context, MbxSdtpBox* box) {
    return MbxFreeBox(context, box);
}
