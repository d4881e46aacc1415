#include "boxlib/sample/sample_cursor.h"

namespace {

template <typename Entry>
void settle(MbxBlockPosition* position) {
    while (position->block != nullptr && position->index == position->block->count) {
        position->block = position->block->next;
        position->index = 0;
    }
    position->entry =
        position->block != nullptr ? MbxBlockEntries<Entry>(position->block) + position->index : nullptr;
}

template <typename Entry>
MbxBlockPosition start(const MbxBlockList& list) {
    MbxBlockPosition position = {list.first, 0, nullptr, 0};
    settle<Entry>(&position);
    return position;
}

template <typename Entry>
void advance(MbxBlockPosition* position) {
    position->index++;
    position->used = 0;
    settle<Entry>(position);
}

template <typename Entry>
const Entry* entryAt(const MbxBlockPosition& position) {
    return static_cast<const Entry*>(position.entry);
}

MbxStatus stepRun(MbxBlockPosition* position, uint32_t* value) {
    const MbxRun* run = entryAt<MbxRun>(*position);
    if (run == nullptr) return MBX_ERR_NOT_FOUND;
    *value = run->value;
    if (++position->used == run->count) advance<MbxRun>(position);
    return MBX_OK;
}

template <typename Entry, typename Value>
MbxStatus stepEntry(MbxBlockPosition* position, Value* value) {
    const Entry* entry = entryAt<Entry>(*position);
    if (entry == nullptr) return MBX_ERR_NOT_FOUND;
    *value = *entry;
    advance<Entry>(position);
    return MBX_OK;
}

MbxStatus stepSize(MbxSampleCursor* cursor, uint32_t* size) {
    const MbxSizeList& sizes = cursor->segment->sizes;
    if (sizes.list.first != nullptr) return stepEntry<uint32_t>(&cursor->sizes, size);
    if (cursor->sampleNumber > sizes.count) return MBX_ERR_NOT_FOUND;
    *size = sizes.uniformSize;
    return MBX_OK;
}

MbxStatus stepDependency(MbxSampleCursor* cursor, uint8_t* dependency) {
    const MbxDependencyList& list = cursor->segment->dependencies;
    if (cursor->sampleNumber - 1 > list.runCount)
        return stepEntry<uint8_t>(&cursor->dependencies, dependency);
    const uint8_t* value = cursor->sampleNumber == 1 ? list.first : list.second;
    if (value == nullptr) return MBX_ERR_NOT_FOUND;
    *dependency = *value;
    return MBX_OK;
}

bool stepSync(MbxSampleCursor* cursor) {
    const MbxSyncList& syncs = cursor->segment->syncSamples;
    if (syncs.list.first == nullptr) return syncs.syncCount != 0;
    const uint32_t* next = entryAt<uint32_t>(cursor->syncSamples);
    if (next == nullptr || *next != cursor->sampleNumber) return false;
    advance<uint32_t>(&cursor->syncSamples);
    return true;
}

}  // namespace

void MbxStartCursor(const MbxTrack* track, const MbxSampleSegment* segment, MbxSampleCursor* cursor) {
    cursor->segment = segment;
    for (int i = 0; i < 3; i++) cursor->perSampleForced[i] = track->perSampleForced[i];
    cursor->sampleNumber = 1;
    cursor->chunkNumber = 1;
    cursor->durations = start<MbxRun>(segment->durations.list);
    cursor->sizes = start<uint32_t>(segment->sizes.list);
    cursor->chunks = start<MbxChunkRun>(segment->chunks.list);
    cursor->chunkOffsets = start<uint64_t>(segment->chunkOffsets.list);
    cursor->compositionOffsets = start<MbxRun>(segment->compositionOffsets.runs.list);
    cursor->dependencies = start<uint8_t>(segment->dependencies.list);
    cursor->syncSamples = start<uint32_t>(segment->syncSamples.list);
}

MbxStatus MbxStepChunk(MbxSampleCursor* cursor, uint32_t* samples) {
    const MbxChunkRun* run = entryAt<MbxChunkRun>(cursor->chunks);
    if (run == nullptr || cursor->chunkNumber > cursor->segment->chunks.chunkCount) return MBX_ERR_NOT_FOUND;
    *samples = run->samplesPerChunk;
    cursor->chunkNumber++;
    // A run goes on to where the next one begins, and the last one to the last chunk.
    MbxBlockPosition next = cursor->chunks;
    advance<MbxChunkRun>(&next);
    const MbxChunkRun* following = entryAt<MbxChunkRun>(next);
    if (following != nullptr && following->firstChunk == cursor->chunkNumber) cursor->chunks = next;
    return MBX_OK;
}

MbxStatus MbxStepChunkOffset(MbxSampleCursor* cursor, uint64_t* offset) {
    return stepEntry<uint64_t>(&cursor->chunkOffsets, offset);
}

MbxStatus MbxStepSample(MbxSampleCursor* cursor, MbxSampleValues* values) {
    uint8_t dependency = 0;
    MBX_TRY(stepRun(&cursor->durations, &values->duration));
    MBX_TRY(stepSize(cursor, &values->size));
    MBX_TRY(stepDependency(cursor, &dependency));
    MBX_TRY(stepRun(&cursor->compositionOffsets, &values->compositionOffset));
    values->flags = uint32_t{dependency} << 20 | (stepSync(cursor) ? 0 : MBX_SAMPLE_NON_SYNC);
    cursor->sampleNumber++;
    return MBX_OK;
}

MbxSampleDefaults MbxSegmentDefaults(const MbxSampleSegment* segment, const MbxSampleDefaults& fallback) {
    MbxSampleDefaults defaults = fallback;
    const auto* chunk = MbxBlockListFirst<MbxChunkRun>(&segment->chunks.list);
    if (chunk != nullptr) defaults.descriptionIndex = chunk->descriptionIndex;
    const auto* duration = MbxBlockListFirst<MbxRun>(&segment->durations.list);
    if (duration != nullptr) defaults.duration = duration->value;
    const auto* size = MbxBlockListFirst<uint32_t>(&segment->sizes.list);
    if (size != nullptr) {
        defaults.size = *size;
    } else if (segment->sizes.count != 0) {
        defaults.size = segment->sizes.uniformSize;
    }
    const bool listed = segment->syncSamples.list.first != nullptr;
    defaults.flags = listed || segment->syncSamples.syncCount == 0 ? MBX_SAMPLE_NON_SYNC : 0;
    return defaults;
}
