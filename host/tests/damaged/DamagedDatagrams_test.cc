// Damaged streams as a network brings them, over UDP and in real time.

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <netinet/in.h>
#include <sys/socket.h>
#include <unistd.h>

#include <chrono>
#include <thread>

#include "damaged/Damage.h"
#include "damaged/DamagedFixture.h"
#include "support/FreePorts.h"
#include "support/Senders.h"

namespace endtoend {
namespace {

/// What is sent, of the material's 8 seconds.
constexpr double kShare = 0.5;
constexpr std::chrono::seconds kLength{4};

/// What happens to them on their way.
using DatagramDamage = std::function<std::vector<Bytes>(std::vector<Bytes>, Random&)>;

std::vector<Bytes> Datagrams(const Pieces& pieces) {
    std::vector<Bytes> datagrams;
    for (std::size_t at = 0; at < pieces.size(); ++at) {
        if (at % kDatagramPackets == 0) {
            datagrams.emplace_back();
        }
        datagrams.back().insert(datagrams.back().end(), pieces[at].begin(), pieces[at].end());
    }
    return datagrams;
}

/// Sends datagrams to a port of this machine, spread evenly over that time.
void SendDatagrams(const std::vector<Bytes>& datagrams, std::uint16_t port, std::chrono::nanoseconds length) {
    const int file = socket(AF_INET, SOCK_DGRAM | SOCK_CLOEXEC, 0);
    sockaddr_in address{};
    address.sin_family = AF_INET;
    address.sin_port = htons(port);
    address.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
    const auto begin = std::chrono::steady_clock::now();
    for (std::size_t number = 0; number < datagrams.size(); ++number) {
        std::this_thread::sleep_until(begin + length * number / datagrams.size());
        sendto(file, datagrams[number].data(), datagrams[number].size(), 0,
               reinterpret_cast<const sockaddr*>(&address), sizeof address);
    }
    close(file);
}

struct DatagramCase {
    const char* name;
    DatagramDamage damage;
    Expectation expected;
};

std::ostream& operator<<(std::ostream& out, const DatagramCase& parameters) {
    return out << parameters.name;
}

class DamagedDatagramTest : public DamagedFixture, public ::testing::WithParamInterface<DatagramCase> {};

TEST_P(DamagedDatagramTest, AreRecordedInStepOrRefusedWithASentence) {
    const DamagedMaterial& material = DamagedMaterial::Get();
    Pieces pieces = material.pieces;
    pieces.resize(static_cast<std::size_t>(kShare * static_cast<double>(pieces.size())));
    Random random(1);
    const auto datagrams = GetParam().damage(Datagrams(pieces), random);
    const FreePorts ports;
    const auto receiver = Start({"--input", "udp://127.0.0.1:" + std::to_string(ports.First()), "--timeout",
                                 "2", "--no-reconnect", "--timecode", "10:00:00:00"});
    ASSERT_TRUE(WaitUntilBound(ports.First())) << receiver->AllText();
    SendDatagrams(datagrams, ports.First(), kLength);
    ExpectEnd(*receiver, GetParam().expected, material.file);
}

/// `hit` changes the list at a place, which happens to one datagram in thirty.
template <typename Hit>
DatagramDamage Rarely(Hit hit) {
    return [hit](std::vector<Bytes> datagrams, Random& random) {
        // Not the first ones, with the tables.
        for (std::size_t at = 5; at + 1 < datagrams.size(); ++at) {
            if (random() % 30 == 0) {
                hit(datagrams, at);
            }
        }
        return datagrams;
    };
}

/// The sender has gone when it has sent everything.
const Expectation kSentenced{.code = kUnavailable, .sentence = "the source was lost", .pictures = 70};

INSTANTIATE_TEST_SUITE_P(
    All, DamagedDatagramTest,
    ::testing::Values(DatagramCase{"Dropped", Rarely([](std::vector<Bytes>& all, std::size_t at) {
                                       all.erase(all.begin() + static_cast<std::ptrdiff_t>(at));
                                   }),
                                   kSentenced},
                      DatagramCase{"Reordered", Rarely([](std::vector<Bytes>& all, std::size_t at) {
                                       std::swap(all[at], all[at + 1]);
                                   }),
                                   kSentenced},
                      DatagramCase{"CutShort", Rarely([](std::vector<Bytes>& all, std::size_t at) {
                                       all[at].resize(all[at].size() / 3);
                                   }),
                                   kSentenced},
                      DatagramCase{"OfAnotherProtocol",
                                   Rarely([](std::vector<Bytes>& all, std::size_t at) {
                                       all.insert(all.begin() + static_cast<std::ptrdiff_t>(at),
                                                  Bytes(500, 0x11));
                                   }),
                                   {.code = kUnavailable, .sentence = "the source was lost", .pictures = 90}},
                      DatagramCase{"OfTwoSenders",
                                   [](const std::vector<Bytes>& all, Random&) {
                                       std::vector<Bytes> both;
                                       for (std::size_t at = 0; at < all.size(); ++at) {
                                           both.push_back(all[at]);
                                           both.push_back(all[(at + all.size() / 2) % all.size()]);
                                       }
                                       return both;
                                   },
                                   {.code = kUnavailable,
                                    .sentence = "look for a second sender at the same address",
                                    .pictures = 0}}),
    ::testing::PrintToStringParamName());

}  // namespace
}  // namespace endtoend
