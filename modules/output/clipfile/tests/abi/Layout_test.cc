#include <gtest/gtest.h>

#include <array>
#include <cstdio>
#include <string>

namespace {

// Counted by hand for 64-bit machines under the Itanium C++ ABI: a record with virtual operations begins with
// the pointer to its table, a shared_ptr is two pointers, a map 48 bytes. A virtual destructor takes two
// slots. The letters are the types as that ABI mangles them: m 64-bit, j 32-bit unsigned, i int, b bool, v
// void, h unsigned char, P pointer, R reference, K const; M is a pointer to an operation of a class.

const std::string kText = "NSt7__cxx1112basic_stringIcSt11char_traitsIcESaIcEEE";
const std::string kBytes = "St10shared_ptrIhE";
const std::string kUnit = "RKSt10shared_ptrI10StreamDataE";

const std::string kRecords =
    "StreamData is 120 bytes, aligned to 8, virtual destructor 1\n"
    "rtp_timestamp at 8, 8 bytes, m\n"
    "timestamp at 16, 8 bytes, m\n"
    "word 1 at 24, 8 bytes, m\n"
    "word 2 at 32, 8 bytes, m\n"
    "word 3 at 40, 8 bytes, m\n"
    "word 4 at 48, 8 bytes, m\n"
    "data at 56, 16 bytes, " +
    kBytes +
    "\n"
    "size at 72, 8 bytes, m\n"
    "word 5 at 80, 8 bytes, m\n"
    "flag at 88, 1 bytes, b\n"
    "buffer at 96, 16 bytes, " +
    kBytes +
    "\n"
    "payload at 112, 8 bytes, PKh\n"
    "flag is 1 by default\n"
    "QxInputOutputConnectRequest is 64 bytes, aligned to 8, virtual destructor 0\n"
    "framerate at 0, 4 bytes, j\n"
    "width at 4, 4 bytes, j\n"
    "height at 8, 4 bytes, j\n"
    "bitrate at 12, 4 bytes, j\n"
    "properties at 16, 48 bytes, "
    "St3mapINSt7__cxx1112basic_stringIcSt11char_traitsIcESaIcEEES5_St4lessIS5_ESaISt4pairIKS5_S5_EEE\n"
    "QxInputOutputDisconnectionRequest is 4 bytes, aligned to 4, virtual destructor 0\n"
    "connectionKind at 0, 4 bytes, j\n";

const std::string kInterfaces =
    "QxModuleHostInterface is 8 bytes, aligned to 8, virtual destructor 0\n"
    "SetStatus in slot 0, M21QxModuleHostInterfaceFviiE\n"
    "GetStatus in slot 1, M21QxModuleHostInterfaceFivE\n"
    "GetParameter of numbers in slot 2, M21QxModuleHostInterfaceFv" +
    kText +
    "RiiE\n"
    "GetParameter of texts in slot 3, M21QxModuleHostInterfaceFv" +
    kText +
    "RS5_S5_E\n"
    "SendTransmissionStatus in slot 4, M21QxModuleHostInterfaceFi"
    "RKSt3mapINSt7__cxx1112basic_stringIcSt11char_traitsIcESaIcEEES6_St4lessIS6_ESaISt4pairIKS6_S6_EEEE\n"
    "QxModuleStreamInterface is 8 bytes, aligned to 8, virtual destructor 0\n"
    "PushReserved in slot 0, M23QxModuleStreamInterfaceFv" +
    kUnit +
    "E\n"
    "PushVideo in slot 1, M23QxModuleStreamInterfaceFv" +
    kUnit +
    "E\n"
    "PushAudio in slot 2, M23QxModuleStreamInterfaceFv" +
    kUnit +
    "E\n"
    "PushMeta in slot 3, M23QxModuleStreamInterfaceFv" +
    kUnit +
    "E\n"
    "QxModuleNotifyInterface is 8 bytes, aligned to 8, virtual destructor 1\n"
    "NotifyInputOutputConnectRequest in slot 0, "
    "M23QxModuleNotifyInterfaceFjPK27QxInputOutputConnectRequestE\n"
    "NotifyModuleConnectionRequestReply in slot 1, M23QxModuleNotifyInterfaceFjPKvE\n"
    "NotifyInputOutputDisconnectionRequest in slot 2, "
    "M23QxModuleNotifyInterfaceFjPK33QxInputOutputDisconnectionRequestE\n"
    "NotifySetPropertiesRequest in slot 3, M23QxModuleNotifyInterfaceFjPKvE\n"
    "NotifyOnlineStatus in slot 4, M23QxModuleNotifyInterfaceFvvE\n"
    "NotifyOfflineStatus in slot 5, M23QxModuleNotifyInterfaceFvvE\n"
    "QxModuleInterface is 8 bytes, aligned to 8, virtual destructor 1\n"
    "Initialize in slot 0, M17QxModuleInterfaceFbP21QxModuleHostInterfaceE\n"
    "Uninitialize in slot 1, M17QxModuleInterfaceFbvE\n"
    "Execute in slot 2, M17QxModuleInterfaceFbvE\n"
    "GetModuleInterval in slot 3, M17QxModuleInterfaceFbPjE\n"
    "ReservedOperationA in slot 4, M17QxModuleInterfaceFbvE\n"
    "ReservedOperationB in slot 5, M17QxModuleInterfaceFbvE\n"
    "GetStreamInterface in slot 6, M17QxModuleInterfaceFbPP23QxModuleStreamInterfaceE\n"
    "GetNotifyInterface in slot 7, M17QxModuleInterfaceFbPP23QxModuleNotifyInterfaceE\n"
    "ReservedOperationC in slot 8, M17QxModuleInterfaceFivE\n";

std::string OutputOf(const std::string& program) {
    std::FILE* const pipe = popen(("'" + program + "'").c_str(), "r");
    if (pipe == nullptr) {
        ADD_FAILURE() << program;
        return {};
    }
    std::string output;
    std::array<char, 4096> block;
    while (const std::size_t got = std::fread(block.data(), 1, block.size(), pipe)) {
        output.append(block.data(), got);
    }
    EXPECT_EQ(pclose(pipe), 0) << program;
    return output;
}

TEST(Layout, OfTheModulesDeclarationsIsTheOneThatHostsAreBuiltWith) {
    EXPECT_EQ(OutputOf(LAYOUT_OF_MODULE), kRecords + kInterfaces);
}

TEST(Layout, OfTheSecondDeclarationsIsTheSame) {
    EXPECT_EQ(OutputOf(LAYOUT_OF_HOST), kRecords + kInterfaces);
}

}  // namespace
