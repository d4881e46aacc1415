#pragma once

#include <atomic>
#include <condition_variable>
#include <cstddef>
#include <cstdint>
#include <limits>
#include <memory>
#include <optional>
#include <string>
#include <thread>
#include <vector>

#include "QxModuleStreamInterface.h"
#include "StreamAnalyzer.h"
#include "StreamData.h"
#include "buffer/ChunkPass.h"
#include "buffer/PresentationOrder.h"
#include "buffer/chunk/ChunkData.h"
#include "buffer/queue/StreamQueue.h"
#include "buffer/state/CacheState.h"
#include "common/ControllerInterface.h"
#include "common/Mutex.h"
#include "common/OutputSettings.h"
#include "common/StreamBufferInterface.h"
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
/// Sources: StreamBuffer.cc has life and states, StreamBufferChunk.cc the chunk thread, StreamBufferExact.cc
/// what is different with exact rules, StreamBufferOrder.cc what pictures in decoding order add.
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
    /// stopped. Throws `std::system_error` when no thread can be started; with exact rules the recording
    /// fails then, and asks for its removal.
    void Start(const OutputSettings& recordSettings) EXCLUDES(controlMutex);
    /// Ends the recording: joins its threads, writes the chunks that wait and closes the file. Leaves start
    /// and stop timestamp at 0 and -1. Does nothing when the buffer is stopped. With exact rules what is
    /// complete in the caches becomes a last chunk before that.
    ///
    /// A host can bring a thread of the recording here, out of a status that the thread reports. Throws
    /// `std::system_error` then: units are dropped from now on, and the next `Stop`, `Start` or the
    /// destruction on another thread does what is left.
    void Stop() EXCLUDES(controlMutex);
    /// True from `Start` until the first IDR frame, the end or a fault. Any thread.
    bool IsWaiting() const { return stateId == kWaitStartState; }
    /// Sets where the record starts: units before it do not belong to it. Has an effect until the recording
    /// has met its first IDR frame.
    void SetStartTimestamp(std::int64_t start) { startTimestamp = start; }
    /// Sets where the record ends; -1 leaves it open.
    void SetStopTimestamp(std::int64_t stop) { stopTimestamp = stop; }
    /// With exact rules: the first instant, in 90 kHz ticks, that does not belong to the record any more; -1
    /// while that is open. The controller sets it before the metadata unit that carries the command reaches
    /// the buffer, so that no chunk can be cut across it, however late the stop itself is carried out.
    void SetEndTimestamp(std::int64_t end) { endTimestamp = end; }

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
    std::int64_t GetEndTimestamp() const override { return endTimestamp; }
    void NotifyEndSync() override;

 private:
    friend class StreamBufferPeer;

    using UnitList = std::vector<std::shared_ptr<StreamData>>;
    using SampleList = std::vector<std::shared_ptr<nal_access::SampleData>>;

    /// Index of a medium's queue.
    enum Medium : std::size_t { kVideo = 0, kAudio = 1, kMeta = 2, kMediumCount = 3 };
    static constexpr const char* kMediaTypes[] = {"video", "audio", "meta"};

    /// Units of each medium in a chunk.
    struct ChunkCounts {
        std::size_t video;
        std::size_t audio;
        std::size_t meta;
    };
    /// Where a chunk ends on the time line of unit counts, less half an audio frame: in ticks of the video
    /// and of the audio track.
    struct ChunkEnd {
        std::uint64_t video;
        std::uint64_t audio;
    };

    // Life cycle and states.
    void pushUnit(const std::shared_ptr<StreamData>& unit, Medium medium) EXCLUDES(stateMutex);
    void updateTimecodeStatus(const std::shared_ptr<StreamData>& unit) EXCLUDES(analyzerMutex);
    void changeState(const std::shared_ptr<CacheState>& next) REQUIRES(stateMutex);
    void addToCache(const std::shared_ptr<StreamData>& unit, UnitList StreamBuffer::*cache,
                    const char* mediaType) EXCLUDES(bufferMutex);
    void removeBefore(UnitList& cache, std::uint64_t limit) REQUIRES(bufferMutex);
    void setError(int code) EXCLUDES(stateMutex, bufferMutex);
    void finishStop() REQUIRES(controlMutex) EXCLUDES(bufferMutex);
    void Cancel() REQUIRES(controlMutex) EXCLUDES(bufferMutex);
    bool startThreads(const std::vector<std::shared_ptr<StreamQueue>>& started) REQUIRES(controlMutex);
    bool isExact() const { return settings.recordRules == RecordRules::kExact; }
    bool inDecodingOrder() const { return settings.pictureOrder == PictureOrder::kDecoding; }
    int framesIn(std::int64_t distance) const;
    static unsigned int getTimecodeFrameCount(std::uint32_t framerate);

    // The chunk thread.
    void makeChunk() EXCLUDES(stateMutex, bufferMutex);
    void endSync() EXCLUDES(stateMutex, bufferMutex);
    PassResult findPassedLimit() const REQUIRES(bufferMutex);
    /// Whether a pass would do, log or decide anything: the chunk thread sleeps until then.
    bool isPassDue() const REQUIRES(bufferMutex);
    PassResult makePass() REQUIRES(bufferMutex);
    /// Where a chunk of so many pictures ends that belongs to a record with that end.
    ChunkEnd findChunkEnd(std::size_t pictures, std::uint64_t end) REQUIRES(bufferMutex);
    std::optional<ChunkCounts> findChunk(std::size_t pictures, std::uint64_t end) REQUIRES(bufferMutex);
    PassResult pushChunk(const ChunkCounts& counts, std::uint64_t end) REQUIRES(bufferMutex);
    /// Units in front of `end`.
    static std::size_t countBefore(const UnitList& cache, std::uint64_t end);
    std::uint64_t rescale(std::uint64_t value, std::uint32_t from, std::uint32_t to) EXCLUDES(analyzerMutex);
    void splitVideo(ChunkData& chunk, std::size_t count, std::uint64_t end) REQUIRES(bufferMutex);
    void splitAudio(ChunkData& chunk, std::size_t count) REQUIRES(bufferMutex);
    void splitMeta(ChunkData& chunk, std::size_t count, std::uint64_t end) REQUIRES(bufferMutex);
    void setDurations(SampleList& samples, std::uint64_t next, std::uint32_t clock, std::uint32_t timescale)
        REQUIRES(analyzerMutex);

    // Pictures in decoding order.
    /// When a video unit is shown, in ticks of its RTP clock.
    std::uint64_t shownAt(const StreamData& unit) const;
    /// When the cached pictures from `first` to in front of `end` are shown.
    std::vector<std::uint64_t> timesOf(std::size_t first, std::size_t end) const REQUIRES(bufferMutex);
    /// The first IDR frame among the cached pictures from `first` on; their number where there is none.
    std::size_t findIdrFrom(std::size_t first) const REQUIRES(bufferMutex);
    /// True when every picture is cached that is shown before one of the first `pictures`.
    bool isOrderKnown(std::size_t pictures) const REQUIRES(bufferMutex);
    /// When the first of the cached pictures is shown: in decoding order, where no IDR frame stands in front,
    /// that need not be the first one. There must be one.
    std::uint64_t firstShownAt() const REQUIRES(bufferMutex);
    /// Pictures of a chunk that may hold so many. In decoding order it ends in front of an IDR frame, or,
    /// where none has come for long, where the pictures so far are shown before all that follow, if it can.
    std::size_t findCut(std::size_t pictures) const REQUIRES(bufferMutex);
    bool isClosedAt(std::size_t cut) const REQUIRES(bufferMutex);
    /// The last IDR frame among the cached pictures in front of `end`; 0 where there is none.
    std::size_t findIdrBefore(std::size_t end) const REQUIRES(bufferMutex);
    /// When the pictures from the `first` cached one to in front of `end` are shown, and those that went into
    /// earlier chunks since the same IDR frame.
    std::vector<std::uint64_t> timesSinceIdr(std::size_t first, std::size_t end) const REQUIRES(bufferMutex);
    /// By how many pictures the first one is shown later than it is decoded.
    std::int64_t findDelay() const REQUIRES(bufferMutex);
    /// Pictures of the record so far and of the cache that a record with that end shows.
    std::uint64_t countShown(std::uint64_t end) const REQUIRES(bufferMutex);
    /// Tells the order of the first `count` cached pictures.
    void placePictures(ChunkData& chunk, std::size_t count, std::uint64_t end) REQUIRES(bufferMutex);
    /// The end of a record that no command ends: what is cached is shown up to there without a gap, and the
    /// other media reach as far.
    std::uint64_t findRestEnd() REQUIRES(bufferMutex);
    /// When the first picture is shown in front of which one is missing that was to come.
    std::uint64_t findFirstGap() REQUIRES(bufferMutex);

    // A recording without a thread, which only exact rules allow.
    void startWriter() REQUIRES(bufferMutex);
    void endWithoutThread() EXCLUDES(controlMutex, stateMutex, bufferMutex);

    // The chunk thread with exact rules.
    PassResult makeExactPass() REQUIRES(bufferMutex);
    void cutRest() REQUIRES(bufferMutex);
    bool hasTimeline() const;
    /// Pictures in the cache that belong to a record with that end or are needed by one that does.
    std::size_t countNeeded(std::uint64_t end) const REQUIRES(bufferMutex);
    std::uint64_t findEnd() const;
    bool startInStep() REQUIRES(bufferMutex);
    bool startInStep(UnitList& cache, std::uint32_t clock) REQUIRES(bufferMutex);
    void removeFront(UnitList& cache, std::size_t count) REQUIRES(bufferMutex);
    std::optional<ChunkCounts> findCompleteChunk(std::size_t pictures, std::uint64_t end)
        REQUIRES(bufferMutex);

    // Log helpers.
    void dumpBuffer() const REQUIRES(bufferMutex);
    static void dumpChunk(const ChunkData& chunk);
    static void dump(const SampleList& samples);

    /// A record whose end is not known.
    static constexpr std::uint64_t kNoEnd = std::numeric_limits<std::uint64_t>::max();

    // Constant after construction.
    /// Not owned.
    ControllerInterface* const controller;
    /// Video units in a chunk.
    const std::uint32_t chunkFrames = 8;
    /// Clock of `rtp_timestamp`: video and metadata, audio.
    const std::uint32_t videoRtpRate = 90000;
    const std::uint32_t audioRtpRate = 48000;

    // Contract: start-and-stop-in-turn. Each is one step to the others.
    Mutex controlMutex;
    std::shared_ptr<std::thread> chunkThread GUARDED_BY(controlMutex);
    /// A stop has begun and threads are left; it stays so when the stop met one of them as its caller.
    bool stopPending GUARDED_BY(controlMutex) = false;
    /// What is complete in the caches is still to be cut.
    bool restPending GUARDED_BY(controlMutex) = false;

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
    /// When the picture that was cached last is decoded. A clock that steps back leaves others at the back.
    std::uint64_t newestVideo GUARDED_BY(bufferMutex) = 0;
    /// The IDR frame that the record begins with.
    std::shared_ptr<StreamData> firstPicture GUARDED_BY(bufferMutex);
    PresentationOrder presentationOrder GUARDED_BY(bufferMutex);
    /// With exact rules: its thread could not be started.
    bool writerMissing GUARDED_BY(bufferMutex) = false;
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
    // Contract: push-counters-unread. Units received.
    std::atomic<std::uint64_t> pushedVideo = 0;
    std::atomic<std::uint64_t> pushedAudio = 0;
    std::atomic<std::uint64_t> pushedMeta = 0;
};

}  // namespace clipfileModule
