#include "source/AnnexB.h"

#include <algorithm>

#include "AnnexBReader.h"

namespace receiver {
namespace {

/// The unsigned Exp-Golomb number (ITU-T H.264 9.1) at the beginning of `bytes`. Numbers of parameter sets
/// are below 256, too short for an emulation prevention byte.
std::optional<std::uint32_t> FirstNumber(std::span<const unsigned char> bytes) {
    const auto bit = [&bytes](std::size_t at) -> std::uint32_t { return bytes[at / 8] >> (7 - at % 8) & 1U; };
    std::size_t zeros = 0;
    while (zeros < bytes.size() * 8 && bit(zeros) == 0) {
        ++zeros;
    }
    if (zeros > 8 || 2 * zeros + 1 > bytes.size() * 8) {
        return std::nullopt;
    }
    std::uint32_t number = 0;
    for (std::size_t at = zeros; at <= 2 * zeros; ++at) {
        number = number << 1 | bit(at);
    }
    return number - 1;
}

std::string WithStartCode(std::span<const unsigned char> bytes) {
    std::string text("\0\0\0\1", 4);
    text.append(reinterpret_cast<const char*>(bytes.data()), bytes.size());
    return text;
}

void Append(const std::map<std::uint32_t, std::string>& sets, std::string& text) {
    for (const auto& [number, bytes] : sets) {
        text += bytes;
    }
}

unsigned int TypeOf(unsigned char header) {
    return header & 0x1FU;
}

bool BeginsSlice(std::span<const unsigned char> bytes) {
    return !bytes.empty() && (TypeOf(bytes[0]) == kNalSlice || TypeOf(bytes[0]) == kNalIdr);
}

/// Enters a NAL unit of the stream, which ends the one before it.
void Append(std::span<const unsigned char> bytes, std::span<const unsigned char> stream,
            std::vector<NalUnit>& units) {
    constexpr std::size_t kStartCode = 3;
    std::size_t begin = static_cast<std::size_t>(bytes.data() - stream.data()) - kStartCode;
    while (begin > 0 && stream[begin - 1] == 0) {
        --begin;
    }
    if (!units.empty()) {
        units.back().end = begin;
    }
    units.push_back({TypeOf(bytes[0]), begin, stream.size(), bytes});
}

}  // namespace

std::vector<NalUnit> NalUnits(std::span<const unsigned char> stream) {
    std::vector<NalUnit> units;
    nal_access::AnnexBReader reader(stream);
    for (std::span<const unsigned char> bytes; reader.Next(bytes);) {
        Append(bytes, stream, units);
    }
    return units;
}

std::vector<NalUnit> LeadingNalUnits(std::span<const unsigned char> stream) {
    std::vector<NalUnit> units;
    nal_access::AnnexBReader reader(stream);
    for (std::span<const unsigned char> bytes; !BeginsSlice(reader.Rest()) && reader.Next(bytes);) {
        Append(bytes, stream, units);
    }
    if (BeginsSlice(reader.Rest())) {
        Append(reader.Rest(), stream, units);
    }
    return units;
}

bool Contains(const std::vector<NalUnit>& units, unsigned int type) {
    return std::any_of(units.begin(), units.end(), [type](const NalUnit& unit) { return unit.type == type; });
}

void ParameterSets::Learn(const std::vector<NalUnit>& units) {
    for (const NalUnit& unit : units) {
        // The number of a sequence parameter set follows profile, constraints and level (7.3.2.1.1), that of
        // a picture parameter set comes first (7.3.2.2).
        if (unit.type == kNalSequenceParameterSet && unit.bytes.size() > 4) {
            if (const auto number = FirstNumber(unit.bytes.subspan(4))) {
                sequence_[*number] = WithStartCode(unit.bytes);
            }
        } else if (unit.type == kNalPictureParameterSet && unit.bytes.size() > 1) {
            if (const auto number = FirstNumber(unit.bytes.subspan(1))) {
                picture_[*number] = WithStartCode(unit.bytes);
            }
        }
    }
}

std::optional<std::string> ParameterSets::Complete(std::span<const unsigned char> stream,
                                                   const std::vector<NalUnit>& units) const {
    const bool addSequence = !Contains(units, kNalSequenceParameterSet) && !sequence_.empty();
    const bool addPicture = !Contains(units, kNalPictureParameterSet) && !picture_.empty();
    if (!Contains(units, kNalIdr) || (!addSequence && !addPicture)) {
        return std::nullopt;
    }
    // Picture parameter sets follow the sequence parameter set that they refer to.
    std::size_t at = 0;
    for (const NalUnit& unit : units) {
        if (unit.type == kNalAccessUnitDelimiter || (!addSequence && unit.type == kNalSequenceParameterSet)) {
            at = unit.end;
        }
    }
    const auto text = [](std::span<const unsigned char> bytes) {
        return std::string(reinterpret_cast<const char*>(bytes.data()), bytes.size());
    };
    std::string completed = text(stream.first(at));
    if (addSequence) {
        Append(sequence_, completed);
    }
    if (addPicture) {
        Append(picture_, completed);
    }
    return completed + text(stream.subspan(at));
}

}  // namespace receiver
