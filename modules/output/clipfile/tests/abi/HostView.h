#pragma once

// The module as a host sees it that was built elsewhere, years ago: every declaration stands here a second
// time, typed from the interface tables, and nothing of include/ is included. A test that passes with these
// keeps the promise to hosts which nobody can rebuild. When one fails, it is include/ that has to go back.

#include <cstdint>
#include <map>
#include <memory>
#include <string>

struct StreamData {
    virtual ~StreamData() = default;

    std::uint64_t rtp_timestamp = 0;
    std::uint64_t timestamp = 0;
    std::uint64_t presentation_timestamp = 0;
    std::uint64_t reserved1 = 0;
    std::uint64_t reserved2 = 0;
    std::uint64_t reserved3 = 0;
    std::shared_ptr<unsigned char> data;
    std::uint64_t size = 0;
    std::uint64_t reserved4 = 0;
    bool reservedFlag = true;
    std::shared_ptr<unsigned char> buffer;
    const unsigned char* payload = nullptr;
};

struct QxInputOutputConnectRequest {
    std::uint32_t framerate = 0;
    std::uint32_t width = 0;
    std::uint32_t height = 0;
    std::uint32_t bitrate = 0;
    std::map<std::string, std::string> properties;
};

struct QxInputOutputDisconnectionRequest {
    std::uint32_t connectionKind = 0;
};

class QxModuleHostInterface {
 public:
    virtual void SetStatus(int status, int cause) = 0;
    virtual int GetStatus() = 0;
    virtual void GetParameter(std::string key, int& value, int defaultValue) = 0;
    virtual void GetParameter(std::string key, std::string& value, std::string defaultValue) = 0;
    virtual int SendTransmissionStatus(const std::map<std::string, std::string>& status) = 0;

 protected:
    ~QxModuleHostInterface() = default;
};

class QxModuleStreamInterface {
 public:
    virtual void PushReserved(const std::shared_ptr<StreamData>& unit) = 0;
    virtual void PushVideo(const std::shared_ptr<StreamData>& unit) = 0;
    virtual void PushAudio(const std::shared_ptr<StreamData>& unit) = 0;
    virtual void PushMeta(const std::shared_ptr<StreamData>& unit) = 0;

 protected:
    ~QxModuleStreamInterface() = default;
};

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

class QxModuleInterface {
 public:
    virtual bool Initialize(QxModuleHostInterface* host) = 0;
    virtual bool Uninitialize() = 0;
    virtual bool Execute() = 0;
    virtual bool GetModuleInterval(unsigned int* value) = 0;
    virtual bool ReservedOperationA() = 0;
    virtual bool ReservedOperationB() = 0;
    virtual bool GetStreamInterface(QxModuleStreamInterface** out) = 0;
    virtual bool GetNotifyInterface(QxModuleNotifyInterface** out) = 0;
    virtual int ReservedOperationC() = 0;
    virtual ~QxModuleInterface() = default;
};

using GetQxModuleInterfaceFunction = bool (*)(QxModuleInterface**);
