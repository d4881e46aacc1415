#pragma once

#include "QxModuleHostInterface.h"
#include "QxModuleNotifyInterface.h"
#include "QxModuleStreamInterface.h"

/// The module as a host sees it. The order of the operations is an ABI.
///
/// Order of calls: `GetQxModuleInterface`; `Initialize`; the two getters and `Execute` in any order; pushes
/// and notifications; `Uninitialize` once, after the last push. `Initialize` may run again after that. When
/// `Initialize` has returned false the host calls nothing further.
///
/// Breaches that do no harm, each a log line at priority 5 and nothing else: `Initialize` while the module
/// runs; `Uninitialize` and `Execute` while it does not; notifications and pushes while it does not, where a
/// run of pushes is one line. Undefined are: calls of this interface at the same time; pushes and
/// notifications that overlap `Uninitialize`; two notifications at the same time; destruction of the host or
/// of the library in between.
///
/// A notification, `Uninitialize` and the stop of a recording wait for the threads of recordings, and these
/// may be inside `SetStatus`, `GetStatus` or `SendTransmissionStatus`. So a host must not hold a lock across
/// a notification or `Uninitialize` that one of these three operations takes.
class QxModuleInterface {
 public:
    /// Reads settings and start parameters and starts the threads of the module. False when no output path is
    /// known: the host then has status 7, cause 2, and no thread runs. `host` must live until `Uninitialize`
    /// has returned. While the module runs: true, the life goes on with the host that it has, and one
    /// `Uninitialize` ends it. Throws `std::system_error` when the system has no thread left; the module must
    /// not be used after that.
    virtual bool Initialize(QxModuleHostInterface* host) = 0;
    /// Ends every recording and every thread. Returns true always. A recording whose disk hangs takes up to
    /// four seconds, and its thread may still be inside a call of the host then; it begins none.
    virtual bool Uninitialize() = 0;
    /// Posts the first status map, "file_output_status" = "standby", which follows on a thread of the module.
    /// Returns true always.
    virtual bool Execute() = 0;
    /// Writes 10000 to `*value`. Returns true.
    virtual bool GetModuleInterval(unsigned int* value) = 0;
    virtual bool ReservedOperationA() = 0;
    virtual bool ReservedOperationB() = 0;
    /// Both pointers stay valid until the library is unloaded; they are not counted. Return true.
    virtual bool GetStreamInterface(QxModuleStreamInterface** out) = 0;
    virtual bool GetNotifyInterface(QxModuleNotifyInterface** out) = 0;
    virtual int ReservedOperationC() = 0;
    virtual ~QxModuleInterface() = default;
};

/// The one export of the library. Stores the address of the one module object and returns true.
extern "C" bool GetQxModuleInterface(QxModuleInterface** out);
