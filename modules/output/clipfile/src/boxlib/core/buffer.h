// The owned byte holder of every variable payload.
#pragma once

#include "boxlib/core/context.h"

// Null `data` with `size` 0 is empty.
struct MbxBuffer {
    uint8_t* data;
    uint64_t size;
};

// Releases what the buffer holds, then takes a copy. As bytes (`asText` 0) it copies `length` bytes. As text
// it copies up to the terminator within `length`, or all of `length` when there is none, and adds a
// terminator that `size` counts. A length of 0 leaves the buffer empty. MBX_ERR_INVALID_ARG for a null
// context or buffer, or a length without a source; MBX_ERR_NO_MEMORY leaves the buffer empty.
MbxStatus MbxBufferAssign(MbxContext* context, uint32_t asText, MbxBuffer* buffer, const void* source,
                          uint64_t length);

// As MbxBufferAssign as text, but an empty text stores its terminator alone.
MbxStatus MbxBufferAssignText(MbxContext* context, MbxBuffer* buffer, const void* source, uint64_t length);

// Releases the bytes and leaves the buffer empty. Safe to call twice.
void MbxBufferRelease(MbxContext* context, MbxBuffer* buffer);
