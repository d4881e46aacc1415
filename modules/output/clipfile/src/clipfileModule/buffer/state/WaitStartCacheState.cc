#include "buffer/state/WaitStartCacheState.h"

#include <algorithm>

#include "buffer/state/EndSyncRecState.h"
#include "buffer/state/StartCacheState.h"
#include "common/Log.h"
#include "common/PresentationTime.h"
#include "common/RtpClock.h"

namespace clipfileModule {

namespace {

/// Half an AAC frame of 1024 samples at 48 kHz, rounded up.
constexpr std::uint64_t kHalfAudioFrameMilliSec = 11;
/// How far the other media may be ahead of the pictures: a queue of 50 pictures and the one in hand last 2.13
/// s at the lowest frame rate.
constexpr std::uint64_t kVideoLagMilliSec = 3000;

/// A parameter set has a length of 16 bits in its record (ISO/IEC 14496-15 5.2.4.1).
constexpr std::uint64_t kLongestSet = 65535;

constexpr std::string_view kVideoName = "video";
constexpr std::string_view kAudioName = "audio";

/// Unsigned on purpose: an open stop of -1 lies above every timestamp.
std::uint64_t toMilliSec(std::int64_t ticks) {
    return static_cast<std::uint64_t>(ticks) / std::uint64_t{kTicksPerMilliSec};
}

}  // namespace

WaitStartCacheState::WaitStartCacheState(StreamBufferInterface* owner, RecordRules recordRules,
                                         PictureOrder pictureOrder)
    : CacheState("wait_state", kWaitStartState, owner), rules(recordRules), order(pictureOrder) {}

std::uint64_t WaitStartCacheState::presentedAt(const StreamData& unit, std::string_view mediaType) const {
    return mediaType == kVideoName ? PresentationMilliSec(unit, order) : unit.timestamp;
}

bool WaitStartCacheState::isBeforeStart(const StreamData& unit, std::string_view mediaType) const {
    // An IDR frame on the start itself needs the audio that begins up to half a frame ahead of it.
    const bool mayLead = rules == RecordRules::kExact && mediaType == kAudioName;
    return presentedAt(unit, mediaType) + (mayLead ? kHalfAudioFrameMilliSec : 0) <
           toMilliSec(buffer->GetStartTimestamp());
}

std::optional<std::int64_t> WaitStartCacheState::stopPassedBy(const StreamData& unit,
                                                              std::string_view mediaType) const {
    // Contract: stop-read-once. It may be set at any moment, and the line shall show what the test saw.
    const std::int64_t stop = buffer->GetStopTimestamp();
    const std::uint64_t presented = presentedAt(unit, mediaType);
    if (rules == RecordRules::kKept) {
        // Contract: stop-in-two-units. In milliseconds here, in ticks in the chunk thread.
        return presented > toMilliSec(stop) ? std::optional(stop) : std::nullopt;
    }
    const std::int64_t commandedEnd = buffer->GetEndTimestamp();
    const std::int64_t end = commandedEnd != -1 ? commandedEnd : stop;
    // The other media may have overtaken a picture that still belongs to the record.
    const std::uint64_t lag = mediaType == kVideoName ? 0 : kVideoLagMilliSec;
    return presented >= toMilliSec(end) + lag ? std::optional(end) : std::nullopt;
}

std::shared_ptr<CacheState> WaitStartCacheState::Execute(const std::shared_ptr<StreamData>& unit,
                                                         std::shared_ptr<StreamQueue>& queue,
                                                         const char* mediaType) {
    nal_access::StreamAnalyzer analyzer;
    if (isBeforeStart(*unit, mediaType)) {
        return nullptr;
    }
    if (const std::optional<std::int64_t> stop = stopPassedBy(*unit, mediaType)) {
        CLIPFILE_LOG_PLAIN(LOG_PRIORITY_OPERATOR, "OP: REC CANCEL. RTPTS = %lld. -> %lld",
                           static_cast<long long>(buffer->GetStartTimestamp()),
                           static_cast<long long>(*stop));
        // Contract: any-medium-cancels. Audio or metadata may be first.
        return std::make_shared<EndSyncRecState>(buffer);
    }
    if (mediaType != kVideoName) {
        queue->queue.Push(unit);
        return nullptr;
    }
    if (!analyzer.IsAccessUnitStart(unit, sps, pps)) {
        return nullptr;
    }
    if (sps.size == 0) {
        CLIPFILE_LOG(LOG_PRIORITY_NOTICE, "sps nal unit size is 0.");
        return nullptr;
    }
    if (pps.size == 0) {
        CLIPFILE_LOG(LOG_PRIORITY_NOTICE, "pps nal unit size is 0.");
        return nullptr;
    }
    if (rules == RecordRules::kExact && std::max(sps.size, pps.size) > kLongestSet) {
        const bool isSps = sps.size > kLongestSet;
        CLIPFILE_LOG(LOG_PRIORITY_NOTICE, "%s nal unit size is %llu.", isSps ? "sps" : "pps",
                     static_cast<unsigned long long>(isSps ? sps.size : pps.size));
        return nullptr;
    }
    dump("IDR received. sps dump.", sps.data.get(), sps.size);
    dump("IDR received. pps dump.", pps.data.get(), pps.size);
    CLIPFILE_LOG_PLAIN(LOG_PRIORITY_OPERATOR, "OP: IDR FRAME RECV. RTPTS = %lld.",
                       static_cast<long long>(unit->rtp_timestamp));
    return std::make_shared<StartCacheState>(buffer, sps, pps, unit);
}

}  // namespace clipfileModule
