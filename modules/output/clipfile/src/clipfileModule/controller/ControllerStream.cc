// Intake of stream units and record commands: the road of a unit from the host's call to the recordings, and
// of a command from the place where it arises to a recording with start and stop timestamps.

#include <algorithm>
#include <system_error>
#include <utility>

#include "QxModuleStatus.h"
#include "buffer/StreamBuffer.h"
#include "common/Log.h"
#include "common/LogScope.h"
#include "common/PresentationTime.h"
#include "controller/Controller.h"

namespace clipfileModule {

namespace {

/// The host system's printf formats are as wide as `long long`.
long long wide(std::int64_t value) {
    return value;
}

}  // namespace

void Controller::PushReserved(const std::shared_ptr<StreamData>&) {}

void Controller::PushVideo(const std::shared_ptr<StreamData>& unit) {
    // Contract: overflow-only-logged. No status, no count.
    if (!pushUnit(Medium::kVideo, unit)) {
        CLIPFILE_LOG(LOG_PRIORITY_WARNING, "queue overflow (video)");
    }
}

void Controller::PushAudio(const std::shared_ptr<StreamData>& unit) {
    if (!pushUnit(Medium::kAudio, unit)) {
        CLIPFILE_LOG(LOG_PRIORITY_WARNING, "queue overflow (audio)");
    }
}

void Controller::PushMeta(const std::shared_ptr<StreamData>& unit) {
    if (!pushUnit(Medium::kMeta, unit)) {
        CLIPFILE_LOG(LOG_PRIORITY_WARNING, "queue overflow (meta)");
    }
}

bool Controller::pushUnit(Medium medium, const std::shared_ptr<StreamData>& unit) {
    const StatusChannel* const channel = intake;
    if (channel == nullptr) {
        noteStrayUnit();
        return true;
    }
    // Contract: silent-after-status-7. Dropped units are not logged. Both are asked: the host's status may be
    // older than the module's 7, and a host may hold a 7 of its own.
    if (channel->IsFinal() || host->GetStatus() == QxStatus::kFailed) {
        return true;
    }
    return queues[static_cast<std::size_t>(medium)]->Push(unit);
}

void Controller::noteStrayUnit() {
    if (!strayUnitNoted.exchange(true)) {
        CLIPFILE_LOG(LOG_PRIORITY_WARNING, "unit is pushed without initialize.");
    }
}

void Controller::queueing(const std::shared_ptr<StreamDataQueue>& queue, UnitConsumer consumer) {
    CLIPFILE_LOG_SCOPE(scope, LOG_PRIORITY_TRACE);
    {
        MutexLock lock(queueStartMutex);
        queueThreadStarted = true;
        queueStartCondition.notify_all();
    }
    while (!terminated) {
        const std::shared_ptr<StreamData> unit = queue->Pop();
        // Contract: empty-unit-two-tests. By payload here, by size behind the recordings' queues.
        if (unit != nullptr && unit->payload != nullptr) {
            consumer(unit);
        }
    }
}

void Controller::pushTo(StreamBuffer& buffer, Medium medium, const std::shared_ptr<StreamData>& unit) {
    switch (medium) {
        case Medium::kVideo:
            buffer.PushVideo(unit);
            break;
        case Medium::kAudio:
            buffer.PushAudio(unit);
            break;
        case Medium::kMeta:
            buffer.PushMeta(unit);
            break;
    }
}

void Controller::checkPresentationTime(Medium medium, const StreamData& unit) {
    if (medium == Medium::kVideo && inDecodingOrder && !presentationNoted && !HasPresentationTime(unit)) {
        presentationNoted = true;
        CLIPFILE_LOG(LOG_PRIORITY_WARNING,
                     "presentation_timestamp %llu of rtp_timestamp %llu is not followed. shown when decoded.",
                     static_cast<unsigned long long>(unit.presentation_timestamp),
                     static_cast<unsigned long long>(unit.rtp_timestamp));
    }
}

void Controller::pushToBuffers(Medium medium, const std::shared_ptr<StreamData>& unit) {
    checkPresentationTime(medium, *unit);
    MutexLock lock(streamBuffersMutex);
    keepUnit(medium, unit);
    for (const Recording& recording : streamBuffers) {
        pushTo(*recording.buffer, medium, unit);
    }
}

void Controller::processMeta(const std::shared_ptr<StreamData>& unit) {
    if (isOutputMode(kOutputModeSync)) {
        const std::int32_t flag = readRecFlag(*unit);
        // Contract: first-unit-is-a-change. -1 differs from both values of a flag.
        if (flag != recFlag) {
            recFlag = flag;
            if (flag == 1) {
                CLIPFILE_LOG_PLAIN(LOG_PRIORITY_OPERATOR, "OP: REC FLAG OFF -> ON.");
                followCommand(*unit);
                // Contract: start-direct-stop-posted. A start holds for this very unit, a stop may be late.
                StartStream(unit);
            } else {
                CLIPFILE_LOG_PLAIN(LOG_PRIORITY_OPERATOR, "OP: REC FLAG ON -> OFF.");
                // In this order: a recording that meets its end asks for its removal, and the stop must stand
                // in front of that among the events.
                PostEvent(std::make_shared<StopStreamingEvent>(unit));
                endRecordings(static_cast<std::int64_t>(unit->rtp_timestamp));
            }
        }
    }
    pushToBuffers(Medium::kMeta, unit);
}

std::int32_t Controller::readRecFlag(const StreamData& unit) {
    MutexLock lock(analyzerMutex);
    return analyzer->GetRecFlg(unit.payload, unit.size) ? 1 : 0;
}

std::shared_ptr<nal_access::SampleData> Controller::readTimecode(const std::shared_ptr<StreamData>& unit) {
    std::shared_ptr<nal_access::SampleData> sample;
    bool dropFrame = false;
    MutexLock lock(analyzerMutex);
    analyzer->ConvertTmcd(unit, sample, dropFrame, 0, 0);
    return sample;
}

void Controller::StartStream(const std::shared_ptr<StreamData>& unit) {
    CLIPFILE_LOG_SCOPE(scope, LOG_PRIORITY_TRACE);
    const auto rtp = static_cast<std::int64_t>(unit->rtp_timestamp);
    std::shared_ptr<nal_access::SampleData> timecode;
    if (unit->payload != nullptr) {
        timecode = readTimecode(unit);
    }
    if (timecode != nullptr) {
        const unsigned char* const t = timecode->GetData();
        // Contract: rec-start-full-stop. Before the arrow; in REC STOP it ends the line.
        CLIPFILE_LOG_PLAIN(LOG_PRIORITY_OPERATOR, "OP: REC START. %02d:%02d:%02d:%02d. RTPTS = %lld. -> %lld",
                           t[0], t[1], t[2], t[3], wide(rtp), wide(kOpenStop));
    } else {
        CLIPFILE_LOG_PLAIN(LOG_PRIORITY_OPERATOR, "OP: REC START. 00:00:00:00. RTPTS = %lld. -> %lld",
                           wide(rtp), wide(kOpenStop));
    }
    limitWaiting();
    const StatusChannel::Hold hold(getStatusChannel());
    MutexLock lock(streamBuffersMutex);
    // A new recording closes every open one at the same instant. One that has an end of its own waits for the
    // stop that set it.
    for (const Recording& recording : streamBuffers) {
        if (recording.IsOpen()) {
            if (isExact) {
                recording.buffer->SetEndTimestamp(rtp);
            }
            recording.buffer->SetStopTimestamp(rtp);
        }
    }
    Recording recording;
    recording.buffer = std::make_shared<StreamBuffer>(this, rtp, kOpenStop);
    recording.made = ++commandOrder;
    recording.buffer->Start(getSettings());
    if (unit->payload != nullptr) {
        replayInto(recording, rtp);
    } else {
        startBehindStream(recording);
    }
    streamBuffers.push_back(recording);
    lock.Unlock();
    scope.End();
}

void Controller::StopStream(const std::shared_ptr<StreamData>& unit, std::uint64_t order) {
    CLIPFILE_LOG_SCOPE(scope, LOG_PRIORITY_TRACE);
    const auto rtp = static_cast<std::int64_t>(unit->rtp_timestamp);
    // Contract: stop-reads-any-unit. A start asks for a payload first.
    const std::shared_ptr<nal_access::SampleData> timecode = readTimecode(unit);
    MutexLock lock(streamBuffersMutex);
    for (const Recording& recording : streamBuffers) {
        const std::shared_ptr<StreamBuffer>& buffer = recording.buffer;
        // However late the event thread carries it out, a stop is for what ran when it was commanded.
        if (buffer->GetStopTimestamp() != kOpenStop || recording.made > order) {
            continue;
        }
        buffer->SetStopTimestamp(rtp);
        const long long start = wide(buffer->GetStartTimestamp());
        const long long stop = wide(buffer->GetStopTimestamp());
        if (timecode != nullptr) {
            const unsigned char* const t = timecode->GetData();
            CLIPFILE_LOG_PLAIN(LOG_PRIORITY_OPERATOR,
                               "OP: REC STOP. %02d:%02d:%02d:%02d. RTPTS = %lld -> %lld.", t[0], t[1], t[2],
                               t[3], start, stop);
        } else {
            CLIPFILE_LOG_PLAIN(LOG_PRIORITY_OPERATOR, "OP: REC STOP. RTPTS = %lld -> %lld.", start, stop);
        }
    }
    scope.End();
}

void Controller::RemoveStream(const std::shared_ptr<StreamBuffer>& buffer) {
    CLIPFILE_LOG_SCOPE(scope, LOG_PRIORITY_TRACE);
    {
        MutexLock lock(streamBuffersMutex);
        streamBuffers.remove_if([&](const Recording& recording) { return recording.buffer == buffer; });
    }
    CLIPFILE_LOG_PLAIN(LOG_PRIORITY_OPERATOR, "OP: REMOVE STREAM. RTPTS = %lld -> %lld.",
                       wide(buffer->GetStartTimestamp()), wide(buffer->GetStopTimestamp()));
    buffer->Stop();
}

void Controller::BufferingStart() {
    CLIPFILE_LOG_SCOPE(scope, LOG_PRIORITY_TRACE);
    if (isOutputMode(kOutputModeOn)) {
        // Contract: second-online-cancels. Recordings of an earlier online are closed at 0.
        StartStream(std::make_shared<StreamData>());
    }
    CLIPFILE_LOG(LOG_PRIORITY_TRACE, "stream buffering start.");
    if (terminated) {
        // Contract: terminated-start-has-no-end. A way out without the last line.
        CLIPFILE_LOG(LOG_PRIORITY_TRACE, "process is terminated.");
        scope.Dismiss();
        return;
    }
    SetStatus(QxStatus::kBufferingStarted, QxStatus::kNoCause);
    const StatusChannel::Hold hold(getStatusChannel());
    MutexLock lock(streamBuffersMutex);
    removeOverBuffers();
    // Contract: online-records-again. What an offline stopped is still in the list.
    if (const std::exception_ptr fault = startBuffers(); fault != nullptr) {
        std::rethrow_exception(fault);
    }
    scope.End();
}

void Controller::removeOverBuffers() {
    streamBuffers.remove_if([this](const Recording& recording) {
        if (recording.isOver) {
            // The event thread lets go of it: this one may be a thread of the recording, inside a status.
            PostEvent(std::make_shared<RemoveStreamingEvent>(recording.buffer));
        }
        return recording.isOver;
    });
}

/// Starts all that can be started also when one of them has still to be joined by its own thread. Returns
/// what it threw first.
std::exception_ptr Controller::startBuffers() {
    const OutputSettings now = getSettings();
    std::exception_ptr fault;
    for (Recording& recording : streamBuffers) {
        try {
            recording.buffer->Start(now);
        } catch (const std::system_error&) {
            if (fault == nullptr) {
                fault = std::current_exception();
            }
            continue;
        }
        if (recording.isStopped) {
            recording.isStopped = false;
            startBehindStream(recording);
        }
    }
    return fault;
}

void Controller::BufferingStop() {
    CLIPFILE_LOG_SCOPE(scope, LOG_PRIORITY_TRACE);
    CLIPFILE_LOG(LOG_PRIORITY_TRACE, "stream buffering stop.");
    std::exception_ptr fault;
    try {
        SetStatus(QxStatus::kBufferingStopped, QxStatus::kNoCause);
    } catch (...) {
        // What a host throws keeps nothing recording.
        fault = std::current_exception();
    }
    {
        const StatusChannel::Hold hold(getStatusChannel());
        MutexLock lock(streamBuffersMutex);
        // Contract: stop-under-the-list-lock. Units wait meanwhile; a removal stops outside.
        if (const std::exception_ptr stopFault = stopBuffers(); fault == nullptr) {
            fault = stopFault;
        }
    }
    flushQueues();
    {
        MutexLock lock(streamBuffersMutex);
        forgetPreRoll();
    }
    if (fault != nullptr) {
        std::rethrow_exception(fault);
    }
}

/// Stops all that there are also when one of them cannot be joined, as by its own thread. Returns what it
/// threw first.
std::exception_ptr Controller::stopBuffers() {
    std::exception_ptr fault;
    for (Recording& recording : streamBuffers) {
        recording.isOver = recording.isOver || keepsStop(recording);
        try {
            recording.buffer->Stop();
        } catch (const std::system_error&) {
            if (fault == nullptr) {
                fault = std::current_exception();
            }
        }
        recording.MarkStopped(++commandOrder);
    }
    return fault;
}

void Controller::stopAndRemoveBuffers() {
    const StatusChannel::Hold hold(getStatusChannel());
    MutexLock lock(streamBuffersMutex);
    if (const std::exception_ptr fault = stopBuffers(); fault != nullptr) {
        std::rethrow_exception(fault);
    }
    streamBuffers.clear();
}

void Controller::flushQueues() {
    for (const std::shared_ptr<StreamDataQueue>& queue : queues) {
        queue->Clear();
    }
}

void Controller::OnChangeInStreamInfo(const std::shared_ptr<Event>& event) {
    CLIPFILE_LOG_SCOPE(scope, LOG_PRIORITY_TRACE);
    const OutputSettings& input = std::static_pointer_cast<ChangeInStreamInfoEvent>(event)->settings;
    MutexLock lock(settingsMutex);
    // Contract: connect-changes-the-rate. The prefix is never taken over, the rest only with "direct".
    settings.framerate = input.framerate;
    if (settings.naluType == "direct") {
        settings.bitrate = input.bitrate;
        settings.width = input.width;
        settings.height = input.height;
    }
    CLIPFILE_LOG(LOG_PRIORITY_TRACE, "input settings.");
    CLIPFILE_LOG(LOG_PRIORITY_TRACE, "framerate : %d.", static_cast<int>(settings.framerate));
    CLIPFILE_LOG(LOG_PRIORITY_TRACE, "bitrate   : %d.", static_cast<int>(settings.bitrate));
    CLIPFILE_LOG(LOG_PRIORITY_TRACE, "width     : %d.", static_cast<int>(settings.width));
    CLIPFILE_LOG(LOG_PRIORITY_TRACE, "height    : %d.", static_cast<int>(settings.height));
    scope.End();
}

// Contract: start-event-unused. Nothing posts one.
void Controller::OnStartStream(const std::shared_ptr<Event>& event) {
    CLIPFILE_LOG_SCOPE(scope, LOG_PRIORITY_TRACE);
    StartStream(std::static_pointer_cast<StartStreamingEvent>(event)->unit);
}

void Controller::OnStopStream(const std::shared_ptr<Event>& event) {
    CLIPFILE_LOG_SCOPE(scope, LOG_PRIORITY_TRACE);
    StopStream(std::static_pointer_cast<StopStreamingEvent>(event)->unit, event->order);
}

// Contract: restart-misspelled. The log shows the name so.
void Controller::OnRetartStream(const std::shared_ptr<Event>& event) {
    CLIPFILE_LOG_SCOPE(scope, LOG_PRIORITY_TRACE);
    const auto restarting = std::static_pointer_cast<RestartStreamingEvent>(event);
    const std::shared_ptr<StreamBuffer>& buffer = restarting->buffer;
    CLIPFILE_LOG_PLAIN(LOG_PRIORITY_OPERATOR, "OP: REC RESTART. RTPTS = %lld -> %lld.",
                       wide(buffer->GetStartTimestamp()), wide(buffer->GetStopTimestamp()));
    if (!restart(*restarting)) {
        RemoveStream(buffer);
    }
}

/// False when the recording has to be removed instead, with nothing done.
bool Controller::restart(const RestartStreamingEvent& event) {
    const StatusChannel::Hold hold(getStatusChannel());
    MutexLock lock(streamBuffersMutex);
    const auto found = std::find_if(streamBuffers.begin(), streamBuffers.end(),
                                    [&](const Recording& r) { return r.buffer == event.buffer; });
    // Stopped since the event was posted, as by a host that went offline, it stays stopped, or has begun
    // again already.
    const bool restarts = found != streamBuffers.end() && found->stopped < event.order;
    if (restarts && keepsStop(*found)) {
        if (found->buffer->GetStopTimestamp() == kOpenStop) {
            found->buffer->SetStopTimestamp(found->buffer->GetEndTimestamp());
        }
        return false;
    }
    if (restarts) {
        found->buffer->Stop();
        found->MarkStopped(++commandOrder);
        found->buffer->Start(getSettings());
        found->isStopped = false;
    }
    // Contract: restart-flushes-all. Also the units of other recordings, and for a buffer that has gone.
    flushQueues();
    forgetPreRoll();
    if (restarts) {
        startBehindStream(*found);
    }
    return true;
}

void Controller::OnRemoveStreaming(const std::shared_ptr<Event>& event) {
    CLIPFILE_LOG_SCOPE(scope, LOG_PRIORITY_TRACE);
    RemoveStream(std::static_pointer_cast<RemoveStreamingEvent>(event)->buffer);
}

}  // namespace clipfileModule
