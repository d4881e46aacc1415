#include "boxlib/sample/sample_store.h"

#include "boxlib/sample/sample_segment.h"

MbxStatus MbxAddRun(MbxContext* context, MbxRunList* runs, uint32_t value) {
    if (runs->last != nullptr && runs->last->value == value) {
        runs->last->count++;
        return MBX_OK;
    }
    return MbxBlockListAppend(context, &runs->list, MbxRun{1, value}, &runs->last);
}

MbxStatus MbxCloseChunk(MbxContext* context, MbxChunkState* chunks) {
    if (chunks->samplesInChunk == 0) return MBX_ERR_BAD_STATE;
    const MbxChunkRun* last = chunks->last;
    if (last == nullptr || last->samplesPerChunk != chunks->samplesInChunk ||
        last->descriptionIndex != chunks->descriptionIndex) {
        const MbxChunkRun run = {chunks->firstChunk, chunks->samplesInChunk, chunks->descriptionIndex};
        MBX_TRY(MbxBlockListAppend(context, &chunks->list, run, &chunks->last));
    }
    chunks->chunkCount++;
    chunks->samplesInChunk = 0;
    return MBX_OK;
}

namespace {

// Brings a list into use for what went before in run form: `count` entries, each from `value(index)`, then
// `entry`.
template <typename Value>
MbxStatus spill(MbxContext* context, MbxBlockList* list, uint32_t count, Value&& value, uint32_t entry) {
    MbxStatus status = MBX_OK;
    for (uint32_t i = 0; i < count && status == MBX_OK; i++) {
        status = MbxBlockListAppend<uint32_t>(context, list, value(i), nullptr);
    }
    if (status == MBX_OK) status = MbxBlockListAppend<uint32_t>(context, list, entry, nullptr);
    if (status != MBX_OK) MbxBlockListRelease(context, list);
    return status;
}

}  // namespace

MbxStatus MbxAddSize(MbxContext* context, MbxSizeList* sizes, uint32_t size) {
    if (sizes->list.first != nullptr) {
        MBX_TRY(MbxBlockListAppend<uint32_t>(context, &sizes->list, size, nullptr));
    } else if (sizes->count == 0 && size != 0) {
        sizes->uniformSize = size;
    } else if (sizes->count == 0 || size != sizes->uniformSize) {
        const uint32_t uniform = sizes->uniformSize;
        MBX_TRY(spill(
            context, &sizes->list, sizes->count, [=](uint32_t) { return uniform; }, size));
        sizes->uniformSize = 0;
    }
    sizes->count++;
    return MBX_OK;
}

MbxStatus MbxAddSync(MbxContext* context, MbxSyncList* syncs, uint32_t number, bool isSync) {
    const bool inUse = syncs->list.first != nullptr;
    if (isSync) {
        if (inUse || (syncs->syncCount == 0 && number != 1)) {
            MBX_TRY(MbxBlockListAppend<uint32_t>(context, &syncs->list, number, nullptr));
        }
        syncs->syncCount++;
        return MBX_OK;
    }
    if (inUse || syncs->syncCount == 0 || number < 2) return MBX_OK;
    const auto sampleNumber = [](uint32_t index) { return index + 1; };
    return spill(context, &syncs->list, number - 2, sampleNumber, number - 1);
}

MbxStatus MbxAddDependency(MbxContext* context, MbxDependencyList* dependencies, uint8_t dependency,
                           uint32_t count) {
    if (count != 0 && dependencies->first == nullptr) {
        dependencies->store[0] = dependency;
        dependencies->first = &dependencies->store[0];
        count--;
    }
    if (count != 0 && dependencies->second == nullptr) {
        dependencies->store[1] = dependency;
        dependencies->second = &dependencies->store[1];
        dependencies->runCount = 1;
        count--;
    }
    if (count != 0 && dependencies->list.first == nullptr && dependency == *dependencies->second) {
        dependencies->runCount += count;
        return MBX_OK;
    }
    for (; count != 0; count--) {
        MBX_TRY(MbxBlockListAppend<uint8_t>(context, &dependencies->list, dependency, nullptr));
    }
    return MBX_OK;
}

