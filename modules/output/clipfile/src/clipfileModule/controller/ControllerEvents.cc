// The event loop of `Controller`: whatever must not run on a thread of the host or of a recording runs here.

#include <utility>

#include "common/Log.h"
#include "common/LogScope.h"
#include "controller/Controller.h"

namespace clipfileModule {

void Controller::PostEvent(std::shared_ptr<Event> event) {
    CLIPFILE_LOG_SCOPE(scope, LOG_PRIORITY_TRACE, " event_id = %d.", event->id);
    enqueueEvent(std::move(event), false);
}

// Contract: send-event-unused. Two in a row run in reverse order.
void Controller::SendEvent(std::shared_ptr<Event> event) {
    CLIPFILE_LOG_SCOPE(scope, LOG_PRIORITY_TRACE, " event_id = %d.", event->id);
    enqueueEvent(std::move(event), true);
}

void Controller::enqueueEvent(std::shared_ptr<Event> event, bool atHead) {
    {
        MutexLock lock(eventQueueMutex);
        event->order = ++commandOrder;
        if (atHead) {
            eventQueue.push_front(std::move(event));
        } else {
            eventQueue.push_back(std::move(event));
        }
        eventPending = true;
    }
    eventCondition.notify_one();
}

std::shared_ptr<Event> Controller::getEvent() {
    CLIPFILE_LOG_SCOPE(scope, LOG_PRIORITY_TRACE);
    std::shared_ptr<Event> event;
    {
        MutexLock lock(eventQueueMutex);
        if (!eventQueue.empty()) {
            event = std::move(eventQueue.front());
            eventQueue.pop_front();
        }
    }
    if (event == nullptr) {
        scope.EndAs(LOG_PRIORITY_TRACE, "end. no event.");
        return nullptr;
    }
    CLIPFILE_LOG(LOG_PRIORITY_TRACE, "event id = %d.", event->id);
    return event;
}

void Controller::dispatchEvent(const std::shared_ptr<Event>& event) {
    CLIPFILE_LOG_SCOPE(scope, LOG_PRIORITY_TRACE);
    const auto handler = eventHandlers.find(event->id);
    if (handler != eventHandlers.end()) {
        handler->second(event);
    } else {
        CLIPFILE_LOG(LOG_PRIORITY_WARNING, "invalid event.");
    }
}

void Controller::EventLoop() {
    CLIPFILE_LOG_SCOPE(scope, LOG_PRIORITY_TRACE);
    bool firstWait = true;
    do {
        waitForEvent(firstWait);
        firstWait = false;
        if (terminated) {
            CLIPFILE_LOG(LOG_PRIORITY_TRACE, "terminate.");
            break;
        }
        if (!eventPending) {
            CLIPFILE_LOG(LOG_PRIORITY_TRACE, "no event.");
            continue;
        }
        eventPending = false;
        while (const std::shared_ptr<Event> event = getEvent()) {
            dispatchEvent(event);
        }
    } while (!terminated);
}

void Controller::waitForEvent(bool firstWait) {
    MutexLock lock(eventQueueMutex);
    // Contract: first-post-may-wait. A post before the thread first comes here waits for a later signal.
    // Contract: event-wait-tests-first. From then on the wait is not entered while there is work to do.
    if (terminated || (!firstWait && !eventQueue.empty())) {
        return;
    }
    lock.Wait(eventCondition);
}

void Controller::OnTransferStatusNotify(const std::shared_ptr<Event>& event) {
    CLIPFILE_LOG_SCOPE(scope, LOG_PRIORITY_TRACE);
    const std::map<std::string, std::string> status =
        std::static_pointer_cast<TransferStatusNotifyEvent>(event)->status;
    const int result = host->SendTransmissionStatus(status);
    // Contract: refused-map-not-repeated. The log has the only trace.
    if (result != 0) {
        CLIPFILE_LOG(LOG_PRIORITY_ERROR, "SendTransmissionStatus() failed. result = %d.", result);
    }
}

// Contract: terminate-event-undelivered. Runs only when the event lands in a drain.
void Controller::OnTerminate(const std::shared_ptr<Event>&) {
    CLIPFILE_LOG_SCOPE(scope, LOG_PRIORITY_TRACE);
    terminated = true;
    BufferingStop();
    eventCondition.notify_one();
}

}  // namespace clipfileModule
