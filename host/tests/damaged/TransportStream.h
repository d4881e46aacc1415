#pragma once

#include <cstdint>
#include <filesystem>
#include <optional>
#include <vector>

#include "support/Klv.h"

namespace endtoend {

/// A transport stream in pieces (ISO/IEC 13818-1 2.4.3): packets of 188 bytes, and whatever damage makes of
/// them.
using Pieces = std::vector<Bytes>;

inline constexpr std::size_t kPacketSize = 188;

/// PIDs that ffmpeg gives the streams of the tests.
inline constexpr int kTablePid = 0;
inline constexpr int kMapPid = 0x1000;
inline constexpr int kVideoPid = 0x100;
inline constexpr int kAudioPid = 0x101;

/// Throws std::runtime_error when the file is no whole transport stream.
Pieces ReadPieces(const std::filesystem::path& file);
void WritePieces(const Pieces& pieces, const std::filesystem::path& file);

/// Header fields of a packet.
int PidOf(const Bytes& packet);
/// A PES packet or a section begins in it.
bool BeginsUnit(const Bytes& packet);
/// Where the payload begins; the size of the packet when it has none.
std::size_t PayloadOf(const Bytes& packet);
void SetContinuity(Bytes& packet, int counter);

/// Counters of 33 bits, 90000 a second (2.4.3.5, 2.4.3.7).
inline constexpr std::int64_t kStampSpan = std::int64_t{1} << 33;

/// The presentation stamp of the PES packet that begins in a packet.
std::optional<std::int64_t> StampOf(const Bytes& packet);
/// Presentation and decoding stamps, and the base of the programme clock reference, each through `change`.
template <typename Change>
void ChangeStamps(Bytes& packet, Change change);
/// Takes the stamps out of the PES packet that begins in a packet.
void RemoveStamps(Bytes& packet);
/// Takes the programme clock reference out.
void RemoveClock(Bytes& packet);

/// Replaces one PID by another in the headers of packets and in the map of the programme, whose checksum it
/// renews.
void RenamePid(Bytes& packet, int from, int to);

namespace transport {

/// Where counters of a packet stand: with the four marker bits in front (5 bytes), or as clock reference.
struct Counters {
    std::vector<std::size_t> stamps;
    std::optional<std::size_t> clock;
};
Counters CountersOf(const Bytes& packet);
std::int64_t ReadStamp(const Bytes& packet, std::size_t at);
void WriteStamp(Bytes& packet, std::size_t at, std::int64_t stamp);
std::int64_t ReadClock(const Bytes& packet, std::size_t at);
void WriteClock(Bytes& packet, std::size_t at, std::int64_t base);

}  // namespace transport

template <typename Change>
void ChangeStamps(Bytes& packet, Change change) {
    const auto wrapped = [&change](std::int64_t stamp) {
        return ((change(stamp) % kStampSpan) + kStampSpan) % kStampSpan;
    };
    const transport::Counters counters = transport::CountersOf(packet);
    for (const std::size_t at : counters.stamps) {
        transport::WriteStamp(packet, at, wrapped(transport::ReadStamp(packet, at)));
    }
    if (counters.clock) {
        transport::WriteClock(packet, *counters.clock,
                              wrapped(transport::ReadClock(packet, *counters.clock)));
    }
}

}  // namespace endtoend
