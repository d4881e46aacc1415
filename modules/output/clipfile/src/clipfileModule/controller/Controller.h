#pragma once

#include <array>
#include <atomic>
#include <condition_variable>
#include <cstdint>
#include <deque>
#include <exception>
#include <functional>
#include <list>
#include <map>
#include <memory>
#include <string>
#include <thread>
#include <vector>

#include "QxModuleHostInterface.h"
#include "QxModuleStreamInterface.h"
#include "StreamAnalyzer.h"
#include "buffer/queue/StreamQueue.h"
#include "common/ControllerInterface.h"
#include "common/Mutex.h"
#include "common/OutputSettings.h"
#include "controller/PreRoll.h"
#include "controller/Recording.h"
#include "controller/StatusChannel.h"

namespace clipfileModule {

/// The centre of the module: reads the configuration, owns the intake of the stream and its threads, turns
/// record commands into recordings, and runs on a thread of its own, one event at a time, whatever must not
/// run on a thread of the host or of a recording.
///
/// Life: construction starts nothing. `Initialize` starts the event thread and three queue threads; after it
/// has returned true, `Uninitialize` must run before destruction, and `Initialize` may run again after that.
/// Calls of a host outside this order that can be told change nothing and are logged at priority 5.
class Controller : public ControllerInterface, public QxModuleStreamInterface {
 public:
    Controller();
    ~Controller() override;

    /// Reads the settings store and the start parameters of `moduleHost`, which must live until
    /// `Uninitialize`, and starts the threads. False when no output path is known: the host then has status
    /// 7, cause 2, and no thread runs. When a thread cannot be started it throws `std::system_error` with
    /// kept rules, and is false with cause 2 with exact ones. A life that runs already goes on with the host
    /// that it has, and the result is true.
    bool Initialize(QxModuleHostInterface* moduleHost);
    /// Ends the event thread, every recording and every queue thread, in this order, once the host has
    /// stopped pushing. Nothing outside a life.
    void Uninitialize();
    /// Posts the first status map, "standby". Nothing outside a life.
    void Execute();

    void PostEvent(std::shared_ptr<Event> event) override;
    void SendEvent(std::shared_ptr<Event> event) override;
    void BufferingStart() override;
    void BufferingStop() override;
    void SetStatus(int status, int cause) override;
    bool IsRunning() const override { return intake != nullptr; }

    /// The pushes cost one status query, one reference and one push under the queue's own lock. A unit that
    /// finds its queue full is lost and logged; with status 7 all units are dropped in silence. Outside a
    /// life the first unit of a run is logged.
    void PushReserved(const std::shared_ptr<StreamData>& unit) override;
    void PushVideo(const std::shared_ptr<StreamData>& unit) override;
    void PushAudio(const std::shared_ptr<StreamData>& unit) override;
    void PushMeta(const std::shared_ptr<StreamData>& unit) override;

 private:
    friend class ControllerPeer;

    using UnitConsumer = std::function<void(const std::shared_ptr<StreamData>&)>;
    using EventHandler = std::function<void(std::shared_ptr<Event>)>;

    /// One queue and one thread for each `Medium`, in this order.
    static constexpr std::size_t kQueueCount = 3;

    // Configuration (Controller.cc).
    bool getStaticConfig();
    bool getStartParameters();
    void endFailedStart();
    void endLife();
    void startQueueThread(std::size_t index, const UnitConsumer& consumer);
    void endStatusChannel() EXCLUDES(statusMutex);
    std::shared_ptr<StatusChannel> getStatusChannel() const EXCLUDES(statusMutex);
    OutputSettings getSettings() const EXCLUDES(settingsMutex);
    bool isOutputMode(const char* mode) const EXCLUDES(settingsMutex);

    // Event loop (ControllerEvents.cc).
    void enqueueEvent(std::shared_ptr<Event> event, bool atHead) EXCLUDES(eventQueueMutex);
    std::shared_ptr<Event> getEvent() EXCLUDES(eventQueueMutex);
    void dispatchEvent(const std::shared_ptr<Event>& event);
    void EventLoop();
    void waitForEvent(bool firstWait) EXCLUDES(eventQueueMutex);
    void OnTransferStatusNotify(const std::shared_ptr<Event>& event);
    void OnTerminate(const std::shared_ptr<Event>& event);

    // Intake and record commands (ControllerStream.cc).
    bool pushUnit(Medium medium, const std::shared_ptr<StreamData>& unit);
    void noteStrayUnit();
    void queueing(const std::shared_ptr<StreamDataQueue>& queue, UnitConsumer consumer);
    void processMeta(const std::shared_ptr<StreamData>& unit);
    std::int32_t readRecFlag(const StreamData& unit) EXCLUDES(analyzerMutex);
    std::shared_ptr<nal_access::SampleData> readTimecode(const std::shared_ptr<StreamData>& unit)
        EXCLUDES(analyzerMutex);
    /// Tells once a life that a picture does not say when it is shown. By the video queue thread alone.
    void checkPresentationTime(Medium medium, const StreamData& unit);
    static void pushTo(StreamBuffer& buffer, Medium medium, const std::shared_ptr<StreamData>& unit);
    void pushToBuffers(Medium medium, const std::shared_ptr<StreamData>& unit) EXCLUDES(streamBuffersMutex);
    void StartStream(const std::shared_ptr<StreamData>& unit) EXCLUDES(streamBuffersMutex);
    void StopStream(const std::shared_ptr<StreamData>& unit, std::uint64_t order)
        EXCLUDES(streamBuffersMutex);
    void RemoveStream(const std::shared_ptr<StreamBuffer>& buffer) EXCLUDES(streamBuffersMutex);
    void removeOverBuffers() REQUIRES(streamBuffersMutex);
    std::exception_ptr startBuffers() REQUIRES(streamBuffersMutex);
    std::exception_ptr stopBuffers() REQUIRES(streamBuffersMutex);
    void stopAndRemoveBuffers() EXCLUDES(streamBuffersMutex);
    bool restart(const RestartStreamingEvent& event) EXCLUDES(streamBuffersMutex);
    void flushQueues();
    void OnChangeInStreamInfo(const std::shared_ptr<Event>& event);
    void OnStartStream(const std::shared_ptr<Event>& event);
    void OnStopStream(const std::shared_ptr<Event>& event);
    void OnRetartStream(const std::shared_ptr<Event>& event);
    void OnRemoveStreaming(const std::shared_ptr<Event>& event);

