#pragma once

#include <cstddef>
#include <memory>
#include <string>
#include <string_view>

namespace spdlog {
class async_logger;
namespace details {
class thread_pool;
}
}  // namespace spdlog

/// The open file, or standard error, behind the log. Serves one thread at a time.
class LogFile {
 public:
    /// Opens `path` for appending, created with mode 0600; an empty path means standard error. When it cannot
    /// be opened, standard error takes its place and `Error` tells why.
    explicit LogFile(const std::string& path);
    LogFile(const LogFile&) = delete;
    LogFile& operator=(const LogFile&) = delete;
    ~LogFile();

    /// The reason why the path could not be opened; 0 when it was.
    int Error() const { return error_; }
    bool IsStandardError() const { return owned_ < 0; }
    /// Writes all bytes, waiting as long as that takes. False, with `errno` set, when they were refused; a
    /// line torn by that is closed before the next one.
    bool Write(std::string_view bytes);

 private:
    bool WriteAll(std::string_view bytes, bool& any);

    int owned_ = -1;
    int error_ = 0;
    bool torn_ = false;
};

/// Writes lines to a log file on a thread of its own, in order.
class LogWriter {
 public:
    /// Lines that may wait.
    static constexpr std::size_t kQueueLines = 8192;

    /// Opens the file and starts the thread. Throws when there is no memory or no thread.
    explicit LogWriter(const std::string& path);
    LogWriter(const LogWriter&) = delete;
    LogWriter& operator=(const LogWriter&) = delete;
    /// Writes what is queued, then ends the thread. No `Write` may run or follow.
    ~LogWriter();

    /// Queues one line, stamped with the time and the calling thread, and returns at once. When the queue is
    /// full the oldest line gives way. Callable from any thread.
    void Write(std::string_view line);

    /// Writes one line in the same form, on the calling thread, opening and closing the file: for a time when
    /// no thread can serve.
    static void WriteDirectly(const std::string& path, std::string_view line);

 private:
    class Sink;

    std::shared_ptr<Sink> sink_;
    std::shared_ptr<spdlog::details::thread_pool> pool_;
    std::shared_ptr<spdlog::async_logger> logger_;
};
