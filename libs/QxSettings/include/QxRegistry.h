#pragma once

#include <string>

/// The host system's settings store, read-only to modules. Callable from any thread, also when several
/// threads come first at the same time. A host system may put a library of its own in the place of this one:
/// callers share nothing with it but this header.
///
/// This library reads one INI file, at the first `getValue` of the process: the one that the environment
/// variable `QX_SETTINGS` names, else /etc/qx/settings.ini. What happens to the file later is not seen.
///
///     ; seen by every module
///     [Qx/Other/MP4FileOut]
///     MP4OutputPath = /srv/recordings
///     MP4MaxFileSize = 120
///
/// - A section name is everything between the brackets, slashes included. Names are case-sensitive.
/// - Blanks around names and values are dropped, blanks inside them stay; a line may end in LF or CR LF.
/// - A line that begins with ';' or '#' is a comment. Elsewhere the two are plain characters, and so are
///   quotation marks and backslashes, so that any password can be written down as it is.
/// - Text is taken as UTF-8 and handed on byte by byte; a byte order mark in front of the file is skipped.
/// - `key =` is a key with an empty text.
///
/// When there is no file, there are no keys. When the file cannot be opened or read, is larger than 1 MiB or
/// cannot be parsed (a line that is none of the above, a zero byte, a section or a key of a section met
/// twice), there are no keys either, and one line on the log, at `LOG_PRIORITY_ERROR`, names file, line and
/// reason. No line shows a value.
class QxRegistry {
 public:
    /// The one instance of the process. Never null.
    static QxRegistry* GetInstance();

    QxRegistry(const QxRegistry&) = delete;
    QxRegistry& operator=(const QxRegistry&) = delete;

    /// Copies the text under `key` in `section` to `value`. False, with `value` unchanged, when there is no
    /// such key.
    bool getValue(const std::string& section, const std::string& key, std::string& value);
    /// The same for an unsigned number. A text that is not wholly a decimal number from 0 to 4294967295
    /// (signs, blanks inside, other bases, nothing at all) counts as a missing key. Leading zeros are
    /// allowed.
    bool getValue(const std::string& section, const std::string& key, unsigned int& value);

 private:
    QxRegistry() = default;
};
