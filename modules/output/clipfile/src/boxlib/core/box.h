// The shape that all boxes share: measuring, header and payload, child records, release. It lives here once.
//
// A box is measured and written by the same code. Its payload writer is the one description of its bytes; run
// with a null file it only counts. There is no other size calculation, so sizes cannot drift from what is
// written.
//
// ---- How to write a box ----
//
// A box with the code xxxx is a plain record MbxXxxxBox, whose first field is `uint64_t size`: its total size
// on file, header included, set by its builder. Child boxes hang on pointers (null is absent) or on an
// MbxList, for which the child record ends in a `next` pointer. Values stand in the record; variable bytes
// are either owned (MbxBuffer) or borrowed from the model, which outlives the box. Four functions belong to
// it, with these arguments, of which `options` stands only where a child or a form needs it:
//
//   MbxStatus MbxBuildXxxx(context, options, const Params* params, MbxXxxxBox* box);
//     MBX_ERR_INVALID_ARG for a null argument (MbxAnyNull); copy the parameters; MbxMakeChild for each child;
//     MbxMeasureBox last. `box` comes in zeroed. After a failure MbxFreeXxxx releases it with whatever was
//     handed over by then.
//   MbxStatus MbxWriteXxxxPayload(context, options, file, position, box, written, accumulated);
//     Everything behind the header. A leaf composes one buffer and ends with MbxWriteFixedPayload. A parent
//     seeks, then calls each child by name (MbxWriteBoxes for a list), in the order of the file, at position
//     + count with &count as `accumulated`, and ends with MbxReportBytes(count, written, accumulated).
//   MbxStatus MbxWriteXxxxBox(context, options, file, position, box, written, accumulated);
//     One line: MbxWriteBox, or MbxWriteOptionalBox where a null record means that the box is absent.
//   MbxStatus MbxFreeXxxx(context, box);
//     One line: MbxFreeBox, with a function that releases what the record owns.
//
// The payload writer reads beside the standard: the clause stands above it (`// 8.2.2 Movie Header Box`), the
// syntax behind each field (`// unsigned int(32) timescale`), with what the field is set to where that
// differs.
//
// Rules for all of it:
// - First failure returns at once (MBX_TRY); what was handed to the parent goes with the parent.
// - Ownership passes by hanging the record on its parent and clearing the local pointer (MbxMakeChild does
//   both).
// - All memory comes from MbxNew, MbxNewArray, MbxBufferAssign or MbxAlloc in class MBX_MEMORY_CLASS.
//   Copying, comparing and clearing go through the context (MbxCopy, MbxClear, callbacks), never through the
//   C library.
// - Tables go through MbxWriteTable: one temporary array per block, converted in a loop that vectorises, one
//   write.
// - A count that its field cannot carry is MBX_ERR_OVERFLOW; a value that the mode cannot carry is
//   MBX_ERR_BAD_STATE; an unknown kind or code is MBX_ERR_INTERNAL.
// - Public operations stand in session/ and only check and look up; what they do to the tree stands in the
//   family's file, with the context first.
#pragma once

#include "boxlib/core/block_list.h"
#include "boxlib/core/list.h"
#include "boxlib/core/stream.h"

// Calls a payload writer with or without options, whichever it takes.
template <typename Box, typename Payload>
MbxStatus MbxCallPayload(Payload&& payload, MbxContext* context, const MbxOptions* options, MbxFile* file,
                         uint64_t position, const Box* box, uint64_t* written, uint64_t* accumulated) {
    if constexpr (std::is_invocable_v<Payload, MbxContext*, const MbxOptions*, MbxFile*, uint64_t, const Box*,
                                      uint64_t*, uint64_t*>) {
        return payload(context, options, file, position, box, written, accumulated);
    } else {
        return payload(context, file, position, box, written, accumulated);
    }
}

