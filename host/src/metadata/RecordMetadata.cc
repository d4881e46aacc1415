#include "metadata/RecordMetadata.h"

#include <array>

namespace receiver {
namespace {

/// Stands in front of every packet of a metadata unit.
constexpr unsigned char kPacket = 0x01;

/// Universal label of a local set with tags and lengths of two bytes.
constexpr std::array<unsigned char, 16> kLocalSet{0x06, 0x0E, 0x2B, 0x34, 0x02, 0x53, 0x01, 0x01,
                                                  0x0C, 0x02, 0x01, 0x01, 0x7F, 0x01, 0x00, 0x00};

/// Item E000: the identifier of the record set.
constexpr std::array<unsigned char, 20> kIdentifier{0xE0, 0x00, 0x00, 0x10, 0x9B, 0x1F, 0x5C,
                                                    0x2E, 0x4D, 0x60, 0x4A, 0x17, 0xA6, 0x3B,
                                                    0x0E, 0x72, 0xD8, 0x41, 0xC5, 0x93};

/// Tag and length of item E101, one byte, and of item E102, five bytes.
constexpr std::array<unsigned char, 4> kRecordFlag{0xE1, 0x01, 0x00, 0x01};
constexpr std::array<unsigned char, 4> kTimecode{0xE1, 0x02, 0x00, 0x05};

template <typename Bytes>
void Append(std::vector<unsigned char>& to, const Bytes& bytes) {
    to.insert(to.end(), bytes.begin(), bytes.end());
}

}  // namespace

std::vector<unsigned char> BuildMetadata(bool record, const std::optional<Timecode>& timecode,
                                         const std::vector<std::vector<unsigned char>>& packets) {
    std::vector<unsigned char> items;
    Append(items, kIdentifier);
    Append(items, kRecordFlag);
    items.push_back(record ? 1 : 0);
    if (timecode) {
        Append(items, kTimecode);
        items.insert(items.end(), {timecode->hours, timecode->minutes, timecode->seconds, timecode->frames,
                                   static_cast<unsigned char>(timecode->dropFrame ? 1 : 0)});
    }

    std::size_t size = 1 + kLocalSet.size() + 1 + items.size();
    for (const std::vector<unsigned char>& packet : packets) {
        size += 1 + packet.size();
    }
    std::vector<unsigned char> unit;
    unit.reserve(size);
    unit.push_back(kPacket);
    Append(unit, kLocalSet);
    // 34 bytes at the most, so the length has its short form.
    unit.push_back(static_cast<unsigned char>(items.size()));
    Append(unit, items);
    for (const std::vector<unsigned char>& packet : packets) {
        unit.push_back(kPacket);
        Append(unit, packet);
    }
    return unit;
}

}  // namespace receiver
