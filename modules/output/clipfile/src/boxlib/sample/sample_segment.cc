#include "boxlib/sample/sample_segment.h"

#include "boxlib/entry/codec_config.h"
#include "boxlib/sample/sample_group_model.h"

namespace {

// Empty tables; the sign of the composition offsets stays.
void clearTables(MbxSampleSegment* segment) {
    constexpr MbxBlockList kEmpty = {MBX_BLOCK_CAPACITY, nullptr, nullptr};
    segment->durations = {kEmpty, nullptr};
    segment->compositionOffsets.runs = {kEmpty, nullptr};
    segment->chunks = {0, 0, 0, 0, kEmpty, nullptr};
    segment->sizes = {0, 0, kEmpty};
    segment->chunkOffsets = {0, kEmpty};
    segment->syncSamples = {0, kEmpty};
    segment->dependencies = {nullptr, nullptr, {0, 0}, 0, kEmpty};
    segment->auxSizes = {0, 0, kEmpty};
    segment->auxOffsets = kEmpty;
    segment->trickBytes = kEmpty;
}

MbxStatus newSegment(MbxContext* context, uint64_t firstDecodeTime, MbxSampleSegment** segment) {
    MBX_TRY(MbxNew(context, segment));
    (*segment)->firstDecodeTime = firstDecodeTime;
    (*segment)->earliestPresentation = MBX_NO_PRESENTATION;
    clearTables(*segment);
    return MBX_OK;
}

void appendSegment(MbxTrack* track, MbxSampleSegment* segment) {
    track->sealedSegment = track->segments.last;
    MbxListAppend(&track->segments, segment);
    track->segmentCount++;
    track->fragmentIndex.capacity = MBX_BLOCK_CAPACITY;
}

// The segments that one track is to get.
MbxStatus newTrackSegments(MbxContext* context, const MbxTrack* track, MbxList<MbxSampleSegment>* segments) {
    const MbxSampleSegment* previous = track->segments.last;
    MbxSampleSegment* segment = nullptr;
    if (previous == nullptr) {
        MBX_TRY(newSegment(context, track->baseDecodeTime, &segment));
        MbxListAppend(segments, segment);
        previous = segment;
    }
    if (previous->decodeDuration > UINT64_MAX - previous->firstDecodeTime) return MBX_ERR_OVERFLOW;
    MBX_TRY(newSegment(context, previous->firstDecodeTime + previous->decodeDuration, &segment));
    segment->compositionOffsets.signedOffsets = previous->compositionOffsets.signedOffsets;
    MbxListAppend(segments, segment);
    return MBX_OK;
}

MbxStatus freeSegment(MbxContext* context, MbxSampleSegment* segment) {
    return MbxFreeBox(context, segment, [&] { return MbxReleaseSegment(context, segment); });
}

}  // namespace

MbxStatus MbxRequireSegment(MbxContext* context, MbxTrack* track) {
    if (track->segments.last != nullptr) return MBX_OK;
    MbxSampleSegment* segment = nullptr;
    MBX_TRY(newSegment(context, track->baseDecodeTime, &segment));
    appendSegment(track, segment);
    return MBX_OK;
}

MbxSampleSegment* MbxFindSegment(const MbxTrack* track, uint32_t fragment) {
    if (fragment >= track->segmentCount) return nullptr;
    // The last two are what a recording asks for.
    if (fragment == track->segmentCount - 1) return track->segments.last;
    if (fragment + 2 == track->segmentCount) return track->sealedSegment;
    MbxSampleSegment* segment = track->segments.first;
    while (fragment-- != 0) segment = segment->next;
    return segment;
}

MbxStatus MbxAppendSegments(MbxContext* context, MbxMovie* movie) {
    // All are made before any is hung on its track, in the order of the tracks.
    MbxList<MbxSampleSegment> made = {};
    MbxStatus status = MBX_OK;
    for (const MbxTrack* track = movie->tracks.first; track != nullptr && status == MBX_OK;
         track = track->next) {
        status = newTrackSegments(context, track, &made);
    }
    if (status != MBX_OK) {
        MBX_TRY(MbxFreeList(context, &made, freeSegment));
        return status;
    }
    for (MbxTrack* track = movie->tracks.first; track != nullptr; track = track->next) {
        const uint32_t count = track->segmentCount == 0 ? 2 : 1;
        for (uint32_t i = 0; i < count; i++) {
            MbxSampleSegment* segment = made.first;
            made.first = segment->next;
            segment->next = nullptr;
            appendSegment(track, segment);
        }
    }
    return MBX_OK;
}

MbxStatus MbxFragmentCount(const MbxMovie* movie, uint32_t* count) {
    if (movie == nullptr || count == nullptr) return MBX_ERR_INVALID_ARG;
    uint32_t longest = 0;
    for (const MbxTrack* track = movie->tracks.first; track != nullptr; track = track->next) {
        if (track->segmentCount > longest) longest = track->segmentCount;
    }
    const uint32_t fragments = longest != 0 ? longest - 1 : 0;
    if (fragments != 0 && fragments != movie->fragmentCount) return MBX_ERR_INTERNAL;
    *count = fragments;
    return MBX_OK;
}

bool MbxSegmentHasSamples(const MbxSampleSegment* segment) {
    return segment != nullptr && (segment->sizes.count != 0 || segment->releasedSamples != 0);
}

