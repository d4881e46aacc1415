// Damaged streams as a network brings them, over UDP and in real time.

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <chrono>

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

/// The packets of datagrams, of each from its beginning.
Pieces Packets(const std::vector<Bytes>& datagrams) {
    Pieces pieces;
    for (const Bytes& datagram : datagrams) {
        for (std::size_t at = 0; at + kPacketSize <= datagram.size(); at += kPacketSize) {
            const auto begin = datagram.begin() + static_cast<std::ptrdiff_t>(at);
            pieces.emplace_back(begin, begin + static_cast<std::ptrdiff_t>(kPacketSize));
        }
    }
    return pieces;
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
    ExpectEnd(*receiver, GetParam().expected, IntactOf(material.pieces, Packets(datagrams)));
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
const Expectation kSentenced{.code = kUnavailable, .sentence = "the source was lost"};

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
                                   {.code = kUnavailable, .sentence = "the source was lost"}},
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
                                    .refused = true}}),
    ::testing::PrintToStringParamName());

}  // namespace
}  // namespace endtoend
