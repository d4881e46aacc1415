#pragma once

#include <cstddef>
#include <vector>

namespace endtoend {

using Bytes = std::vector<unsigned char>;

/// The `number`th packet of a source (SMPTE ST 336): the label of the UAS datalink local set (MISB ST 0601),
/// a length in short or long form, and a value that holds the number, so that no two packets are alike.
inline Bytes MakeKlvPacket(std::size_t number) {
    Bytes packet = {0x06, 0x0E, 0x2B, 0x34, 0x02, 0x0B, 0x01, 0x01,
                    0x0E, 0x01, 0x03, 0x01, 0x01, 0x00, 0x00, 0x00};
    // One in four is longer than the short form can tell, one in seven longer than one byte.
    const std::size_t length = number % 7 == 6 ? 300 : number % 4 == 3 ? 150 : 5 + number % 11;
    if (length < 128) {
        packet.push_back(static_cast<unsigned char>(length));
    } else if (length < 256) {
        packet.insert(packet.end(), {0x81, static_cast<unsigned char>(length)});
    } else {
        packet.insert(packet.end(), {0x82, static_cast<unsigned char>(length >> 8),
                                     static_cast<unsigned char>(length & 0xFF)});
    }
    for (std::size_t i = 0; i < length; ++i) {
        packet.push_back(static_cast<unsigned char>(i < 4 ? number >> (8 * (3 - i)) : 31 * i + number));
    }
    return packet;
}

/// The packets of a run, cut by their lengths. What does not parse ends the run.
inline std::vector<Bytes> SplitKlv(const Bytes& run) {
    std::vector<Bytes> packets;
    std::size_t at = 0;
    // A unit of the recorder has a byte 01 in front of each label; a source has none.
    while (at < run.size()) {
        const std::size_t label = at + (run[at] == 0x01 ? 1 : 0);
        std::size_t value = label + 17;
        if (value > run.size()) {
            break;
        }
        std::size_t length = run[label + 16];
        if (length >= 0x80) {
            std::size_t rest = length & 0x7F;
            length = 0;
            for (; rest > 0 && value < run.size(); --rest) {
                length = length << 8 | run[value++];
            }
        }
        if (length > run.size() - value) {
            break;
        }
        packets.emplace_back(run.begin() + static_cast<std::ptrdiff_t>(label),
                             run.begin() + static_cast<std::ptrdiff_t>(value + length));
        at = value + length;
    }
    return packets;
}

}  // namespace endtoend
