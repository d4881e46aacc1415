// Reading a segment's tables back, sample by sample. A cursor is a plain value: copying it saves the
// position.
#pragma once

#include "boxlib/model/model.h"

// A position in one block list.
struct MbxBlockPosition {
    const MbxBlock* block;
    uint32_t index;     // in the block
    const void* entry;  // the entry there; null at the end of the list
    uint32_t used;      // how often the entry was given already, where it stands for a run
};

struct MbxSampleCursor {
    const MbxSampleSegment* segment;
    uint32_t perSampleForced[3];  // of the track: duration, size, flags
    uint32_t sampleNumber;        // 1-based number of the next sample in the segment
    uint32_t chunkNumber;         // the same of the next chunk
    MbxBlockPosition durations;
    MbxBlockPosition sizes;
    MbxBlockPosition chunks;
    MbxBlockPosition chunkOffsets;
    MbxBlockPosition compositionOffsets;
    MbxBlockPosition dependencies;
    MbxBlockPosition syncSamples;
};

// Flag of a sample that is not a sync sample (ISO/IEC 14496-12 8.8.3.1, sample_is_non_sync_sample).
constexpr uint32_t MBX_SAMPLE_NON_SYNC = 0x00010000;

// A cursor at the first sample of a segment.
void MbxStartCursor(const MbxTrack* track, const MbxSampleSegment* segment, MbxSampleCursor* cursor);

// Step over the next chunk: its number of samples and its offset. MBX_ERR_NOT_FOUND when the table ran out.
MbxStatus MbxStepChunk(MbxSampleCursor* cursor, uint32_t* samples);
MbxStatus MbxStepChunkOffset(MbxSampleCursor* cursor, uint64_t* offset);

// One sample as its tables tell it.
struct MbxSampleValues {
    uint32_t duration;
    uint32_t size;
    uint32_t flags;  // as in `trun`
    uint32_t compositionOffset;
};

// Steps over the next sample in all tables. MBX_ERR_NOT_FOUND when one of them ran out.
MbxStatus MbxStepSample(MbxSampleCursor* cursor, MbxSampleValues* values);

// What a segment says of its samples as a whole: the values of the first one, and whether they are sync
// samples. Values that it does not have are taken from `fallback`.
MbxSampleDefaults MbxSegmentDefaults(const MbxSampleSegment* segment, const MbxSampleDefaults& fallback);