MbxStatus MbxAddAuxSize(MbxContext* context, MbxAuxSizeList* auxSizes, uint8_t size, const uint8_t* data) {
    MbxAuxSize entry = {size, nullptr};
    if (size != 0) {
        if (data == nullptr) return MBX_ERR_INVALID_ARG;
        MBX_TRY(MbxNewArray(context, size, &entry.data));
    }
    MbxStatus status = size != 0 ? MbxCopy(context, entry.data, size, data, size) : MBX_OK;
    if (status == MBX_OK) status = MbxBlockListAppend(context, &auxSizes->list, entry, nullptr);
    if (status != MBX_OK) {
        MbxFree(context, entry.data);
        return status;
    }
    if (auxSizes->count == 0) {
        auxSizes->defaultSize = size;
    } else if (size != auxSizes->defaultSize) {
        auxSizes->defaultSize = 0;
    }
    auxSizes->count++;
    return MBX_OK;
}

namespace {

// The track by its number; to one who adds a sample, one that does not exist is MBX_ERR_BAD_STATE.
MbxStatus findTrack(const MbxSession* session, uint32_t index, MbxTrack** track) {
    if (session->movie == nullptr) return MBX_ERR_BAD_STATE;
    MBX_TRY(MbxListAt(session->movie->tracks.first, index, track));
    return *track != nullptr ? MBX_OK : MBX_ERR_BAD_STATE;
}

bool hasEntry(const MbxTrack* track, uint32_t index) {
    const MbxSampleEntry* entry = track->sampleEntries.entries.first;
    while (entry != nullptr && index > 1) {
        entry = entry->next;
        index--;
    }
    return entry != nullptr && index == 1;
}

// A composition offset is signed in a segment that says so. A time beyond the signed range stays at its end.
int64_t presentationTime(uint64_t decodeTime, int32_t offset, uint32_t signedOffsets) {
    if (signedOffsets == 1 && offset < 0) {
        const uint64_t back = 0 - static_cast<uint64_t>(int64_t{offset});
        if (decodeTime < back) return -static_cast<int64_t>(back - decodeTime);
        decodeTime -= back;
    } else {
        const uint64_t ahead = static_cast<uint32_t>(offset);
        decodeTime = decodeTime <= UINT64_MAX - ahead ? decodeTime + ahead : UINT64_MAX;
    }
    return decodeTime < INT64_MAX ? static_cast<int64_t>(decodeTime) : INT64_MAX;
}

MbxStatus checkTimes(const MbxSampleSegment* segment, const MbxSampleInfo* sample) {
    const uint64_t room = UINT64_MAX - segment->decodeDuration;
    if (sample->duration > room) return MBX_ERR_OVERFLOW;
    if (sample->compositionOffset < 0 && segment->compositionOffsets.signedOffsets == 1) return MBX_OK;
    return static_cast<uint32_t>(sample->compositionOffset) <= room ? MBX_OK : MBX_ERR_OVERFLOW;
}

MbxStatus openChunk(MbxContext* context, const MbxTrack* track, MbxSampleSegment* segment,
                    const MbxSampleInfo* sample) {
    MBX_TRY(MbxBlockListAppend(context, &segment->chunkOffsets.list, sample->offset, nullptr));
    segment->chunkOffsets.firstSampleOfChunk = segment->sizes.count;
    if (track->auxEnabled == 0) return MBX_OK;
    const MbxAuxOffset entry = {segment->auxSizes.count + 1, sample->auxOffset};
    return MbxBlockListAppend(context, &segment->auxOffsets, entry, nullptr);
}

MbxStatus addIndexEntry(MbxContext* context, const MbxMovie* movie, uint32_t trackIndex, MbxTrack* track,
                        const MbxSampleSegment* segment, uint64_t time) {
    MbxFragmentIndexEntry entry = {};
    MBX_TRY(MbxFragmentCount(movie, &entry.fragmentIndex));
    if (entry.fragmentIndex == 0) return MBX_ERR_INTERNAL;
    entry.time = time;
    entry.trackIndex = trackIndex;
    entry.trunNumber = segment->chunks.chunkCount + 1;
    entry.sampleNumber = segment->chunks.samplesInChunk + 1;
    return MbxBlockListAppend(context, &track->fragmentIndex, entry, nullptr);
}

}  // namespace

