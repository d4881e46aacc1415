#pragma once

#include <memory>
#include <string_view>

#include "Logger.h"

/// One line as a caller of `Logger::Put` gave it. Valid only during the call that delivers it.
struct LogLine {
    _LogPriority priority;
    /// Null where the caller passed null.
    const char* file;
    const char* function;
    int line;
    /// The formatted text, before control characters are replaced.
    std::string_view text;
};

/// Receives log lines beside the log itself, for tests.
class [[gnu::visibility("default")]] LogSinkInterface {
 public:
    virtual ~LogSinkInterface() = default;
    /// Called on the logging thread, inside `Logger::Put`, under no lock of the log: several threads may call
    /// at the same time, and a sink that blocks holds up its own caller alone.
    virtual void OnLine(const LogLine& line) = 0;
};

/// The registered sinks.
class [[gnu::visibility("default")]] LogSinks {
 public:
    /// From now on `sink` gets every line whose priority is not above `highest`, whatever the threshold of
    /// the log is. Callable from any thread.
    static void Add(std::shared_ptr<LogSinkInterface> sink, _LogPriority highest);
    /// Ends that. Calls that have begun may still run in the sink, which lives until they have ended. An
    /// unknown sink is ignored.
    static void Remove(const LogSinkInterface* sink);
};
