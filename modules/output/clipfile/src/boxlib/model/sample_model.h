// What is known about the samples of a track while the file is written: growing block lists, in run-length
// form wherever the data allows. `stbl` and the fragment boxes are made from them.
#pragma once

#include "boxlib/core/block_list.h"
#include "boxlib/core/buffer.h"
#include "boxlib/core/list.h"

struct MbxAvcConfig;
struct MbxGroupDescriptionParams;
struct MbxSampleGroupParams;
struct MbxSubSampleParams;

struct MbxRun {
    uint32_t count;
    uint32_t value;
};

struct MbxRunList {
    MbxBlockList list;  // of MbxRun
    MbxRun* last;       // the run written last; it stays valid across blocks
};

struct MbxCompositionList {
    uint32_t signedOffsets;  // 1: the offsets are signed, which is version 1 of `ctts` and `trun`
    MbxRunList runs;
};

struct MbxChunkRun {
    uint32_t firstChunk;
    uint32_t samplesPerChunk;
    uint32_t descriptionIndex;
};

struct MbxChunkState {
    uint32_t firstChunk;        // number of the open chunk
    uint32_t samplesInChunk;    // not 0: a chunk is open
    uint32_t descriptionIndex;  // of the open chunk
    uint32_t chunkCount;        // closed chunks
    MbxBlockList list;          // of MbxChunkRun
    MbxChunkRun* last;
};

struct MbxSizeList {
    uint32_t uniformSize;  // size of all samples so far, 0 once the list is in use
    uint32_t count;        // samples so far, whichever form holds their sizes
    MbxBlockList list;     // of uint32_t; empty while all sizes are equal
};

struct MbxChunkOffsetList {
    uint32_t firstSampleOfChunk;  // samples before the open chunk
    MbxBlockList list;            // of uint64_t
};

struct MbxSyncList {
    uint32_t syncCount;
    MbxBlockList list;  // of uint32_t sample numbers; empty while all samples are sync samples
};

struct MbxDependencyList {
    uint8_t* first;   // into `store`, null without a sample
    uint8_t* second;  // into `store`, null before the second sample
    uint8_t store[2];
    uint32_t runCount;  // samples that hold the second value, the second sample included
    MbxBlockList list;  // of uint8_t, for all that follow
};

struct MbxAuxSize {
    uint8_t size;
    uint8_t* data;  // owned; null when size is 0
};

struct MbxAuxSizeList {
    uint8_t defaultSize;  // size of all entries so far, 0 for good once two differ
    uint32_t count;
    MbxBlockList list;  // of MbxAuxSize
};

struct MbxAuxOffset {
    uint32_t sampleNumber;  // 1-based number of the first entry that stands there
    uint64_t offset;
};

// Bits of MbxSampleSegment::overridesSet.
enum MbxOverride : uint32_t {
    MBX_OVERRIDE_BASE_OFFSET = 1,
    MBX_OVERRIDE_DESCRIPTION = 2,
    MBX_OVERRIDE_DURATION = 8,
    MBX_OVERRIDE_SIZE = 16,
    MBX_OVERRIDE_FLAGS = 32,
};

// Values that a caller fixed for the `tfhd` of one segment.
struct MbxSegmentOverrides {
    uint64_t baseDataOffset;
    uint32_t descriptionIndex;
    uint32_t duration;
    uint32_t size;
    uint32_t flags;
};

constexpr int64_t MBX_NO_PRESENTATION = INT64_MAX;

// The samples of one track in `moov`, or in one fragment.
struct MbxSampleSegment {
    uint64_t fragmentOffset;       // position of the segment's `moof` in the file
    uint64_t firstDecodeTime;      // in ticks of the track, as are the two that follow
    int64_t earliestPresentation;  // MBX_NO_PRESENTATION without a sample
    uint64_t decodeDuration;       // sum of the sample durations
    uint32_t overridesSet;         // MbxOverride bits
    MbxSegmentOverrides overrides;
    MbxRunList durations;                                  // `stts`
    MbxCompositionList compositionOffsets;                 // `ctts`
    MbxChunkState chunks;                                  // `stsc`
    MbxSizeList sizes;                                     // `stsz`
    MbxChunkOffsetList chunkOffsets;                       // `stco`, `co64`
    MbxSyncList syncSamples;                               // `stss`
    MbxDependencyList dependencies;                        // `sdtp`
    MbxAuxSizeList auxSizes;                               // `saiz`, and the bytes of `senc`
    MbxBlockList auxOffsets;                               // of MbxAuxOffset: `saio`
    MbxBlockList trickBytes;                               // of uint8_t: `trik`
    MbxList<MbxSubSampleParams> subSamples;                // `subs`
    MbxList<MbxSampleGroupParams> sampleGroups;            // `sbgp`
    MbxAvcConfig* avcConfig;                               // `avcn`, owned
    MbxList<MbxGroupDescriptionParams> groupDescriptions;  // `sgpd`
    uint32_t releasedSamples;                              // held by the tables when they were released
    MbxSampleSegment* next;
};

// One row of a track's fragment index (`tfra`).
struct MbxFragmentIndexEntry {
    uint64_t time;           // decode time of the sample, in ticks of the track
    uint32_t fragmentIndex;  // 1-based, as are the following
    uint32_t trackIndex;
    uint32_t trunNumber;
    uint32_t sampleNumber;  // within its `trun`
};
