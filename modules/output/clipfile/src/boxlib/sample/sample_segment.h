// The life of a track's sample segments: the first holds what `moov` reports, each later one what one
// fragment reports. Fragment numbers are 1-based; number 0 is the part in `moov`.
#pragma once

#include "boxlib/model/model.h"

// Makes the track's first segment when there is none; it starts at the track's base time.
MbxStatus MbxRequireSegment(MbxContext* context, MbxTrack* track);

// The track's segment of a fragment, or with number 0 the first one; null when the track has none.
MbxSampleSegment* MbxFindSegment(const MbxTrack* track, uint32_t fragment);

// Makes one more segment for every track of the movie, and the first one too where a track has none. Nothing
// changes on failure: MBX_ERR_NO_MEMORY, or MBX_ERR_OVERFLOW when a decode time leaves 64 bits.
MbxStatus MbxAppendSegments(MbxContext* context, MbxMovie* movie);

// The number of the open fragment, from the track with the longest chain of segments; 0 for a movie that is
// not fragmented. MBX_ERR_INVALID_ARG for a null argument, MBX_ERR_INTERNAL when it disagrees with the
// movie's count.
MbxStatus MbxFragmentCount(const MbxMovie* movie, uint32_t* count);

// Whether the segment has or, before it was released, had samples; false for null.
bool MbxSegmentHasSamples(const MbxSampleSegment* segment);

// Releases the tables of a segment; its times and position stay, and so does the number of samples it had.
MbxStatus MbxReleaseSegment(MbxContext* context, MbxSampleSegment* segment);

// Releases all segments of a track, and its fragment index. Safe to call twice.
MbxStatus MbxFreeSegments(MbxContext* context, MbxTrack* track);

// Adds `delta` to chunk offsets: of the track with that number, or with 0 of all. With `byFragment` 0 it
// treats what `moov` reports; otherwise one fragment, or with `fragmentIndex` 0 all. With `chunkIndex` 0 it
// treats all chunks of a segment. MBX_ERR_NOT_FOUND for a track, fragment or chunk beyond the end, before
// anything is shifted; MBX_ERR_OVERFLOW when an offset wrapped, after all are shifted.
MbxStatus MbxApplyOffsetDelta(MbxContext* context, uint32_t byFragment, uint32_t trackIndex,
                              uint32_t fragmentIndex, uint32_t chunkIndex, int64_t delta,
                              const MbxList<MbxTrack>* tracks);
