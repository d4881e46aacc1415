// Rows of a table that are composed as one block and written at once: in the session's scratch when they fit
// in it, otherwise in a temporary block of exactly their size.
#pragma once

#include "boxlib/core/stream.h"

struct MbxRows {
    uint8_t* data;       // null for no rows
    uint8_t* temporary;  // owned; null when the scratch holds them
};

// Takes room for `count` rows of `rowSize` bytes; its content is undefined. A null scratch, or one without
// memory, has room for none. MBX_ERR_NO_MEMORY.
inline MbxStatus MbxTakeRows(MbxContext* context, const MbxScratch* scratch, uint64_t count, uint64_t rowSize,
                             MbxRows* rows) {
    *rows = {};
    if (count == 0 || rowSize == 0) return MBX_OK;
    if (count > UINT32_MAX / rowSize) return MBX_ERR_NO_MEMORY;
    const uint64_t size = count * rowSize;
    if (scratch != nullptr && scratch->data != nullptr && size <= scratch->size) {
        rows->data = scratch->data;
        return MBX_OK;
    }
    MBX_TRY(MbxNewArray(context, size, &rows->temporary));
    rows->data = rows->temporary;
    return MBX_OK;
}

// Releases a temporary block. Safe to call twice.
inline void MbxReleaseRows(MbxContext* context, MbxRows* rows) {
    MbxFree(context, rows->temporary);
    *rows = {};
}

// Writes `count` rows of `rowSize` bytes where the stream stands: `fill(data)` composes all of them, so that
// it must set every byte.
template <typename Fill>
MbxStatus MbxWriteRows(MbxContext* context, const MbxScratch* scratch, MbxFile* file, uint64_t count,
                       uint64_t rowSize, Fill&& fill, uint64_t* accumulated) {
    MbxRows rows;
    MBX_TRY(MbxTakeRows(context, scratch, count, rowSize, &rows));
    MbxStatus status = rows.data != nullptr ? fill(rows.data) : MBX_OK;
    if (status == MBX_OK) {
        status = MbxWriteBytes(context, file, rows.data, count * rowSize, nullptr, accumulated);
    }
    MbxReleaseRows(context, &rows);
    return status;
}

// Composes rows in place, field behind field, most significant byte first.
struct MbxRowBytes {
    uint8_t* next;
};

inline void MbxAppend(MbxRowBytes* bytes, uint64_t value, uint32_t width) {
    for (uint32_t shift = 8 * width; shift != 0; shift -= 8) {
        *bytes->next++ = static_cast<uint8_t>(value >> (shift - 8));
    }
}

// Binds the scratch to a function that takes it behind the context, so that it has the shape that all boxes
// share.
template <typename... Rest>
auto MbxWithScratch(const MbxScratch* scratch,
                    MbxStatus (*function)(MbxContext*, const MbxScratch*, Rest...)) {
    return [=](MbxContext* context, Rest... rest) { return function(context, scratch, rest...); };
}
