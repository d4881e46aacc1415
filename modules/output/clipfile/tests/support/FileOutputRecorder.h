#pragma once

// Takes the place of `FileOutput` in a test program: linking FileOutputRecorder.cc keeps the real one out of
// it. Everything that recordings ask of their file output is kept here.

#include <chrono>
#include <condition_variable>
#include <cstddef>
#include <functional>
#include <memory>
#include <mutex>
#include <optional>
#include <string>
#include <vector>

#include "buffer/chunk/ChunkData.h"
#include "common/OutputSettings.h"
#include "common/StreamBufferInterface.h"

/// Records what all file outputs are asked for while it lives. One at a time.
class FileOutputRecorder {
 public:
    static constexpr std::chrono::seconds kDeadline{30};

    /// One file output: from `Initialize` to `Uninitialize`.
    struct Output {
        clipfileModule::StreamBufferInterface* buffer = nullptr;
        std::string type;
        clipfileModule::OutputSettings settings;
        /// "Initialize", "Start", "Stop" and "Uninitialize" in the order they came.
        std::vector<std::string> calls;
        std::vector<std::shared_ptr<clipfileModule::ChunkData>> chunks;
        std::size_t chunkCount = 0;
    };

    using ChunkHook =
        std::function<void(std::size_t output, const std::shared_ptr<clipfileModule::ChunkData>& chunk)>;

    FileOutputRecorder();
    ~FileOutputRecorder();
    FileOutputRecorder(const FileOutputRecorder&) = delete;
    FileOutputRecorder& operator=(const FileOutputRecorder&) = delete;

    /// What the next calls of `Initialize` return.
    void SetInitializeResult(bool result);
    /// What `PushChunk` returns, by default 0: a file output that is never behind.
    void SetQueueSize(std::size_t size);
    /// Chunks go to `hook`, with the number of their output, and are not kept. It runs on the chunk thread,
    /// under the lock of its caches.
    void SetChunkHook(ChunkHook hook);
    /// Runs inside each `Start`.
    void SetStartHook(std::function<void()> hook);
    /// Runs inside each `Stop`.
    void SetStopHook(std::function<void()> hook);
    /// Each output runs a thread from `Start` to `Stop` that asks its buffer for timecodes as a writer does.
    void SetThreaded();

    std::vector<Output> Outputs() const;
    /// The output `index`, counted by `Initialize`.
    Output At(std::size_t index) const;
    [[nodiscard]] bool WaitFor(const std::function<bool(const std::vector<Output>&)>& predicate,
                               std::chrono::milliseconds deadline = kDeadline) const;
    [[nodiscard]] bool WaitForChunks(std::size_t count, std::size_t index = 0,
                                     std::chrono::milliseconds deadline = kDeadline) const;

    // Called by the file outputs.
    bool OnInitialize(const void* output, clipfileModule::StreamBufferInterface* buffer,
                      const std::string& type);
    void OnUninitialize(const void* output);
    void OnStart(const void* output, const clipfileModule::OutputSettings& settings);
    void OnStop(const void* output);
    std::size_t OnChunk(const void* output, const std::shared_ptr<clipfileModule::ChunkData>& chunk);

 private:
    class Writer;
    struct Entry {
        const void* output;
        Output record;
        std::shared_ptr<Writer> writer;
    };

    Entry& find(const void* output);
    std::vector<Output> records() const;

    mutable std::mutex mutex_;
    mutable std::condition_variable changed_;
    // Guarded by mutex_:
    std::vector<Entry> entries_;
    bool initializeResult_ = true;
    bool threaded_ = false;
    std::size_t queueSize_ = 0;
    ChunkHook chunkHook_;
    std::function<void()> startHook_;
    std::function<void()> stopHook_;
};
