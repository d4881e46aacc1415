#pragma once

#include <string>

/// The host system's settings store, read-only to modules. Callable from any thread.
class QxRegistry {
 public:
    /// The one instance of the process. Never null.
    static QxRegistry* GetInstance();

    /// Reads the text under `key` in `section`. False, with `value` unchanged, when there is no such key.
    bool getValue(const std::string& section, const std::string& key, std::string& value);
    /// The same for an unsigned number; a text that is no unsigned 32-bit decimal counts as a missing key.
    bool getValue(const std::string& section, const std::string& key, unsigned int& value);

 private:
    QxRegistry() = default;
};
