// Append-only lists of fixed arrays: entries never move once written, and a long recording never copies one.
#pragma once

#include "boxlib/core/context.h"

// Entries in each block of the lists of a sample segment.
constexpr uint32_t MBX_BLOCK_CAPACITY = 1000;

struct MbxBlock {
    uint32_t count;  // entries used
    void* data;      // an array for the list's whole capacity
    MbxBlock* next;
};

struct MbxBlockList {
    uint32_t capacity;  // entries per block
    MbxBlock* first;
    MbxBlock* current;
};

// Appends an empty block and makes it the current one. MBX_ERR_NO_MEMORY leaves the list as it was;
// MBX_ERR_INTERNAL for a list whose capacity was never set.
MbxStatus MbxBlockListGrow(MbxContext* context, MbxBlockList* list, uint64_t entrySize);

// Appends an entry; `stored`, which may be null, receives its lasting address. MBX_ERR_NO_MEMORY leaves the
// list as it was.
template <typename Entry>
inline MbxStatus MbxBlockListAppend(MbxContext* context, MbxBlockList* list, const Entry& entry,
                                    std::type_identity_t<Entry>** stored = nullptr) {
    static_assert(std::is_trivially_copyable_v<Entry> && alignof(Entry) <= 8);
    if (list->current == nullptr || list->current->count == list->capacity) [[unlikely]] {
        MBX_TRY(MbxBlockListGrow(context, list, sizeof(Entry)));
    }
    Entry* place = static_cast<Entry*>(list->current->data) + list->current->count++;
    *place = entry;
    if (stored != nullptr) *stored = place;
    return MBX_OK;
}

// The entries of one block.
template <typename Entry>
inline const Entry* MbxBlockEntries(const MbxBlock* block) {
    return static_cast<const Entry*>(block->data);
}

// The first entry of the list, null for an empty one.
template <typename Entry>
inline const Entry* MbxBlockListFirst(const MbxBlockList* list) {
    return list->first != nullptr && list->first->count != 0 ? MbxBlockEntries<Entry>(list->first) : nullptr;
}

// The number of entries; a null list gives 0. MBX_ERR_INVALID_ARG for a null result, MBX_ERR_OVERFLOW beyond
// 32 bits.
MbxStatus MbxBlockListCount(const MbxBlockList* list, uint32_t* total);

// The same for a 16-bit field: MBX_ERR_OVERFLOW above 65535.
MbxStatus MbxBlockListCount16(const MbxBlockList* list, uint16_t* total);

// Releases all blocks; the capacity stays, so that the list can be used again. Entries that own something are
// the caller's to release before.
void MbxBlockListRelease(MbxContext* context, MbxBlockList* list);
