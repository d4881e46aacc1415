#include "support/FaultyFiles.h"

#include <array>
#include <atomic>
#include <string>

#include "boxlib/mbx_stdio.h"
#include "mp4/FileAccess.h"

namespace {

struct Plan {
    std::atomic<std::uint64_t> count{0};
    std::atomic<std::uint64_t> failAt{0};  // 0 for never
    std::atomic<bool> andAllAfter{false};

    /// Counts one operation; true when it fails.
    bool Fails() {
        const std::uint64_t number = ++count;
        const std::uint64_t at = failAt;
        return at != 0 && (number == at || (andAllAfter && number > at));
    }
};

std::array<Plan, FaultyFiles::kOperationCount> plans;
std::atomic<std::int64_t> blocks{0};
std::string instead;

MbxCallbacks real() {
    MbxCallbacks callbacks = {};
    MbxStdioCallbacks(&callbacks);
    return callbacks;
}

MbxStatus faultyOpen(const char* path, std::uint32_t unused, MbxFile** file) {
    if (plans[FaultyFiles::kOpen].Fails()) {
        return MBX_ERR_IO;
    }
    return MbxOpenFile(instead.empty() ? path : instead.c_str(), unused, file);
}

MbxStatus faultyWrite(MbxFile* file, const void* buffer, std::uint64_t size, std::uint64_t* count) {
    if (plans[FaultyFiles::kWrite].Fails()) {
        *count = 0;
        return MBX_ERR_IO;
    }
    const bool half = plans[FaultyFiles::kShortWrite].Fails();
    return MbxStdioWrite(file, buffer, half ? size / 2 : size, count);
}

MbxStatus faultySeek(MbxFile* file, std::int64_t offset, std::uint32_t origin) {
    return plans[FaultyFiles::kSeek].Fails() ? MBX_ERR_IO : MbxStdioSeek(file, offset, origin);
}

void* faultyAlloc(void* userData, std::uint64_t size) {
    if (plans[FaultyFiles::kAlloc].Fails()) {
        return nullptr;
    }
    ++blocks;
    return real().alloc(userData, size);
}

void countingFree(void* userData, void* pointer) {
    if (pointer != nullptr) {
        --blocks;
    }
    real().free(userData, pointer);
}

void clear() {
    for (Plan& plan : plans) {
        plan.count = 0;
        plan.failAt = 0;
        plan.andAllAfter = false;
    }
    blocks = 0;
    instead.clear();
}

}  // namespace

FaultyFiles::FaultyFiles() {
    clear();
}

FaultyFiles::~FaultyFiles() {
    clear();
}

void FaultyFiles::FailAt(Operation operation, std::uint64_t nth, bool andAllAfter) {
    plans[operation].failAt = nth;
    plans[operation].andAllAfter = andAllAfter;
}

void FaultyFiles::OpenInstead(const char* path) {
    instead = path;
}

std::uint64_t FaultyFiles::Count(Operation operation) const {
    return plans[operation].count;
}

std::int64_t FaultyFiles::BlocksInUse() const {
    return blocks;
}

namespace clipfileModule {

FileAccess GetFileAccess() {
    FileAccess access = {real(), faultyOpen};
    access.callbacks.write = faultyWrite;
    access.callbacks.seek = faultySeek;
    access.callbacks.alloc = faultyAlloc;
    access.callbacks.free = countingFree;
    return access;
}

}  // namespace clipfileModule