// Contract: sample-of-no-track. Bad state, where other operations do not find the track.
MbxStatus MbxAddSample(MbxContext* context, MbxSession* session, uint32_t trackIndex,
                       const MbxSampleInfo* sample, uint32_t startsFragmentIndexEntry) {
    if (context == nullptr || session == nullptr || sample == nullptr) return MBX_ERR_INVALID_ARG;
    MbxTrack* track = nullptr;
    MBX_TRY(findTrack(session, trackIndex, &track));
    if (track->auxEnabled != 0 && sample->auxSize != 0 && sample->auxData == nullptr)
        return MBX_ERR_INVALID_ARG;
    MBX_TRY(MbxRequireSegment(context, track));
    MbxSampleSegment* segment = track->segments.last;
    if (!hasEntry(track, sample->descriptionIndex)) return MBX_ERR_BAD_STATE;
    if (segment->sizes.count == UINT32_MAX) return MBX_ERR_OVERFLOW;
    MBX_TRY(checkTimes(segment, sample));

    const int64_t presentation =
        presentationTime(segment->firstDecodeTime + segment->decodeDuration, sample->compositionOffset,
                         segment->compositionOffsets.signedOffsets);
    MbxChunkState* chunks = &segment->chunks;
    if (chunks->samplesInChunk == 0) MBX_TRY(openChunk(context, track, segment, sample));
    if (startsFragmentIndexEntry != 0 && segment != track->segments.first) {
        const uint64_t time = startsFragmentIndexEntry == MBX_INDEX_ROW_OF_PRESENTATION
                                  ? static_cast<uint64_t>(presentation > 0 ? presentation : 0)
                                  : segment->firstDecodeTime + segment->decodeDuration;
        MBX_TRY(addIndexEntry(context, session->movie, trackIndex, track, segment, time));
    }
    MBX_TRY(MbxAddRun(context, &segment->durations, sample->duration));
    const auto offset = static_cast<uint32_t>(sample->compositionOffset);
    MBX_TRY(MbxAddRun(context, &segment->compositionOffsets.runs, offset));
    if (chunks->samplesInChunk == 0) {
        chunks->descriptionIndex = sample->descriptionIndex;
        chunks->firstChunk = chunks->chunkCount + 1;
    }
    chunks->samplesInChunk++;
    MBX_TRY(MbxAddSize(context, &segment->sizes, sample->size));
    MBX_TRY(MbxAddSync(context, &segment->syncSamples, segment->sizes.count, sample->isSync != 0));
    MBX_TRY(MbxAddDependency(context, &segment->dependencies, sample->dependency, 1));
    if (track->trickEnabled != 0) {
        const auto trick = static_cast<uint8_t>(sample->pictureType << 6 | (sample->dependencyLevel & 0x3F));
        MBX_TRY(MbxBlockListAppend(context, &segment->trickBytes, trick, nullptr));
    }
    if (track->auxEnabled != 0) {
        MBX_TRY(MbxAddAuxSize(context, &segment->auxSizes, sample->auxSize, sample->auxData));
    }
    if (presentation < segment->earliestPresentation) segment->earliestPresentation = presentation;
    segment->decodeDuration += sample->duration;
    return MBX_OK;
}

MbxStatus MbxEndChunk(MbxContext* context, MbxSession* session, uint32_t trackIndex) {
    if (context == nullptr || session == nullptr) return MBX_ERR_INVALID_ARG;
    MbxTrack* track = nullptr;
    MBX_TRY(MbxRequireTrack(session, trackIndex, &track));
    if (track->segments.last == nullptr) return MBX_ERR_BAD_STATE;
    return MbxCloseChunk(context, &track->segments.last->chunks);
}

MbxStatus MbxTrackSetSignedOffsets(MbxContext* context, MbxTrack* track, uint32_t signedOffsets) {
    if (context == nullptr || track == nullptr || signedOffsets > 1) return MBX_ERR_INVALID_ARG;
    MBX_TRY(MbxRequireSegment(context, track));
    MbxCompositionList* offsets = &track->segments.last->compositionOffsets;
    // Equal offsets share one run, so that more than one means that one differs from 0.
    const MbxRun* first = MbxBlockListFirst<MbxRun>(&offsets->runs.list);
    const bool hasOffsets = first != nullptr && (first->value != 0 || first != offsets->runs.last);
    if (track->sealedSegment != nullptr || hasOffsets) return MBX_ERR_BAD_STATE;
    offsets->signedOffsets = signedOffsets;
    return MBX_OK;
}
