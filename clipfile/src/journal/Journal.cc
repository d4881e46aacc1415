#include "journal/Journal.h"

#include <algorithm>
#include <charconv>
#include <filesystem>
#include <nlohmann/json.hpp>
#include <stdexcept>
#include <utility>

namespace clipfile {

namespace {

using Json = nlohmann::ordered_json;

constexpr int kVersion = 1;
/// A set is some dozens of bytes long.
constexpr std::size_t kMaxSetSize = 4096;
/// Of values inside of values.
constexpr int kMaxDepth = 4;

std::string ToHex(const std::vector<unsigned char>& bytes) {
    constexpr std::string_view kDigits = "0123456789abcdef";
    std::string text;
    for (const unsigned char byte : bytes) {
        text += kDigits[byte >> 4U];
        text += kDigits[byte & 0xFU];
    }
    return text;
}

std::optional<std::vector<unsigned char>> FromHex(const std::string& text) {
    if (text.empty() || text.size() % 2 != 0 || text.size() > 2 * kMaxSetSize) {
        return std::nullopt;
    }
    std::vector<unsigned char> bytes(text.size() / 2);
    for (std::size_t i = 0; i < bytes.size(); ++i) {
        const char* const digits = text.data() + 2 * i;
        const auto [end, error] = std::from_chars(digits, digits + 2, bytes[i], 16);
        if (error != std::errc() || end != digits + 2) {
            return std::nullopt;
        }
    }
    return bytes;
}

/// Names of files need not be UTF-8, as JSON is. Such a one is an object with its bytes.
Json NameToJson(const std::string& name) {
    try {
        static_cast<void>(Json(name).dump());
        return name;
    } catch (const Json::type_error&) {
        return {{"hex", ToHex({name.begin(), name.end()})}};
    }
}

std::optional<std::string> NameFromJson(const Json& json) {
    if (json.is_string()) {
        return json.get<std::string>();
    }
    const auto bytes = FromHex(json.at("hex").get_ref<const std::string&>());
    return bytes ? std::optional(std::string(bytes->begin(), bytes->end())) : std::nullopt;
}

bool IsBelow(const std::filesystem::path& path) {
    return path.is_relative() && !path.empty() && path.has_filename() &&
           path.native().find('\0') == std::string::npos &&
           std::none_of(path.begin(), path.end(), [](const auto& part) { return part == ".."; });
}

std::optional<Journal> Read(const Json& json) {
    if (json.at("version") != kVersion) {
        return std::nullopt;
    }
    Journal journal;
    json.at("frames_per_1000_seconds").get_to(journal.frameRate);
    json.at("width").get_to(journal.width);
    json.at("height").get_to(journal.height);
    for (const Json& pair : json.at("parameter_sets")) {
        auto sps = FromHex(pair.at("sps").get_ref<const std::string&>());
        auto pps = FromHex(pair.at("pps").get_ref<const std::string&>());
        if (!sps || !pps || journal.sets.size() == Journal::kMaxSets) {
            return std::nullopt;
        }
        journal.sets.push_back({std::move(*sps), std::move(*pps)});
    }
    for (const Json& file : json.at("files")) {
        auto name = NameFromJson(file);
        if (!name || !IsBelow(*name) || journal.files.size() == Journal::kMaxFiles) {
            return std::nullopt;
        }
        journal.files.push_back(std::move(*name));
    }
    return journal;
}

}  // namespace

std::string ToText(const Journal& journal) {
    Json json = {{"version", kVersion},
                 {"frames_per_1000_seconds", journal.frameRate},
                 {"width", journal.width},
                 {"height", journal.height},
                 {"audio", {{"codec", "AAC LC"}, {"sample_rate", 48000}, {"channels", 2}}},
                 {"parameter_sets", Json::array()},
                 {"files", Json::array()}};
    for (const ParameterSets& sets : journal.sets) {
        json["parameter_sets"].push_back({{"sps", ToHex(sets.sps)}, {"pps", ToHex(sets.pps)}});
    }
    for (const std::string& file : journal.files) {
        json["files"].push_back(NameToJson(file));
    }
    return json.dump(2) + "\n";
}

std::optional<Journal> ParseJournal(std::string_view text) {
    const auto checkDepth = [](int depth, Json::parse_event_t, const Json&) {
        if (depth > kMaxDepth) {
            throw std::length_error("too deep");
        }
        return true;
    };
    try {
        return Read(Json::parse(text, checkDepth));
    } catch (const Json::exception&) {
        return std::nullopt;
    } catch (const std::length_error&) {
        return std::nullopt;
    }
}

}  // namespace clipfile
