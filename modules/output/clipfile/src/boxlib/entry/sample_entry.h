// Sample entries of a track, before boxes are made from them.
#pragma once

#include "boxlib/core/context.h"
#include "boxlib/model/entry_model.h"

// A new sample entry: kind, code, and the parameters that the kind uses. All bytes are copied.
struct MbxSampleEntryRequest {
    uint32_t kind;                    // MbxEntryKind
    uint32_t code;                    // kinds 4, 5 and 7 to 10; the others have a code of their own
    uint32_t dataReferenceIndex;      // 1-based
    MbxVisualEntryParams visual;      // kinds 1, 2, 11
    MbxAudioEntryParams audio;        // kind 3
    MbxGraphicsEntry graphics;        // kinds 8, 9
    const char* texts[3];             // kind 10, with terminator or cut at the size
    uint64_t textSizes[3];            // in bytes
    const MbxBtrtParams* btrt;        // kind 10, null for none
    MbxTimecodeEntryParams timecode;  // kind 12
};

// Appends an entry to the list; `index` receives the new number of entries. MBX_ERR_INTERNAL for an unknown
// kind, MBX_ERR_NO_MEMORY; both leave the list as it was.
MbxStatus MbxAddSampleEntry(MbxContext* context, MbxSampleEntryList* list,
                            const MbxSampleEntryRequest* request, uint32_t* index);

// Releases all entries with what they own and leaves the list empty.
MbxStatus MbxReleaseSampleEntries(MbxContext* context, MbxSampleEntryList* list);
