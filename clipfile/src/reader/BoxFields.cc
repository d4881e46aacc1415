#include "reader/BoxFields.h"

#include <algorithm>
#include <charconv>
#include <optional>
#include <utility>

#include "reader/BigEndian.h"
#include "reader/ElementaryStream.h"

// The notation of a layout, a list of words:
//   V                 version and flags of a full box
//   name:TYPE         a field
//   name:TYPE?MASK    a field that is there when one of these flags is set (hexadecimal)
//   -N                N reserved bytes
//   [ ... ]           the rows of a table, as many as the last count before it says, or else to the end
// Types:
//   u8 u16 u24 u32 u64, i16 i32    numbers; x8 to x64 the same in hexadecimal
//   v, vi        32 bits in version 0, 64 bits in version 1, without and with sign
//   c            32 bits, with sign from version 1 on
//   l0 l2 l4     1 to 4 bytes, less one in two bits of the field before the count (tfra)
//   q16 q8       fixed point, 16.16 and 8.8
//   4cc lang str     four characters, ISO 639-2/T code, text to its NUL or to the end
//   bN, rest     N bytes, all bytes that are left
//   pN           text in N bytes, of which the first counts its characters
//   nal5 nal8    a count in the low bits of a byte, and NAL units behind 16 bits of length
//   es           the descriptors of an elementary stream

namespace clipfile {

namespace {

constexpr std::size_t kLongestBytes = 64;
constexpr std::uint64_t kLongestText = 256;

/// Layout, by clause of ISO/IEC 14496-12 where nothing else is said.
const std::vector<BoxLayout> kLayouts = {
    // 4.3
    {"ftyp", "", "major_brand:4cc minor_version:x32 [ compatible_brand:4cc ]"},
    // 8.2
    {"mvhd", "",
     "V creation_time:v modification_time:v timescale:u32 duration:v rate:q16 volume:q8 -10 matrix:b36 -24 "
     "next_track_ID:u32"},
    // 8.3
    {"tkhd", "",
     "V creation_time:v modification_time:v track_ID:u32 -4 duration:v -8 layer:i16 alternate_group:i16 "
     "volume:q8 -2 matrix:b36 width:q16 height:q16"},
    {"cdsc", "tref", "[ track_ID:u32 ]"},
    // 8.4
    {"mdhd", "", "V creation_time:v modification_time:v timescale:u32 duration:v language:lang -2"},
    {"hdlr", "", "V pre_defined:u32 handler_type:4cc -12 name:str"},
    // 8.4.5.2, 12.1.2, 12.2.2
    {"vmhd", "", "V graphicsmode:u16 opcolor:b6"},
    {"smhd", "", "V balance:q8 -2"},
    {"nmhd", "", "V"},
    // 8.5.2, 12.1.3, 12.2.3
    {"stsd", "", "V entry_count:u32"},
    {"avc1", "stsd",
     "-6 data_reference_index:u16 -16 width:u16 height:u16 horizresolution:q16 vertresolution:q16 -4 "
     "frame_count:u16 compressorname:p32 depth:u16 -2"},
    {"mp4a", "stsd", "-6 data_reference_index:u16 -8 channelcount:u16 samplesize:u16 -4 samplerate:q16"},
    {"tmcd", "stsd",
     "-6 data_reference_index:u16 -4 flags:x32 timescale:u32 frame_duration:u32 number_of_frames:u8"},
    {"rtmd", "stsd", "-6 data_reference_index:u16"},
    // ISO/IEC 14496-15 5.3.3.1
    {"avcC", "",
     "configurationVersion:u8 AVCProfileIndication:u8 profile_compatibility:x8 AVCLevelIndication:u8 "
     "lengthSizeMinusOne:u2 sequenceParameterSetNALUnit:nal5 pictureParameterSetNALUnit:nal8"},
    // ISO/IEC 14496-14 5.6
    {"esds", "", "V es:es"},
    // 8.6
    {"stts", "", "V entry_count:u32 [ sample_count:u32 sample_delta:u32 ]"},
    {"ctts", "", "V entry_count:u32 [ sample_count:u32 sample_offset:c ]"},
    {"stss", "", "V entry_count:u32 [ sample_number:u32 ]"},
    {"elst", "", "V entry_count:u32 [ segment_duration:v media_time:vi media_rate:q16 ]"},
    // 8.7
    {"dref", "", "V entry_count:u32"},
    {"url ", "", "V location:str"},
    {"stsz", "", "V sample_size:u32 sample_count:u32 [ entry_size:u32 ]"},
    {"stsc", "", "V entry_count:u32 [ first_chunk:u32 samples_per_chunk:u32 sample_description_index:u32 ]"},
    {"stco", "", "V entry_count:u32 [ chunk_offset:u32 ]"},
    {"co64", "", "V entry_count:u32 [ chunk_offset:u64 ]"},
    // 8.8
    {"mehd", "", "V fragment_duration:v"},
    {"trex", "",
     "V track_ID:u32 default_sample_description_index:u32 default_sample_duration:u32 "
     "default_sample_size:u32 default_sample_flags:x32"},
    {"mfhd", "", "V sequence_number:u32"},
    {"tfhd", "",
     "V track_ID:u32 base_data_offset:u64?1 sample_description_index:u32?2 default_sample_duration:u32?8 "
     "default_sample_size:u32?10 default_sample_flags:x32?20"},
    {"tfdt", "", "V baseMediaDecodeTime:v"},
    {"trun", "",
     "V sample_count:u32 data_offset:i32?1 first_sample_flags:x32?4 [ sample_duration:u32?100 "
     "sample_size:u32?200 sample_flags:x32?400 sample_composition_time_offset:c?800 ]"},
    {"tfra", "",
     "V track_ID:u32 lengths:x32 entry_count:u32 [ time:v moof_offset:v traf_number:l4 trun_number:l2 "
     "sample_number:l0 ]"},
    {"mfro", "", "V size:u32"},
    // The recorder's own.
    {"uuid", "", "usertype:b16"},
    {"FPRF", "", "V format:x32 -4"},
    {"APRF", "",
     "V track_ID:u32 codec:4cc codec_information:x32 attributes:x32 average_bitrate:u32 maximum_bitrate:u32 "
     "sampling_rate:u32 channels:u32"},
    {"VPRF", "",
     "V track_ID:u32 codec:4cc codec_information:x32 attributes:x32 average_bitrate:u32 maximum_bitrate:u32 "
     "average_frame_rate:q16 maximum_frame_rate:q16 width:u16 height:u16 pixel_aspect:b4"},
    {"MTDT", "", "item_count:u16 items:rest"},
};

std::vector<std::string_view> Words(std::string_view text) {
    std::vector<std::string_view> words;
    while (!text.empty()) {
        const std::size_t space = std::min(text.find(' '), text.size());
        if (space != 0) {
            words.push_back(text.substr(0, space));
        }
        text.remove_prefix(std::min(space + 1, text.size()));
    }
    return words;
}

std::uint32_t Parse(std::string_view digits, int base) {
    std::uint32_t value = 0;
    std::from_chars(digits.data(), digits.data() + digits.size(), value, base);
    return value;
}

/// Takes bytes of a box from the front.
class FieldReader {
 public:
    FieldReader(const InputFile& file, const Box& box)
        : file_(file), position_(box.Payload()), end_(box.end) {}

