#include "SettingsStore.h"

#include <algorithm>
#include <array>
#include <boost/property_tree/ini_parser.hpp>
#include <boost/property_tree/ptree.hpp>
#include <cerrno>
#include <charconv>
#include <cstdio>
#include <cstdlib>
#include <locale>
#include <memory>
#include <sstream>
#include <string_view>
#include <system_error>

namespace qx_settings {
namespace {

constexpr std::size_t kMaxFileSize = 1 << 20;
constexpr std::string_view kByteOrderMark = "\xEF\xBB\xBF";

std::string reasonOf(int error) {
    return std::generic_category().message(error);
}

/// Reads the whole file into `text`, which stays empty when there is no such file.
bool readFile(const std::string& path, std::string& text, SettingsError& error) {
    const std::unique_ptr<std::FILE, int (*)(std::FILE*)> file(std::fopen(path.c_str(), "rbe"), &std::fclose);
    if (!file) {
        const int reason = errno;
        if (reason == ENOENT || reason == ENOTDIR) {
            return true;
        }
        error.reason = reasonOf(reason);
        return false;
    }
    std::array<char, 4096> block;
    while (const std::size_t got = std::fread(block.data(), 1, block.size(), file.get())) {
        text.append(block.data(), got);
        if (text.size() > kMaxFileSize) {
            error.reason = "larger than " + std::to_string(kMaxFileSize) + " bytes";
            return false;
        }
    }
    if (std::ferror(file.get()) != 0) {
        error.reason = reasonOf(errno);
        return false;
    }
    return true;
}

}  // namespace

bool SettingsStore::Load(const std::string& path, SettingsError& error) {
    values_.clear();
    std::string text;
    if (!readFile(path, text, error)) {
        return false;
    }
    if (text.starts_with(kByteOrderMark)) {
        text.erase(0, kByteOrderMark.size());
    }
    // Text in UTF-16 would otherwise pass as keys that nobody asks for.
    const auto zero = std::find(text.begin(), text.end(), '\0');
    if (zero != text.end()) {
        error.line = 1 + static_cast<unsigned long>(std::count(text.begin(), zero, '\n'));
        error.reason = "zero byte in text, which has to be UTF-8";
        return false;
    }

    boost::property_tree::ptree sections;
    std::istringstream stream(text);
    // What counts as a blank must not depend on the locale of the host.
    stream.imbue(std::locale::classic());
    try {
        boost::property_tree::ini_parser::read_ini(stream, sections);
    } catch (const boost::property_tree::ini_parser_error& fault) {
        error.line = fault.line();
        error.reason = fault.message();
        return false;
    }
    // Walked, never looked up by path: section names hold '/' and keys may hold '.'.
    for (const auto& [section, keys] : sections) {
        for (const auto& [key, value] : keys) {
            values_.emplace(SectionAndKey(section, key), value.data());
        }
    }
    return true;
}

const std::string* SettingsStore::Find(const std::string& section, const std::string& key) const {
    const auto found = values_.find(SectionAndKey(section, key));
    return found == values_.end() ? nullptr : &found->second;
}

void SettingsStore::Set(const std::string& section, const std::string& key, const std::string& text) {
    values_[SectionAndKey(section, key)] = text;
}

std::string SettingsStore::FileText() const {
    std::string text;
    const std::string* open = nullptr;
    for (const auto& [name, value] : values_) {
        const auto& [section, key] = name;
        if (open == nullptr || *open != section) {
            text.append("[").append(section).append("]\n");
            open = &section;
        }
        text.append(key).append(" = ").append(value).append("\n");
    }
    return text;
}

bool ParseNumber(const std::string& text, unsigned int& number) {
    static_assert(sizeof(number) == 4);
    unsigned int parsed = 0;
    const char* const end = text.data() + text.size();
    const auto [stop, fault] = std::from_chars(text.data(), end, parsed);
    if (fault != std::errc() || stop != end) {
        return false;
    }
    number = parsed;
    return true;
}

std::string SettingsPath() {
    const char* const path = std::getenv("QX_SETTINGS");
    return path != nullptr && *path != '\0' ? path : "/etc/qx/settings.ini";
}

}  // namespace qx_settings
