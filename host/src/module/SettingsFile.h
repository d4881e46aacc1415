#pragma once

#include <optional>
#include <string>

namespace receiver {

/// Points the module at a settings store, before it is loaded: the module reads the one that the environment
/// variable QX_SETTINGS names, and there is no start parameter for the length of files. The store of a run
/// that sets it is a private copy (mode 0600, since stores hold passwords) that is gone with this object. It
/// is read by the code that reads it for the module.
class SettingsFile {
 public:
    /// `file` is the operator's store, or the one that is in use anyway when there is none; `minutes` is the
    /// length of files. Throws `ReceiverError` with `kUsage` when the store cannot be read, which the module
    /// would take for one without settings, and with `kInternal` when the copy cannot be written.
    SettingsFile(const std::optional<std::string>& file, std::optional<unsigned int> minutes);
    ~SettingsFile();
    SettingsFile(const SettingsFile&) = delete;
    SettingsFile& operator=(const SettingsFile&) = delete;

 private:
    /// Empty without a copy.
    std::string copy_;
};

}  // namespace receiver
