#include "LogWriter.h"

#include <fcntl.h>
#include <poll.h>
#include <pthread.h>
#include <spdlog/async_logger.h>
#include <spdlog/details/thread_pool.h>
#include <spdlog/pattern_formatter.h>
#include <spdlog/sinks/sink.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <csignal>
#include <cstring>
#include <utility>

namespace {

/// Bytes gathered before they are written although more lines wait.
constexpr std::size_t kBatchBytes = 65536;

std::unique_ptr<spdlog::formatter> MakeFormatter() {
    return std::make_unique<spdlog::pattern_formatter>("%Y-%m-%d %H:%M:%S.%f %z [%t] %v");
}

spdlog::details::log_msg MakeMessage(std::string_view text) {
    // The priority stands in the text: the log has its own scale and its own threshold.
    return {spdlog::string_view_t(), spdlog::level::info, spdlog::string_view_t(text.data(), text.size())};
}

/// Keeps signals from the calling thread, and from threads that it starts, while it lives.
class SignalBlock {
 public:
    explicit SignalBlock(const sigset_t& signals) { pthread_sigmask(SIG_BLOCK, &signals, &before_); }
    SignalBlock(const SignalBlock&) = delete;
    SignalBlock& operator=(const SignalBlock&) = delete;
    ~SignalBlock() { pthread_sigmask(SIG_SETMASK, &before_, nullptr); }

 private:
    sigset_t before_;
};

std::string OpenErrorText(const std::string& path, int error) {
    return "5 The log \"" + path + "\" cannot be opened (" + std::strerror(error) +
           "), standard error takes its place.";
}

}  // namespace

LogFile::LogFile(const std::string& path) {
    if (path.empty()) {
        return;
    }
    // O_NONBLOCK: a pipe that nobody reads is an error here, not an endless wait.
    owned_ = ::open(path.c_str(), O_WRONLY | O_APPEND | O_CREAT | O_CLOEXEC | O_NOCTTY | O_NONBLOCK, 0600);
    if (owned_ < 0) {
        error_ = errno;
    }
}

LogFile::~LogFile() {
    if (owned_ >= 0) {
        ::close(owned_);
    }
}

bool LogFile::Write(std::string_view bytes) {
    bool any = false;
    if (torn_) {
        if (!WriteAll("\n", any)) {
            return false;
        }
        torn_ = false;
        any = false;
    }
    if (WriteAll(bytes, any)) {
        return true;
    }
    torn_ = any;
    return false;
}

bool LogFile::WriteAll(std::string_view bytes, bool& any) {
    const int descriptor = IsStandardError() ? STDERR_FILENO : owned_;
    while (!bytes.empty()) {
        const ssize_t written = ::write(descriptor, bytes.data(), bytes.size());
        if (written >= 0) {
            any = any || written > 0;
            bytes.remove_prefix(static_cast<std::size_t>(written));
        } else if (errno == EAGAIN) {
            pollfd ready{descriptor, POLLOUT, 0};
            ::poll(&ready, 1, -1);
        } else if (errno != EINTR) {
            return false;
        }
    }
    return true;
}

/// What the log's thread does with each line. Everything in it belongs to that thread, and before the thread
/// starts and after it has ended to the owner.
class LogWriter::Sink : public spdlog::sinks::sink {
 public:
    explicit Sink(const std::string& path) : file_(path), formatter_(MakeFormatter()) {
        if (file_.Error() != 0) {
            Append(OpenErrorText(path, file_.Error()));
        }
    }

    void SetPool(spdlog::details::thread_pool* pool) { pool_ = pool; }

    void log(const spdlog::details::log_msg& message) override {
        const std::size_t overruns = pool_->overrun_counter();
        lost_ += overruns - overrunsSeen_;
        overrunsSeen_ = overruns;
        AnnounceLoss();
        formatter_->format(message, batch_);
        ++batchLines_;
        // A line behind this one will see to the batch.
        if (batch_.size() >= kBatchBytes || pool_->queue_size() == 0) {
            flush();
        }
    }

    void flush() override {
        if (file_.Write({batch_.data(), batch_.size()})) {
            refused_ = false;
        } else {
            ComplainOnce(errno);
            lost_ += batchLines_ + announced_;
        }
        batch_.clear();
        batchLines_ = 0;
        announced_ = 0;
    }

    void Finish() {
        AnnounceLoss();
        flush();
    }

    void set_pattern(const std::string&) override {}
    void set_formatter(std::unique_ptr<spdlog::formatter> formatter) override {
        formatter_ = std::move(formatter);
    }

 private:
    void Append(std::string_view text) { formatter_->format(MakeMessage(text), batch_); }

    void AnnounceLoss() {
        if (lost_ > 0) {
            Append("5 " + std::to_string(lost_) + " log lines were lost here.");
            announced_ += lost_;
            lost_ = 0;
        }
    }

    void ComplainOnce(int error) {
        if (!refused_ && !file_.IsStandardError()) {
            spdlog::memory_buf_t line;
            formatter_->format(
                MakeMessage(std::string("5 The log cannot be written (") + std::strerror(error) + ")."),
                line);
            LogFile("").Write({line.data(), line.size()});
        }
        refused_ = true;
    }

    LogFile file_;
    std::unique_ptr<spdlog::formatter> formatter_;
    spdlog::details::thread_pool* pool_ = nullptr;
    spdlog::memory_buf_t batch_;
    std::size_t batchLines_ = 0;
    /// Lost lines not yet announced, and those that a line of this batch announces.
    std::size_t lost_ = 0;
    std::size_t announced_ = 0;
    std::size_t overrunsSeen_ = 0;
    bool refused_ = false;
};

LogWriter::LogWriter(const std::string& path) : sink_(std::make_shared<Sink>(path)) {
    // The log's thread takes no signal: those of the process belong to the host's threads, and a pipe that
    // its reader left is an error of write and not the end of the process.
    sigset_t all;
    sigfillset(&all);
    const SignalBlock block(all);
    pool_ = std::make_shared<spdlog::details::thread_pool>(
        kQueueLines, 1, [] { pthread_setname_np(pthread_self(), "qx-log"); },
        [sink = sink_.get()] { sink->Finish(); });
    sink_->SetPool(pool_.get());
    logger_ = std::make_shared<spdlog::async_logger>("", sink_, pool_,
                                                     spdlog::async_overflow_policy::overrun_oldest);
}

LogWriter::~LogWriter() {
    // The pool's destructor queues its end behind all lines and joins the thread.
    pool_.reset();
}

void LogWriter::Write(std::string_view line) {
    logger_->log(spdlog::level::info, spdlog::string_view_t(line.data(), line.size()));
}

void LogWriter::WriteDirectly(const std::string& path, std::string_view line) {
    LogFile file(path);
    spdlog::memory_buf_t bytes;
    const auto formatter = MakeFormatter();
    if (file.Error() != 0) {
        formatter->format(MakeMessage(OpenErrorText(path, file.Error())), bytes);
    }
    formatter->format(MakeMessage(line), bytes);
    sigset_t pipe;
    sigemptyset(&pipe);
    sigaddset(&pipe, SIGPIPE);
    const SignalBlock block(pipe);
    if (!file.Write({bytes.data(), bytes.size()}) && errno == EPIPE) {
        // The pipe's reader has left: the signal that this raised is taken back, the caller is not to end by
        // it.
        const timespec now{};
        sigtimedwait(&pipe, nullptr, &now);
    }
}
