#include "boxlib/fragment/track_run.h"

#include "boxlib/core/row_table.h"

namespace {

// A run as its box writes it.
struct MbxTrunValues {
    uint32_t flags;  // MbxTrunFlag bits
    uint32_t sampleCount;
    int32_t dataOffset;
    uint32_t firstSampleFlags;
    uint64_t rowSize;  // in bytes per sample
};

// The first pass: which fields the run needs. Moves cursor and position behind the run.
MbxStatus inspectSamples(const MbxTfhdValues& defaults, MbxSampleCursor* cursor, uint64_t* position,
                         MbxTrunValues* values) {
    const uint32_t* forced = cursor->perSampleForced;
    for (uint32_t i = 0; i < values->sampleCount; i++) {
        MbxSampleValues sample;
        MBX_TRY(MbxStepSample(cursor, &sample));
        if (forced[0] == 1 || sample.duration != defaults.defaultSampleDuration) {
            values->flags |= MBX_TRUN_DURATION;
        }
        if (forced[1] == 1 || sample.size != defaults.defaultSampleSize) values->flags |= MBX_TRUN_SIZE;
        if (forced[2] == 1) {
            values->flags |= MBX_TRUN_FLAGS;
        } else if (sample.flags != defaults.defaultSampleFlags) {
            values->flags |= i == 0 ? MBX_TRUN_FIRST_FLAGS : MBX_TRUN_FLAGS;
        }
        if (sample.compositionOffset != 0) values->flags |= MBX_TRUN_COMPOSITION_OFFSET;
        if (i == 0) values->firstSampleFlags = sample.flags;
        *position += sample.size;
    }
    if ((values->flags & MBX_TRUN_FLAGS) != 0) values->flags &= ~uint32_t{MBX_TRUN_FIRST_FLAGS};
    return MBX_OK;
}

// The second pass: the rows, from where the first one began.
MbxStatus composeRows(MbxSampleCursor cursor, const MbxTrunValues& values, uint8_t* row) {
    const auto append = [&](uint32_t flag, uint32_t value) {
        if ((values.flags & flag) == 0) return;
        MbxStore32(row, value);
        row += 4;
    };
    for (uint32_t i = 0; i < values.sampleCount; i++) {
        MbxSampleValues sample;
        MBX_TRY(MbxStepSample(&cursor, &sample));
        append(MBX_TRUN_DURATION, sample.duration);  // unsigned int(32) sample_duration
        append(MBX_TRUN_SIZE, sample.size);          // unsigned int(32) sample_size
        append(MBX_TRUN_FLAGS, sample.flags);        // unsigned int(32) sample_flags
        // unsigned int(32) or int(32) sample_composition_time_offset
        append(MBX_TRUN_COMPOSITION_OFFSET, sample.compositionOffset);
    }
    return MBX_OK;
}

MbxStatus computeDataOffset(const MbxOptions* options, uint64_t offset, uint64_t base, int32_t* dataOffset) {
    const uint64_t distance = offset >= base ? offset - base : base - offset;
    const uint64_t limit = offset >= base ? 0x7FFFFFFF : 0x80000000;
    if (options->base_offset_mode == MBX_BASE_EXPLICIT && distance > limit) return MBX_ERR_OVERFLOW;
    // Contract: data-offset-cut. Silently, in the other modes.
    *dataOffset = static_cast<int32_t>(static_cast<uint32_t>(offset - base));
    return MBX_OK;
}

// The values of the run at the cursor, without its rows. Moves cursor and position behind it.
MbxStatus inspectRun(const MbxOptions* options, const MbxTfhdValues& defaults, MbxSampleCursor* cursor,
                     uint64_t* position, MbxTrunValues* values) {
    *values = {};
    uint64_t offset = 0;
    MBX_TRY(MbxStepChunkOffset(cursor, &offset));
    MBX_TRY(MbxStepChunk(cursor, &values->sampleCount));
    if (options->trun_offset_mode == MBX_TRUN_OFFSET_ALWAYS || offset != *position)
        values->flags |= MBX_TRUN_DATA_OFFSET;
    MBX_TRY(computeDataOffset(options, offset, defaults.baseDataOffset, &values->dataOffset));
    *position = offset;
    MBX_TRY(inspectSamples(defaults, cursor, position, values));
    if ((values->flags & MBX_TRUN_DURATION) != 0) values->rowSize += 4;
    if ((values->flags & MBX_TRUN_SIZE) != 0) values->rowSize += 4;
    if ((values->flags & MBX_TRUN_FLAGS) != 0) values->rowSize += 4;
    if ((values->flags & MBX_TRUN_COMPOSITION_OFFSET) != 0) values->rowSize += 4;
    return MBX_OK;
}

// Version 1 makes the composition offsets of the run signed.
uint32_t versionOf(const MbxOptions* options, const MbxSampleSegment* segment) {
    return options->trun_version_mode == MBX_TRUN_VERSION_1 ? 1 : segment->compositionOffsets.signedOffsets;
}

}  // namespace