// Measures a box by running its payload writer with a null file, and stores its size.
template <typename Box, typename Payload>
MbxStatus MbxMeasureBox(MbxContext* context, const MbxOptions* options, Box* box, Payload&& payload) {
    uint64_t payloadSize = 0;
    MBX_TRY(MbxCallPayload<Box>(payload, context, options, nullptr, 0, box, &payloadSize, nullptr));
    return MbxBoxTotalSize(context, options, payloadSize, &box->size);
}

// Writes the header with the stored size, then the payload right behind it. MBX_ERR_INVALID_ARG for a null
// record.
template <typename Box, typename Payload>
MbxStatus MbxWriteBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                      uint32_t code, const Box* box, Payload&& payload, uint64_t* written,
                      uint64_t* accumulated) {
    if (box == nullptr) return MBX_ERR_INVALID_ARG;
    uint64_t count = 0;
    MBX_TRY(MbxWriteBoxHeader(context, options, file, position, box->size, code, nullptr, &count));
    MBX_TRY(MbxCallPayload<Box>(payload, context, options, file, position + count, box, nullptr, &count));
    return MbxReportBytes(count, written, accumulated);
}

// The same for a box that may be absent: a null record writes nothing, and `written` receives 0.
template <typename Box, typename Payload>
MbxStatus MbxWriteOptionalBox(MbxContext* context, const MbxOptions* options, MbxFile* file,
                              uint64_t position, uint32_t code, const Box* box, Payload&& payload,
                              uint64_t* written, uint64_t* accumulated) {
    if (box == nullptr) return MbxReportBytes(0, written, accumulated);
    return MbxWriteBox(context, options, file, position, code, box, payload, written, accumulated);
}

// Writes every record of a list with `writeRecord(record, at, &count)`, where `at` is its position on file.
template <typename Record, typename WriteRecord>
MbxStatus MbxWriteEach(const Record* first, uint64_t position, uint64_t* count, WriteRecord&& writeRecord) {
    for (const Record* record = first; record != nullptr; record = record->next) {
        MBX_TRY(writeRecord(record, position + *count, count));
    }
    return MBX_OK;
}

// Writes every box of a list with its own box writer, one behind the other.
template <typename Box>
MbxStatus MbxWriteBoxes(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                        const Box* first,
                        MbxStatus (*writeBox)(MbxContext*, const MbxOptions*, MbxFile*, uint64_t,
                                              std::type_identity_t<const Box>*, uint64_t*, uint64_t*),
                        uint64_t* count) {
    return MbxWriteEach(first, position, count, [&](const Box* box, uint64_t at, uint64_t* counter) {
        return writeBox(context, options, file, at, box, nullptr, counter);
    });
}

// Allocates a zeroed record, builds it with `build(record)` and hands it over to `*slot`. A record whose
// build fails is released. MBX_ERR_INTERNAL when the slot holds one already.
template <typename Record, typename Build, typename Free>
MbxStatus MbxMakeChild(MbxContext* context, Record** slot, Build&& build, Free&& release) {
    if (*slot != nullptr) return MBX_ERR_INTERNAL;
    Record* record = nullptr;
    MbxStatus status = MbxNew(context, &record);
    if (status == MBX_OK) status = build(record);
    if (status == MBX_OK) {
        *slot = record;
        record = nullptr;
    }
    const MbxStatus released = release(context, record);
    return status != MBX_OK ? status : released;
}

// The same for a record that goes to the tail of a list.
template <typename Record, typename Build, typename Free>
MbxStatus MbxMakeListItem(MbxContext* context, MbxList<Record>* list, Build&& build, Free&& release) {
    Record* record = nullptr;
    MBX_TRY(MbxMakeChild(context, &record, build, release));
    MbxListAppend(list, record);
    return MBX_OK;
}

// MbxMakeChild for a box that its own builder makes from a parameter record.
template <typename Box, typename Params>
MbxStatus MbxMakeBox(MbxContext* context, const MbxOptions* options, Box** slot, const Params* params,
                     MbxStatus (*build)(MbxContext*, const MbxOptions*, std::type_identity_t<const Params>*,
                                        std::type_identity_t<Box>*),
                     MbxStatus (*release)(MbxContext*, std::type_identity_t<Box>*)) {
    return MbxMakeChild(
        context, slot, [&](Box* box) { return build(context, options, params, box); }, release);
}

