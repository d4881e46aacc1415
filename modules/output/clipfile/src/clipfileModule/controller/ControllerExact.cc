// What exact rules add to the record commands of `Controller`: recordings end on the frame of their command,
// and begin with all media in step whatever the queue threads have let go by.

#include <algorithm>

#include "common/Log.h"
#include "common/RtpClock.h"
#include "controller/Controller.h"

namespace clipfileModule {

namespace {

/// An audio frame of 1024 samples at 48 kHz in milliseconds, rounded up.
constexpr std::uint64_t kAudioFrame = 22;
/// No unit of the same clock comes so late behind those of other media: a queue holds some two seconds.
constexpr std::uint64_t kLargestLag = 5000;

/// With four threads each. A flag that toggles while the stream's clock stands still would make more and
/// more.
constexpr std::ptrdiff_t kMostWaiting = 16;

}  // namespace

void Controller::followCommand(const StreamData& unit) {
    if (isExact) {
        MutexLock lock(streamBuffersMutex);
        preRoll.Follow(Medium::kMeta, unit.timestamp);
    }
}

void Controller::endRecordings(std::int64_t end) {
    if (!isExact) {
        return;
    }
    MutexLock lock(streamBuffersMutex);
    for (const Recording& recording : streamBuffers) {
        if (recording.IsOpen()) {
            recording.buffer->SetEndTimestamp(end);
        }
    }
}

void Controller::limitWaiting() {
    if (!isExact) {
        return;
    }
    const auto waits = [](const Recording& recording) { return recording.buffer->IsWaiting(); };
    std::shared_ptr<StreamBuffer> oldest;
    {
        MutexLock lock(streamBuffersMutex);
        if (std::count_if(streamBuffers.begin(), streamBuffers.end(), waits) < kMostWaiting) {
            return;
        }
        const auto found = std::find_if(streamBuffers.begin(), streamBuffers.end(), waits);
        if (found == streamBuffers.end()) {
            return;
        }
        oldest = found->buffer;
        // At once: from now on no unit can end it, which would have it removed a second time.
        streamBuffers.erase(found);
    }
    CLIPFILE_LOG(LOG_PRIORITY_WARNING, "%d recordings wait for their first picture. the oldest is removed.",
                 static_cast<int>(kMostWaiting));
    RemoveStream(oldest);
}

void Controller::replayInto(const Recording& recording, std::int64_t start) {
    if (!isExact) {
        return;
    }
    StreamBuffer& buffer = *recording.buffer;
    for (const PreRoll::Entry& entry : preRoll.From(static_cast<std::uint64_t>(start / kTicksPerMilliSec))) {
        pushTo(buffer, entry.medium, entry.unit);
    }
}

bool Controller::keepsStop(const Recording& recording) const {
    return isExact && !recording.IsOpen();
}

void Controller::startBehindStream(Recording& recording) {
    const std::optional<std::uint64_t> newest = isExact ? preRoll.Newest() : std::nullopt;
    if (!newest || !recording.IsOpen()) {
        return;
    }
    // Of what has gone by or was flushed each medium lacks something else. Behind it all nothing lacks, also
    // not the audio frame that begins in front of a picture.
    // Clocks may stand anywhere, and wrap here as they do where they are compared.
    const std::uint64_t start = (*newest + kAudioFrame) * std::uint64_t{kTicksPerMilliSec};
    recording.buffer->SetStartTimestamp(static_cast<std::int64_t>(start));
    recording.startsBehind = true;
}

void Controller::keepUnit(Medium medium, const std::shared_ptr<StreamData>& unit) {
    if (!isExact) {
        return;
    }
    if (isSync) {
        preRoll.Add(medium, unit);
    } else {
        preRoll.Follow(medium, unit->timestamp);
    }
    for (Recording& recording : streamBuffers) {
        const auto start =
            static_cast<std::uint64_t>(recording.buffer->GetStartTimestamp() / kTicksPerMilliSec);
        if (recording.startsBehind && unit->timestamp + kLargestLag < start) {
            // The clock was set back: the instant that the recording waits for may never come.
            recording.buffer->SetStartTimestamp(0);
            recording.startsBehind = false;
        }
    }
}

void Controller::noteFlushed(Medium medium, const std::shared_ptr<StreamData>& unit) {
    if (unit == nullptr) {
        return;
    }
    std::atomic<std::uint64_t>& latest = flushedUntil[static_cast<std::size_t>(medium)];
    std::uint64_t seen = latest;
    while (unit->timestamp > seen && !latest.compare_exchange_weak(seen, unit->timestamp)) {
    }
}

void Controller::forgetPreRoll() {
    for (std::size_t i = 0; i < flushedUntil.size(); ++i) {
        if (const std::uint64_t latest = flushedUntil[i].exchange(0); latest != 0) {
            preRoll.Skip(static_cast<Medium>(i), latest);
        }
    }
    preRoll.Clear();
}

}  // namespace clipfileModule