    std::uint64_t Left() const { return end_ - position_; }
    /// Nothing, for good, when there are fewer.
    std::optional<std::vector<unsigned char>> Take(std::uint64_t count) {
        if (count > Left()) {
            position_ = end_;
            return std::nullopt;
        }
        position_ += count;
        return file_.Read(position_ - count, static_cast<std::size_t>(count));
    }
    void Skip(std::uint64_t count) { position_ += std::min(count, Left()); }
    std::uint64_t Position() const { return position_; }

 private:
    const InputFile& file_;
    std::uint64_t position_;
    std::uint64_t end_;
};

/// Reads the fields of one box as its layout tells.
class LayoutReader {
 public:
    LayoutReader(const InputFile& file, const Box& box, std::size_t maxRows)
        : reader_(file, box), maxRows_(maxRows) {}

    BoxFields Read(const std::vector<std::string_view>& words) {
        for (std::size_t i = 0; i < words.size() && !result_.isCut; ++i) {
            if (words[i] == "[") {
                const auto close =
                    std::find(words.begin() + static_cast<std::ptrdiff_t>(i), words.end(), "]");
                ReadRows({words.begin() + static_cast<std::ptrdiff_t>(i) + 1, close});
                break;
            }
            ReadWord(words[i], result_.fields);
        }
        return std::move(result_);
    }

 private:
    void ReadWord(std::string_view word, std::vector<Field>& into) {
        if (word == "V") {
            if (const auto head = Number(4)) {
                version_ = *head >> 24;
                flags_ = *head & 0xFFFFFF;
                into.push_back({"version", version_});
                into.push_back({"flags", Hex(flags_, 6)});
            }
            return;
        }
        if (word.front() == '-') {
            reader_.Skip(Parse(word.substr(1), 10));
            return;
        }
        const std::size_t colon = word.find(':');
        std::string_view type = word.substr(colon + 1);
        if (const std::size_t mark = type.find('?'); mark != std::string_view::npos) {
            if ((flags_ & Parse(type.substr(mark + 1), 16)) == 0) {
                return;
            }
            type = type.substr(0, mark);
        }
        ReadField(std::string(word.substr(0, colon)), type, into);
    }

