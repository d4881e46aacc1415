#include "support/FaultyFiles.h"

#include <array>
#include <atomic>
#include <chrono>
#include <condition_variable>
#include <mutex>

#include "boxlib/mbx_stdio.h"
#include "mp4/FileAccess.h"
#include "platform/PlatformInterface.h"

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

/// A write that hangs.
class Hold {
 public:
    void Set(std::uint64_t nth) {
        const std::lock_guard lock(mutex_);
        at_ = nth;
        held_ = false;
        released_ = false;
    }
    void Pass(std::uint64_t number) {
        std::unique_lock lock(mutex_);
        if (number != at_) {
            return;
        }
        held_ = true;
        changed_.notify_all();
        changed_.wait(lock, [this] { return released_; });
    }
    bool WaitHeld() {
        std::unique_lock lock(mutex_);
        return changed_.wait_for(lock, std::chrono::seconds(30), [this] { return held_; });
    }
    void Release() {
        const std::lock_guard lock(mutex_);
        released_ = true;
        changed_.notify_all();
    }

 private:
    std::mutex mutex_;
    std::condition_variable changed_;
    std::uint64_t at_ = 0;  // 0 for never
    bool held_ = false;
    bool released_ = false;
};

std::array<Plan, FaultyFiles::kOperationCount> plans;
Hold hold;
std::atomic<std::int64_t> blocks{0};

MbxCallbacks real() {
    MbxCallbacks callbacks = {};
    MbxStdioCallbacks(&callbacks);
    return callbacks;
}

MbxStatus faultyOpen(const char* path, std::uint32_t unused, MbxFile** file) {
    if (plans[FaultyFiles::kOpen].Fails()) {
        return MBX_ERR_IO;
    }
    return MbxOpenFile(clipfileModule::GetPlatform().NativePath(path).c_str(), unused, file);
}

MbxStatus faultyWrite(MbxFile* file, const void* buffer, std::uint64_t size, std::uint64_t* count) {
    const bool fails = plans[FaultyFiles::kWrite].Fails();
    hold.Pass(plans[FaultyFiles::kWrite].count);
    if (fails) {
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
}

}  // namespace

FaultyFiles::FaultyFiles() {
    clear();
}

FaultyFiles::~FaultyFiles() {
    hold.Release();
    clear();
}

void FaultyFiles::FailAt(Operation operation, std::uint64_t nth, bool andAllAfter) {
    plans[operation].failAt = nth;
    plans[operation].andAllAfter = andAllAfter;
}

void FaultyFiles::Reset() {
    clear();
}

void FaultyFiles::HoldWriteAt(std::uint64_t nth) {
    hold.Set(nth);
}

bool FaultyFiles::WaitHeld() const {
    return hold.WaitHeld();
}

void FaultyFiles::Release() {
    hold.Release();
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
