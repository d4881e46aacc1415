#pragma once

#include <atomic>
#include <boost/thread/shared_mutex.hpp>
#include <cstdint>

#include "QxModuleNotifyInterface.h"
#include "common/ControllerInterface.h"
#include "common/OutputSettings.h"

namespace clipfileModule {

/// Takes the host's control notifications and turns them into calls on `ControllerInterface`. It decides when
/// buffering runs, from two facts: whether the host is online, and whether file output has been started.
///
/// It has no thread: each notification runs on the host's thread, and the host delivers them one at a time.
/// Outside a life of the module a notification changes nothing: it is logged, and gives 3 where it gives a
/// result.
class QxMessageHandler : public QxModuleNotifyInterface {
 public:
    /// `owner` is not owned and must live as long as this object. Throws `boost::thread_resource_error` when
    /// the system has no room for the lock.
    explicit QxMessageHandler(ControllerInterface* owner);
    ~QxMessageHandler() override;

    /// An input was connected: passes rate, size and bit rate on. 0.
    std::uint32_t NotifyInputOutputConnectRequest(const QxInputOutputConnectRequest* request) override;
    /// Only logged. 0.
    std::uint32_t NotifyModuleConnectionRequestReply(const void* reply) override;
    /// A disconnect of kind 1 stops file output and gives 0; any other changes nothing and gives 3.
    std::uint32_t NotifyInputOutputDisconnectionRequest(
        const QxInputOutputDisconnectionRequest* request) override;
    /// Only logged. 0.
    std::uint32_t NotifySetPropertiesRequest(const void* request) override;
    /// The host is online: starts file output. No effect when it was online already.
    void NotifyOnlineStatus() override;
    /// The host is offline: status 6, cause 26, and file output stops. No effect when it was offline already.
    void NotifyOfflineStatus() override;

 private:
    void startFileOutput();
    void stopFileOutput();
    /// False, with a log line, outside a life of the module.
    bool mayCall(const char* notification) const;

    ControllerInterface* controller;
    /// Only prefix, bit rate, frame rate and picture size are ever filled. The prefix lives on from one
    /// connection to the next.
    OutputSettings settings;
    std::atomic<bool> fileOutputStarted = false;
    /// Guarded by `onlineMutex`, which is taken for upgrade first and exclusively only for a change.
    bool online = false;
    boost::shared_mutex onlineMutex;
};

}  // namespace clipfileModule