    void ReadField(const std::string& name, std::string_view type, std::vector<Field>& into) {
        if (type.starts_with("nal")) {
            ReadNalUnits(name, type == "nal5" ? 0x1F : 0xFF, into);
        } else if (type == "es") {
            ReadElementaryStream(into);
        } else if (type == "u2") {
            if (const auto value = Number(1)) {
                into.push_back({name, *value & 3});
            }
        } else if (type == "str" || type == "rest" || type.front() == 'b' || type.front() == 'p') {
            ReadBytes(name, type, into);
        } else {
            ReadNumber(name, type, into);
        }
    }

    void ReadNumber(const std::string& name, std::string_view type, std::vector<Field>& into) {
        const std::size_t width = Width(type);
        const auto number = Number(width);
        if (!number) {
            return;
        }
        const auto narrow = static_cast<std::uint32_t>(*number);
        if (type == "4cc") {
            into.push_back({name, FourCcText(narrow)});
        } else if (type == "lang") {
            into.push_back({name, Language(narrow)});
        } else if (type == "q16") {
            into.push_back({name, narrow / 65536.0});
        } else if (type == "q8") {
            into.push_back({name, narrow / 256.0});
        } else if (type.front() == 'x') {
            into.push_back({name, Hex(*number, 2 * width)});
        } else if (type == "i16") {
            into.push_back({name, std::int64_t{static_cast<std::int16_t>(*number)}});
        } else if (type == "i32" || (type == "vi" && width == 4) || (type == "c" && version_ != 0)) {
            into.push_back({name, std::int64_t{static_cast<std::int32_t>(narrow)}});
        } else if (type == "vi") {
            into.push_back({name, static_cast<std::int64_t>(*number)});
        } else {
            into.push_back({name, *number});
        }
    }

    std::size_t Width(std::string_view type) const {
        if (type == "v" || type == "vi") {
            return version_ == 0 ? 4 : 8;
        }
        if (type == "c" || type == "4cc" || type == "q16") {
            return 4;
        }
        if (type == "lang" || type == "q8") {
            return 2;
        }
        const std::uint32_t digits = Parse(type.substr(1), 10);
        if (type.front() == 'l') {
            return (lengths_ >> digits & 3) + 1;
        }
        return digits / 8;
    }

    void ReadBytes(const std::string& name, std::string_view type, std::vector<Field>& into) {
        const bool isSized = type.front() == 'b' || type.front() == 'p';
        const auto bytes =
            reader_.Take(isSized ? Parse(type.substr(1), 10) : std::min(reader_.Left(), kLongestText));
        if (!bytes) {
            result_.isCut = true;
        } else if (type == "str") {
            into.push_back({name, TextOf(*bytes)});
        } else if (type.front() == 'p') {
            const std::size_t length = std::min<std::size_t>((*bytes)[0], bytes->size() - 1);
            into.push_back({name, TextOf(Bytes(*bytes).subspan(1, length))});
        } else {
            into.push_back({name, ShortHex(*bytes)});
        }
    }

    /// Up to a NUL; what does not print is a question mark.
    static std::string TextOf(Bytes bytes) {
        const auto end = std::find(bytes.begin(), bytes.end(), 0);
        std::string text;
        for (auto byte = bytes.begin(); byte != end; ++byte) {
            text += *byte >= 0x20 && *byte < 0x7F ? static_cast<char>(*byte) : '?';
        }
        return text;
    }

    void ReadNalUnits(const std::string& name, unsigned char mask, std::vector<Field>& into) {
        const auto count = Number(1);
        for (std::uint64_t i = 0; count && i < (*count & mask); ++i) {
            const auto length = Number(2);
            const auto unit = length ? reader_.Take(*length) : std::nullopt;
            if (!unit) {
                result_.isCut = true;
                return;
            }
            into.push_back({name, ShortHex(*unit)});
        }
    }

    void ReadElementaryStream(std::vector<Field>& into) {
        const auto bytes = reader_.Take(std::min(reader_.Left(), std::uint64_t{1024}));
        const auto stream = bytes ? ParseElementaryStream(*bytes) : std::nullopt;
        if (!stream) {
            result_.isCut = true;
            return;
        }
        into.push_back({"objectTypeIndication", Hex(stream->objectTypeIndication, 2)});
        into.push_back({"streamType", std::uint64_t{stream->streamType}});
        into.push_back({"bufferSizeDB", std::uint64_t{stream->bufferSizeDB}});
        into.push_back({"maxBitrate", std::uint64_t{stream->maxBitrate}});
        into.push_back({"avgBitrate", std::uint64_t{stream->avgBitrate}});
        into.push_back({"DecoderSpecificInfo", ShortHex(stream->decoderSpecificInfo)});
    }

