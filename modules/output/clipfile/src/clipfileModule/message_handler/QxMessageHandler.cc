#include "message_handler/QxMessageHandler.h"

#include <boost/thread/lock_types.hpp>
#include <memory>

#include "QxModuleStatus.h"
#include "common/Log.h"
#include "common/LogScope.h"

namespace clipfileModule {

namespace {

constexpr const char* kPropertyFilePrefix = "filePrefix";

constexpr std::uint32_t kResultSuccess = 0;
constexpr std::uint32_t kResultNotHandled = 3;

/// The only kind of connection whose end stops file output.
constexpr std::uint32_t kConnectionKindInput = 1;

// Contract: rates-halved. Frame rate of the file for that of an input: these three are halved, no other.
std::uint32_t fileFramerate(std::uint32_t inputRate) {
    switch (inputRate) {
        case 50000:
            return 25000;
        case 59940:
            return 29970;
        case 60000:
            return 30000;
        default:
            return inputRate;
    }
}

}  // namespace

QxMessageHandler::QxMessageHandler(ControllerInterface* owner) : controller(owner) {}

QxMessageHandler::~QxMessageHandler() {
    controller = nullptr;
}

std::uint32_t QxMessageHandler::NotifyInputOutputConnectRequest(const QxInputOutputConnectRequest* request) {
    if (!mayCall("NotifyInputOutputConnectRequest")) {
        return kResultNotHandled;
    }
    CLIPFILE_LOG_SCOPE(scope, LOG_PRIORITY_TRACE);
    CLIPFILE_LOG(LOG_PRIORITY_TRACE, "notify input output connect request received.");
    settings.framerate = fileFramerate(request->framerate);
    settings.bitrate = request->bitrate;
    settings.height = request->height;
    settings.width = request->width;
    CLIPFILE_LOG(LOG_PRIORITY_TRACE, "framerate : %d.", static_cast<int>(request->framerate));
    CLIPFILE_LOG(LOG_PRIORITY_TRACE, "bitrate   : %d.", static_cast<int>(settings.bitrate));
    CLIPFILE_LOG(LOG_PRIORITY_TRACE, "width     : %d.", static_cast<int>(settings.width));
    CLIPFILE_LOG(LOG_PRIORITY_TRACE, "height    : %d.", static_cast<int>(settings.height));
    // Contract: prefix-lives-on. A connection without one repeats the one before.
    const auto prefix = request->properties.find(kPropertyFilePrefix);
    if (prefix != request->properties.end()) {
        settings.filePrefix = prefix->second;
    }
    controller->PostEvent(std::make_shared<ChangeInStreamInfoEvent>(settings));
    return scope.Return("result", kResultSuccess);
}

std::uint32_t QxMessageHandler::NotifyModuleConnectionRequestReply(const void*) {
    if (!mayCall("NotifyModuleConnectionRequestReply")) {
        return kResultNotHandled;
    }
    CLIPFILE_LOG_SCOPE(scope, LOG_PRIORITY_TRACE);
    CLIPFILE_LOG(LOG_PRIORITY_TRACE, "notify module connection request reply.");
    return scope.Return("result", kResultSuccess);
}

std::uint32_t QxMessageHandler::NotifyInputOutputDisconnectionRequest(
    const QxInputOutputDisconnectionRequest* request) {
    if (!mayCall("NotifyInputOutputDisconnectionRequest")) {
        return kResultNotHandled;
    }
    CLIPFILE_LOG_SCOPE(scope, LOG_PRIORITY_TRACE);
    CLIPFILE_LOG(LOG_PRIORITY_TRACE, "notify disconnect received.");
    // Contract: other-disconnects-give-3. Nothing else happens then.
    std::uint32_t result = kResultNotHandled;
    if (request->connectionKind == kConnectionKindInput) {
        if (fileOutputStarted) {
            // Contract: disconnect-leaves-online. The next online is none then.
            stopFileOutput();
        }
        result = kResultSuccess;
    }
    return scope.Return("result", result);
}

std::uint32_t QxMessageHandler::NotifySetPropertiesRequest(const void*) {
    if (!mayCall("NotifySetPropertiesRequest")) {
        return kResultNotHandled;
    }
    CLIPFILE_LOG_SCOPE(scope, LOG_PRIORITY_TRACE);
    return scope.Return("result", kResultSuccess);
}

// Contract: online-outlives-a-life. `Initialize` and `Uninitialize` do not touch the flags.
void QxMessageHandler::NotifyOnlineStatus() {
    if (!mayCall("NotifyOnlineStatus")) {
        return;
    }
    bool changed = false;
    {
        boost::upgrade_lock<boost::shared_mutex> lock(onlineMutex);
        if (!online) {
            boost::upgrade_to_unique_lock<boost::shared_mutex> exclusive(lock);
            CLIPFILE_LOG(LOG_PRIORITY_TRACE, "notify online.");
            online = true;
            changed = true;
        }
    }
    if (changed && !fileOutputStarted) {
        startFileOutput();
    }
}

void QxMessageHandler::NotifyOfflineStatus() {
    if (!mayCall("NotifyOfflineStatus")) {
        return;
    }
    bool changed = false;
    {
        boost::upgrade_lock<boost::shared_mutex> lock(onlineMutex);
        if (online) {
            boost::upgrade_to_unique_lock<boost::shared_mutex> exclusive(lock);
            CLIPFILE_LOG(LOG_PRIORITY_TRACE, "notify offline.");
            online = false;
            changed = true;
        }
    }
    if (changed && fileOutputStarted) {
        // Contract: offline-is-a-fault. Also when it was meant.
        controller->SetStatus(QxStatus::kStreamFault, QxStreamFault::kOffline);
        stopFileOutput();
    }
}

void QxMessageHandler::startFileOutput() {
    CLIPFILE_LOG(LOG_PRIORITY_TRACE, "start file output.");
    try {
        controller->BufferingStart();
    } catch (...) {
        // What could be started runs, and the next offline must find that so.
        fileOutputStarted = true;
        throw;
    }
    fileOutputStarted = true;
}

void QxMessageHandler::stopFileOutput() {
    CLIPFILE_LOG(LOG_PRIORITY_TRACE, "stop file output.");
    try {
        controller->BufferingStop();
    } catch (...) {
        // Every recording has been stopped all the same, and the next start must find that so.
        fileOutputStarted = false;
        throw;
    }
    fileOutputStarted = false;
}

bool QxMessageHandler::mayCall(const char* notification) const {
    if (controller->IsRunning()) {
        return true;
    }
    CLIPFILE_LOG(LOG_PRIORITY_WARNING, "%s is called without initialize.", notification);
    return false;
}

}  // namespace clipfileModule
