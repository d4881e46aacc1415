// `stsd`: the sample entries of a track.
#pragma once

#include "boxlib/entry/audio_entry.h"
#include "boxlib/entry/timed_data_entry.h"
#include "boxlib/entry/visual_entry.h"

// One entry of any kind, of which one pointer is set.
struct MbxSampleEntryBox {
    uint32_t kind;  // MbxEntryKind
    union {
        MbxVisualEntryBox* visual;      // kinds 1, 2, 11
        MbxAudioEntryBox* audio;        // kind 3
        MbxSystemsEntryBox* systems;    // kind 4
        MbxPlainEntryBox* plain;        // kinds 5, 7
        MbxMetaEntryBox* meta;          // kind 6
        MbxGraphicsEntryBox* graphics;  // kinds 8, 9
        MbxTextEntryBox* text;          // kind 10
        MbxTimecodeEntryBox* timecode;  // kind 12
    } body;
    MbxSampleEntryBox* next;
};

struct MbxStsdBox {
    uint64_t size;
    uint32_t version;
    MbxList<MbxSampleEntryBox> entries;
};

// `stsd`, mandatory in `stbl`. Version 1 when the list's version is 1, otherwise 0; audio entries take it
// over. `timescale` is that of the track, from which they take the sample rate. The entries are borrowed.
// MBX_ERR_INTERNAL for an unknown kind.
MbxStatus MbxBuildStsd(MbxContext* context, const MbxOptions* options, uint32_t timescale,
                       const MbxSampleEntryList* entries, MbxStsdBox* box);
MbxStatus MbxWriteStsdPayload(MbxContext* context, const MbxOptions* options, MbxFile* file,
                              uint64_t position, const MbxStsdBox* box, uint64_t* written,
                              uint64_t* accumulated);
MbxStatus MbxWriteStsdBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxStsdBox* box, uint64_t* written, uint64_t* accumulated);
MbxStatus MbxFreeStsd(MbxContext* context, MbxStsdBox* box);
