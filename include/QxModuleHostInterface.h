#pragma once

#include <map>
#include <string>

/// What the host implements for the module. The order of the operations is an ABI. The module keeps the
/// pointer from `QxModuleInterface::Initialize` to `Uninitialize`, never owns it, and calls it from several
/// threads at once.
class QxModuleHostInterface {
 public:
    /// Records status and cause of the module. Status 7 means that the module has failed for good.
    virtual void SetStatus(int status, int cause) = 0;
    /// The status last set.
    virtual int GetStatus() = 0;
    /// Fills `value` with the start parameter named `key`, or with `defaultValue` when there is none.
    virtual void GetParameter(std::string key, int& value, int defaultValue) = 0;
    virtual void GetParameter(std::string key, std::string& value, std::string defaultValue) = 0;
    /// Passes a status map to the host's management side. 0 means delivered. Always called on one thread.
    virtual int SendTransmissionStatus(const std::map<std::string, std::string>& status) = 0;

 protected:
    ~QxModuleHostInterface() = default;
};
