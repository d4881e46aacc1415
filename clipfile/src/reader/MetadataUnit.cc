#include "reader/MetadataUnit.h"

#include <algorithm>
#include <array>
#include <cstdio>

#include "reader/BigEndian.h"

namespace clipfile {

namespace {

using Identifier = std::array<unsigned char, 16>;

constexpr unsigned char kPacketStart = 0x01;
constexpr Identifier kLocalSet = {0x06, 0x0E, 0x2B, 0x34, 0x02, 0x53, 0x01, 0x01,
                                  0x0C, 0x02, 0x01, 0x01, 0x7F, 0x01, 0x00, 0x00};
constexpr Identifier kRecordSet = {0x9B, 0x1F, 0x5C, 0x2E, 0x4D, 0x60, 0x4A, 0x17,
                                   0xA6, 0x3B, 0x0E, 0x72, 0xD8, 0x41, 0xC5, 0x93};
constexpr Identifier kRecorderBlock = {0x85, 0x1D, 0x08, 0x00, 0x46, 0x78, 0x03, 0x1C,
                                       0xE8, 0x1F, 0x06, 0xF5, 0xA8, 0x84, 0x11, 0xE2};
constexpr std::uint16_t kIdentifierTag = 0xE000;
constexpr std::uint16_t kRecordFlagTag = 0xE101;
constexpr std::uint16_t kTimecodeTag = 0xE102;

bool Equals(Bytes bytes, const Identifier& identifier) {
    return std::equal(bytes.begin(), bytes.end(), identifier.begin(), identifier.end());
}

/// Calls `visit` with tag and value of each item until it returns true; an item that runs past ends the set.
template <typename Visit>
bool AnyItem(const KlvPacket& packet, Visit visit) {
    if (!Equals(packet.label, kLocalSet)) {
        return false;
    }
    Bytes rest = packet.value;
    while (rest.size() >= 4) {
        const std::uint16_t tag = ReadU16(&rest[0]);
        const std::size_t size = ReadU16(&rest[2]);
        if (size > rest.size() - 4) {
            return false;
        }
        if (visit(tag, rest.subspan(4, size))) {
            return true;
        }
        rest = rest.subspan(4 + size);
    }
    return false;
}

/// The first identifier counts.
bool IsSet(const KlvPacket& packet, const Identifier& identifier) {
    bool matches = false;
    AnyItem(packet, [&](std::uint16_t tag, Bytes value) {
        if (tag != kIdentifierTag || value.size() != identifier.size()) {
            return false;
        }
        matches = Equals(value, identifier);
        return true;
    });
    return matches;
}

void ReadRecordSet(const KlvPacket& packet, MetadataUnit& unit) {
    AnyItem(packet, [&](std::uint16_t tag, Bytes value) {
        if (tag == kRecordFlagTag && !unit.recordFlag && value.size() == 1 && value[0] <= 1) {
            unit.recordFlag = value[0] == 1;
        }
        if (tag == kTimecodeTag && !unit.timecode && value.size() == 5 && value[0] < 24 && value[1] < 60 &&
            value[2] < 60) {
            unit.timecode = Timecode{value[0], value[1], value[2], value[3], (value[4] & 1) != 0};
        }
        return false;
    });
}

}  // namespace

std::optional<KlvPacket> ReadKlvPacket(Bytes bytes) {
    constexpr std::size_t kHead = 1 + 16;
    if (bytes.size() < kHead + 1 || bytes[0] != kPacketStart) {
        return std::nullopt;
    }
    std::size_t at = kHead + 1;
    std::uint64_t length = bytes[kHead];
    if (length >= 0x80) {
        const std::size_t width = length & 0x7F;
        if (width == 0 || width > 8 || width > bytes.size() - at) {
            return std::nullopt;
        }
        length = ReadBigEndian(&bytes[at], width);
        at += width;
    }
    if (length > bytes.size() - at) {
        return std::nullopt;
    }
    const auto size = static_cast<std::size_t>(length);
    return KlvPacket{bytes.subspan(1, 16), bytes.subspan(at, size), at + size};
}

std::string TimecodeText(const Timecode& timecode) {
    std::array<char, 32> text = {};
    std::snprintf(text.data(), text.size(), "%02d:%02d:%02d%c%02d", timecode.hours, timecode.minutes,
                  timecode.seconds, timecode.dropFrame ? ';' : ':', timecode.frames);
    return text.data();
}

bool IsRecorderBlock(const KlvPacket& packet) {
    return IsSet(packet, kRecorderBlock);
}

MetadataUnit ReadMetadataUnit(Bytes bytes) {
    MetadataUnit unit;
    std::size_t at = 0;
    while (const auto packet = ReadKlvPacket(bytes.subspan(at))) {
        ++unit.packets;
        at += packet->size;
        if (IsSet(*packet, kRecordSet)) {
            ReadRecordSet(*packet, unit);
        } else if (IsRecorderBlock(*packet)) {
            unit.blockEnd = at;
        }
    }
    return unit;
}

}  // namespace clipfile
