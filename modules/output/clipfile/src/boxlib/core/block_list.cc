#include "boxlib/core/block_list.h"

MbxStatus MbxBlockListGrow(MbxContext* context, MbxBlockList* list, uint64_t entrySize) {
    if (list->capacity == 0) return MBX_ERR_INTERNAL;
    MbxBlock* block = nullptr;
    MBX_TRY(MbxNew(context, &block));
    block->data = MbxAlloc(context, MBX_MEMORY_CLASS, list->capacity * entrySize);
    if (block->data == nullptr) {
        MbxFree(context, block);
        return MBX_ERR_NO_MEMORY;
    }
    if (list->current != nullptr) {
        list->current->next = block;
    } else {
        list->first = block;
    }
    list->current = block;
    return MBX_OK;
}

MbxStatus MbxBlockListCount(const MbxBlockList* list, uint32_t* total) {
    if (total == nullptr) return MBX_ERR_INVALID_ARG;
    uint64_t sum = 0;
    for (const MbxBlock* block = list != nullptr ? list->first : nullptr; block != nullptr;
         block = block->next) {
        sum += block->count;
    }
    if (sum > UINT32_MAX) return MBX_ERR_OVERFLOW;
    *total = static_cast<uint32_t>(sum);
    return MBX_OK;
}

MbxStatus MbxBlockListCount16(const MbxBlockList* list, uint16_t* total) {
    if (total == nullptr) return MBX_ERR_INVALID_ARG;
    uint32_t count = 0;
    MBX_TRY(MbxBlockListCount(list, &count));
    if (count > UINT16_MAX) return MBX_ERR_OVERFLOW;
    *total = static_cast<uint16_t>(count);
    return MBX_OK;
}

void MbxBlockListRelease(MbxContext* context, MbxBlockList* list) {
    while (list->first != nullptr) {
        MbxBlock* block = list->first;
        list->first = block->next;
        MbxFree(context, block->data);
        MbxFree(context, block);
    }
    list->current = nullptr;
}
