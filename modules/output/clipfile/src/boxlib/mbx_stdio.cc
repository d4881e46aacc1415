#include "boxlib/mbx_stdio.h"

#include <cstdlib>
#include <cstring>

#include "boxlib/platform/stream_file.h"

namespace {

// RFC 3629: shortest form only, no surrogates, nothing above U+10FFFF.
bool isUtf8(const char* text) {
    const auto* p = reinterpret_cast<const unsigned char*>(text);
    while (*p != 0) {
        const unsigned char lead = *p++;
        if (lead < 0x80) continue;
        const int tails = lead >= 0xF0 ? 3 : lead >= 0xE0 ? 2 : 1;
        if (lead < 0xC2 || lead > 0xF4) return false;
        unsigned char lowest = 0x80;
        unsigned char highest = 0xBF;
        if (lead == 0xE0) lowest = 0xA0;
        if (lead == 0xED) highest = 0x9F;
        if (lead == 0xF0) lowest = 0x90;
        if (lead == 0xF4) highest = 0x8F;
        for (int i = 0; i < tails; i++) {
            // The terminator is outside every range, so the text is never overrun.
            if (*p < lowest || *p > highest) return false;
            p++;
            lowest = 0x80;
            highest = 0xBF;
        }
    }
    return true;
}

bool isOpen(const MbxFile* file) {
    return file != nullptr && file->stream != nullptr;
}

void* stdioAlloc(void*, uint64_t size) {
    return std::malloc(size);
}

void stdioFree(void*, void* pointer) {
    std::free(pointer);
}

int stdioStrncmp(void*, const char* a, const char* b, uint64_t n) {
    return std::strncmp(a, b, n);
}

char* stdioStrncpy(void*, char* destination, uint64_t capacity, const char* source, uint64_t count) {
    if (destination == nullptr || source == nullptr || capacity < count) return nullptr;
    return std::strncpy(destination, source, count);
}

int stdioMemcmp(void*, const void* a, const void* b, uint64_t n) {
    return std::memcmp(a, b, n);
}

void* stdioMemcpy(void*, void* destination, uint64_t capacity, const void* source, uint64_t count) {
    if (destination == nullptr || source == nullptr || capacity < count) return nullptr;
    return std::memcpy(destination, source, count);
}

void* stdioMemmove(void*, void* destination, uint64_t capacity, const void* source, uint64_t count) {
    if (destination == nullptr || source == nullptr || capacity < count) return nullptr;
    return std::memmove(destination, source, count);
}

void* stdioMemset(void*, void* pointer, int byte, uint64_t count) {
    return std::memset(pointer, byte, count);
}

}  // namespace

// Contract: open-word-unused. The second argument.
MbxStatus MbxOpenFile(const char* path, uint32_t, MbxFile** file) {
    if (path == nullptr || file == nullptr) return MBX_ERR_INVALID_ARG;
    auto* cell = static_cast<MbxFile*>(std::malloc(sizeof(MbxFile)));
    if (cell == nullptr) return MBX_ERR_NO_MEMORY;
    if (!isUtf8(path)) {
        std::free(cell);
        return MBX_ERR_INVALID_ARG;
    }
    cell->stream = MbxOpenStream(path);
    if (cell->stream == nullptr) {
        std::free(cell);
        return MBX_ERR_IO;
    }
    *file = cell;
    return MBX_OK;
}

void MbxStdioCallbacks(MbxCallbacks* callbacks) {
    *callbacks = {
        .user_data = nullptr,
        .read = MbxStdioRead,
        .write = MbxStdioWrite,
        .seek = MbxStdioSeek,
        .tell = MbxStdioTell,
        .size = MbxStdioSize,
        .alloc = stdioAlloc,
        .free = stdioFree,
        .strncmp = stdioStrncmp,
        .strncpy = stdioStrncpy,
        .memcmp = stdioMemcmp,
        .memcpy = stdioMemcpy,
        .memmove = stdioMemmove,
        .memset = stdioMemset,
    };
}

MbxStatus MbxStdioRead(MbxFile* file, void* buffer, uint64_t size, uint64_t* count) {
    if (!isOpen(file) || buffer == nullptr || count == nullptr) return MBX_ERR_INVALID_ARG;
    *count = 0;
    if (size > INT32_MAX) return MBX_ERR_IO;
    *count = std::fread(buffer, 1, size, file->stream);
    return *count == size ? MBX_OK : MBX_ERR_IO;
}

MbxStatus MbxStdioWrite(MbxFile* file, const void* buffer, uint64_t size, uint64_t* count) {
    if (!isOpen(file) || buffer == nullptr || count == nullptr) return MBX_ERR_INVALID_ARG;
    *count = 0;
    // Contract: one-write-below-2-gib. One call moves 2^31 - 1 bytes at the most.
    if (size > INT32_MAX) return MBX_ERR_IO;
    *count = std::fwrite(buffer, 1, size, file->stream);
    return *count == size ? MBX_OK : MBX_ERR_IO;
}

MbxStatus MbxStdioSeek(MbxFile* file, int64_t offset, uint32_t origin) {
    static constexpr int kOrigins[] = {SEEK_SET, SEEK_CUR, SEEK_END};
    if (!isOpen(file) || origin > MBX_SEEK_END) return MBX_ERR_INVALID_ARG;
    return MbxSeekStream(file->stream, offset, kOrigins[origin]) ? MBX_OK : MBX_ERR_IO;
}

MbxStatus MbxStdioTell(MbxFile* file, uint64_t* position) {
    if (!isOpen(file) || position == nullptr) return MBX_ERR_INVALID_ARG;
    const int64_t at = MbxTellStream(file->stream);
    if (at < 0) return MBX_ERR_IO;
    *position = static_cast<uint64_t>(at);
    return MBX_OK;
}

MbxStatus MbxStdioSize(MbxFile* file, uint64_t* length) {
    if (!isOpen(file) || length == nullptr) return MBX_ERR_INVALID_ARG;
    const int64_t at = MbxTellStream(file->stream);
    if (at < 0 || !MbxSeekStream(file->stream, 0, SEEK_END)) return MBX_ERR_IO;
    const int64_t end = MbxTellStream(file->stream);
    if (!MbxSeekStream(file->stream, at, SEEK_SET) || end < 0) return MBX_ERR_IO;
    *length = static_cast<uint64_t>(end);
    return MBX_OK;
}
