#include "RecordMetadata.h"

#include <algorithm>
#include <array>
#include <cstddef>
#include <cstdint>

#include "Klv.h"

namespace nal_access {

namespace {

constexpr std::array<unsigned char, 16> kIdentifier = {0x9B, 0x1F, 0x5C, 0x2E, 0x4D, 0x60, 0x4A, 0x17,
                                                       0xA6, 0x3B, 0x0E, 0x72, 0xD8, 0x41, 0xC5, 0x93};
constexpr std::uint16_t kRecordFlagTag = 0xE101;
constexpr std::uint16_t kTimecodeTag = 0xE102;

/// Calls `accept` with the value of each item `tag` of our sets until it returns true.
template <typename Accept>
void VisitItems(Bytes payload, std::uint16_t tag, Accept accept) {
    KlvReader packets(payload);
    KlvPacket packet;
    while (packets.Next(packet)) {
        const auto identifier = SetIdentifier(packet);
        if (!identifier ||
            !std::equal(identifier->begin(), identifier->end(), kIdentifier.begin(), kIdentifier.end())) {
            continue;
        }
        LocalSetReader items(packet);
        KlvItem item;
        while (items.Next(item)) {
            if (item.tag == tag && accept(item.value)) {
                return;
            }
        }
    }
}

}  // namespace

std::optional<bool> ReadRecordFlag(Bytes payload) {
    std::optional<bool> flag;
    VisitItems(payload, kRecordFlagTag, [&](Bytes value) {
        if (value.size() != 1 || value[0] > 1) {
            return false;
        }
        flag = value[0] == 1;
        return true;
    });
    return flag;
}

std::optional<Timecode> ReadTimecode(Bytes payload, unsigned int rate) {
    constexpr std::size_t kTimecodeSize = 5;
    std::optional<Timecode> timecode;
    VisitItems(payload, kTimecodeTag, [&](Bytes value) {
        if (value.size() != kTimecodeSize) {
            return false;
        }
        const Timecode read{value[0], value[1], value[2], value[3], (value[4] & 1) != 0};
        if (!IsValid(read, rate)) {
            return false;
        }
        timecode = read;
        return true;
    });
    return timecode;
}

}  // namespace nal_access