    // What exact rules add (ControllerExact.cc). Nothing happens in them with kept rules.
    void followCommand(const StreamData& unit) EXCLUDES(streamBuffersMutex);
    void endRecordings(std::int64_t end) EXCLUDES(streamBuffersMutex);
    void limitWaiting() EXCLUDES(streamBuffersMutex);
    void replayInto(const Recording& recording, std::int64_t start) REQUIRES(streamBuffersMutex);
    bool keepsStop(const Recording& recording) const REQUIRES(streamBuffersMutex);
    void startBehindStream(Recording& recording) REQUIRES(streamBuffersMutex);
    void keepUnit(Medium medium, const std::shared_ptr<StreamData>& unit) REQUIRES(streamBuffersMutex);
    void noteFlushed(Medium medium, const std::shared_ptr<StreamData>& unit);
    void forgetPreRoll() REQUIRES(streamBuffersMutex);

    // Changed by Initialize and Uninitialize only, while none of the module's threads runs.
    QxModuleHostInterface* host = nullptr;
    std::vector<std::shared_ptr<std::thread>> queueThreads;
    std::vector<std::shared_ptr<StreamDataQueue>> queues;
    std::map<int, EventHandler> eventHandlers;
    std::shared_ptr<std::thread> eventThread;
    bool isExact = false;
    bool isSync = false;
    bool inDecodingOrder = false;

    // Constant after construction.
    const int queueCapacity = 50;
    const bool dropWhenFull = true;
    const std::uint32_t defaultMaxFileSize = 120;
    const std::uint32_t defaultHeight = 720;
    const std::uint32_t defaultWidth = 1280;
    const std::uint32_t defaultFramerate = 29970;
    const std::uint32_t defaultBitrate = 60000;

    mutable Mutex statusMutex;
    /// Null outside a life. Copied for each use: a thread that was given up may come for it late.
    std::shared_ptr<StatusChannel> statusChannel GUARDED_BY(statusMutex);
    /// The same for the pushes, which the host keeps inside a life. Null from the first moment of
    /// `Uninitialize` on.
    std::atomic<const StatusChannel*> intake = nullptr;
    /// A unit came outside a life, and was logged.
    std::atomic<bool> strayUnitNoted = false;

    /// Numbers the commands in the order in which they are given: events when they are posted, recordings
    /// when they are made and stopped.
    std::atomic<std::uint64_t> commandOrder = 0;

    /// Held while a unit goes to the recordings and during every command, so that no unit falls into a
    /// change.
    Mutex streamBuffersMutex;
    /// One entry a recording in progress or in completion, oldest first.
    std::list<Recording> streamBuffers GUARDED_BY(streamBuffersMutex);
    /// With exact rules: the stream as it was handed to the recordings, kept in "sync" mode.
    PreRoll preRoll GUARDED_BY(streamBuffersMutex);
    /// With exact rules: the latest `timestamp` of each medium that a flush has dropped since the pre-roll
    /// was told.
    std::array<std::atomic<std::uint64_t>, kQueueCount> flushedUntil = {};

    // Contract: locks-for-shared-state. Settings and analyser serve several threads.
    /// Innermost lock: a connected input changes the settings while a recording starts from them.
    mutable Mutex settingsMutex;
    OutputSettings settings GUARDED_BY(settingsMutex);

    /// An analyser serves one thread at a time; both the metadata thread and the event thread read units with
    /// it.
    Mutex analyzerMutex;
    std::shared_ptr<nal_access::StreamAnalyzer> analyzer GUARDED_BY(analyzerMutex);

    /// Used by the video queue thread alone once that runs.
    bool presentationNoted = false;

    /// Last record flag seen, -1 before the first. Used by the metadata queue thread alone once that runs.
    std::int32_t recFlag = -1;

    Mutex queueStartMutex;
    std::condition_variable queueStartCondition;
    bool queueThreadStarted GUARDED_BY(queueStartMutex) = false;

    // Contract: atomic-flags. Others read them without the lock that guards the events.
    /// Once true, every thread of the Controller ends.
    std::atomic<bool> terminated = false;

    /// Guards the events, and is what the loop waits with: a post takes this lock alone, for the length of
    /// the append, and its signal cannot fall between the loop's last test and its wait.
    Mutex eventQueueMutex;
    std::condition_variable eventCondition;
    std::deque<std::shared_ptr<Event>> eventQueue GUARDED_BY(eventQueueMutex);
    /// Set by each post, cleared by the loop before it drains the queue.
    std::atomic<bool> eventPending = false;
};

}  // namespace clipfileModule
