#pragma once

/// Priority of a log line: the higher the number, the finer the line.
enum _LogPriority {
    LOG_PRIORITY_OPERATOR = 3,
    LOG_PRIORITY_ERROR = 4,
    LOG_PRIORITY_WARNING = 5,
    LOG_PRIORITY_NOTICE = 6,
    LOG_PRIORITY_TRACE = 11,
    LOG_PRIORITY_DETAIL = 12,
    LOG_PRIORITY_SAMPLE = 13,
};

/// The host system's log.
class Logger {
 public:
    /// Writes one line, formatted as by printf, when `priority` is not above the threshold. `file` and
    /// `function` may be null and `line` 0 for lines that name no place. Callable from any thread; never
    /// waits for a disk.
    [[gnu::format(printf, 5, 6)]] static void Put(_LogPriority priority, const char* file,
                                                  const char* function, int line, const char* format, ...);
};