MbxStatus MbxBuildTrun(MbxContext* context, const MbxScratch* scratch, const MbxOptions* options,
                       const MbxTrunParams* params, MbxTrunBox* box) {
    if (MbxAnyNull(context, options, params, box)) return MBX_ERR_INVALID_ARG;
    box->defaults = *params->defaults;
    box->cursor = *params->cursor;
    box->position = *params->position;
    MBX_TRY(MbxMeasureBox(context, options, box, MbxWithScratch(scratch, MbxWriteTrunPayload)));
    MbxTrunValues values;
    return inspectRun(options, box->defaults, params->cursor, params->position, &values);
}

// 8.8.8 Track Fragment Run Box
MbxStatus MbxWriteTrunPayload(MbxContext* context, const MbxScratch* scratch, const MbxOptions* options,
                              MbxFile* file, uint64_t position, const MbxTrunBox* box, uint64_t* written,
                              uint64_t* accumulated) {
    MbxSampleCursor cursor = box->cursor;
    uint64_t dataPosition = box->position;
    MbxTrunValues values;
    MBX_TRY(inspectRun(options, box->defaults, &cursor, &dataPosition, &values));
    MbxBytes bytes;
    MbxBeginBytes(context, &bytes);
    MbxPutVersionFlags(&bytes, versionOf(options, box->cursor.segment), values.flags);
    MbxPut32(&bytes, values.sampleCount);  // unsigned int(32) sample_count
    if ((values.flags & MBX_TRUN_DATA_OFFSET) != 0) {
        MbxPut32(&bytes, static_cast<uint32_t>(values.dataOffset));  // signed int(32) data_offset
    }
    if ((values.flags & MBX_TRUN_FIRST_FLAGS) != 0) {
        MbxPut32(&bytes, values.firstSampleFlags);  // unsigned int(32) first_sample_flags
    }
    uint64_t count = 0;
    MBX_TRY(MbxSeek(context, file, position));
    MBX_TRY(MbxWriteComposed(context, file, &bytes, &count));
    const auto fill = [&](uint8_t* rows) { return composeRows(box->cursor, values, rows); };
    MBX_TRY(MbxWriteRows(context, scratch, file, values.sampleCount, values.rowSize, fill, &count));
    return MbxReportBytes(count, written, accumulated);
}

MbxStatus MbxWriteTrunBox(MbxContext* context, const MbxScratch* scratch, const MbxOptions* options,
                          MbxFile* file, uint64_t position, const MbxTrunBox* box, uint64_t* written,
                          uint64_t* accumulated) {
    return MbxWriteBox(context, options, file, position, MbxCode("trun"), box,
                       MbxWithScratch(scratch, MbxWriteTrunPayload), written, accumulated);
}

MbxStatus MbxFreeTrun(MbxContext* context, MbxTrunBox* box) {
    return MbxFreeBox(context, box);
}
