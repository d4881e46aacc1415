#pragma once

#include <optional>
#include <string>
#include <string_view>

namespace receiver {

/// The text of a settings store with the file length of the recorder set to `minutes`, whatever it was; all
/// else stays as it is.
std::string WithFileLength(std::string_view store, unsigned int minutes);

/// Points the module at a settings store, before it is loaded: the module reads the one that the environment
/// variable QX_SETTINGS names, and there is no start parameter for the length of files. The store of a run
/// that sets it is a private copy (mode 0600, since stores hold passwords) that is gone with this object.
class SettingsFile {
 public:
    /// `file` is the operator's store, or the one that is in use anyway when there is none. Throws
    /// `ReceiverError` with `kUsage` when `file` cannot be read, and with `kInternal` when the copy cannot be
    /// written.
    SettingsFile(const std::optional<std::string>& file, std::optional<unsigned int> minutes);
    ~SettingsFile();
    SettingsFile(const SettingsFile&) = delete;
    SettingsFile& operator=(const SettingsFile&) = delete;

 private:
    /// Empty without a copy.
    std::string copy_;
};

}  // namespace receiver
