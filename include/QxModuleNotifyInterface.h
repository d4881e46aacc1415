#pragma once

#include <cstdint>
#include <map>
#include <string>

/// What the module reads of the host's connect request record.
struct QxInputOutputConnectRequest {
    /// Rate of the input in frames per 1000 seconds.
    std::uint32_t framerate = 0;
    /// Picture size in pixels.
    std::uint32_t width = 0;
    std::uint32_t height = 0;
    /// Bit rate of the input, passed on as it is.
    std::uint32_t bitrate = 0;
    /// Free properties of the connection.
    std::map<std::string, std::string> properties;
};

/// What the module reads of the host's disconnect request record.
struct QxInputOutputDisconnectionRequest {
    std::uint32_t connectionKind = 0;
};

/// The host's control notifications. The order of the operations is an ABI. The host delivers them one at a
/// time, from any of its threads, between a successful `QxModuleInterface::Initialize` and `Uninitialize`;
/// each runs on the calling thread. A result of 0 means success, 3 that nothing was done.
///
/// Going offline and disconnecting wait for every recording to be written and closed. See
/// `QxModuleInterface` for the locks that the host must not hold, and `QxModuleHostInterface` for calls from
/// inside its operations.
class QxModuleNotifyInterface {
 public:
    virtual std::uint32_t NotifyInputOutputConnectRequest(const QxInputOutputConnectRequest* request) = 0;
    virtual std::uint32_t NotifyModuleConnectionRequestReply(const void* reply) = 0;
    virtual std::uint32_t NotifyInputOutputDisconnectionRequest(
        const QxInputOutputDisconnectionRequest* request) = 0;
    virtual std::uint32_t NotifySetPropertiesRequest(const void* request) = 0;
    virtual void NotifyOnlineStatus() = 0;
    virtual void NotifyOfflineStatus() = 0;
    virtual ~QxModuleNotifyInterface() = default;
};
