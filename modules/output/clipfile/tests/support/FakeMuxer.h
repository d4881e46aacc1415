#pragma once

// Takes the place of `Mp4MuxerFactory` in a test program: linking FakeMuxer.cc gives file output muxers that
// write plain text, so that what is on disk can be read, and that fail or hang where a test says.

#include <chrono>
#include <condition_variable>
#include <cstddef>
#include <cstdint>
#include <functional>
#include <memory>
#include <mutex>
#include <string>
#include <vector>

#include "buffer/chunk/ChunkData.h"
#include "common/OutputSettings.h"

/// What muxers do and did while it lives. One at a time. Muxers share its state, so they may outlive it.
///
/// A file is named after its number, counted from 1: "1.txt". It holds the lines "open", "chunk N SIZE" with
/// the chunk's number and its payload behind it, "tmcd H:M:S:F" and "closed".
class FakeMuxers {
 public:
    static constexpr std::chrono::seconds kDeadline{30};

    /// Each is asked before the operation takes place, on the thread that calls it; false makes it fail. An
    /// unset one never does.
    struct Hooks {
        /// False for a type that the factory does not know. Without it "normal" and "fragment" are known.
        std::function<bool(const std::string& type)> create;
        std::function<bool()> initialize;
        std::function<bool()> uninitialize;
        std::function<bool()> open;
        std::function<bool(std::uint64_t chunk)> write;
        std::function<bool()> writeTmcd;
        std::function<bool()> close;
    };

    /// One opened file.
    struct File {
        std::string type;
        clipfileModule::OutputSettings settings;
        /// "01:02:03:04", with " DF" behind it for drop frame, or "none".
        std::string timecode;
        std::string path;
    };

    FakeMuxers();
    ~FakeMuxers();
    FakeMuxers(const FakeMuxers&) = delete;
    FakeMuxers& operator=(const FakeMuxers&) = delete;

    /// Any thread, for all calls from now on.
    void SetHooks(const std::function<void(Hooks&)>& change);
    /// What `GetBoxSize` returns.
    void SetBoxSize(std::uint64_t bytes);
    /// What `GetDuration` grows by with each chunk, in ticks of 1/25000 s.
    void SetChunkDuration(std::uint64_t ticks);
    /// Files are FIFOs from now on: writing to one hangs once the pipe is full.
    void SetFifo();

    /// All calls of all muxers in their order, with the number of the muxer, counted from 1 by the factory:
    /// "create 1 normal", "2 Initialize", "2 Open", "2 Write 0", "2 WriteTmcd", "2 Close", "2 Uninitialize",
    /// "2 gone".
    std::vector<std::string> Calls() const;
    std::vector<File> Files() const;
    [[nodiscard]] bool WaitForCall(const std::string& call,
                                   std::chrono::milliseconds deadline = kDeadline) const;

    /// Shared with the muxers.
    struct State;

 private:
    const std::shared_ptr<State> state_;
};
