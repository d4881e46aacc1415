#pragma once

#include "QxModuleHostInterface.h"
#include "QxModuleNotifyInterface.h"
#include "QxModuleStreamInterface.h"

/// The module as a host sees it. The order of the operations is an ABI.
///
/// Order of calls: `GetQxModuleInterface`; `Initialize`; the two getters and `Execute` in any order; pushes
/// and notifications; `Uninitialize` once, after the last push. `Initialize` may run again after that. When
/// `Initialize` has returned false the host calls nothing further.
class QxModuleInterface {
 public:
    /// Reads settings and start parameters and starts the threads of the module. False when no output path is
    /// known: the host then has status 7, cause 2, and no thread runs. `host` must live until `Uninitialize`.
    virtual bool Initialize(QxModuleHostInterface* host) = 0;
    /// Ends every recording and every thread. Returns true always.
    virtual bool Uninitialize() = 0;
    /// Posts the first status map, "file_output_status" = "standby". Returns true always.
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
