// A recording with exact rules: it begins with all media in step, ends on its frame, and fails by itself
// where the system has no thread for it.

#include <algorithm>
#include <system_error>

#include "QxModuleStatus.h"
#include "buffer/ChunkTimeline.h"
#include "buffer/StartInStep.h"
#include "buffer/StreamBuffer.h"
#include "buffer/state/ErrorCacheState.h"
#include "common/Log.h"
#include "common/PresentationTime.h"

namespace clipfileModule {

void StreamBuffer::startWriter() {
    try {
        fileOutput->Start(settings);
    } catch (const std::system_error& error) {
        if (!isExact()) {
            throw;
        }
        CLIPFILE_LOG(LOG_PRIORITY_ERROR, "recording cannot be started. %s.", error.what());
        // The chunk thread ends the recording: no status may leave here, under the locks of states and list.
        writerMissing = true;
        bufferCondition.notify_one();
    }
}

void StreamBuffer::endWithoutThread() {
    {
        MutexLock lock(stateMutex);
        if (stateId != kWaitStartState && stateId != kStartState) {
            return;
        }
        changeState(std::make_shared<ErrorCacheState>(this));
    }
    controller->SetStatus(QxStatus::kFailed, QxFailure::kNoFirstChunk);
    NotifyEndSync();
}

PassResult StreamBuffer::makeExactPass() {
    if (writerMissing) {
        return kWriterMissing;
    }
    // More than one chunk may be complete: what comes while the thread works wakes nobody.
    while (!videoBuffer.empty()) {
        const bool inStep = startInStep();
        const std::uint64_t end = findEnd();
        const std::size_t pictures = countNeeded(end);
        const bool reachesEnd = countBefore(videoBuffer, end) < videoBuffer.size();
        if (pictures == 0 && reachesEnd) {
            return kRecordEnded;
        }
        if (!inStep || !hasTimeline() || (!reachesEnd && pictures < kMinimumVideoUnits)) {
            return kGoOn;
        }
        if (!reachesEnd && !isOrderKnown(chunkFrames)) {
            return kGoOn;
        }
        const std::optional<ChunkCounts> counts = findChunk(findCut(pictures), end);
        if (!counts) {
            return kGoOn;
        }
        const PassResult result = pushChunk(*counts, end);
        if (result != kGoOn) {
            return result;
        }
    }
    return kGoOn;
}

void StreamBuffer::cutRest() {
    if (writerMissing || videoBuffer.empty() || !hasTimeline() || !startInStep()) {
        return;
    }
    const std::uint64_t end = findRestEnd();
    while (!videoBuffer.empty()) {
        std::size_t pictures = findCut(countNeeded(end));
        std::optional<ChunkCounts> counts;
        for (; pictures > 0 && !counts; --pictures) {
            counts = findCompleteChunk(pictures, end);
        }
        // The file output may be behind already; it gets no more than any recording may leave with it.
        if (!counts || pushChunk(*counts, end) != kGoOn) {
            return;
        }
    }
}

std::size_t StreamBuffer::countNeeded(std::uint64_t end) const {
    std::size_t count = countBefore(videoBuffer, end);
    // What is decoded behind the last picture that is shown is needed by none.
    while (count > 0 && shownAt(*videoBuffer[count - 1]) >= end) {
        --count;
    }
    return count;
}

bool StreamBuffer::hasTimeline() const {
    return streamInfo.video_sample_duration != 0;
}

std::uint64_t StreamBuffer::findEnd() const {
    const std::int64_t end = endTimestamp;
    // Unsigned: an open end of -1 lies above every timestamp.
    return static_cast<std::uint64_t>(end != -1 ? end : stopTimestamp.load());
}

bool StreamBuffer::startInStep() {
    if (chunkedVideo != 0) {
        return true;
    }
    const auto first = std::find(videoBuffer.begin(), videoBuffer.end(), firstPicture);
    removeFront(videoBuffer, static_cast<std::size_t>(first - videoBuffer.begin()));
    const bool audioInStep = startInStep(audioBuffer, audioRtpRate);
    return startInStep(metaBuffer, videoRtpRate) && audioInStep;
}

bool StreamBuffer::startInStep(UnitList& cache, std::uint32_t clock) {
    const std::uint64_t frame =
        kCommonTicks * streamInfo.audio_sample_duration / streamInfo.audio_track_timescale;
    StreamData shown;
    shown.rtp_timestamp = shownAt(*firstPicture);
    shown.timestamp = PresentationMilliSec(*firstPicture, settings.pictureOrder);
    const StartInStep start =
        FindStart(cache, clock, {shown, videoRtpRate}, static_cast<std::int64_t>(frame / 2));
    removeFront(cache, start.early);
    return start.settled;
}

void StreamBuffer::removeFront(UnitList& cache, std::size_t count) {
    const auto end = cache.begin() + static_cast<std::ptrdiff_t>(count);
    for (auto it = cache.begin(); it != end; ++it) {
        CLIPFILE_LOG_PLAIN(LOG_PRIORITY_TRACE, "ST: remove\t%llu\t%llu",
                           static_cast<unsigned long long>((*it)->timestamp),
                           static_cast<unsigned long long>((*it)->rtp_timestamp));
    }
    cache.erase(cache.begin(), end);
}

std::optional<StreamBuffer::ChunkCounts> StreamBuffer::findCompleteChunk(std::size_t pictures,
                                                                         std::uint64_t end) {
    const ChunkEnd chunkEnd = findChunkEnd(pictures, end);
    const int audioCount =
        CountUpTo(chunkEnd.audio, chunkedAudio, streamInfo.audio_sample_duration, audioBuffer.size());
    const int metaCount = CountUpTo(chunkEnd.video, chunkedMeta, streamInfo.video_sample_duration,
                                    countBefore(metaBuffer, end));
    if (audioCount == -1 || metaCount == -1) {
        return std::nullopt;
    }
    return ChunkCounts{pictures, static_cast<std::size_t>(audioCount), static_cast<std::size_t>(metaCount)};
}

}  // namespace clipfileModule
