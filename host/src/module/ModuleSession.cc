#include "module/ModuleSession.h"

#include <chrono>
#include <string>

#include "common/ReceiverError.h"

namespace receiver {

ModuleSession::ModuleSession(QxModuleInterface& module, Host& host) : module_(module) {
    if (!module_.Initialize(&host)) {
        const ModuleStatus status = host.Status();
        // The contract allows no further call, Uninitialize included.
        throw ReceiverError(ExitCode::kModule, "the module refuses to start (status " +
                                                   std::to_string(status.status) + ", cause " +
                                                   std::to_string(status.cause) + "); its log tells why.");
    }
    module_.GetStreamInterface(&stream_);
    module_.GetNotifyInterface(&notify_);
    // An event that is posted before the module's event thread has come to wait lies there until the next
    // one; a stop command would, too, and come much too late. The status tells that the thread is there, and
    // asking for it once more is the event that wakes it.
    constexpr int kTries = 50;
    constexpr std::chrono::milliseconds kTry{20};
    for (int i = 0; i < kTries; ++i) {
        module_.Execute();
        if (host.WaitForMap(kTry)) {
            break;
        }
    }
    // There is no connect notification. It would tell the module the rate once more, but halves 50, 59.94 and
    // 60 on its way, so that files of these rates would carry wrong times; and what else it says is settled
    // by the start parameters, which carry the exact rate.
}

ModuleSession::~ModuleSession() {
    End();
}

void ModuleSession::GoOnline() {
    if (!online_) {
        online_ = true;
        notify_->NotifyOnlineStatus();
    }
}

void ModuleSession::End() {
    if (ended_) {
        return;
    }
    ended_ = true;
    if (online_) {
        notify_->NotifyOfflineStatus();
    }
    module_.Uninitialize();
}

}  // namespace receiver
