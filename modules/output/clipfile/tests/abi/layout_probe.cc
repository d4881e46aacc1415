// Prints what a compiler makes of the declarations that hosts and module share: offset and width of each
// field, slot and type of each virtual operation. Built twice, with the module's own declarations and with
// the host's second ones.

#if defined(LAYOUT_OF_MODULE)
#include "QxModuleInterface.h"
#else
#include "HostView.h"
#endif

#include <cstddef>
#include <cstdio>
#include <cstring>
#include <type_traits>
#include <typeinfo>

namespace {

template <typename Record, typename Field>
void printField(const char* name, const Record& record, const Field& field) {
    const std::ptrdiff_t offset =
        reinterpret_cast<const char*>(&field) - reinterpret_cast<const char*>(&record);
    std::printf("%s at %td, %zu bytes, %s\n", name, offset, sizeof(Field), typeid(Field).name());
}

template <typename Record>
void printSize(const char* name) {
    std::printf("%s is %zu bytes, aligned to %zu, virtual destructor %d\n", name, sizeof(Record),
                alignof(Record), static_cast<int>(std::has_virtual_destructor_v<Record>));
}

/// A pointer to a virtual operation begins with 1 plus the offset of its slot in the table (Itanium C++
/// ABI, 2.3).
template <typename Operation>
void printSlot(const char* name, Operation operation) {
    std::ptrdiff_t word = 0;
    static_assert(sizeof(operation) == 2 * sizeof(word));
    std::memcpy(&word, &operation, sizeof(word));
    std::printf("%s in slot %td, %s\n", name, (word - 1) / static_cast<std::ptrdiff_t>(sizeof(void*)),
                typeid(Operation).name());
}

void printRecords() {
    const StreamData unit;
    printSize<StreamData>("StreamData");
    printField("rtp_timestamp", unit, unit.rtp_timestamp);
    printField("timestamp", unit, unit.timestamp);
    printField("word 1", unit, unit.presentation_timestamp);
    printField("word 2", unit, unit.reserved1);
    printField("word 3", unit, unit.reserved2);
    printField("word 4", unit, unit.reserved3);
    printField("data", unit, unit.data);
    printField("size", unit, unit.size);
    printField("word 5", unit, unit.reserved4);
    printField("flag", unit, unit.reservedFlag);
    printField("buffer", unit, unit.buffer);
    printField("payload", unit, unit.payload);
    std::printf("flag is %d by default\n", static_cast<int>(unit.reservedFlag));

    const QxInputOutputConnectRequest connect;
    printSize<QxInputOutputConnectRequest>("QxInputOutputConnectRequest");
    printField("framerate", connect, connect.framerate);
    printField("width", connect, connect.width);
    printField("height", connect, connect.height);
    printField("bitrate", connect, connect.bitrate);
    printField("properties", connect, connect.properties);

    const QxInputOutputDisconnectionRequest disconnect;
    printSize<QxInputOutputDisconnectionRequest>("QxInputOutputDisconnectionRequest");
    printField("connectionKind", disconnect, disconnect.connectionKind);
}

void printInterfaces() {
    using Host = QxModuleHostInterface;
    printSize<Host>("QxModuleHostInterface");
    printSlot("SetStatus", &Host::SetStatus);
    printSlot("GetStatus", &Host::GetStatus);
    printSlot("GetParameter of numbers",
              static_cast<void (Host::*)(std::string, int&, int)>(&Host::GetParameter));
    printSlot("GetParameter of texts",
              static_cast<void (Host::*)(std::string, std::string&, std::string)>(&Host::GetParameter));
    printSlot("SendTransmissionStatus", &Host::SendTransmissionStatus);

    using Stream = QxModuleStreamInterface;
    printSize<Stream>("QxModuleStreamInterface");
    printSlot("PushReserved", &Stream::PushReserved);
    printSlot("PushVideo", &Stream::PushVideo);
    printSlot("PushAudio", &Stream::PushAudio);
    printSlot("PushMeta", &Stream::PushMeta);

    using Notify = QxModuleNotifyInterface;
    printSize<Notify>("QxModuleNotifyInterface");
    printSlot("NotifyInputOutputConnectRequest", &Notify::NotifyInputOutputConnectRequest);
    printSlot("NotifyModuleConnectionRequestReply", &Notify::NotifyModuleConnectionRequestReply);
    printSlot("NotifyInputOutputDisconnectionRequest", &Notify::NotifyInputOutputDisconnectionRequest);
    printSlot("NotifySetPropertiesRequest", &Notify::NotifySetPropertiesRequest);
    printSlot("NotifyOnlineStatus", &Notify::NotifyOnlineStatus);
    printSlot("NotifyOfflineStatus", &Notify::NotifyOfflineStatus);

    using Module = QxModuleInterface;
    printSize<Module>("QxModuleInterface");
    printSlot("Initialize", &Module::Initialize);
    printSlot("Uninitialize", &Module::Uninitialize);
    printSlot("Execute", &Module::Execute);
    printSlot("GetModuleInterval", &Module::GetModuleInterval);
    printSlot("ReservedOperationA", &Module::ReservedOperationA);
    printSlot("ReservedOperationB", &Module::ReservedOperationB);
    printSlot("GetStreamInterface", &Module::GetStreamInterface);
    printSlot("GetNotifyInterface", &Module::GetNotifyInterface);
    printSlot("ReservedOperationC", &Module::ReservedOperationC);
}

}  // namespace

int main() {
    printRecords();
    printInterfaces();
}
