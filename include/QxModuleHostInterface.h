#pragma once

#include <map>
#include <string>

/// What the host implements for the module. The order of the operations is an ABI. The module keeps the
/// pointer from `QxModuleInterface::Initialize` to `Uninitialize`, never owns it, and calls it from several
/// threads at once: the host's own, inside calls of the module, and the module's.
///
/// From inside `SetStatus` and `GetStatus` the host may push, query the module and connect an input, on any
/// thread. It may go online, offline or disconnect from inside `SetStatus` too; when the status came from a
/// thread of a recording, which cannot wait for its own end, the notification then throws `std::system_error`
/// (`resource_deadlock_would_occur`) after everything was stopped. From inside `SendTransmissionStatus` the
/// host may call all but `Uninitialize`. `Initialize` and `Uninitialize` from inside any of these operations
/// are undefined.
///
/// The module holds no lock of its event loop or of its statuses during a call of the host. A slow operation
/// delays what it was called for, and a push by as long as `GetStatus` takes.
///
/// What an operation throws leaves the call of the module that it was called in. On a thread of the module
/// nothing catches it.
class QxModuleHostInterface {
 public:
    /// Records status and cause of the module. Status 7 means that the module has failed for good: no status
    /// follows it in this life of the module, and no unit is taken.
    ///
    /// One call at a time, in the order in which the statuses arose. While one thread is inside, it delivers
    /// what arises on others too, so a status may come a moment later, and on another thread, than what it
    /// tells of.
    virtual void SetStatus(int status, int cause) = 0;
    /// The status last set. Asked before each `SetStatus` and at each push: while it is 7, also one that the
    /// host has set itself, the module sets no status and takes no unit.
    virtual int GetStatus() = 0;
    /// Fills `value` with the start parameter named `key`, or with `defaultValue` when there is none. Only
    /// inside `Initialize`.
    virtual void GetParameter(std::string key, int& value, int defaultValue) = 0;
    virtual void GetParameter(std::string key, std::string& value, std::string defaultValue) = 0;
    /// Passes a status map to the host's management side. 0 means delivered. Always called on one thread.
    virtual int SendTransmissionStatus(const std::map<std::string, std::string>& status) = 0;

 protected:
    ~QxModuleHostInterface() = default;
};
