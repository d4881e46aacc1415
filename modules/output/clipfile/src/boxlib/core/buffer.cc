#include "boxlib/core/buffer.h"

namespace {

uint64_t textLength(const uint8_t* text, uint64_t limit) {
    uint64_t length = 0;
    while (length < limit && text[length] != 0) length++;
    return length;
}

}  // namespace

MbxStatus MbxBufferAssign(MbxContext* context, uint32_t asText, MbxBuffer* buffer, const void* source,
                          uint64_t length) {
    if (context == nullptr || buffer == nullptr) return MBX_ERR_INVALID_ARG;
    MbxBufferRelease(context, buffer);
    if (length == 0) return MBX_OK;
    if (source == nullptr) return MBX_ERR_INVALID_ARG;

    const auto* bytes = static_cast<const uint8_t*>(source);
    const uint64_t copied = asText != 0 ? textLength(bytes, length) : length;
    const uint64_t size = asText != 0 ? copied + 1 : length;
    auto* data = static_cast<uint8_t*>(MbxAlloc(context, MBX_MEMORY_CLASS, size));
    if (data == nullptr) return MBX_ERR_NO_MEMORY;
    // The block is zeroed, so the terminator stands already.
    const MbxStatus status = MbxCopy(context, data, size, bytes, copied);
    if (status != MBX_OK) {
        MbxFree(context, data);
        return status;
    }
    buffer->data = data;
    buffer->size = size;
    return MBX_OK;
}

MbxStatus MbxBufferAssignText(MbxContext* context, MbxBuffer* buffer, const void* source, uint64_t length) {
    static constexpr uint8_t kEmpty[] = {0};
    if (length == 0) return MbxBufferAssign(context, 1, buffer, kEmpty, sizeof(kEmpty));
    return MbxBufferAssign(context, 1, buffer, source, length);
}

void MbxBufferRelease(MbxContext* context, MbxBuffer* buffer) {
    MbxFree(context, buffer->data);
    buffer->data = nullptr;
    buffer->size = 0;
}
