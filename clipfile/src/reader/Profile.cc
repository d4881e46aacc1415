#include "reader/Profile.h"

#include <algorithm>
#include <vector>

#include "reader/BigEndian.h"
#include "reader/FormatError.h"

namespace clipfile {

namespace {

constexpr std::array<unsigned char, 16> kIdentifier = {0x50, 0x52, 0x4F, 0x46, 0x21, 0xD2, 0x4F, 0xCE,
                                                       0xBB, 0x88, 0x69, 0x5C, 0xFA, 0xC9, 0xC7, 0x40};
constexpr std::uint64_t kHead = 24;  // identifier, version, flags, entry_count

/// `count` 32-bit numbers behind version and flags.
std::vector<std::uint32_t> ReadWords(const InputFile& file, const Box& box, std::size_t count) {
    if (box.PayloadSize() < 4 + 4 * count) {
        throw FormatError(
            box.offset, "'" + FourCcText(box.type) + "' at " + std::to_string(box.offset) + " is too short.");
    }
    const std::vector<unsigned char> bytes = file.Read(box.Payload() + 4, 4 * count);
    std::vector<std::uint32_t> words(count);
    for (std::size_t i = 0; i < count; ++i) {
        words[i] = ReadU32(&bytes[4 * i]);
    }
    return words;
}

AudioProfile ReadAudio(const InputFile& file, const Box& box) {
    const auto words = ReadWords(file, box, 8);
    return {words[0], words[1], words[4], words[5], words[6], words[7]};
}

VideoProfile ReadVideo(const InputFile& file, const Box& box) {
    const auto words = ReadWords(file, box, 10);
    const auto high = [](std::uint32_t word) { return static_cast<std::uint16_t>(word >> 16); };
    const auto low = [](std::uint32_t word) { return static_cast<std::uint16_t>(word); };
    return {words[0],       words[1],      words[2],       words[4],     words[5],
            high(words[6]), low(words[6]), high(words[8]), low(words[8])};
}

}  // namespace

std::optional<Profile> ReadProfile(const InputFile& file, const Box& uuid) {
    if (uuid.type != FourCc("uuid") || uuid.PayloadSize() < kHead) {
        return std::nullopt;
    }
    const std::vector<unsigned char> identifier = file.Read(uuid.Payload(), kIdentifier.size());
    if (!std::equal(identifier.begin(), identifier.end(), kIdentifier.begin())) {
        return std::nullopt;
    }
    Profile profile;
    BoxCursor cursor = Children(file, uuid, kHead);
    while (const auto box = cursor.Next()) {
        switch (box->type) {
            case FourCc("FPRF"):
                profile.format = ReadWords(file, *box, 1)[0];
                break;
            case FourCc("APRF"):
                profile.audio = ReadAudio(file, *box);
                break;
            case FourCc("VPRF"):
                profile.video = ReadVideo(file, *box);
                break;
            default:
                break;
        }
    }
    return profile;
}

}  // namespace clipfile
