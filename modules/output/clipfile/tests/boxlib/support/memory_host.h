// A host whose memory and files live in the test: it counts every operation and can fail the Nth one.
#pragma once

#include <cstdint>
#include <cstdlib>
#include <cstring>
#include <map>
#include <string>
#include <vector>

#include "boxlib/mbx.h"
#include "boxlib/mbx_stdio.h"

// A file in memory. Bytes are made as they are written; a seek beyond the end leaves zeros between.
struct MemoryFile : MbxFile {
    std::vector<uint8_t> bytes;
    uint64_t position = 0;

    uint64_t writes = 0;  // calls so far, failed ones included
    uint64_t seeks = 0;
    std::vector<uint64_t> writeSizes;

    uint64_t failWrite = 0;   // number of the write, from 1, that fails; 0 for none
    uint64_t shortWrite = 0;  // number of the write that moves one byte less and reports success
    uint64_t failSeek = 0;
    MbxStatus failure = MBX_ERR_INTERNAL;  // what a failing call returns: the library makes it MBX_ERR_IO

    MemoryFile() : MbxFile{nullptr} {}
};

// Memory and callbacks. One host serves one context.
class MemoryHost {
 public:
    uint64_t allocations = 0;  // calls of `alloc`, refused ones included
    uint64_t frees = 0;
    uint64_t failAllocation = 0;  // number of the allocation, from 1, that is refused; 0 for none
    uint64_t copies = 0;          // calls of `memcpy`, `memmove` and `strncpy`
    uint64_t failCopy = 0;
    std::map<void*, uint64_t> live;  // blocks not yet freed, with their sizes
    uint64_t liveBytes = 0;
    uint64_t peakBytes = 0;
    std::vector<uint64_t> peaks;  // every value that peakBytes took

    MbxCallbacks callbacks() {
        return {
            .user_data = this,
            .read = [](MbxFile*, void*, uint64_t, uint64_t*) { return MBX_ERR_IO; },
            .write = write,
            .seek = seek,
            .tell =
                [](MbxFile* file, uint64_t* position) {
                    *position = static_cast<MemoryFile*>(file)->position;
                    return MBX_OK;
                },
            .size =
                [](MbxFile* file, uint64_t* length) {
                    *length = static_cast<MemoryFile*>(file)->bytes.size();
                    return MBX_OK;
                },
            .alloc = alloc,
            .free = release,
            .strncmp = [](void*, const char* a, const char* b, uint64_t n) { return std::strncmp(a, b, n); },
            .strncpy =
                [](void* host, char* destination, uint64_t capacity, const char* source, uint64_t count) {
                    return static_cast<char*>(copy(host, destination, capacity, source, count));
                },
            .memcmp = [](void*, const void* a, const void* b, uint64_t n) { return std::memcmp(a, b, n); },
            .memcpy = copy,
            .memmove = copy,
            .memset = [](void*, void* pointer, int byte,
                         uint64_t count) { return std::memset(pointer, byte, count); },
        };
    }

 private:
    static MbxStatus write(MbxFile* handle, const void* buffer, uint64_t size, uint64_t* count) {
        auto* file = static_cast<MemoryFile*>(handle);
        *count = 0;
        if (++file->writes == file->failWrite) return file->failure;
        const uint64_t moved = file->writes == file->shortWrite ? size - 1 : size;
        const auto* bytes = static_cast<const uint8_t*>(buffer);
        if (file->bytes.size() < file->position + moved) file->bytes.resize(file->position + moved);
        std::copy(bytes, bytes + moved, file->bytes.begin() + static_cast<std::ptrdiff_t>(file->position));
        file->position += moved;
        file->writeSizes.push_back(moved);
        *count = moved;
        return MBX_OK;
    }

    static MbxStatus seek(MbxFile* handle, int64_t offset, uint32_t origin) {
        auto* file = static_cast<MemoryFile*>(handle);
        if (++file->seeks == file->failSeek) return file->failure;
        if (origin != 0 || offset < 0) return MBX_ERR_INVALID_ARG;
        file->position = static_cast<uint64_t>(offset);
        return MBX_OK;
    }

    static void* alloc(void* user, uint64_t size) {
        auto* host = static_cast<MemoryHost*>(user);
        if (++host->allocations == host->failAllocation) return nullptr;
        void* block = std::malloc(size);
        std::memset(block, 0xCD, size);  // whoever forgets to clear is found out
        host->live[block] = size;
        host->liveBytes += size;
        if (host->liveBytes > host->peakBytes) {
            host->peakBytes = host->liveBytes;
            host->peaks.push_back(host->peakBytes);
        }
        return block;
    }

    static void release(void* user, void* pointer) {
        auto* host = static_cast<MemoryHost*>(user);
        const auto found = host->live.find(pointer);
        if (found == host->live.end()) std::abort();  // freed twice, or not ours
        host->liveBytes -= found->second;
        host->live.erase(found);
        host->frees++;
        std::free(pointer);
    }

    static void* copy(void* user, void* destination, uint64_t capacity, const void* source, uint64_t count) {
        auto* host = static_cast<MemoryHost*>(user);
        if (++host->copies == host->failCopy) return nullptr;
        if (destination == nullptr || source == nullptr || capacity < count) return nullptr;
        return std::memmove(destination, source, count);
    }
};
