#pragma once

#include "QxModuleInterface.h"
#include "controller/Controller.h"
#include "message_handler/QxMessageHandler.h"

namespace clipfileModule {

/// The module object: what a host holds. `Initialize`, `Uninitialize` and `Execute` go to the controller, the
/// two getters give controller and message handler, all else is constant. It has no state of its own.
class Mp4FileOutput : public QxModuleInterface {
 public:
    Mp4FileOutput();

    bool Initialize(QxModuleHostInterface* host) override;
    bool Uninitialize() override;
    bool Execute() override;
    bool GetModuleInterval(unsigned int* value) override;
    bool ReservedOperationA() override;
    bool ReservedOperationB() override;
    bool GetStreamInterface(QxModuleStreamInterface** out) override;
    bool GetNotifyInterface(QxModuleNotifyInterface** out) override;
    int ReservedOperationC() override;
    ~Mp4FileOutput() override;

 private:
    // In this order: the message handler keeps a pointer to the controller and goes first.
    Controller controller;
    QxMessageHandler messageHandler;
};

}  // namespace clipfileModule
