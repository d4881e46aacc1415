#include "reader/ElementaryStream.h"

#include "reader/BigEndian.h"

namespace clipfile {

namespace {

constexpr std::uint8_t kEsDescriptor = 0x03;
constexpr std::uint8_t kDecoderConfig = 0x04;
constexpr std::uint8_t kDecoderSpecificInfo = 0x05;

/// Takes the descriptor at the front when it has this tag. Its size has seven bits a byte.
std::optional<Bytes> TakeDescriptor(Bytes& rest, std::uint8_t tag) {
    if (rest.size() < 2 || rest[0] != tag) {
        return std::nullopt;
    }
    std::size_t size = 0;
    std::size_t at = 1;
    for (int count = 0; count < 4; ++count) {
        if (at == rest.size()) {
            return std::nullopt;
        }
        const unsigned char byte = rest[at++];
        size = size << 7 | (byte & 0x7F);
        if ((byte & 0x80) == 0) {
            break;
        }
    }
    if (size > rest.size() - at) {
        return std::nullopt;
    }
    const Bytes payload = rest.subspan(at, size);
    rest = rest.subspan(at + size);
    return payload;
}

/// ES_ID, flags, and what the flags say.
bool SkipEsHead(Bytes& rest) {
    if (rest.size() < 3) {
        return false;
    }
    const unsigned char flags = rest[2];
    std::size_t size = 3;
    if ((flags & 0x80) != 0) {
        size += 2;  // dependsOn_ES_ID
    }
    if ((flags & 0x40) != 0) {
        size += 1 + (rest.size() > size ? rest[size] : 0U);  // URLstring
    }
    if ((flags & 0x20) != 0) {
        size += 2;  // OCR_ES_Id
    }
    if (size > rest.size()) {
        return false;
    }
    rest = rest.subspan(size);
    return true;
}

}  // namespace

std::optional<ElementaryStream> ParseElementaryStream(Bytes descriptors) {
    auto es = TakeDescriptor(descriptors, kEsDescriptor);
    if (!es || !SkipEsHead(*es)) {
        return std::nullopt;
    }
    auto config = TakeDescriptor(*es, kDecoderConfig);
    constexpr std::size_t kConfigHead = 13;
    if (!config || config->size() < kConfigHead) {
        return std::nullopt;
    }
    ElementaryStream stream;
    stream.objectTypeIndication = (*config)[0];
    stream.streamType = static_cast<std::uint8_t>((*config)[1] >> 2);
    stream.bufferSizeDB = static_cast<std::uint32_t>(ReadBigEndian(&(*config)[2], 3));
    stream.maxBitrate = ReadU32(&(*config)[5]);
    stream.avgBitrate = ReadU32(&(*config)[9]);
    Bytes rest = config->subspan(kConfigHead);
    if (const auto info = TakeDescriptor(rest, kDecoderSpecificInfo)) {
        stream.decoderSpecificInfo.assign(info->begin(), info->end());
    }
    return stream;
}

}  // namespace clipfile
