#pragma once

#include <cstdint>
#include <map>
#include <memory>
#include <string>
#include <utility>

#include "StreamData.h"
#include "common/OutputSettings.h"

namespace clipfileModule {

class StreamBuffer;

/// Identifies the class of an event.
enum EventId : std::int32_t {
    kChangeInStreamInfo = 1,
    kStartStreaming = 2,
    kStopStreaming = 3,
    kRestartStreaming = 4,
    kRemoveStreaming = 5,
    kTransferStatusNotify = 6,
    kTerminate = 7,
};

/// Base of what the event thread of `Controller` runs, one at a time.
struct Event {
    explicit Event(std::int32_t eventId) : id(eventId) {}
    virtual ~Event() = default;

    std::int32_t id;
    /// Place among the commands, by the counter of `Controller`, which sets it when the event is posted.
    std::uint64_t order = 0;
};

/// The host has connected an input.
struct ChangeInStreamInfoEvent : Event {
    explicit ChangeInStreamInfoEvent(OutputSettings inputSettings)
        : Event(kChangeInStreamInfo), settings(std::move(inputSettings)) {}

    OutputSettings settings;
};

/// A recording starts at the unit.
struct StartStreamingEvent : Event {
    explicit StartStreamingEvent(std::shared_ptr<StreamData> startUnit)
        : Event(kStartStreaming), unit(std::move(startUnit)) {}

    std::shared_ptr<StreamData> unit;
};

/// The open recordings stop at the unit.
struct StopStreamingEvent : Event {
    explicit StopStreamingEvent(std::shared_ptr<StreamData> stopUnit)
        : Event(kStopStreaming), unit(std::move(stopUnit)) {}

    std::shared_ptr<StreamData> unit;
};

/// A recording has to begin again.
struct RestartStreamingEvent : Event {
    explicit RestartStreamingEvent(std::shared_ptr<StreamBuffer> restarted)
        : Event(kRestartStreaming), buffer(std::move(restarted)) {}

    std::shared_ptr<StreamBuffer> buffer;
};

/// A recording has finished.
struct RemoveStreamingEvent : Event {
    explicit RemoveStreamingEvent(std::shared_ptr<StreamBuffer> removed)
        : Event(kRemoveStreaming), buffer(std::move(removed)) {}

    std::shared_ptr<StreamBuffer> buffer;
};

/// A status map goes to the host.
struct TransferStatusNotifyEvent : Event {
    explicit TransferStatusNotifyEvent(std::map<std::string, std::string> statusMap)
        : Event(kTransferStatusNotify), status(std::move(statusMap)) {}

    std::map<std::string, std::string> status;
};

/// The module ends.
struct TerminateEvent : Event {
    TerminateEvent() : Event(kTerminate) {}
};

}  // namespace clipfileModule