// The same for a box that may be absent: null parameters make none.
template <typename Box, typename Params>
MbxStatus MbxMakeOptionalBox(MbxContext* context, const MbxOptions* options, Box** slot, const Params* params,
                             MbxStatus (*build)(MbxContext*, const MbxOptions*,
                                                std::type_identity_t<const Params>*,
                                                std::type_identity_t<Box>*),
                             MbxStatus (*release)(MbxContext*, std::type_identity_t<Box>*)) {
    if (params == nullptr) return MBX_OK;
    return MbxMakeBox(context, options, slot, params, build, release);
}

// One box for each parameter record from `first` on, in the same order.
template <typename Box, typename Params>
MbxStatus MbxMakeBoxes(MbxContext* context, const MbxOptions* options, MbxList<Box>* boxes,
                       const Params* first,
                       MbxStatus (*build)(MbxContext*, const MbxOptions*, std::type_identity_t<const Params>*,
                                          std::type_identity_t<Box>*),
                       MbxStatus (*release)(MbxContext*, std::type_identity_t<Box>*)) {
    for (const Params* params = first; params != nullptr; params = params->next) {
        MBX_TRY(MbxMakeListItem(
            context, boxes, [&](Box* box) { return build(context, options, params, box); }, release));
    }
    return MBX_OK;
}

// One temporary box for one write: builds it with `build(box)`, writes it with `writeBox(box)` when there is
// a file, and releases it on every path. `size` receives the measured size.
template <typename Box, typename Build, typename WriteRecord, typename Free>
MbxStatus MbxWriteTemporary(MbxContext* context, const MbxFile* file, uint64_t* size, Build&& build,
                            WriteRecord&& writeBox, Free&& release) {
    Box* box = nullptr;
    MbxStatus status = MbxMakeChild(context, &box, build, release);
    if (status == MBX_OK && file != nullptr) status = writeBox(box);
    if (status == MBX_OK) *size = box->size;
    const MbxStatus released = release(context, box);
    return status != MBX_OK ? status : released;
}

// Releases a record: first what it owns, by `members()`, then the record. MBX_ERR_INVALID_ARG for a null
// context; a null record is MBX_OK.
template <typename Record, typename Members>
MbxStatus MbxFreeBox(MbxContext* context, Record* record, Members&& members) {
    if (context == nullptr) return MBX_ERR_INVALID_ARG;
    if (record == nullptr) return MBX_OK;
    MBX_TRY(members());
    MbxFree(context, record);
    return MBX_OK;
}

// The same for a record that owns nothing.
template <typename Record>
MbxStatus MbxFreeBox(MbxContext* context, Record* record) {
    return MbxFreeBox(context, record, [] { return MBX_OK; });
}

// Writes a block list as a table of `cells` words of type Cell per entry, where the stream stands: per block
// one temporary array, filled by `convert(entry, row)` for each entry, and one write. An empty block ends the
// walk. Measuring makes the same calls of the context, and leaves out only the conversion, which nobody would
// read.
template <typename Entry, typename Cell, uint32_t cells, typename Convert>
MbxStatus MbxWriteTable(MbxContext* context, MbxFile* file, const MbxBlockList* list, Convert&& convert,
                        uint64_t* accumulated) {
    for (const MbxBlock* block = list->first; block != nullptr && block->count != 0; block = block->next) {
        Cell* rows = nullptr;
        MBX_TRY(MbxNewArray(context, uint64_t{block->count} * cells, &rows));
        const Entry* entries = MbxBlockEntries<Entry>(block);
        if (file != nullptr) {
            for (uint32_t i = 0; i < block->count; i++) convert(entries[i], rows + i * cells);
        }
        const MbxStatus status = MbxWriteBytes(
            context, file, rows, uint64_t{block->count} * cells * sizeof(Cell), nullptr, accumulated);
        MbxFree(context, rows);
        MBX_TRY(status);
    }
    return MBX_OK;
}
