#include "buffer/state/WaitStartCacheState.h"

#include <string_view>

#include "buffer/state/EndSyncRecState.h"
#include "buffer/state/StartCacheState.h"
#include "common/Log.h"

namespace clipfileModule {

namespace {

/// Ticks of the 90 kHz clock in a millisecond.
constexpr std::uint64_t kTicksPerMilliSec = 90;

/// Unsigned on purpose: an open stop of -1 lies above every timestamp.
std::uint64_t toMilliSec(std::int64_t ticks) {
    return static_cast<std::uint64_t>(ticks) / kTicksPerMilliSec;
}

}  // namespace

WaitStartCacheState::WaitStartCacheState(StreamBufferInterface* owner)
    : CacheState("wait_state", kWaitStartState, owner) {}

std::shared_ptr<CacheState> WaitStartCacheState::Execute(const std::shared_ptr<StreamData>& unit,
                                                         std::shared_ptr<StreamQueue>& queue,
                                                         const char* mediaType) {
    nal_access::StreamAnalyzer analyzer;
    if (unit->timestamp < toMilliSec(buffer->GetStartTimestamp())) {
        return nullptr;
    }
    // Contract: stop-read-once. It may be set at any moment, and the line shall show what the test saw.
    const std::int64_t stop = buffer->GetStopTimestamp();
    // Contract: stop-in-two-units. In milliseconds here, in ticks in the chunk thread.
    if (unit->timestamp > toMilliSec(stop)) {
        CLIPFILE_LOG_PLAIN(LOG_PRIORITY_OPERATOR, "OP: REC CANCEL. RTPTS = %lld. -> %lld",
                           static_cast<long long>(buffer->GetStartTimestamp()), static_cast<long long>(stop));
        // Contract: any-medium-cancels. Audio or metadata may be first.
        return std::make_shared<EndSyncRecState>(buffer);
    }
    if (std::string_view(mediaType) != "video") {
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
    dump("IDR received. sps dump.", sps.data.get(), sps.size);
    dump("IDR received. pps dump.", pps.data.get(), pps.size);
    CLIPFILE_LOG_PLAIN(LOG_PRIORITY_OPERATOR, "OP: IDR FRAME RECV. RTPTS = %lld.",
                       static_cast<long long>(unit->rtp_timestamp));
    return std::make_shared<StartCacheState>(buffer, sps, pps, unit);
}

}  // namespace clipfileModule