    void ReadRows(const std::vector<std::string_view>& words) {
        lengths_ = LengthsField();
        std::uint64_t rowSize = 0;
        for (const std::string_view word : words) {
            std::string_view type = word.substr(word.find(':') + 1);
            const std::size_t mark = std::min(type.find('?'), type.size());
            if (mark == type.size() || (flags_ & Parse(type.substr(mark + 1), 16)) != 0) {
                rowSize += Width(type.substr(0, mark));
            }
        }
        const std::uint64_t room = rowSize == 0 ? 0 : reader_.Left() / rowSize;
        result_.rowCount = std::min(Count().value_or(room), room);
        const std::size_t shown =
            static_cast<std::size_t>(std::min<std::uint64_t>(result_.rowCount, maxRows_));
        for (std::size_t i = 0; i < shown; ++i) {
            std::vector<Field>& row = result_.rows.emplace_back();
            for (const std::string_view word : words) {
                ReadWord(word, row);
            }
        }
    }

    std::optional<std::uint64_t> Count() const {
        for (auto field = result_.fields.rbegin(); field != result_.fields.rend(); ++field) {
            if (field->name.ends_with("_count")) {
                return std::get<std::uint64_t>(field->value);
            }
        }
        return std::nullopt;
    }

    std::uint32_t LengthsField() const {
        const auto field = std::find_if(result_.fields.begin(), result_.fields.end(),
                                        [](const Field& candidate) { return candidate.name == "lengths"; });
        return field == result_.fields.end() ? 0 : Parse(std::get<std::string>(field->value), 16);
    }

    std::optional<std::uint64_t> Number(std::size_t width) {
        const auto bytes = reader_.Take(width);
        if (!bytes) {
            result_.isCut = true;
            return std::nullopt;
        }
        return ReadBigEndian(bytes->data(), width);
    }

    static std::string Hex(std::uint64_t value, std::size_t digits) {
        std::string text(digits, '0');
        for (std::size_t i = digits; i-- > 0; value >>= 4) {
            text[i] = "0123456789ABCDEF"[value & 15];
        }
        return text;
    }

    static std::string ShortHex(const std::vector<unsigned char>& bytes) {
        const Bytes all(bytes);
        return all.size() <= kLongestBytes ? HexText(all) : HexText(all.first(kLongestBytes)) + "...";
    }

    static std::string Language(std::uint32_t packed) {
        std::string text;
        for (int shift = 10; shift >= 0; shift -= 5) {
            const auto letter = static_cast<char>(0x60 + (packed >> shift & 0x1F));
            text += letter >= 'a' && letter <= 'z' ? letter : '?';
        }
        return text;
    }

    FieldReader reader_;
    std::size_t maxRows_;
    std::uint64_t version_ = 0;
    std::uint64_t flags_ = 0;
    std::uint32_t lengths_ = 0;
    BoxFields result_;
};

}  // namespace

const std::vector<BoxLayout>& BoxLayouts() {
    return kLayouts;
}

BoxFields ReadBoxFields(const InputFile& file, const Box& box, std::uint32_t parent, std::size_t maxRows) {
    const std::string type = FourCcText(box.type);
    const std::string around = FourCcText(parent);
    const auto layout = std::find_if(kLayouts.begin(), kLayouts.end(), [&](const BoxLayout& candidate) {
        return candidate.type == type && (candidate.parent.empty() || candidate.parent == around);
    });
    if (layout == kLayouts.end()) {
        return {};
    }
    return LayoutReader(file, box, maxRows).Read(Words(layout->fields));
}

std::string FieldText(const Field& field) {
    if (const auto* const number = std::get_if<std::uint64_t>(&field.value)) {
        return std::to_string(*number);
    }
    if (const auto* const number = std::get_if<std::int64_t>(&field.value)) {
        return std::to_string(*number);
    }
    if (const auto* const number = std::get_if<double>(&field.value)) {
        char text[32];
        const auto written =
            std::to_chars(std::begin(text), std::end(text), *number, std::chars_format::fixed, 4);
        std::string trimmed(text, written.ptr);
        trimmed.erase(trimmed.find_last_not_of('0') + 1);
        if (trimmed.ends_with('.')) {
            trimmed.pop_back();
        }
        return trimmed;
    }
    return std::get<std::string>(field.value);
}

}  // namespace clipfile
