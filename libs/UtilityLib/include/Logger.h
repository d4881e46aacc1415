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
///
/// Two environment variables, read once, by the first call, set it up:
/// - `QX_LOG` names the file that lines are appended to. It is created with mode 0600 whatever the umask
///   allows, since lines can carry credentials; the mode of a file that exists is left as it is. Unset or
///   empty, the log is standard error. A file that cannot be opened is replaced by standard error, whose
///   first line then says so.
/// - `QX_LOG_PRIORITY` is the highest priority written, a decimal from 0 to 13. Unset or empty it is 6. Any
///   other text gives 6 as well, and one line of the log says so.
///
/// A line is written as local time with microseconds and zone, thread, priority, file and line, function,
/// text; file with line, and function, are left out where they are null. Control characters other than tab
/// appear as \xHH, so that one call is always one line.
///
/// Lines are queued and written by one thread of the log, so no caller waits for a disk. The queue holds 8192
/// lines. When the disk falls behind by more, the oldest waiting lines give way, and a line of the log says
/// how many were lost as soon as it moves again. Lines that the disk refused are counted and reported in the
/// same way. The lines of one thread stay in their order.
///
/// Everything queued is written before the library is unloaded and before the process ends by `exit` or by
/// returning from `main`. A line that comes later still, out of a destructor of another library, is written
/// at once by its caller. A process that ends by a signal or `_exit` loses what is queued. `fork` waits until
/// the queue is written; parent and child then both append to the log.
class [[gnu::visibility("default")]] Logger {
 public:
    /// Writes one line, formatted as by printf, when `priority` is not above the threshold; otherwise the
    /// call costs one relaxed load and a compare. `file` and `function` may be null, with `line` 0, for lines
    /// that name no place. No argument is kept after the call. Callable from any thread. Leaves `errno`
    /// alone. Nothing is reported to the caller: a line that finds no memory is lost.
    [[gnu::format(printf, 5, 6)]] static void Put(_LogPriority priority, const char* file,
                                                  const char* function, int line, const char* format, ...);
};
