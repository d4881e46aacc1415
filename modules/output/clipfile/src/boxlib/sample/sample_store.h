// The accumulators of a segment: each takes one value per sample and keeps it in run-length form where the
// data allows. MBX_ERR_NO_MEMORY leaves the accumulator as it was.
#pragma once

#include "boxlib/model/model.h"
#include "boxlib/model/session_model.h"

// Extends the last run when it has that value, else begins one.
MbxStatus MbxAddRun(MbxContext* context, MbxRunList* runs, uint32_t value);

// Adds the chunk that is open to the runs, and closes it. A chunk like the one before costs no entry.
// MBX_ERR_BAD_STATE when none is open.
MbxStatus MbxCloseChunk(MbxContext* context, MbxChunkState* chunks);

// Adds a size. Equal sizes only count; the first different one spills them into the list. A size of 0 is
// listed from the start, since a `sample_size` of 0 means that the sizes follow.
MbxStatus MbxAddSize(MbxContext* context, MbxSizeList* sizes, uint32_t size);

// Adds whether sample `number` (1-based) is a sync sample. The list comes into use with the first difference.
MbxStatus MbxAddSync(MbxContext* context, MbxSyncList* syncs, uint32_t number, bool isSync);

// Adds `count` samples with the same dependency byte.
MbxStatus MbxAddDependency(MbxContext* context, MbxDependencyList* dependencies, uint8_t dependency,
                           uint32_t count);

// Adds the size of a sample's auxiliary information and a copy of its bytes.
MbxStatus MbxAddAuxSize(MbxContext* context, MbxAuxSizeList* auxSizes, uint8_t size, const uint8_t* data);

// The inner form of MbxAddSample. No operation rolls back: after MBX_ERR_NO_MEMORY the sample stands in some
// tables and not in others, and the file is lost.
MbxStatus MbxAddSample(MbxContext* context, MbxSession* session, uint32_t trackIndex,
                       const MbxSampleInfo* sample, uint32_t startsFragmentIndexEntry);

// The inner form of MbxEndChunk.
MbxStatus MbxEndChunk(MbxContext* context, MbxSession* session, uint32_t trackIndex);

// Makes composition offsets of the track signed, or not. MBX_ERR_INVALID_ARG for a word above 1,
// MBX_ERR_BAD_STATE once the track has a fragment or a sample with a composition offset.
MbxStatus MbxTrackSetSignedOffsets(MbxContext* context, MbxTrack* track, uint32_t signedOffsets);
