// The context: callbacks, memory quota, and the counted allocator that everything else allocates through.
#pragma once

#include <type_traits>

#include "boxlib/core/status.h"
#include "boxlib/mbx.h"

struct MbxContext {
    MbxCallbacks callbacks;
    uint32_t quota_on;
    uint64_t class1_limit;  // in bytes, as are the following
    uint64_t class2_limit;
    uint64_t class1_used;
    uint64_t class2_used;
};

// The library allocates class 1; class 2 exists for a host's own accounting.
constexpr uint32_t MBX_MEMORY_CLASS = 1;

// Clears and copies through the host's primitives. A copy that the host refuses is MBX_ERR_INTERNAL: the
// library never asks for one that does not fit.
void MbxClear(MbxContext* context, void* pointer, uint64_t count);
MbxStatus MbxCopy(MbxContext* context, void* destination, uint64_t capacity, const void* source,
                  uint64_t count);

// Allocates a zeroed record.
template <typename Record>
MbxStatus MbxNew(MbxContext* context, Record** record) {
    static_assert(std::is_trivially_copyable_v<Record> && std::is_trivially_destructible_v<Record>);
    static_assert(alignof(Record) <= 8, "the block header leaves 8-byte alignment");
    *record = static_cast<Record*>(MbxAlloc(context, MBX_MEMORY_CLASS, sizeof(Record)));
    return *record != nullptr ? MBX_OK : MBX_ERR_NO_MEMORY;
}

// Allocates a zeroed array of `count` elements of a temporary table.
template <typename Element>
MbxStatus MbxNewArray(MbxContext* context, uint64_t count, Element** elements) {
    static_assert(std::is_trivially_copyable_v<Element> && alignof(Element) <= 8);
    if (count > UINT32_MAX / sizeof(Element)) return MBX_ERR_NO_MEMORY;
    *elements = static_cast<Element*>(MbxAlloc(context, MBX_MEMORY_CLASS, count * sizeof(Element)));
    return *elements != nullptr ? MBX_OK : MBX_ERR_NO_MEMORY;
}
