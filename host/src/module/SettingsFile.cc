#include "module/SettingsFile.h"

#include <stdlib.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>
#include <filesystem>

#include "SettingsStore.h"
#include "common/ReceiverError.h"

namespace receiver {
namespace {

constexpr const char* kVariable = "QX_SETTINGS";
constexpr const char* kSection = "Qx/Other/MP4FileOut";
constexpr const char* kKey = "MP4MaxFileSize";

ReceiverError Unreadable(const std::string& file, const std::string& reason) {
    return {ExitCode::kUsage, "the settings file '" + file + "' cannot be read: " + reason + "."};
}

qx_settings::SettingsStore Load(const std::string& file) {
    qx_settings::SettingsStore store;
    qx_settings::SettingsError error;
    if (!store.Load(file, error)) {
        const std::string place = error.line != 0 ? "line " + std::to_string(error.line) + ": " : "";
        throw Unreadable(file, place + error.reason);
    }
    return store;
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

SettingsFile::SettingsFile(const std::optional<std::string>& file, std::optional<unsigned int> minutes) {
    if (file) {
        // In use anyway it may be missing; one that the operator names may not.
        if (access(file->c_str(), F_OK) != 0) {
            throw Unreadable(*file, std::strerror(errno));
        }
        setenv(kVariable, file->c_str(), 1);
    }
    qx_settings::SettingsStore store = Load(qx_settings::SettingsPath());
    if (!minutes) {
        return;
    }
    store.Set(kSection, kKey, std::to_string(*minutes));
    copy_ = WritePrivately(store.FileText());
    setenv(kVariable, copy_.c_str(), 1);
}

SettingsFile::~SettingsFile() {
    if (!copy_.empty()) {
        unlink(copy_.c_str());
    }
}

}  // namespace receiver
