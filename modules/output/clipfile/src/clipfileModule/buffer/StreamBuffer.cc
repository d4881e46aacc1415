#include "buffer/StreamBuffer.h"

#include <algorithm>
#include <cmath>
#include <cstring>
#include <iterator>
#include <system_error>
#include <utility>

#include "buffer/state/EndSyncRecState.h"
#include "buffer/state/ErrorCacheState.h"
#include "buffer/state/StopCacheState.h"
#include "buffer/state/WaitStartCacheState.h"
#include "common/JoinThread.h"
#include "common/Log.h"
#include "common/LogScope.h"
#include "common/PresentationTime.h"

namespace clipfileModule {

namespace {

/// Units between a push and the cache. A push waits while they stand full.
constexpr std::uint64_t kQueueCapacity = 20;

// Contract: block-with-a-byte-in-front. A packet begins with its label (SMPTE ST 336).
/// A packet in the key, length, value form of SMPTE ST 336: one byte 01, universal label, BER length 43, and
/// the items E000, 8500, 8509 and 8512 ("WGS-84"), each with a 2-byte tag and a 2-byte length.
constexpr unsigned char kMetaBlock[64] = {
    0x01,                                                                                            // start
    0x06, 0x0E, 0x2B, 0x34, 0x02, 0x53, 0x01, 0x01, 0x0C, 0x02, 0x01, 0x01, 0x7F, 0x01, 0x00, 0x00,  // label
    0x83, 0x00, 0x00, 0x2B,                                                                          // length
    0xE0, 0x00, 0x00, 0x10,                                                                          // E000
    0x85, 0x1D, 0x08, 0x00, 0x46, 0x78, 0x03, 0x1C, 0xE8, 0x1F, 0x06, 0xF5, 0xA8, 0x84, 0x11, 0xE2,  //
    0x85, 0x00, 0x00, 0x04, 0x02, 0x03, 0x00, 0x00,                                                  // 8500
    0x85, 0x09, 0x00, 0x01, 0x56,                                                                    // 8509
    0x85, 0x12, 0x00, 0x06, 0x57, 0x47, 0x53, 0x2D, 0x38, 0x34,                                      // 8512
};

bool byRtpTimestamp(const std::shared_ptr<StreamData>& a, const std::shared_ptr<StreamData>& b) {
    return a->rtp_timestamp < b->rtp_timestamp;
}

}  // namespace

StreamBuffer::StreamBuffer(ControllerInterface* owner, std::int64_t start, std::int64_t stop)
    : controller(owner),
      state(std::make_shared<StopCacheState>(this)),
      queues(kMediumCount),
      stateId(kStopState),
      startTimestamp(start),
      stopTimestamp(stop) {}

StreamBuffer::~StreamBuffer() {
    MutexLock control(controlMutex);
    if (stopPending) {
        finishStop();
    }
}

void StreamBuffer::Start(const OutputSettings& recordSettings) {
    CLIPFILE_LOG_SCOPE(scope, LOG_PRIORITY_TRACE);
    MutexLock control(controlMutex);
    if (stateId != kStopState) {
        scope.End();
        return;
    }
    if (stopPending) {
        finishStop();
    }
    settings = recordSettings;
    auto output = std::make_shared<FileOutput>();
    if (!output->Initialize(controller, this, settings.fileType)) {
        // Contract: muxer-failure-goes-on. Status 7 has been set already.
        CLIPFILE_LOG(LOG_PRIORITY_WARNING, "mp4File initialize failed.");
    }
    {
        MutexLock lock(bufferMutex);
        fileOutput = std::move(output);
        videoBuffer.clear();
        audioBuffer.clear();
        metaBuffer.clear();
        firstPicture.reset();
        presentationOrder.Begin(0);
        writerMissing = false;
        metaBlock.assign(std::begin(kMetaBlock), std::end(kMetaBlock));
        chunkedVideo = 0;
        chunkedAudio = 0;
        chunkedMeta = 0;
    }
    pushedVideo = 0;
    pushedAudio = 0;
    pushedMeta = 0;
    {
        MutexLock lock(analyzerMutex);
        fileTimecode.clear();
    }
    // Contract: sps-line-at-each-start. The sets come with the IDR frame.
    streamInfo.MakeInputStreamInfo(settings);

    std::vector<std::shared_ptr<StreamQueue>> started(kMediumCount);
    for (std::shared_ptr<StreamQueue>& queue : started) {
        queue = std::make_shared<StreamQueue>(kQueueCapacity, false);
    }
    {
        MutexLock lock(stateMutex);
        queues = started;
        changeState(std::make_shared<WaitStartCacheState>(this, settings.recordRules, settings.pictureOrder));
    }
    if (!startThreads(started)) {
        control.Unlock();
        endWithoutThread();
    }
    scope.End();
}

bool StreamBuffer::startThreads(const std::vector<std::shared_ptr<StreamQueue>>& started) {
    UnitList StreamBuffer::*const caches[] = {&StreamBuffer::videoBuffer, &StreamBuffer::audioBuffer,
                                              &StreamBuffer::metaBuffer};
    try {
        for (std::size_t medium = 0; medium < kMediumCount; ++medium) {
            started[medium]->Start([this, cache = caches[medium],
                                    mediaType = kMediaTypes[medium]](std::shared_ptr<StreamData>& unit) {
                addToCache(unit, cache, mediaType);
            });
        }
        chunkThread = std::make_shared<std::thread>(&StreamBuffer::makeChunk, this);
        return true;
    } catch (const std::system_error& error) {
        if (!isExact()) {
            throw;
        }
        CLIPFILE_LOG(LOG_PRIORITY_ERROR, "recording cannot be started. %s.", error.what());
        return false;
    }
}

void StreamBuffer::Stop() {
    CLIPFILE_LOG_SCOPE(scope, LOG_PRIORITY_TRACE);
    MutexLock control(controlMutex);
    std::vector<std::shared_ptr<StreamQueue>> stopped(kMediumCount);
    {
        // A push may wait here for room in a queue. Its worker runs until it is stopped below, and nothing
        // that the worker waits for waits for this lock, so the push gets its room and the lock comes free.
        MutexLock lock(stateMutex);
        if (stateId == kStopState && !stopPending) {
            scope.End();
            return;
        }
        if (stateId != kStopState) {
            // A record that found its end has nothing more to cut.
            restPending = isExact() && (stateId == kStartState || stateId == kErrorState);
            stopPending = true;
            changeState(std::make_shared<StopCacheState>(this));
            stopped.swap(queues);
        }
    }
    // Contract: leftovers-dropped. Units in queues and caches are not written.
    for (std::shared_ptr<StreamQueue>& queue : stopped) {
        if (queue != nullptr) {
            if (restPending) {
                queue->Finish();
            } else {
                queue->Stop();
            }
            queue.reset();
        }
    }
    finishStop();
    scope.End();
}

void StreamBuffer::finishStop() {
    Cancel();
    std::shared_ptr<FileOutput> output;
    {
        MutexLock lock(bufferMutex);
        if (restPending) {
            cutRest();
            restPending = false;
        }
        output = fileOutput;
    }
    // Contract: restart-forgets-the-stop. A stop that was commanded is lost.
    startTimestamp = 0;
    stopTimestamp = -1;
    endTimestamp = -1;
    if (output != nullptr) {
        // It throws on its own thread, and must outlive that thread.
        output->Stop();
        output->Uninitialize();
        MutexLock lock(bufferMutex);
        fileOutput.reset();
    }
    stopPending = false;
}

void StreamBuffer::Cancel() {
    CLIPFILE_LOG_SCOPE(scope, LOG_PRIORITY_TRACE);
    if (chunkThread != nullptr) {
        if (chunkThread->joinable()) {
            CLIPFILE_LOG(LOG_PRIORITY_TRACE, "start join...");
            {
                // The thread tests the state and enters its wait under this lock: either it sees the new
                // state or it gets the signal.
                MutexLock lock(bufferMutex);
                bufferCondition.notify_one();
            }
            JoinThread(*chunkThread);
            CLIPFILE_LOG(LOG_PRIORITY_TRACE, "end join...");
        }
        chunkThread.reset();
    }
}

void StreamBuffer::PushReserved(const std::shared_ptr<StreamData>& /*unit*/) {}

void StreamBuffer::PushVideo(const std::shared_ptr<StreamData>& unit) {
    ++pushedVideo;
    CLIPFILE_LOG_PLAIN(LOG_PRIORITY_TRACE, "ST: [V]\t%llu",
                       static_cast<unsigned long long>(unit->rtp_timestamp));
    pushUnit(unit, kVideo);
}

void StreamBuffer::PushAudio(const std::shared_ptr<StreamData>& unit) {
    ++pushedAudio;
    CLIPFILE_LOG_PLAIN(LOG_PRIORITY_TRACE, "ST: [A]\t%llu",
                       static_cast<unsigned long long>(unit->rtp_timestamp));
    pushUnit(unit, kAudio);
}

void StreamBuffer::PushMeta(const std::shared_ptr<StreamData>& unit) {
    ++pushedMeta;
    updateTimecodeStatus(unit);
    CLIPFILE_LOG_PLAIN(LOG_PRIORITY_TRACE, "ST: [M]\t%llu",
                       static_cast<unsigned long long>(unit->rtp_timestamp));
    pushUnit(unit, kMeta);
}

void StreamBuffer::pushUnit(const std::shared_ptr<StreamData>& unit, Medium medium) {
    MutexLock lock(stateMutex);
    const std::shared_ptr<CacheState> next = state->Execute(unit, queues[medium], kMediaTypes[medium]);
    if (next != nullptr) {
        changeState(next);
    }
}

void StreamBuffer::updateTimecodeStatus(const std::shared_ptr<StreamData>& unit) {
    MutexLock lock(analyzerMutex);
    std::shared_ptr<nal_access::SampleData> sample;
    bool flag = false;
    analyzer.ConvertTmcd(unit, sample, flag, 0, 0);
    // Contract: timecode-status-for-life. The first two timecodes decide, also for what a restart records.
    if (tcStatus != 0 || sample == nullptr) {
        return;
    }
    if (lastTimecode != nullptr) {
        // Contract: timecode-common-length. Compared in the length that both have.
        const std::uint64_t size = std::min(sample->GetDataSize(), lastTimecode->GetDataSize());
        const bool still = std::memcmp(sample->GetData(), lastTimecode->GetData(), size) == 0;
        tcStatus = still ? 1 : 2;
        CLIPFILE_LOG_PLAIN(LOG_PRIORITY_TRACE, "ST: tc_status : %d", tcStatus.load());
    }
    lastTimecode = sample;
}

void StreamBuffer::changeState(const std::shared_ptr<CacheState>& next) {
    CLIPFILE_LOG_PLAIN(LOG_PRIORITY_OPERATOR, "OP: CHANGE STATE %s -> %s.", state->GetName().c_str(),
                       next->GetName().c_str());
    // Contract: enter-before-leave. The old state is still in place.
    next->OnEnter();
    const std::shared_ptr<CacheState> old = state;
    state = next;
    stateId = next->GetId();
    old->OnExit();
}

// Contract: media-word-unused. The last argument.
void StreamBuffer::addToCache(const std::shared_ptr<StreamData>& unit, UnitList StreamBuffer::*cache,
                              const char* /*mediaType*/) {
    bool due = false;
    {
        MutexLock lock(bufferMutex);
        UnitList& units = this->*cache;
        // Contract: sorted-insertion. The cache is in order; a late unit goes behind those of its own time.
        units.insert(std::upper_bound(units.begin(), units.end(), unit, byRtpTimestamp), unit);
        newestVideo = &units == &videoBuffer ? unit->rtp_timestamp : newestVideo;
        due = isPassDue();
    }
    if (due) {
        bufferCondition.notify_one();
    }
}

void StreamBuffer::SetVideoSequenceHeader(const nal_access::NalUnit& sps, const nal_access::NalUnit& pps,
                                          const std::shared_ptr<StreamData>& unit) {
    CLIPFILE_LOG_SCOPE(scope, LOG_PRIORITY_TRACE);
    const double frameMilliSec = static_cast<double>(streamInfo.audio_sample_duration) /
                                 static_cast<double>(streamInfo.audio_track_timescale) * 1000;
    // Contract: half-an-audio-frame-is-10-ms. Cut twice: 21.3 to 21, and 10.5 to 10.
    const std::uint64_t half = static_cast<std::uint64_t>(frameMilliSec) >> 1;

    MutexLock lock(bufferMutex);
    if (!isExact()) {
        const std::uint64_t shown = PresentationMilliSec(*unit, settings.pictureOrder);
        const std::uint64_t limit = shown == 0 ? 0 : shown - half;
        removeBefore(videoBuffer, limit);
        removeBefore(audioBuffer, limit);
        removeBefore(metaBuffer, limit);
    }
    settings.sps = sps;
    settings.pps = pps;
    startWriter();
    // Contract: idr-frame-unsorted. The cache is empty here.
    videoBuffer.push_back(unit);
    newestVideo = unit->rtp_timestamp;
    firstPicture = unit;
    if (isExact()) {
        startInStep();
    }
}

void StreamBuffer::removeBefore(UnitList& cache, std::uint64_t limit) {
    CLIPFILE_LOG(LOG_PRIORITY_DETAIL, "start. ts = %llu", static_cast<unsigned long long>(limit));
    auto end = cache.begin();
    for (auto it = cache.begin(); it != cache.end(); ++it) {
        end = it;
        if ((*it)->timestamp >= limit) {
            break;
        }
        CLIPFILE_LOG_PLAIN(LOG_PRIORITY_TRACE, "ST: remove\t%llu\t%llu",
                           static_cast<unsigned long long>((*it)->timestamp),
                           static_cast<unsigned long long>((*it)->rtp_timestamp));
    }
    // Contract: last-unit-stays. The unit where the walk stopped, also when it lies below the limit.
    cache.erase(cache.begin(), end);
}

void StreamBuffer::NotifyEndSync() {
    controller->PostEvent(std::make_shared<RemoveStreamingEvent>(shared_from_this()));
}

void StreamBuffer::setError(int code) {
    {
        MutexLock lock(stateMutex);
        // Contract: stopped-cannot-fail. Stopped or ended since the limit was seen: nothing is left to fail.
        if (stateId != kWaitStartState && stateId != kStartState) {
            return;
        }
        changeState(std::make_shared<ErrorCacheState>(this));
    }
    controller->SetStatus(QxStatus::kStreamFault, code);
    if (!chunkProduced) {
        // Contract: fault-before-first-chunk. Ends the module for good, whatever the cause was.
        controller->SetStatus(QxStatus::kFailed, QxFailure::kNoFirstChunk);
        return;
    }
    MutexLock lock(stateMutex);
    // The host may have stopped it inside its status. What is stopped must not begin again.
    if (stateId == kErrorState) {
        controller->PostEvent(std::make_shared<RestartStreamingEvent>(shared_from_this()));
    }
}

bool StreamBuffer::MakeFileTimecode(const std::shared_ptr<ChunkData>& chunk) {
    MutexLock lock(analyzerMutex);
    const std::uint64_t shown = inDecodingOrder() ? chunk->firstShown : chunk->firstVideo->rtp_timestamp;
    int offset = 0;
    const std::int64_t duration = streamInfo.video_sample_duration;
    if (tcStatus == 2 && duration != 0) {
        const auto distance = static_cast<std::int64_t>(shown - chunk->firstMeta->rtp_timestamp);
        if (isExact() || inDecodingOrder()) {
            offset = framesIn(distance);
        } else {
            // Contract: timecode-offset-by-3. From 90 kHz to 30 kHz, at every frame rate.
            offset = static_cast<int>((distance / 3 + duration / 2) / duration);
        }
    }
    fileTimecode.assign(4, 0);
    bool result = false;
    const unsigned int frames = getTimecodeFrameCount(settings.framerate);
    if (frames != 0) {
        std::shared_ptr<nal_access::SampleData> sample;
        analyzer.ConvertTmcd(chunk->firstMeta, sample, dropFrame, frames, offset);
        if (sample != nullptr) {
            std::copy_n(sample->GetData(), fileTimecode.size(), fileTimecode.begin());
            result = true;
        }
    }
    // Contract: file-first-without-timecode. Logged with zeros then.
    CLIPFILE_LOG_PLAIN(LOG_PRIORITY_OPERATOR, "OP: FILE FIRST. %02d:%02d:%02d:%02d. RTPTS = %lld.",
                       fileTimecode[0], fileTimecode[1], fileTimecode[2], fileTimecode[3],
                       static_cast<long long>(shown));
    return result;
}

int StreamBuffer::framesIn(std::int64_t distance) const {
    const double ticks = static_cast<double>(distance) * streamInfo.video_track_timescale / videoRtpRate;
    return static_cast<int>(std::llround(ticks / streamInfo.video_sample_duration));
}

unsigned int StreamBuffer::getTimecodeFrameCount(std::uint32_t framerate) {
    switch (framerate) {
        case 23980:
        case 24000:
            return 24;
        case 25000:
            return 25;
        case 29970:
        case 30000:
            return 30;
        case 50000:
            return 50;
        case 59940:
        case 60000:
            return 60;
        default:
            // Contract: unknown-frame-rate. Logged here for each file, and where the stream is described.
            CLIPFILE_LOG(LOG_PRIORITY_WARNING, "no type.");
            return 0;
    }
}

bool StreamBuffer::GetFileTimecode(unsigned char* timecode, bool* drop) {
    MutexLock lock(analyzerMutex);
    if (fileTimecode.empty()) {
        return false;
    }
    std::copy(fileTimecode.begin(), fileTimecode.end(), timecode);
    *drop = dropFrame;
    return true;
}

bool StreamBuffer::GetFileTimecode(unsigned char* timecode) {
    bool drop = false;
    return GetFileTimecode(timecode, &drop);
}

}  // namespace clipfileModule
