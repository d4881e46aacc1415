// The payload that most sample tables share: version and flags, the entry count, then the entries.
#pragma once

#include "boxlib/core/box.h"

// Writes a block list that way, with MbxWriteTable's `convert(entry, row)`.
template <typename Entry, typename Cell, uint32_t cells, typename Convert>
MbxStatus MbxWriteCountedTable(MbxContext* context, MbxFile* file, uint64_t position, uint32_t version,
                               const MbxBlockList* list, Convert&& convert, uint64_t* written,
                               uint64_t* accumulated) {
    uint32_t entries = 0;
    MBX_TRY(MbxBlockListCount(list, &entries));
    MbxBytes bytes;
    MbxBeginBytes(context, &bytes);
    MbxPutVersionFlags(&bytes, version, 0);
    MbxPut32(&bytes, entries);  // unsigned int(32) entry_count

    uint64_t count = 0;
    MBX_TRY(MbxSeek(context, file, position));
    MBX_TRY(MbxWriteComposed(context, file, &bytes, &count));
    MBX_TRY((MbxWriteTable<Entry, Cell, cells>(context, file, list, convert, &count)));
    return MbxReportBytes(count, written, accumulated);
}
