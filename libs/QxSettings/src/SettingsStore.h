#pragma once

#include <map>
#include <string>
#include <utility>

namespace qx_settings {

/// Why a file gave no keys. Never holds a value of the file.
struct SettingsError {
    /// Line of the fault, from 1; 0 when it is not about one line.
    unsigned long line = 0;
    std::string reason;
};

/// The keys of one settings file. The form of the file is told at `QxRegistry`. Readable from any thread
/// while no thread loads or sets.
class SettingsStore {
 public:
    /// Takes over the keys of the file at `path`. A file that does not exist has none. False, with `error`
    /// filled and no keys, when the file cannot be read or parsed.
    bool Load(const std::string& path, SettingsError& error);

    /// The text under `key` in `section`, null when there is none. Lives as long as the store.
    const std::string* Find(const std::string& section, const std::string& key) const;

    /// Adds a key, or gives it another text. Names and text must be such as a file can hold: without line
    /// breaks and without blanks around them.
    void Set(const std::string& section, const std::string& key, const std::string& text);
    /// A file that has these keys and no others.
    std::string FileText() const;

 private:
    using SectionAndKey = std::pair<std::string, std::string>;
    std::map<SectionAndKey, std::string> values_;
};

/// Reads all of `text` as an unsigned 32-bit decimal. False, with `number` unchanged, when it is none.
bool ParseNumber(const std::string& text, unsigned int& number);

/// Where the settings file of this process is: `QX_SETTINGS` unless unset or empty, else
/// /etc/qx/settings.ini.
std::string SettingsPath();

}  // namespace qx_settings
