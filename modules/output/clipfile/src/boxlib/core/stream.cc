#include "boxlib/core/stream.h"

MbxStatus MbxSeek(MbxContext* context, MbxFile* file, uint64_t position) {
    if (file == nullptr) return MBX_OK;
    if (context == nullptr || position > INT64_MAX) return MBX_ERR_INVALID_ARG;
    return context->callbacks.seek(file, static_cast<int64_t>(position), MBX_SEEK_START) == MBX_OK
               ? MBX_OK
               : MBX_ERR_IO;
}

MbxStatus MbxWriteBytes(MbxContext* context, MbxFile* file, const void* data, uint64_t length,
                        uint64_t* written, uint64_t* accumulated) {
    uint64_t count = length;
    if (file != nullptr && length != 0) {
        if (context == nullptr || data == nullptr) return MBX_ERR_INVALID_ARG;
        count = 0;
        if (context->callbacks.write(file, data, length, &count) != MBX_OK || count < length)
            return MBX_ERR_IO;
    }
    return MbxReportBytes(count, written, accumulated);
}

MbxStatus MbxWriteBuffer(MbxContext* context, MbxFile* file, const MbxBuffer* buffer, uint64_t* accumulated) {
    return MbxWriteBytes(context, file, buffer->data, buffer->size, nullptr, accumulated);
}

MbxStatus MbxWriteComposed(MbxContext* context, MbxFile* file, const MbxBytes* bytes, uint64_t* accumulated) {
    if (bytes->overrun != 0) return MBX_ERR_INTERNAL;
    return MbxWriteBytes(context, file, bytes->data, bytes->length, nullptr, accumulated);
}

MbxStatus MbxReportBytes(uint64_t count, uint64_t* written, uint64_t* accumulated) {
    if (written != nullptr) *written = count;
    if (accumulated != nullptr) *accumulated += count;
    return MBX_OK;
}

MbxStatus MbxWriteFixedPayload(MbxContext* context, MbxFile* file, uint64_t position, const MbxBytes* bytes,
                               uint64_t* written, uint64_t* accumulated) {
    uint64_t count = 0;
    MBX_TRY(MbxSeek(context, file, position));
    MBX_TRY(MbxWriteComposed(context, file, bytes, &count));
    return MbxReportBytes(count, written, accumulated);
}

// ISO/IEC 14496-12 4.2, Box
MbxStatus MbxWriteBoxHeader(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                            uint64_t size, uint32_t type, uint64_t* written, uint64_t* accumulated) {
    if (context == nullptr || options == nullptr) return MBX_ERR_INVALID_ARG;
    MBX_TRY(MbxSeek(context, file, position));
    bool large = false;
    switch (options->box_size_mode) {
        case MBX_SIZES_32:
            if (size > UINT32_MAX) return MBX_ERR_BAD_STATE;
            break;
        case MBX_SIZES_BY_VALUE:
            large = size > UINT32_MAX;
            break;
        case MBX_SIZES_64:
            large = true;
            break;
        default:
            return MBX_ERR_INVALID_ARG;
    }
    MbxBytes bytes;
    MbxBeginBytes(context, &bytes);
    MbxPut32(&bytes, large ? 1 : static_cast<uint32_t>(size));  // unsigned int(32) size
    MbxPut32(&bytes, type);                                     // unsigned int(32) type
    if (large) MbxPut64(&bytes, size);                          // unsigned int(64) largesize
    uint64_t count = 0;
    MBX_TRY(MbxWriteComposed(context, file, &bytes, &count));
    return MbxReportBytes(count, written, accumulated);
}

MbxStatus MbxBoxTotalSize(MbxContext* context, const MbxOptions* options, uint64_t payloadSize,
                          uint64_t* total) {
    if (total == nullptr) return MBX_ERR_INVALID_ARG;
    if (payloadSize > UINT64_MAX - 16) return MBX_ERR_OVERFLOW;
    uint64_t header = 0;
    MBX_TRY(MbxWriteBoxHeader(context, options, nullptr, 0, payloadSize + 8, 0, &header, nullptr));
    *total = payloadSize + header;
    return MBX_OK;
}

MbxStatus MbxWriteStandaloneHeader(MbxContext* context, uint32_t form, MbxFile* file, uint64_t position,
                                   uint64_t payloadSize, uint32_t type, uint64_t* written,
                                   uint64_t* accumulated) {
    if (context == nullptr || payloadSize >= UINT64_MAX - 15) return MBX_ERR_INVALID_ARG;
    MbxOptions options = {};
    // Contract: header-forms-renumbered. 1 and 2 change places.
    switch (form) {
        case MBX_MDAT_HEADER_32:
            options.box_size_mode = MBX_SIZES_32;
            break;
        case MBX_MDAT_HEADER_64:
            options.box_size_mode = MBX_SIZES_64;
            break;
        case MBX_MDAT_HEADER_BY_VALUE:
            options.box_size_mode = MBX_SIZES_BY_VALUE;
            break;
        default:
            return MBX_ERR_INTERNAL;
    }
    uint64_t size = 0;
    MBX_TRY(MbxBoxTotalSize(context, &options, payloadSize, &size));
    return MbxWriteBoxHeader(context, &options, file, position, size, type, written, accumulated);
}

