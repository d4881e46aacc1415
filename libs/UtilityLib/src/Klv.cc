#include "Klv.h"

#include <algorithm>
#include <array>
#include <cstddef>

namespace nal_access {

namespace {

constexpr unsigned char kPacketStart = 0x01;
constexpr std::size_t kLabelSize = 16;
constexpr std::array<unsigned char, kLabelSize> kLocalSetLabel = {
    0x06, 0x0E, 0x2B, 0x34, 0x02, 0x53, 0x01, 0x01, 0x0C, 0x02, 0x01, 0x01, 0x7F, 0x01, 0x00, 0x00};
constexpr std::uint16_t kIdentifierTag = 0xE000;
constexpr std::size_t kIdentifierSize = 16;

/// Takes a BER length off the front of `rest`.
std::optional<std::uint64_t> ReadBerLength(Bytes& rest) {
    if (rest.empty()) {
        return std::nullopt;
    }
    const unsigned char first = rest[0];
    rest = rest.subspan(1);
    if (first < 0x80) {
        return first;
    }
    const std::size_t size = first & 0x7F;
    if (size == 0 || size > sizeof(std::uint64_t) || size > rest.size()) {  // 80 is the indefinite form
        return std::nullopt;
    }
    std::uint64_t length = 0;
    for (const unsigned char byte : rest.first(size)) {
        length = length << 8 | byte;
    }
    rest = rest.subspan(size);
    return length;
}

std::uint16_t ReadU16(Bytes bytes, std::size_t offset) {
    return static_cast<std::uint16_t>(bytes[offset] << 8 | bytes[offset + 1]);
}

}  // namespace

bool KlvReader::Next(KlvPacket& packet) {
    Bytes rest = rest_;
    rest_ = {};  // whatever stops the reading stops it for good
    if (rest.size() < 1 + kLabelSize || rest[0] != kPacketStart) {
        return false;
    }
    packet.label = rest.subspan(1, kLabelSize);
    rest = rest.subspan(1 + kLabelSize);
    const auto length = ReadBerLength(rest);
    if (!length || *length > rest.size()) {
        return false;
    }
    packet.value = rest.first(static_cast<std::size_t>(*length));
    rest_ = rest.subspan(static_cast<std::size_t>(*length));
    return true;
}

LocalSetReader::LocalSetReader(const KlvPacket& packet) {
    if (std::equal(packet.label.begin(), packet.label.end(), kLocalSetLabel.begin(), kLocalSetLabel.end())) {
        rest_ = packet.value;
    }
}

bool LocalSetReader::Next(KlvItem& item) {
    constexpr std::size_t kHeadSize = 4;
    if (rest_.size() < kHeadSize) {
        return false;
    }
    const std::size_t length = ReadU16(rest_, 2);
    if (length > rest_.size() - kHeadSize) {
        rest_ = {};
        return false;
    }
    item.tag = ReadU16(rest_, 0);
    item.value = rest_.subspan(kHeadSize, length);
    rest_ = rest_.subspan(kHeadSize + length);
    return true;
}

std::optional<Bytes> SetIdentifier(const KlvPacket& packet) {
    LocalSetReader reader(packet);
    KlvItem item;
    while (reader.Next(item)) {
        if (item.tag == kIdentifierTag && item.value.size() == kIdentifierSize) {
            return item.value;
        }
    }
    return std::nullopt;
}

bool HasSet(Bytes payload, Bytes identifier) {
    KlvReader reader(payload);
    KlvPacket packet;
    while (reader.Next(packet)) {
        const auto found = SetIdentifier(packet);
        if (found && std::equal(found->begin(), found->end(), identifier.begin(), identifier.end())) {
            return true;
        }
    }
    return false;
}

}  // namespace nal_access
