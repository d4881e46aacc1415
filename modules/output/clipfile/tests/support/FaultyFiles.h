#pragma once

// Takes the place of `GetFileAccess` in a test program: linking FaultyFiles.cc puts files and memory before
// the muxers that fail where a test says so, and count what is asked of them.

#include <cstdint>

/// While it lives, one operation can be made to fail. One at a time; set up before the threads start that
/// write.
class FaultyFiles {
 public:
    enum Operation { kOpen, kWrite, kShortWrite, kSeek, kAlloc, kOperationCount };

    FaultyFiles();
    ~FaultyFiles();
    FaultyFiles(const FaultyFiles&) = delete;
    FaultyFiles& operator=(const FaultyFiles&) = delete;

    /// The `nth` such operation from construction on fails, counted from 1; with `andAllAfter` every later
    /// one too, as on a disk that is full or gone. A short write reports success and half of the bytes.
    void FailAt(Operation operation, std::uint64_t nth, bool andAllAfter = false);
    /// The `nth` write from construction on hangs, until `Release` or destruction.
    void HoldWriteAt(std::uint64_t nth);
    /// Waits until a write hangs. False when none did before the deadline.
    [[nodiscard]] bool WaitHeld() const;
    void Release();
    /// As after construction.
    void Reset();
    /// How many there were since construction.
    std::uint64_t Count(Operation operation) const;
    /// Blocks of memory that are out.
    std::int64_t BlocksInUse() const;
};
