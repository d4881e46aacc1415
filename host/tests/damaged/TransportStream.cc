#include "damaged/TransportStream.h"

#include <algorithm>
#include <fstream>
#include <iterator>
#include <stdexcept>

namespace endtoend {
namespace {

constexpr unsigned char kSync = 0x47;
/// Bytes of a packet's header, and of a PES packet's up to its optional fields (2.4.3.6).
constexpr std::size_t kHeader = 4;
constexpr std::size_t kPesHeader = 9;

bool hasAdaptationField(const Bytes& packet) {
    return (packet[3] & 0x20) != 0;
}

/// The polynomial of 2.4.4.6 annex A, without reflection.
std::uint32_t checksumOf(const unsigned char* begin, const unsigned char* end) {
    std::uint32_t sum = 0xFFFFFFFF;
    for (; begin != end; ++begin) {
        sum ^= static_cast<std::uint32_t>(*begin) << 24;
        for (int bit = 0; bit < 8; ++bit) {
            sum = (sum & 0x80000000) != 0 ? sum << 1 ^ 0x04C11DB7 : sum << 1;
        }
    }
    return sum;
}

/// Where the PES packet that begins in the packet has its fields; nothing when none with fields does.
std::optional<std::size_t> pesOf(const Bytes& packet) {
    const std::size_t at = PayloadOf(packet);
    const bool begins = BeginsUnit(packet) && at + kPesHeader <= packet.size() && packet[at] == 0 &&
                        packet[at + 1] == 0 && packet[at + 2] == 1;
    return begins ? std::optional(at) : std::nullopt;
}

void replacePid(Bytes& bytes, std::size_t at, int from, int to) {
    if (((bytes[at] & 0x1F) << 8 | bytes[at + 1]) == from) {
        bytes[at] = static_cast<unsigned char>((bytes[at] & 0xE0) | to >> 8);
        bytes[at + 1] = static_cast<unsigned char>(to & 0xFF);
    }
}

}  // namespace

Pieces ReadPieces(const std::filesystem::path& file) {
    std::ifstream in(file, std::ios::binary);
    const Bytes bytes{std::istreambuf_iterator<char>(in), {}};
    if (bytes.empty() || bytes.size() % kPacketSize != 0) {
        throw std::runtime_error(file.string() + " is no transport stream");
    }
    Pieces pieces;
    for (auto at = bytes.begin(); at != bytes.end(); at += kPacketSize) {
        if (*at != kSync) {
            throw std::runtime_error(file.string() + " has lost its sync bytes");
        }
        pieces.emplace_back(at, at + kPacketSize);
    }
    return pieces;
}

void WritePieces(const Pieces& pieces, const std::filesystem::path& file) {
    std::ofstream out(file, std::ios::binary);
    for (const Bytes& piece : pieces) {
        out.write(reinterpret_cast<const char*>(piece.data()), static_cast<std::streamsize>(piece.size()));
    }
}

int PidOf(const Bytes& packet) {
    return (packet[1] & 0x1F) << 8 | packet[2];
}

bool BeginsUnit(const Bytes& packet) {
    return (packet[1] & 0x40) != 0;
}

std::size_t PayloadOf(const Bytes& packet) {
    if ((packet[3] & 0x10) == 0) {
        return packet.size();
    }
    const std::size_t field = hasAdaptationField(packet) ? 1U + packet[kHeader] : 0;
    return std::min(kHeader + field, packet.size());
}

void SetContinuity(Bytes& packet, int counter) {
    packet[3] = static_cast<unsigned char>((packet[3] & 0xF0) | (counter & 0x0F));
}

std::optional<std::int64_t> StampOf(const Bytes& packet) {
    const auto counters = transport::CountersOf(packet);
    return counters.stamps.empty() ? std::nullopt
                                   : std::optional(transport::ReadStamp(packet, counters.stamps.front()));
}

void RemoveStamps(Bytes& packet) {
    if (const auto pes = pesOf(packet)) {
        // What is no field any more is stuffing of the header.
        std::fill_n(packet.begin() + static_cast<std::ptrdiff_t>(*pes + kPesHeader), packet[*pes + 8],
                    static_cast<unsigned char>(0xFF));
        packet[*pes + 7] = static_cast<unsigned char>(packet[*pes + 7] & 0x3F);
    }
}

void RemoveClock(Bytes& packet) {
    if (hasAdaptationField(packet) && packet[kHeader] > 0) {
        packet[kHeader + 1] = static_cast<unsigned char>(packet[kHeader + 1] & ~0x10);
    }
}

void RenamePid(Bytes& packet, int from, int to) {
    replacePid(packet, 1, from, to);
    if (PidOf(packet) != kMapPid || !BeginsUnit(packet)) {
        return;
    }
    // The section of 2.4.4.8 behind its pointer field.
    const std::size_t section = PayloadOf(packet) + 1;
    const std::size_t end = section + 3 + ((packet[section + 1] & 0x0F) << 8 | packet[section + 2]) - 4;
    replacePid(packet, section + 8, from, to);
    std::size_t at = section + 12 + ((packet[section + 10] & 0x0F) << 8 | packet[section + 11]);
    while (at + 5 <= end) {
        replacePid(packet, at + 1, from, to);
        at += 5 + ((packet[at + 3] & 0x0F) << 8 | packet[at + 4]);
    }
    // A new version, or nobody looks.
    packet[section + 5] =
        static_cast<unsigned char>((packet[section + 5] & 0xC1) | ((packet[section + 5] + 2) & 0x3E));
    const std::uint32_t sum = checksumOf(&packet[section], &packet[end]);
    for (std::size_t byte = 0; byte < 4; ++byte) {
        packet[end + byte] = static_cast<unsigned char>(sum >> (24 - 8 * byte));
    }
}

namespace transport {

Counters CountersOf(const Bytes& packet) {
    Counters counters;
    if (hasAdaptationField(packet) && packet[kHeader] >= 7 && (packet[kHeader + 1] & 0x10) != 0) {
        counters.clock = kHeader + 2;
    }
    if (const auto pes = pesOf(packet)) {
        const int flags = packet[*pes + 7] >> 6;
        for (int field = 0; field < (flags == 3 ? 2 : flags == 2 ? 1 : 0); ++field) {
            counters.stamps.push_back(*pes + kPesHeader + 5 * static_cast<std::size_t>(field));
        }
    }
    return counters;
}

std::int64_t ReadStamp(const Bytes& packet, std::size_t at) {
    return std::int64_t{packet[at] >> 1 & 7} << 30 | packet[at + 1] << 22 | packet[at + 2] >> 1 << 15 |
           packet[at + 3] << 7 | packet[at + 4] >> 1;
}

void WriteStamp(Bytes& packet, std::size_t at, std::int64_t stamp) {
    packet[at] = static_cast<unsigned char>((packet[at] & 0xF0) | (stamp >> 30 & 7) << 1 | 1);
    packet[at + 1] = static_cast<unsigned char>(stamp >> 22);
    packet[at + 2] = static_cast<unsigned char>((stamp >> 15 & 0x7F) << 1 | 1);
    packet[at + 3] = static_cast<unsigned char>(stamp >> 7);
    packet[at + 4] = static_cast<unsigned char>((stamp & 0x7F) << 1 | 1);
}

std::int64_t ReadClock(const Bytes& packet, std::size_t at) {
    return std::int64_t{packet[at]} << 25 | packet[at + 1] << 17 | packet[at + 2] << 9 | packet[at + 3] << 1 |
           packet[at + 4] >> 7;
}

void WriteClock(Bytes& packet, std::size_t at, std::int64_t base) {
    for (std::size_t byte = 0; byte < 4; ++byte) {
        packet[at + byte] = static_cast<unsigned char>(base >> (25 - 8 * byte));
    }
    packet[at + 4] = static_cast<unsigned char>((packet[at + 4] & 0x7F) | (base & 1) << 7);
}

}  // namespace transport
}  // namespace endtoend
