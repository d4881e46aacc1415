#include "boxlib/core/context.h"

#include "boxlib/core/bytes.h"

namespace {

// The header in front of every block: "FF4", the class byte, then the size of block and header, big-endian.
constexpr uint64_t kHeaderSize = 8;

bool isCompleteTable(const MbxCallbacks& table) {
    return table.read != nullptr && table.write != nullptr && table.seek != nullptr &&
           table.tell != nullptr && table.size != nullptr && table.alloc != nullptr &&
           table.free != nullptr && table.strncmp != nullptr && table.strncpy != nullptr &&
           table.memcmp != nullptr && table.memcpy != nullptr && table.memmove != nullptr &&
           table.memset != nullptr;
}

bool isValidHeader(const uint8_t* header) {
    return header[0] == 'F' && header[1] == 'F' && header[2] == '4' && (header[3] == 1 || header[3] == 2) &&
           MbxGet32(header + 4) >= kHeaderSize;
}

}  // namespace

MbxStatus MbxCreateContext(const MbxCallbacks* callbacks, MbxContext** context) {
    if (callbacks == nullptr || context == nullptr || !isCompleteTable(*callbacks))
        return MBX_ERR_INVALID_ARG;
    auto* made = static_cast<MbxContext*>(callbacks->alloc(callbacks->user_data, sizeof(MbxContext)));
    if (made == nullptr) return MBX_ERR_NO_MEMORY;
    callbacks->memset(callbacks->user_data, made, 0, sizeof(MbxContext));
    made->callbacks = *callbacks;
    *context = made;
    return MBX_OK;
}

MbxStatus MbxDestroyContext(MbxContext* context) {
    if (context != nullptr) context->callbacks.free(context->callbacks.user_data, context);
    return MBX_OK;
}

// Contract: quota-unused. Nothing in the module sets one, or allocates in class 2.
MbxStatus MbxSetQuota(MbxContext* context, uint32_t class_, uint64_t quota, uint32_t percent,
                      uint64_t minimum) {
    if (context == nullptr || class_ != 0 || percent > 100) return MBX_ERR_INVALID_ARG;
    if (quota == 0) {
        context->quota_on = 0;
        return MBX_OK;
    }
    uint64_t class2 = 0;
    MBX_TRY(MbxRescale(quota, 100, percent, &class2));
    if (quota - class2 < minimum) return MBX_ERR_INVALID_ARG;
    context->quota_on = 1;
    context->class1_limit = quota - class2;
    context->class2_limit = class2;
    context->class1_used = 0;
    context->class2_used = 0;
    return MBX_OK;
}

void* MbxAlloc(MbxContext* context, uint32_t class_, uint64_t size) {
    if (context == nullptr || (class_ != 1 && class_ != 2) || size > UINT32_MAX - kHeaderSize) return nullptr;
    const uint64_t total = size + kHeaderSize;
    uint64_t* used = class_ == 1 ? &context->class1_used : &context->class2_used;
    const uint64_t limit = class_ == 1 ? context->class1_limit : context->class2_limit;
    if (context->quota_on != 0 && (*used > limit || total > limit - *used)) return nullptr;

    const MbxCallbacks& host = context->callbacks;
    auto* block = static_cast<uint8_t*>(host.alloc(host.user_data, total));
    if (block == nullptr) return nullptr;
    host.memset(host.user_data, block, 0, total);
    block[0] = 'F';
    block[1] = 'F';
    block[2] = '4';
    block[3] = static_cast<uint8_t>(class_);
    MbxStore32(block + 4, static_cast<uint32_t>(total));
    if (context->quota_on != 0) *used += total;
    return block + kHeaderSize;
}

void MbxFree(MbxContext* context, void* pointer) {
    if (context == nullptr || pointer == nullptr) return;
    uint8_t* block = static_cast<uint8_t*>(pointer) - kHeaderSize;
    // Contract: damaged-blocks-leak. Nothing fails.
    if (!isValidHeader(block)) return;
    const uint32_t class_ = block[3];
    const uint64_t total = MbxGet32(block + 4);

    const MbxCallbacks& host = context->callbacks;
    host.memset(host.user_data, block, 0, kHeaderSize);
    host.free(host.user_data, block);
    if (context->quota_on == 0) return;
    uint64_t* used = class_ == 1 ? &context->class1_used : &context->class2_used;
    // A block from before the quota was set was never counted.
    *used = *used > total ? *used - total : 0;
}

MbxStatus MbxScratchInit(MbxContext* context, uint32_t class_, uint64_t size, MbxScratch* scratch) {
    if (context == nullptr || scratch == nullptr) return MBX_ERR_INVALID_ARG;
    auto* data = static_cast<uint8_t*>(MbxAlloc(context, class_, size));
    if (data == nullptr) return MBX_ERR_NO_MEMORY;
    scratch->size = size;
    scratch->data = data;
    return MBX_OK;
}

void MbxScratchRelease(MbxContext* context, MbxScratch* scratch) {
    if (scratch == nullptr) return;
    MbxFree(context, scratch->data);
    scratch->data = nullptr;
}

void MbxClear(MbxContext* context, void* pointer, uint64_t count) {
    context->callbacks.memset(context->callbacks.user_data, pointer, 0, count);
}

MbxStatus MbxCopy(MbxContext* context, void* destination, uint64_t capacity, const void* source,
                  uint64_t count) {
    const MbxCallbacks& host = context->callbacks;
    return host.memcpy(host.user_data, destination, capacity, source, count) != nullptr ? MBX_OK
                                                                                        : MBX_ERR_INTERNAL;
}
