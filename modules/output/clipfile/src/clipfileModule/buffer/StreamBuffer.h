#pragma once

#include <atomic>
#include <condition_variable>
#include <cstddef>
#include <cstdint>
#include <memory>
#include <string>
#include <thread>
#include <vector>

#include "QxModuleStreamInterface.h"
#include "StreamAnalyzer.h"
#include "StreamData.h"
#include "buffer/ChunkData.h"
#include "buffer/StreamQueue.h"
#include "buffer/state/CacheState.h"
#include "buffer/state/StreamBufferInterface.h"
#include "common/Mutex.h"
#include "controller/ControllerInterface.h"
#include "controller/OutputSettings.h"
#include "fileout/FileOutput.h"
#include "mp4/InputStreamInfo.h"

namespace clipfileModule {

/// One recording: runs the recording states, caches the units of the stream in time order, cuts them into
/// chunks on a thread of its own and owns the `FileOutput` that writes these.
///
/// It must live in a `shared_ptr`. Life: construction, `Start`, any number of units, `Stop`; `Start` after
/// `Stop` begins again on the same object. `Stop` must have run before destruction. Every public operation
/// may be called from any thread, at any time in that life.
///
/// Order of the locks: `controlMutex`, `stateMutex`, `bufferMutex`, and last, one at a time,
/// `analyzerMutex`, the locks of the queues and of `FileOutput`.
class StreamBuffer final : public QxModuleStreamInterface,
                           public StreamBufferInterface,
                           public std::enable_shared_from_this<StreamBuffer> {
 public:
    /// A record from `start` to `stop`, in 90 kHz ticks of the RTP clock; a `stop` of -1 leaves it open.
    /// `owner` outlives the buffer.
    StreamBuffer(ControllerInterface* owner, std::int64_t start, std::int64_t stop);
    ~StreamBuffer() override;
    StreamBuffer(const StreamBuffer&) = delete;
    StreamBuffer& operator=(const StreamBuffer&) = delete;

    /// Starts the recording with its own copy of `recordSettings`. Does nothing unless the buffer is
    /// stopped. Throws `std::system_error` when no thread can be started.
    void Start(const OutputSettings& recordSettings) EXCLUDES(controlMutex);
    /// Ends the recording: joins its threads, writes the chunks that wait and closes the file. Leaves start
    /// and stop timestamp at 0 and -1. Does nothing when the buffer is stopped.
    void Stop() EXCLUDES(controlMutex);
    /// Sets where the record starts: units before it do not belong to it. Has an effect until the recording
    /// has met its first IDR frame.
    void SetStartTimestamp(std::int64_t start) { startTimestamp = start; }
    /// Sets where the record ends; -1 leaves it open.
    void SetStopTimestamp(std::int64_t stop) { stopTimestamp = stop; }
    /// With exact rules: the first instant, in 90 kHz ticks, that does not belong to the record any more; -1
    /// while that is open. The controller sets it before the metadata unit that carries the command reaches
    /// the buffer, so that no chunk can be cut across it, however late the stop itself is carried out.
    void SetEndTimestamp(std::int64_t end) { endTimestamp = end; }
    std::int64_t GetEndTimestamp() const { return endTimestamp; }

    // QxModuleStreamInterface. A push waits while the queue of its medium is full.
    void PushReserved(const std::shared_ptr<StreamData>& unit) override;
    void PushVideo(const std::shared_ptr<StreamData>& unit) override;
    void PushAudio(const std::shared_ptr<StreamData>& unit) override;
    void PushMeta(const std::shared_ptr<StreamData>& unit) override;

    // StreamBufferInterface.
    void SetVideoSequenceHeader(const nal_access::NalUnit& sps, const nal_access::NalUnit& pps,
                                const std::shared_ptr<StreamData>& unit) override EXCLUDES(bufferMutex);
    bool MakeFileTimecode(const std::shared_ptr<ChunkData>& chunk) override EXCLUDES(analyzerMutex);
    bool GetFileTimecode(unsigned char* timecode, bool* drop) override EXCLUDES(analyzerMutex);
    bool GetFileTimecode(unsigned char* timecode) override EXCLUDES(analyzerMutex);
    std::int64_t GetStartTimestamp() const override { return startTimestamp; }
    std::int64_t GetStopTimestamp() const override { return stopTimestamp; }
    void NotifyEndSync() override;

 private:
    friend class StreamBufferPeer;

    using UnitList = std::vector<std::shared_ptr<StreamData>>;
    using SampleList = std::vector<std::shared_ptr<nal_access::SampleData>>;

    /// Index of a medium's queue.
    enum Medium : std::size_t { kVideo = 0, kAudio = 1, kMeta = 2, kMediumCount = 3 };
    static constexpr const char* kMediaTypes[] = {"video", "audio", "meta"};

    // Life cycle and states.
    void pushUnit(const std::shared_ptr<StreamData>& unit, Medium medium) EXCLUDES(stateMutex);
    void updateTimecodeStatus(const std::shared_ptr<StreamData>& unit) EXCLUDES(analyzerMutex);
    void changeState(const std::shared_ptr<CacheState>& next) REQUIRES(stateMutex);
    void addToCache(const std::shared_ptr<StreamData>& unit, UnitList StreamBuffer::*cache,
                    const char* mediaType) EXCLUDES(bufferMutex);
    void removeBefore(UnitList& cache, std::uint64_t limit) REQUIRES(bufferMutex);
    void setError(int code) EXCLUDES(stateMutex, bufferMutex);
    void Cancel() REQUIRES(controlMutex) EXCLUDES(bufferMutex);
    static unsigned int getTimecodeFrameCount(std::uint32_t framerate);

    // The chunk thread.
    void makeChunk() EXCLUDES(stateMutex, bufferMutex);
    void endSync() EXCLUDES(stateMutex, bufferMutex);
    int findPassedLimit() const REQUIRES(bufferMutex);
    int cutChunk() REQUIRES(bufferMutex);
    std::uint64_t rescale(std::uint64_t value, std::uint32_t from, std::uint32_t to) EXCLUDES(analyzerMutex);
    void splitVideo(ChunkData& chunk, std::size_t count) REQUIRES(bufferMutex);
    void splitAudio(ChunkData& chunk, std::size_t count) REQUIRES(bufferMutex);
    void splitMeta(ChunkData& chunk, std::size_t count) REQUIRES(bufferMutex);
    void setDurations(SampleList& samples, std::uint64_t next, std::uint32_t clock, std::uint32_t timescale)
        REQUIRES(analyzerMutex);

    // Log helpers.
    void dumpBuffer() const REQUIRES(bufferMutex);
    static void dumpChunk(const ChunkData& chunk);
    static void dump(const SampleList& samples);

    // Constant after construction.
    /// Not owned.
    ControllerInterface* const controller;
    /// Video units in a chunk.
    const std::uint32_t chunkFrames = 8;
    /// Clock of `rtp_timestamp`: video and metadata, audio.
    const std::uint32_t videoRtpRate = 90000;
    const std::uint32_t audioRtpRate = 48000;

    /// Makes each `Start` and each `Stop` one step to the others.
    Mutex controlMutex;
    std::shared_ptr<std::thread> chunkThread GUARDED_BY(controlMutex);

    /// Guards each call of `Execute` with the change of state that follows it, and every other change.
    Mutex stateMutex;
    std::shared_ptr<CacheState> state GUARDED_BY(stateMutex);
    std::vector<std::shared_ptr<StreamQueue>> queues GUARDED_BY(stateMutex);
    /// The number of `state`, for threads that must not wait for the lock.
    std::atomic<std::int32_t> stateId;

    /// Guards the caches and the counters of chunks.
    Mutex bufferMutex;
    std::condition_variable bufferCondition;
    /// Units by ascending `rtp_timestamp`.
    UnitList videoBuffer GUARDED_BY(bufferMutex);
    UnitList audioBuffer GUARDED_BY(bufferMutex);
    UnitList metaBuffer GUARDED_BY(bufferMutex);
    /// Units moved into chunks.
    std::uint64_t chunkedVideo GUARDED_BY(bufferMutex) = 0;
    std::uint64_t chunkedAudio GUARDED_BY(bufferMutex) = 0;
    std::uint64_t chunkedMeta GUARDED_BY(bufferMutex) = 0;
    /// The packet that `ConvertMeta` may merge into each metadata sample.
    std::vector<unsigned char> metaBlock GUARDED_BY(bufferMutex);
    std::shared_ptr<FileOutput> fileOutput GUARDED_BY(bufferMutex);

    /// An analyser serves one thread at a time.
    Mutex analyzerMutex;
    nal_access::StreamAnalyzer analyzer GUARDED_BY(analyzerMutex);
    /// Last timecode while `tcStatus` is unknown.
    std::shared_ptr<nal_access::SampleData> lastTimecode GUARDED_BY(analyzerMutex);
    /// Hours, minutes, seconds and frames of the current file's first frame, with their flag.
    std::vector<unsigned char> fileTimecode GUARDED_BY(analyzerMutex);
    bool dropFrame GUARDED_BY(analyzerMutex) = false;

    // Written by `Start` while no thread of the recording runs and every unit is dropped, then only read. The
    // parameter sets in `settings` follow once, before the threads that read them exist.
    OutputSettings settings;
    InputStreamInfo streamInfo;

    std::atomic<std::int64_t> startTimestamp;
    std::atomic<std::int64_t> stopTimestamp;
    std::atomic<std::int64_t> endTimestamp = -1;
    /// Set with the first chunk of the object's life, and never cleared.
    std::atomic<bool> chunkProduced = false;
    /// 0 unknown, 1 the timecode stands still, 2 it runs. Decided once in the object's life.
    std::atomic<std::int32_t> tcStatus = 0;
    /// Units received.
    std::atomic<std::uint64_t> pushedVideo = 0;
    std::atomic<std::uint64_t> pushedAudio = 0;
    std::atomic<std::uint64_t> pushedMeta = 0;
};

}  // namespace clipfileModule
