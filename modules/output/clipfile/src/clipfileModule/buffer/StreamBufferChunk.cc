// The chunk thread of a recording: three independent streams become one aligned sequence.

#include <algorithm>
#include <iterator>
#include <utility>

#include "buffer/ChunkTimeline.h"
#include "buffer/StreamBuffer.h"
#include "buffer/state/EndSyncRecState.h"
#include "common/Log.h"
#include "common/LogScope.h"

namespace clipfileModule {

namespace {

// Contract: waiting-fills-a-cache. Audio and metadata are cached while no IDR frame comes.
/// Units in a cache, and chunks that wait for `FileOutput`; passing one of these ends the recording.
constexpr std::size_t kVideoLimit = 600;
constexpr std::size_t kAudioLimit = 900;
constexpr std::size_t kMetaLimit = 600;
constexpr std::size_t kFileQueueLimit = 48;

const char* messageOf(PassResult error) {
    switch (error) {
        case kFileTooSlow:
            return "file access is too slow. buffer is full.";
        case kVideoBufferFull:
            return "stream is stopped. video buffer is full.";
        case kAudioBufferFull:
            return "stream is stopped. audio buffer is full.";
        default:
            return "stream is stopped. rtmeta buffer is full.";
    }
}

using UnitList = std::vector<std::shared_ptr<StreamData>>;
using SampleList = std::vector<std::shared_ptr<nal_access::SampleData>>;

/// Moves the first `count` units of the cache to `units`, and gives the RTP timestamp where the last of them
/// ends in `next`: that of the unit that follows, or, when there is none, `duration` after its own. False,
/// with nothing done, when the cache is empty or holds fewer units.
bool takeUnits(UnitList& cache, std::size_t count, std::uint64_t duration, UnitList& units,
               std::uint64_t& next) {
    if (cache.empty() || cache.size() < count) {
        return false;
    }
    const auto end = cache.begin() + static_cast<std::ptrdiff_t>(count);
    units.assign(std::make_move_iterator(cache.begin()), std::make_move_iterator(end));
    cache.erase(cache.begin(), end);
    next = cache.empty() ? units.back()->rtp_timestamp + duration : cache.front()->rtp_timestamp;
    return true;
}

std::uint64_t sumOfSizes(const SampleList& samples) {
    std::uint64_t sum = 0;
    for (const auto& sample : samples) {
        sum += sample->GetDataSize();
    }
    return sum;
}

}  // namespace

void StreamBuffer::makeChunk() {
    PassResult result = kGoOn;
    {
        MutexLock lock(bufferMutex);
        // What was cached before the thread came here has woken nobody.
        bool passFirst = isExact();
        while (stateId != kStopState) {
            // No predicate: each wake-up makes one pass, whatever woke it.
            if (!passFirst) {
                lock.Wait(bufferCondition);
            }
            passFirst = false;
            if (stateId == kStopState) {
                break;
            }
            result = findPassedLimit();
            if (result == kGoOn) {
                result = isExact() ? makeExactPass() : makePass();
            } else if (isExact()) {
                cutRest();
            }
            if (result != kGoOn) {
                break;
            }
        }
    }
    // Contract: one-order-of-locks. Both wait for the lock of the state, and whoever holds that one may wait
    // for a worker that adds to a cache: the lock of the caches had to be given back first.
    if (result == kRecordEnded) {
        endSync();
    } else if (result == kWriterMissing) {
        endWithoutThread();
    } else if (result != kGoOn) {
        CLIPFILE_LOG(LOG_PRIORITY_ERROR, "%s", messageOf(result));
        setError(result);
    }
}

bool StreamBuffer::isPassDue() const {
    if (findPassedLimit() != kGoOn) {
        return true;
    }
    if (videoBuffer.empty()) {
        return false;
    }
    if (videoBuffer.size() >= kMinimumVideoUnits) {
        return true;
    }
    if (isExact()) {
        // What comes before the first chunk may head the record, and is cut back pass by pass.
        return chunkedVideo == 0 || findEnd() <= videoBuffer.back()->rtp_timestamp;
    }
    return static_cast<std::uint64_t>(stopTimestamp.load()) < videoBuffer.front()->rtp_timestamp;
}

PassResult StreamBuffer::makePass() {
    if (videoBuffer.empty()) {
        return kGoOn;
    }
    // Contract: stop-in-two-units. In ticks here, and unsigned: an open stop, -1, is above all.
    if (static_cast<std::uint64_t>(stopTimestamp.load()) < videoBuffer.front()->rtp_timestamp) {
        // Contract: record-ends-on-chunk. The last one may hold 7 units beyond the stop.
        return kRecordEnded;
    }
    if (videoBuffer.size() < kMinimumVideoUnits) {
        return kGoOn;
    }
    // What was cached while the first picture waited to be shown is presented before it.
    if (inDecodingOrder() && (!startInStep() || !isOrderKnown(chunkFrames))) {
        return kGoOn;
    }
    const std::optional<ChunkCounts> counts = findChunk(findCut(chunkFrames), kNoEnd);
    return counts ? pushChunk(*counts, kNoEnd) : kGoOn;
}

void StreamBuffer::endSync() {
    const std::int64_t end = isExact() ? static_cast<std::int64_t>(findEnd()) : stopTimestamp.load();
    CLIPFILE_LOG_PLAIN(LOG_PRIORITY_OPERATOR, "OP: END SYNC REC. RTPTS = %lld.", static_cast<long long>(end));
    CLIPFILE_LOG_SCOPE(scope, LOG_PRIORITY_DETAIL);
    MutexLock lock(stateMutex);
    // A stop that came first has ended the record already.
    if (stateId == kStartState) {
        changeState(std::make_shared<EndSyncRecState>(this));
    }
    scope.End();
}

// Contract: full-cache-names-itself. Not the medium that is missing; video is looked at first.
PassResult StreamBuffer::findPassedLimit() const {
    if (videoBuffer.size() > kVideoLimit) {
        return kVideoBufferFull;
    }
    if (audioBuffer.size() > kAudioLimit) {
        return kAudioBufferFull;
    }
    return metaBuffer.size() > kMetaLimit ? kMetaBufferFull : kGoOn;
}

StreamBuffer::ChunkEnd StreamBuffer::findChunkEnd(std::size_t pictures, std::uint64_t end) {
    // The time line is made of unit counts. An audio frame belongs to the chunk when it starts, by count, not
    // after the chunk's end less half an audio frame.
    const std::uint64_t audioFrame = rescale(
        streamInfo.audio_sample_duration, streamInfo.audio_track_timescale, streamInfo.video_track_timescale);
    std::uint64_t counted = pictures + chunkedVideo;
    if (inDecodingOrder() && end != kNoEnd) {
        // Pictures that others need and that nobody sees have no other media.
        counted = std::min(counted, countShown(end));
    }
    const std::uint64_t video = counted * streamInfo.video_sample_duration - (audioFrame >> 1);
    return {video, rescale(video, streamInfo.video_track_timescale, streamInfo.audio_track_timescale)};
}

std::optional<StreamBuffer::ChunkCounts> StreamBuffer::findChunk(std::size_t pictures, std::uint64_t end) {
    const ChunkEnd chunkEnd = findChunkEnd(pictures, end);
    const int audioCount =
        CountUntil(chunkEnd.audio, chunkedAudio, streamInfo.audio_sample_duration, audioBuffer.size());
    // One metadata unit a video frame, and none past the end of the record.
    int metaCount =
        CountUntil(chunkEnd.video, chunkedMeta, streamInfo.video_sample_duration, metaBuffer.size());
    const std::size_t metaBeforeEnd = countBefore(metaBuffer, end);
    if (metaBeforeEnd < metaBuffer.size() &&
        (metaCount == -1 || metaBeforeEnd < static_cast<std::size_t>(metaCount))) {
        metaCount = static_cast<int>(metaBeforeEnd);
    }

    if (audioCount == -1) {
        CLIPFILE_LOG_PLAIN(LOG_PRIORITY_TRACE, "ST: no audio buffer.");
        dumpBuffer();
        return std::nullopt;
    }
    if (static_cast<std::size_t>(audioCount) >= audioBuffer.size()) {
        // Contract: incomplete-lines-unreached. A count that was found is below the size.
        CLIPFILE_LOG_PLAIN(LOG_PRIORITY_TRACE, "ST: audio buffer is not complete.");
        dumpBuffer();
        return std::nullopt;
    }
    if (metaBuffer.empty()) {
        // Contract: metadata-is-required. And this line alone comes without the caches.
        CLIPFILE_LOG_PLAIN(LOG_PRIORITY_TRACE, "ST: rtmeta buffer is empty.");
        return std::nullopt;
    }
    if (metaCount == -1) {
        CLIPFILE_LOG_PLAIN(LOG_PRIORITY_TRACE, "ST: no rtmeta buffer.");
        dumpBuffer();
        return std::nullopt;
    }
    if (static_cast<std::size_t>(metaCount) >= metaBuffer.size()) {
        // Contract: incomplete-lines-unreached. As above.
        CLIPFILE_LOG_PLAIN(LOG_PRIORITY_TRACE, "ST: rtmeta buffer is not complete.");
        dumpBuffer();
        return std::nullopt;
    }
    return ChunkCounts{pictures, static_cast<std::size_t>(audioCount), static_cast<std::size_t>(metaCount)};
}

PassResult StreamBuffer::pushChunk(const ChunkCounts& counts, std::uint64_t end) {
    auto chunk = std::make_shared<ChunkData>();
    chunk->firstVideo = videoBuffer.front();
    chunk->firstShown = inDecodingOrder() ? firstShownAt() : 0;
    // Pictures that others need and that nobody sees may be all that is left.
    chunk->firstMeta = metaBuffer.empty() ? nullptr : metaBuffer.front();
    splitVideo(*chunk, counts.video, end);
    splitAudio(*chunk, counts.audio);
    splitMeta(*chunk, counts.meta, end);
    dumpChunk(*chunk);
    chunkedVideo += counts.video;
    chunkedAudio += counts.audio;
    chunkedMeta += counts.meta;

    // The cadence is never 0 here: without a frame rate the time line of the metadata stands still, and no
    // chunk was complete.
    if (chunkedVideo != 0 && chunkedAudio != 0 && chunkedVideo % streamInfo.cadence_video_frames == 0 &&
        chunkedAudio % streamInfo.cadence_audio_frames == 0) {
        CLIPFILE_LOG_PLAIN(LOG_PRIORITY_TRACE, "ST: a/v sync %llu\t%llu\t%llu",
                           static_cast<unsigned long long>(chunkedVideo),
                           static_cast<unsigned long long>(chunkedAudio),
                           static_cast<unsigned long long>(chunkedMeta));
        chunk->sync = true;
    }
    chunk->size = sumOfSizes(chunk->video) + sumOfSizes(chunk->audio) + sumOfSizes(chunk->meta);
    if (chunk->video.empty() && chunk->audio.empty() && chunk->meta.empty()) {
        return kGoOn;
    }

    const std::size_t queued = fileOutput->PushChunk(chunk);
    // Contract: first-chunk-counts-for-life. Never cleared, also not by a restart.
    chunkProduced = true;
    CLIPFILE_LOG_PLAIN(LOG_PRIORITY_TRACE, "ST: [C]\t%d\t%d\t%d\t%llu", static_cast<int>(counts.video),
                       static_cast<int>(counts.audio), static_cast<int>(counts.meta),
                       static_cast<unsigned long long>(queued));
    if (queued > kFileQueueLimit) {
        // Contract: late-chunk-is-written. The chunk that was one too many stays queued.
        return kFileTooSlow;
    }
    dumpBuffer();
    return kGoOn;
}

std::size_t StreamBuffer::countBefore(const UnitList& cache, std::uint64_t end) {
    if (end == kNoEnd) {
        return cache.size();
    }
    const auto first = std::lower_bound(
        cache.begin(), cache.end(), end,
        [](const std::shared_ptr<StreamData>& unit, std::uint64_t rtp) { return unit->rtp_timestamp < rtp; });
    return static_cast<std::size_t>(first - cache.begin());
}

std::uint64_t StreamBuffer::rescale(std::uint64_t value, std::uint32_t from, std::uint32_t to) {
    MutexLock lock(analyzerMutex);
    return analyzer.ConvertTimestamp(value, from, to);
}

void StreamBuffer::splitVideo(ChunkData& chunk, std::size_t count, std::uint64_t end) {
    UnitList units;
    std::uint64_t next = 0;
    const std::uint64_t duration =
        rescale(streamInfo.video_sample_duration, streamInfo.video_track_timescale, videoRtpRate);
    if (inDecodingOrder()) {
        placePictures(chunk, count, end);
    }
    if (!takeUnits(videoBuffer, count, duration, units, next)) {
        return;
    }
    MutexLock lock(analyzerMutex);
    analyzer.ConvertVideo(units, chunk.video);
    // An end is one of showing.
    setDurations(chunk.video, inDecodingOrder() ? next : std::min(next, end), videoRtpRate,
                 streamInfo.video_track_timescale);
}

void StreamBuffer::splitAudio(ChunkData& chunk, std::size_t count) {
    UnitList units;
    std::uint64_t next = 0;
    const std::uint64_t duration =
        rescale(streamInfo.audio_sample_duration, streamInfo.audio_track_timescale, audioRtpRate);
    if (!takeUnits(audioBuffer, count, duration, units, next)) {
        return;
    }
    MutexLock lock(analyzerMutex);
    analyzer.ConvertAudio(units, chunk.audio);
    setDurations(chunk.audio, next, audioRtpRate, streamInfo.audio_track_timescale);
}

void StreamBuffer::splitMeta(ChunkData& chunk, std::size_t count, std::uint64_t end) {
    UnitList units;
    std::uint64_t next = 0;
    const std::uint64_t duration =
        rescale(streamInfo.video_sample_duration, streamInfo.video_track_timescale, videoRtpRate);
    if (!takeUnits(metaBuffer, count, duration, units, next)) {
        return;
    }
    MutexLock lock(analyzerMutex);
    analyzer.ConvertMeta(units, chunk.meta, metaBlock);
    setDurations(chunk.meta, std::min(next, end), videoRtpRate, streamInfo.video_track_timescale);
}

// Contract: rtp-durations-only-logged. Files take theirs from the frame rate.
void StreamBuffer::setDurations(SampleList& samples, std::uint64_t next, std::uint32_t clock,
                                std::uint32_t timescale) {
    for (std::size_t i = 0; i < samples.size(); ++i) {
        const std::uint64_t following = i + 1 < samples.size() ? samples[i + 1]->GetRtpTimestamp() : next;
        samples[i]->SetDuration(
            analyzer.ConvertTimestamp(following - samples[i]->GetRtpTimestamp(), clock, timescale));
    }
}

void StreamBuffer::dumpBuffer() const {
    CLIPFILE_LOG_PLAIN(LOG_PRIORITY_TRACE, "ST: [B]\t%d\t%d\t%d", static_cast<int>(videoBuffer.size()),
                       static_cast<int>(audioBuffer.size()), static_cast<int>(metaBuffer.size()));
    // Contract: dump-without-copies. The lock keeps the caches as they are.
    const auto rtp = [](const std::shared_ptr<StreamData>& unit) {
        return static_cast<unsigned long long>(unit->rtp_timestamp);
    };
    const auto dumpCache = [&rtp](const char* mediaType, const UnitList& cache) {
        CLIPFILE_LOG(LOG_PRIORITY_DETAIL, "---------- %s buffer : size = %d. front = %llu, back = %llu",
                     mediaType, static_cast<int>(cache.size()), cache.empty() ? 0 : rtp(cache.front()),
                     cache.empty() ? 0 : rtp(cache.back()));
        for (const auto& unit : cache) {
            CLIPFILE_LOG(LOG_PRIORITY_DETAIL, "rtp_timestamp = %llu, timestamp = %llu, size = %d.", rtp(unit),
                         static_cast<unsigned long long>(unit->timestamp), static_cast<int>(unit->size));
        }
    };
    dumpCache(kMediaTypes[kVideo], videoBuffer);
    dumpCache(kMediaTypes[kAudio], audioBuffer);
    dumpCache(kMediaTypes[kMeta], metaBuffer);
}

void StreamBuffer::dumpChunk(const ChunkData& chunk) {
    CLIPFILE_LOG(LOG_PRIORITY_DETAIL, "---------- video. size = %d.", static_cast<int>(chunk.video.size()));
    dump(chunk.video);
    CLIPFILE_LOG(LOG_PRIORITY_DETAIL, "---------- audio. size = %d.", static_cast<int>(chunk.audio.size()));
    dump(chunk.audio);
    CLIPFILE_LOG(LOG_PRIORITY_DETAIL, "---------- meta.  size = %d.", static_cast<int>(chunk.meta.size()));
    dump(chunk.meta);
}

void StreamBuffer::dump(const SampleList& samples) {
    for (std::size_t index = 0; index < samples.size(); ++index) {
        nal_access::SampleData& sample = *samples[index];
        CLIPFILE_LOG(LOG_PRIORITY_DETAIL, "%d\t%d\t%llu\t%llu\t%llu\t%d\t%llu.", static_cast<int>(index),
                     sample.GetSync() ? 1 : 0, static_cast<unsigned long long>(index * sample.GetDuration()),
                     static_cast<unsigned long long>(sample.GetRtpTimestamp()),
                     static_cast<unsigned long long>(sample.GetTimestamp()),
                     static_cast<int>(sample.GetDataSize()),
                     static_cast<unsigned long long>(sample.GetDuration()));
    }
}

}  // namespace clipfileModule