MbxStatus MbxWriteShortHeader(MbxContext* context, MbxFile* file, uint64_t position, uint64_t size,
                              uint32_t type, uint64_t* written, uint64_t* accumulated) {
    if (context == nullptr) return MBX_ERR_INVALID_ARG;
    MBX_TRY(MbxSeek(context, file, position));
    if (size > UINT16_MAX) return MBX_ERR_INTERNAL;
    MbxBytes bytes;
    MbxBeginBytes(context, &bytes);
    MbxPut16(&bytes, static_cast<uint32_t>(size));  // unsigned int(16) size
    MbxPut32(&bytes, type);                         // unsigned int(32) type
    uint64_t count = 0;
    MBX_TRY(MbxWriteComposed(context, file, &bytes, &count));
    return MbxReportBytes(count, written, accumulated);
}

MbxStatus MbxShortTotalSize(MbxContext* context, uint64_t payloadSize, uint64_t* total) {
    if (total == nullptr) return MBX_ERR_INVALID_ARG;
    if (payloadSize > UINT16_MAX) return MBX_ERR_INTERNAL;
    uint64_t header = 0;
    MBX_TRY(MbxWriteShortHeader(context, nullptr, 0, payloadSize + 6, 0, &header, nullptr));
    *total = payloadSize + header;
    return MBX_OK;
}

MbxStatus MbxWriteDescriptorHeader(MbxContext* context, MbxFile* file, uint64_t position,
                                   uint64_t payloadSize, uint32_t tag, uint64_t* total,
                                   uint64_t* accumulated) {
    if (context == nullptr) return MBX_ERR_INVALID_ARG;
    MBX_TRY(MbxSeek(context, file, position));
    if (payloadSize >= 1U << 28) return MBX_ERR_OVERFLOW;
    uint32_t groups = 1;
    while (payloadSize >> (7 * groups) != 0) groups++;

    MbxBytes bytes;
    MbxBeginBytes(context, &bytes);
    MbxPut8(&bytes, tag);  // bit(8) tag
    while (groups-- != 0) {
        const auto group = static_cast<uint32_t>(payloadSize >> (7 * groups) & 0x7F);
        MbxPut8(&bytes, groups != 0 ? group | 0x80 : group);  // bit(1) nextByte, bit(7) sizeByte
    }
    uint64_t count = 0;
    MBX_TRY(MbxWriteComposed(context, file, &bytes, &count));
    if (total != nullptr) *total = count + payloadSize;
    return MbxReportBytes(count, nullptr, accumulated);
}

MbxStatus MbxWriteUuid(MbxContext* context, MbxFile* file, uint64_t position, const uint32_t words[4],
                       uint64_t* written, uint64_t* accumulated) {
    if (context == nullptr || words == nullptr) return MBX_ERR_INVALID_ARG;
    MbxBytes bytes;
    MbxBeginBytes(context, &bytes);
    for (int i = 0; i < 4; i++) MbxPut32(&bytes, words[i]);  // unsigned int(8)[16] extended_type
    return MbxWriteFixedPayload(context, file, position, &bytes, written, accumulated);
}

MbxStatus MbxWriteZeros(MbxContext* context, MbxFile* file, uint64_t position, uint64_t count,
                        uint64_t* written, uint64_t* accumulated) {
    if (context == nullptr) return MBX_ERR_INVALID_ARG;
    if (file == nullptr || count == 0) return MbxReportBytes(count, written, accumulated);

    uint8_t* zeros = nullptr;
    MBX_TRY(MbxNewArray(context, count < MBX_ZERO_CHUNK ? count : MBX_ZERO_CHUNK, &zeros));
    MbxStatus status = MBX_OK;
    uint64_t last = 0;
    for (uint64_t done = 0; done < count && status == MBX_OK; done += last) {
        const uint64_t rest = count - done;
        status = MbxSeek(context, file, position + done);
        if (status == MBX_OK) {
            status = MbxWriteBytes(context, file, zeros, rest < MBX_ZERO_CHUNK ? rest : MBX_ZERO_CHUNK, &last,
                                   nullptr);
        }
    }
    // Contract: zeros-count-the-last-write. Not their sum, unlike when measuring.
    MbxFree(context, zeros);
    return status == MBX_OK ? MbxReportBytes(last, written, accumulated) : status;
}
