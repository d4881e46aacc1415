#pragma once

#include "QxModuleInterface.h"
#include "module/Host.h"

namespace receiver {

/// One life of the module, from `Initialize` to `Uninitialize`, with the calls in the order that the module
/// requires. One thread at a time.
class ModuleSession {
 public:
    /// Initialises the module and posts its first status. `host` must outlive the session. Throws
    /// `ReceiverError` with `kModule` when the module refuses.
    ModuleSession(QxModuleInterface& module, Host& host);
    /// Ends the session if that was not done.
    ~ModuleSession();
    ModuleSession(const ModuleSession&) = delete;
    ModuleSession& operator=(const ModuleSession&) = delete;

    QxModuleStreamInterface& Stream() { return *stream_; }

    /// Tells the module that the host is online: in mode "on" a recording begins. A repetition has no effect.
    void GoOnline();
    /// Goes offline when online, and ends the module: recordings are stopped and files closed. Nothing may be
    /// pushed afterwards. A repetition has no effect.
    void End();

 private:
    QxModuleInterface& module_;
    QxModuleStreamInterface* stream_ = nullptr;
    QxModuleNotifyInterface* notify_ = nullptr;
    bool online_ = false;
    bool ended_ = false;
};

}  // namespace receiver
