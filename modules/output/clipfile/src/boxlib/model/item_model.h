// Items and further movie-level parameters as the movie keeps them. The library attaches no meaning to them.
#pragma once

#include "boxlib/core/buffer.h"
#include "boxlib/core/list.h"

struct MbxHandler;

struct MbxAinfParams {
    uint32_t flags;  // low 24 bits
    uint32_t profileVersion;
    MbxBuffer apid;  // a text, terminator included
};

struct MbxIodsParams {
    uint16_t objectDescriptorId;  // low 10 bits
    uint8_t includeInlineProfileLevelFlag;
    uint8_t profileLevels[5];  // object descriptors, scene, sound, pictures, graphics
    uint32_t trackId;          // the one track of the descriptor
};

struct MbxXmlParams {
    MbxBuffer text;
};

struct MbxIlocExtent {
    uint64_t index;  // written in version 1
    uint64_t offset;
    uint64_t length;
    MbxIlocExtent* next;
};

struct MbxIlocItem {
    uint16_t itemId;
    uint8_t constructionMethod;  // four bits, written in version 1
    uint16_t dataReferenceIndex;
    uint64_t baseOffset;
    MbxList<MbxIlocExtent> extents;
    MbxIlocItem* next;
};

// The sizes are in bytes: 0, 4 or 8.
struct MbxIlocParams {
    uint8_t version;
    uint8_t offsetSize;
    uint8_t lengthSize;
    uint8_t baseOffsetSize;
    uint8_t indexSize;  // counts in version 1
    MbxList<MbxIlocItem> items;
};

struct MbxItemData {
    MbxBuffer bytes;
    MbxItemData* next;
};

struct MbxIdatParams {
    MbxList<MbxItemData> ranges;  // written back to back
};

struct MbxMetaParams {
    MbxHandler* handler;  // owned, required
    MbxXmlParams* xml;    // owned, null for none, as are the following
    MbxIlocParams* iloc;
    MbxIdatParams* idat;
};

// Release the parameters with what they own. MBX_ERR_INVALID_ARG for a null context; a null record is MBX_OK.
MbxStatus MbxFreeAinfParams(MbxContext* context, MbxAinfParams* params);
MbxStatus MbxFreeIodsParams(MbxContext* context, MbxIodsParams* params);
MbxStatus MbxFreeMetaParams(MbxContext* context, MbxMetaParams* params);
