// Intake of stream units and record commands: the road of a unit from the host's call to the recordings, and
// of a command from the place where it arises to a recording with start and stop timestamps.

#include <algorithm>
#include <utility>

#include "buffer/StreamBuffer.h"
#include "common/Log.h"
#include "controller/Controller.h"
#include "controller/Status.h"

namespace clipfileModule {

namespace {

/// Stop timestamp of a recording that is open.
constexpr std::int64_t kOpenStop = -1;

constexpr const char* kOutputModeOn = "on";
constexpr const char* kOutputModeSync = "sync";

/// The host system's printf formats are as wide as `long long`.
long long wide(std::int64_t value) {
    return value;
}

}  // namespace

void Controller::PushReserved(const std::shared_ptr<StreamData>&) {}

void Controller::PushVideo(const std::shared_ptr<StreamData>& unit) {
    // Contract: overflow-only-logged. No status, no count.
    if (!pushUnit(kVideoQueue, unit)) {
        CLIPFILE_LOG(LOG_PRIORITY_WARNING, "queue overflow (video)");
    }
}

void Controller::PushAudio(const std::shared_ptr<StreamData>& unit) {
    if (!pushUnit(kAudioQueue, unit)) {
        CLIPFILE_LOG(LOG_PRIORITY_WARNING, "queue overflow (audio)");
    }
}

void Controller::PushMeta(const std::shared_ptr<StreamData>& unit) {
    if (!pushUnit(kMetaQueue, unit)) {
        CLIPFILE_LOG(LOG_PRIORITY_WARNING, "queue overflow (meta)");
    }
}

// Contract: silent-after-status-7. Dropped units are not logged.
bool Controller::pushUnit(std::size_t index, const std::shared_ptr<StreamData>& unit) {
    return host->GetStatus() == kStatusFailed || queues[index]->Push(unit);
}

void Controller::queueing(const std::shared_ptr<StreamDataQueue>& queue, UnitConsumer consumer) {
    CLIPFILE_LOG(LOG_PRIORITY_TRACE, "start.");
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
    CLIPFILE_LOG(LOG_PRIORITY_TRACE, "end.");
}

void Controller::pushToBuffers(void (StreamBuffer::*push)(const std::shared_ptr<StreamData>&),
                               const std::shared_ptr<StreamData>& unit) {
    MutexLock lock(streamBuffersMutex);
    for (const std::shared_ptr<StreamBuffer>& buffer : streamBuffers) {
        (*buffer.*push)(unit);
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
                // Contract: start-direct-stop-posted. A start holds for this very unit, a stop may be late.
                StartStream(unit);
            } else {
                CLIPFILE_LOG_PLAIN(LOG_PRIORITY_OPERATOR, "OP: REC FLAG ON -> OFF.");
                PostEvent(std::make_shared<StopStreamingEvent>(unit));
            }
        }
    }
    pushToBuffers(&StreamBuffer::PushMeta, unit);
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
    CLIPFILE_LOG(LOG_PRIORITY_TRACE, "start.");
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
    MutexLock lock(streamBuffersMutex);
    // A new recording closes every open one at the same instant.
    for (const std::shared_ptr<StreamBuffer>& buffer : streamBuffers) {
        if (buffer->GetStopTimestamp() == kOpenStop) {
            buffer->SetStopTimestamp(rtp);
        }
    }
    const auto buffer = std::make_shared<StreamBuffer>(this, rtp, kOpenStop);
    buffer->Start(getSettings());
    streamBuffers.push_back(buffer);
    lock.Unlock();
    CLIPFILE_LOG(LOG_PRIORITY_TRACE, "end.");
}