MbxStatus MbxReleaseSegment(MbxContext* context, MbxSampleSegment* segment) {
    for (const MbxBlock* block = segment->auxSizes.list.first; block != nullptr; block = block->next) {
        const auto* entries = MbxBlockEntries<MbxAuxSize>(block);
        for (uint32_t i = 0; i < block->count; i++) MbxFree(context, entries[i].data);
    }
    MbxBlockListRelease(context, &segment->durations.list);
    MbxBlockListRelease(context, &segment->compositionOffsets.runs.list);
    MbxBlockListRelease(context, &segment->chunks.list);
    MbxBlockListRelease(context, &segment->sizes.list);
    MbxBlockListRelease(context, &segment->chunkOffsets.list);
    MbxBlockListRelease(context, &segment->syncSamples.list);
    MbxBlockListRelease(context, &segment->dependencies.list);
    MbxBlockListRelease(context, &segment->auxSizes.list);
    MbxBlockListRelease(context, &segment->auxOffsets);
    MbxBlockListRelease(context, &segment->trickBytes);
    segment->releasedSamples += segment->sizes.count;
    clearTables(segment);
    MBX_TRY(MbxFreeAvcConfig(context, segment->avcConfig));
    segment->avcConfig = nullptr;
    return MbxReleaseSampleGroups(context, segment);
}

MbxStatus MbxFreeSegments(MbxContext* context, MbxTrack* track) {
    MBX_TRY(MbxFreeList(context, &track->segments, freeSegment));
    track->sealedSegment = nullptr;
    track->segmentCount = 0;
    MbxBlockListRelease(context, &track->fragmentIndex);
    return MBX_OK;
}

namespace {

struct OffsetDelta {
    uint32_t byFragment;
    uint32_t fragmentIndex;
    uint32_t chunkIndex;
    int64_t delta;
};

// The first segment to shift, and the one behind the last. MBX_ERR_NOT_FOUND for a fragment that the track
// lacks.
MbxStatus selectSegments(const MbxTrack* track, const OffsetDelta& shift, MbxSampleSegment** first,
                         MbxSampleSegment** end) {
    *first = track->segments.first;
    *end = nullptr;
    if (shift.byFragment != 0 && shift.fragmentIndex == 0) {
        if (*first != nullptr) *first = (*first)->next;
        return MBX_OK;
    }
    if (shift.byFragment != 0) {
        *first = MbxFindSegment(track, shift.fragmentIndex);
        if (*first == nullptr) return MBX_ERR_NOT_FOUND;
    }
    if (*first != nullptr) *end = (*first)->next;
    return MBX_OK;
}

// Adds the delta to `count` offsets; returns whether one wrapped.
bool shiftOffsets(uint64_t* offsets, uint32_t count, int64_t delta) {
    const auto addend = static_cast<uint64_t>(delta);
    uint64_t wrapped = 0;
    for (uint32_t i = 0; i < count; i++) {
        const uint64_t shifted = offsets[i] + addend;
        wrapped |= delta < 0 ? shifted > offsets[i] : shifted < offsets[i];
        // Contract: shift-wraps-and-goes-on. Told at the end, with all offsets shifted.
        offsets[i] = shifted;
    }
    return wrapped != 0;
}

bool shiftSegment(MbxSampleSegment* segment, uint32_t chunkIndex, int64_t delta) {
    bool wrapped = false;
    uint32_t before = 0;
    for (MbxBlock* block = segment->chunkOffsets.list.first; block != nullptr; block = block->next) {
        auto* offsets = static_cast<uint64_t*>(block->data);
        if (chunkIndex == 0) {
            wrapped |= shiftOffsets(offsets, block->count, delta);
        } else if (chunkIndex > before && chunkIndex - before <= block->count) {
            wrapped |= shiftOffsets(offsets + (chunkIndex - before - 1), 1, delta);
        }
        before += block->count;
    }
    return wrapped;
}

MbxStatus checkShift(const MbxTrack* track, const OffsetDelta& shift) {
    MbxSampleSegment* segment = nullptr;
    MbxSampleSegment* end = nullptr;
    MBX_TRY(selectSegments(track, shift, &segment, &end));
    if (shift.chunkIndex == 0) return MBX_OK;
    if (segment == nullptr) return MBX_ERR_NOT_FOUND;
    for (; segment != end; segment = segment->next) {
        uint32_t chunks = 0;
        MBX_TRY(MbxBlockListCount(&segment->chunkOffsets.list, &chunks));
        if (shift.chunkIndex > chunks) return MBX_ERR_NOT_FOUND;
    }
    return MBX_OK;
}

}  // namespace

MbxStatus MbxApplyOffsetDelta(MbxContext* context, uint32_t byFragment, uint32_t trackIndex,
                              uint32_t fragmentIndex, uint32_t chunkIndex, int64_t delta,
                              const MbxList<MbxTrack>* tracks) {
    if (context == nullptr || tracks == nullptr) return MBX_ERR_INVALID_ARG;
    MbxTrack* first = tracks->first;
    if (trackIndex != 0) MBX_TRY(MbxListRequire(first, trackIndex, &first));
    const MbxTrack* end = trackIndex != 0 ? first->next : nullptr;
    const OffsetDelta shift = {byFragment, fragmentIndex, chunkIndex, delta};
    for (const MbxTrack* track = first; track != end; track = track->next) MBX_TRY(checkShift(track, shift));

    bool wrapped = false;
    for (const MbxTrack* track = first; track != end; track = track->next) {
        MbxSampleSegment* segment = nullptr;
        MbxSampleSegment* last = nullptr;
        MBX_TRY(selectSegments(track, shift, &segment, &last));
        for (; segment != last; segment = segment->next) wrapped |= shiftSegment(segment, chunkIndex, delta);
    }
    return wrapped ? MBX_ERR_OVERFLOW : MBX_OK;
}
