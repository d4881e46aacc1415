#include "media/NalUnits.h"

#include "reader/BigEndian.h"

namespace clipfile {

namespace {

constexpr unsigned char kStartCode[] = {0, 0, 0, 1};

/// Calls `visit` with each NAL unit. False where the lengths do not fill the sample.
template <typename Visit>
bool ForEachUnit(Bytes sample, Visit visit) {
    while (!sample.empty()) {
        if (sample.size() < kNalLengthSize) {
            return false;
        }
        const std::uint32_t length = ReadU32(sample.data());
        if (length == 0 || length > sample.size() - kNalLengthSize) {
            return false;
        }
        visit(sample.subspan(kNalLengthSize, length));
        sample = sample.subspan(kNalLengthSize + length);
    }
    return true;
}

}  // namespace

std::optional<NalHead> ReadNalHead(Bytes bytes) {
    if (bytes.empty() || (bytes[0] & 0x80) != 0) {  // forbidden_zero_bit
        return std::nullopt;
    }
    const unsigned referenced = bytes[0] >> 5 & 3U;
    NalHead head;
    head.type = bytes[0] & 0x1F;
    switch (head.type) {
        case 1:
        case 2:
            // first_mb_in_slice is 0 when its Exp-Golomb code begins with a one; 1 and 6 are the codes 010
            // and 00111.
            head.startsPicture = bytes.size() > 1 && (bytes[1] & 0x80) != 0;
            head.startsBPicture =
                head.startsPicture && ((bytes[1] & 0x70) == 0x20 || (bytes[1] & 0x7C) == 0x1C);
            return head;
        case 5:
            head.startsPicture = bytes.size() > 1 && (bytes[1] & 0x80) != 0;
            return referenced != 0 ? std::optional(head) : std::nullopt;
        case 7:
        case 8:
        case 13:
        case 15:
            return referenced != 0 ? std::optional(head) : std::nullopt;
        case 6:
        case 9:
        case 10:
        case 11:
        case 12:
            return referenced == 0 ? std::optional(head) : std::nullopt;
        case 3:
        case 4:
        case 14:
        case 19:
        case 20:
            return head;
        default:
            return std::nullopt;
    }
}

bool IsWholePicture(Bytes sample) {
    bool isGood = true;
    const bool isFilled = ForEachUnit(sample, [&](Bytes unit) { isGood = isGood && ReadNalHead(unit); });
    return isFilled && isGood;
}

bool HasBPicture(Bytes sample) {
    bool hasB = false;
    ForEachUnit(sample, [&](Bytes unit) {
        const std::optional<NalHead> head = ReadNalHead(unit);
        hasB = hasB || (head && head->startsBPicture);
    });
    return hasB;
}

std::vector<unsigned char> ToByteStream(Bytes sample) {
    std::vector<unsigned char> stream;
    stream.reserve(sample.size());
    ForEachUnit(sample, [&](Bytes unit) {
        stream.insert(stream.end(), std::begin(kStartCode), std::end(kStartCode));
        stream.insert(stream.end(), unit.begin(), unit.end());
    });
    return stream;
}

}  // namespace clipfile