void Controller::StopStream(const std::shared_ptr<StreamData>& unit) {
    CLIPFILE_LOG(LOG_PRIORITY_TRACE, "start.");
    const auto rtp = static_cast<std::int64_t>(unit->rtp_timestamp);
    // Contract: stop-reads-any-unit. A start asks for a payload first.
    const std::shared_ptr<nal_access::SampleData> timecode = readTimecode(unit);
    MutexLock lock(streamBuffersMutex);
    for (const std::shared_ptr<StreamBuffer>& buffer : streamBuffers) {
        if (buffer->GetStopTimestamp() != kOpenStop) {
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
    CLIPFILE_LOG(LOG_PRIORITY_TRACE, "end.");
}

void Controller::RemoveStream(const std::shared_ptr<StreamBuffer>& buffer) {
    CLIPFILE_LOG(LOG_PRIORITY_TRACE, "start.");
    {
        MutexLock lock(streamBuffersMutex);
        streamBuffers.remove(buffer);
    }
    CLIPFILE_LOG_PLAIN(LOG_PRIORITY_OPERATOR, "OP: REMOVE STREAM. RTPTS = %lld -> %lld.",
                       wide(buffer->GetStartTimestamp()), wide(buffer->GetStopTimestamp()));
    buffer->Stop();
    CLIPFILE_LOG(LOG_PRIORITY_TRACE, "end.");
}

void Controller::BufferingStart() {
    CLIPFILE_LOG(LOG_PRIORITY_TRACE, "start.");
    if (isOutputMode(kOutputModeOn)) {
        // Contract: second-online-cancels. Recordings of an earlier online are closed at 0.
        StartStream(std::make_shared<StreamData>());
    }
    CLIPFILE_LOG(LOG_PRIORITY_TRACE, "stream buffering start.");
    if (terminated) {
        // Contract: terminated-start-has-no-end. A way out without the last line.
        CLIPFILE_LOG(LOG_PRIORITY_TRACE, "process is terminated.");
        return;
    }
    SetStatus(kStatusBufferingStarted, kCauseNone);
    MutexLock lock(streamBuffersMutex);
    // Contract: online-records-again. What an offline stopped is still in the list.
    const OutputSettings now = getSettings();
    for (const std::shared_ptr<StreamBuffer>& buffer : streamBuffers) {
        buffer->Start(now);
    }
    CLIPFILE_LOG(LOG_PRIORITY_TRACE, "end.");
}

void Controller::BufferingStop() {
    CLIPFILE_LOG(LOG_PRIORITY_TRACE, "start.");
    CLIPFILE_LOG(LOG_PRIORITY_TRACE, "stream buffering stop.");
    SetStatus(kStatusBufferingStopped, kCauseNone);
    {
        MutexLock lock(streamBuffersMutex);
        for (const std::shared_ptr<StreamBuffer>& buffer : streamBuffers) {
            // Contract: stop-under-the-list-lock. Units wait meanwhile; a removal stops outside.
            buffer->Stop();
        }
    }
    flushQueues();
    CLIPFILE_LOG(LOG_PRIORITY_TRACE, "end.");
}

void Controller::stopAndRemoveBuffers() {
    MutexLock lock(streamBuffersMutex);
    for (const std::shared_ptr<StreamBuffer>& buffer : streamBuffers) {
        buffer->Stop();
    }
    streamBuffers.clear();
}

void Controller::flushQueues() {
    for (const std::shared_ptr<StreamDataQueue>& queue : queues) {
        queue->Clear();
    }
}

void Controller::OnChangeInStreamInfo(const std::shared_ptr<Event>& event) {
    CLIPFILE_LOG(LOG_PRIORITY_TRACE, "start.");
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
    CLIPFILE_LOG(LOG_PRIORITY_TRACE, "end.");
}

// Contract: start-event-unused. Nothing posts one.
void Controller::OnStartStream(const std::shared_ptr<Event>& event) {
    CLIPFILE_LOG(LOG_PRIORITY_TRACE, "start.");
    StartStream(std::static_pointer_cast<StartStreamingEvent>(event)->unit);
    CLIPFILE_LOG(LOG_PRIORITY_TRACE, "end.");
}

void Controller::OnStopStream(const std::shared_ptr<Event>& event) {
    CLIPFILE_LOG(LOG_PRIORITY_TRACE, "start.");
    StopStream(std::static_pointer_cast<StopStreamingEvent>(event)->unit);
    CLIPFILE_LOG(LOG_PRIORITY_TRACE, "end.");
}

// Contract: restart-misspelled. The log shows the name so.
void Controller::OnRetartStream(const std::shared_ptr<Event>& event) {
    CLIPFILE_LOG(LOG_PRIORITY_TRACE, "start.");
    const std::shared_ptr<StreamBuffer> buffer =
        std::static_pointer_cast<RestartStreamingEvent>(event)->buffer;
    CLIPFILE_LOG_PLAIN(LOG_PRIORITY_OPERATOR, "OP: REC RESTART. RTPTS = %lld -> %lld.",
                       wide(buffer->GetStartTimestamp()), wide(buffer->GetStopTimestamp()));
    MutexLock lock(streamBuffersMutex);
    if (std::find(streamBuffers.begin(), streamBuffers.end(), buffer) != streamBuffers.end()) {
        buffer->Stop();
        buffer->Start(getSettings());
    }
    // Contract: restart-flushes-all. Also the units of other recordings, and for a buffer that has gone.
    flushQueues();
    lock.Unlock();
    CLIPFILE_LOG(LOG_PRIORITY_TRACE, "end.");
}

void Controller::OnRemoveStreaming(const std::shared_ptr<Event>& event) {
    CLIPFILE_LOG(LOG_PRIORITY_TRACE, "start.");
    RemoveStream(std::static_pointer_cast<RemoveStreamingEvent>(event)->buffer);
    CLIPFILE_LOG(LOG_PRIORITY_TRACE, "end.");
}

}  // namespace clipfileModule
