#include "controller/Mp4FileOutput.h"

namespace clipfileModule {

namespace {

// Contract: module-interval. What `GetModuleInterval` gives; its meaning is the host's.
constexpr unsigned int kModuleInterval = 10000;

}  // namespace

Mp4FileOutput::Mp4FileOutput() : messageHandler(&controller) {}

Mp4FileOutput::~Mp4FileOutput() = default;

bool Mp4FileOutput::Initialize(QxModuleHostInterface* host) {
    return controller.Initialize(host);
}

bool Mp4FileOutput::Uninitialize() {
    controller.Uninitialize();
    return true;
}

bool Mp4FileOutput::Execute() {
    controller.Execute();
    return true;
}

bool Mp4FileOutput::GetModuleInterval(unsigned int* value) {
    *value = kModuleInterval;
    return true;
}

// Contract: reserved-operations. They do nothing, and keep their places in the table.
bool Mp4FileOutput::ReservedOperationA() {
    return true;
}

bool Mp4FileOutput::ReservedOperationB() {
    return true;
}

bool Mp4FileOutput::GetStreamInterface(QxModuleStreamInterface** out) {
    *out = &controller;
    return true;
}

bool Mp4FileOutput::GetNotifyInterface(QxModuleNotifyInterface** out) {
    *out = &messageHandler;
    return true;
}

int Mp4FileOutput::ReservedOperationC() {
    return 0;
}

}  // namespace clipfileModule
