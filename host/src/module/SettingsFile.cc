#include "module/SettingsFile.h"

#include <stdlib.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <iterator>

#include "common/ReceiverError.h"

namespace receiver {
namespace {

constexpr const char* kVariable = "QX_SETTINGS";
constexpr const char* kSystemStore = "/etc/qx/settings.ini";
constexpr std::string_view kSection = "[Qx/Other/MP4FileOut]";
constexpr std::string_view kKey = "MP4MaxFileSize";

std::string_view Trimmed(std::string_view text) {
    constexpr std::string_view kBlanks = " \t\r";
    const std::size_t first = text.find_first_not_of(kBlanks);
    if (first == std::string_view::npos) {
        return {};
    }
    return text.substr(first, text.find_last_not_of(kBlanks) - first + 1);
}

std::string ReadAll(const std::string& file) {
    std::error_code error;
    const bool isFile = std::filesystem::is_regular_file(file, error);
    std::ifstream stream(file, std::ios::binary);
    if (!isFile || !stream) {
        throw ReceiverError(ExitCode::kUsage, "the settings file '" + file + "' cannot be read: " +
                                                  (error ? error.message() : "it is no readable file") + ".");
    }
    return {std::istreambuf_iterator<char>(stream), {}};
}

/// Writes a private file of a new name and gives the name.
std::string WritePrivately(const std::string& text) {
    std::string name = (std::filesystem::temp_directory_path() / "receiver-settings-XXXXXX").string();
    const int file = mkstemp(name.data());
    bool written = file >= 0;
    std::size_t done = 0;
    while (written && done < text.size()) {
        const ssize_t count = write(file, text.data() + done, text.size() - done);
        written = count > 0 || (count < 0 && errno == EINTR);
        done += count > 0 ? static_cast<std::size_t>(count) : 0;
    }
    const std::string reason = std::strerror(errno);
    if (file >= 0) {
        close(file);
    }
    if (!written) {
        unlink(name.c_str());
        throw ReceiverError(ExitCode::kInternal, "the settings of this run cannot be written to '" + name +
                                                     "': " + reason + "; TMPDIR names another folder.");
    }
    return name;
}

}  // namespace

std::string WithFileLength(std::string_view store, unsigned int minutes) {
    const std::string setting = std::string(kKey) + " = " + std::to_string(minutes) + "\n";
    std::string result;
    // Stores may begin with a byte order mark.
    constexpr std::string_view kMark = "\xEF\xBB\xBF";
    if (store.starts_with(kMark)) {
        store.remove_prefix(kMark.size());
    }
    bool inSection = false;
    bool set = false;
    while (!store.empty()) {
        const std::size_t end = store.find('\n');
        const std::string_view line = store.substr(0, end);
        store.remove_prefix(end == std::string_view::npos ? store.size() : end + 1);
        const std::string_view content = Trimmed(line);
        if (content.starts_with('[')) {
            inSection = content == kSection;
        }
        if (inSection && Trimmed(content.substr(0, content.find('='))) == kKey) {
            continue;
        }
        result.append(line).push_back('\n');
        if (content == kSection && !set) {
            result += setting;
            set = true;
        }
    }
    if (!set) {
        result.append(kSection).append("\n").append(setting);
    }
    return result;
}

SettingsFile::SettingsFile(const std::optional<std::string>& file, std::optional<unsigned int> minutes) {
    std::string text;
    if (file) {
        text = ReadAll(*file);
        setenv(kVariable, file->c_str(), 1);
    }
    if (!minutes) {
        return;
    }
    if (!file) {
        const char* const set = std::getenv(kVariable);
        const std::string inUse = set != nullptr && *set != '\0' ? set : kSystemStore;
        std::error_code error;
        if (std::filesystem::exists(inUse, error)) {
            text = ReadAll(inUse);
        }
    }
    copy_ = WritePrivately(WithFileLength(text, *minutes));
    setenv(kVariable, copy_.c_str(), 1);
}

SettingsFile::~SettingsFile() {
    if (!copy_.empty()) {
        unlink(copy_.c_str());
    }
}

}  // namespace receiver
