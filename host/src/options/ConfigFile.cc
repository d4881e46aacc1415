#include "options/ConfigFile.h"

#include <toml++/toml.h>

#include <array>
#include <charconv>
#include <optional>

#include "common/ReceiverError.h"

namespace receiver {
namespace {

std::string PlaceIn(const std::string& name, const toml::source_position& position) {
    return name + ":" + std::to_string(position.line) + ":" + std::to_string(position.column) + ": ";
}

ReceiverError WrongAt(const std::string& place, const std::string& sentence) {
    return {ExitCode::kUsage, place + sentence + "."};
}

/// As it would stand on the command line. Nothing for what no option takes: lists, tables, dates.
std::optional<std::string> TextOf(const toml::node& value) {
    if (const auto* const text = value.as_string()) {
        // A command line has no zero byte either.
        return text->get().find('\0') == std::string::npos ? std::optional(text->get()) : std::nullopt;
    }
    if (const auto* const number = value.as_integer()) {
        return std::to_string(number->get());
    }
    if (const auto* const truth = value.as_boolean()) {
        return truth->get() ? "true" : "false";
    }
    if (const auto* const number = value.as_floating_point()) {
        // As short as it can be without another value.
        std::array<char, 32> text{};
        const auto end = std::to_chars(text.data(), text.data() + text.size(), number->get()).ptr;
        return std::string(text.data(), end);
    }
    return std::nullopt;
}

}  // namespace

std::vector<CLI::ConfigItem> ConfigFile::from_config(std::istream& input) const {
    const auto name = app_.get_config_ptr()->as<std::string>();
    toml::table table;
    try {
        table = toml::parse(input, name);
    } catch (const toml::parse_error& error) {
        throw WrongAt(PlaceIn(name, error.source().begin), std::string(error.description()));
    }
    std::vector<CLI::ConfigItem> read;
    for (const auto& [key, value] : table) {
        const std::string place = PlaceIn(name, key.source().begin);
        const std::string option = "--" + std::string(key.str());
        if (key == "password") {
            // Others read configurations, and copy them.
            throw WrongAt(place,
                          "a password has no place in a configuration: name its file with password-file");
        }
        const CLI::Option* const known = app_.get_option_no_throw(option);
        if (known == nullptr || !known->get_configurable()) {
            throw WrongAt(place, "there is no '" + std::string(key.str()) +
                                     "' in a configuration; its names are those of the options");
        }
        const auto text = TextOf(value);
        const bool isFlag = known->get_expected_max() == 0;
        if (!text || isFlag != value.is_boolean()) {
            throw WrongAt(PlaceIn(name, value.source().begin),
                          std::string(key.str()) +
                              (isFlag ? " is true or false" : " is a text or a number, and nothing else"));
        }
        if (known->count() == 0) {
            places_[option] = place;
        }
        CLI::ConfigItem item;
        item.name = key.str();
        item.inputs = {*text};
        read.push_back(item);
    }
    return read;
}

std::string ConfigFile::to_config(const CLI::App* /*app*/, bool /*defaults*/, bool /*description*/,
                                  std::string /*prefix*/) const {
    return {};
}

std::string ConfigFile::PlaceOf(std::string_view sentence) const {
    const std::size_t begin = sentence.find("--");
    if (begin == std::string_view::npos) {
        return {};
    }
    const std::size_t end = sentence.find_first_not_of("abcdefghijklmnopqrstuvwxyz-", begin);
    const auto place = places_.find(sentence.substr(begin, end - begin));
    return place == places_.end() ? std::string() : place->second;
}

}  // namespace receiver
