#include "Logger.h"

#include <pthread.h>

#include <algorithm>
#include <atomic>
#include <cerrno>
#include <charconv>
#include <climits>
#include <cstdarg>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <memory>
#include <mutex>
#include <new>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "LogSink.h"
#include "LogWriter.h"

namespace {

constexpr int kDefaultPriority = LOG_PRIORITY_NOTICE;
constexpr int kHighestPriority = LOG_PRIORITY_SAMPLE;

struct RegisteredSink {
    std::shared_ptr<LogSinkInterface> sink;
    int highest;
};

/// The highest priority that anyone wants. Until the environment was read every line has to ask.
constinit std::atomic<int> threshold{INT_MAX};

/// Everything below is guarded by it. Nothing here has a destructor: destructors of other libraries may log
/// after those of this one have run.
constinit std::mutex mutex;
constinit bool configured = false;
constinit bool closed = false;
constinit int logPriority = kDefaultPriority;
constinit LogWriter* writer = nullptr;
constinit std::vector<RegisteredSink>* sinks = nullptr;
constinit bool handlesFork = false;

std::string LogPath() {
    const char* path = std::getenv("QX_LOG");
    return path != nullptr ? path : "";
}

void UpdateThreshold() {
    int highest = logPriority;
    if (sinks != nullptr) {
        for (const RegisteredSink& entry : *sinks) {
            highest = std::max(highest, entry.highest);
        }
    }
    threshold.store(highest, std::memory_order_relaxed);
}

/// Ends the log's thread around every fork, of which a child would inherit the locks but not the thread. Both
/// sides start a new one with their next line.
void HandleFork() {
    if (std::exchange(handlesFork, true)) {
        return;
    }
    pthread_atfork(
        [] {
            mutex.lock();
            delete std::exchange(writer, nullptr);
        },
        [] { mutex.unlock(); }, [] { mutex.unlock(); });
}

void WriteToLog(std::string_view line) {
    try {
        if (!closed && writer == nullptr) {
            HandleFork();
            writer = new LogWriter(LogPath());
        }
        if (writer != nullptr) {
            writer->Write(line);
            return;
        }
    } catch (...) {
        // No thread or no memory: the caller writes the line itself, once more for the next line.
    }
    try {
        LogWriter::WriteDirectly(LogPath(), line);
    } catch (...) {
        // Without memory for the line it is lost; there is nobody to tell.
    }
}

void Configure() {
    if (std::exchange(configured, true)) {
        return;
    }
    const char* text = std::getenv("QX_LOG_PRIORITY");
    if (text != nullptr && *text != '\0') {
        const char* end = text + std::strlen(text);
        unsigned int value = 0;
        const auto [stop, error] = std::from_chars(text, end, value);
        if (error == std::errc() && stop == end && value <= kHighestPriority) {
            logPriority = static_cast<int>(value);
        } else {
            WriteToLog("5 QX_LOG_PRIORITY is no number from 0 to 13; 6 is taken.");
        }
    }
    UpdateThreshold();
}

std::string Format(const char* format, std::va_list arguments) {
    std::va_list again;
    va_copy(again, arguments);
    char buffer[512];
    const int length = std::vsnprintf(buffer, sizeof buffer, format, arguments);
    std::string text;
    if (length < 0) {
        text = format;  // an argument that cannot be converted: the format still tells where to look
    } else if (static_cast<std::size_t>(length) < sizeof buffer) {
        text.assign(buffer, static_cast<std::size_t>(length));
    } else {
        text.resize(static_cast<std::size_t>(length));
        std::vsnprintf(text.data(), text.size() + 1, format, again);
    }
    va_end(again);
    return text;
}

std::string Compose(const LogLine& line) {
    std::string composed = std::to_string(static_cast<int>(line.priority));
    composed += ' ';
    if (line.file != nullptr) {
        composed.append(line.file).append(":").append(std::to_string(line.line)).append(" ");
    }
    if (line.function != nullptr) {
        composed.append(line.function).append(": ");
    }
    for (const char c : line.text) {
        const auto byte = static_cast<unsigned char>(c);
        if ((byte < 0x20 && c != '\t') || byte == 0x7F) {
            constexpr char kDigits[] = "0123456789abcdef";
            composed.append("\\x").append({kDigits[byte >> 4], kDigits[byte & 15]});
        } else {
            composed += c;
        }
    }
    return composed;
}

/// True when someone wants the line; reads the environment first where nobody has.
bool IsWanted(int priority) {
    if (threshold.load(std::memory_order_relaxed) == INT_MAX) {
        const std::lock_guard lock(mutex);
        Configure();
    }
    return priority <= threshold.load(std::memory_order_relaxed);
}

void Deliver(const LogLine& line) {
    const std::string composed = Compose(line);
    std::vector<std::shared_ptr<LogSinkInterface>> receivers;
    {
        // Queueing is brief; one lock for all lines keeps them in one order and makes closing simple.
        const std::lock_guard lock(mutex);
        if (line.priority <= logPriority) {
            WriteToLog(composed);
        }
        if (sinks != nullptr) {
            for (const RegisteredSink& entry : *sinks) {
                if (line.priority <= entry.highest) {
                    receivers.push_back(entry.sink);
                }
            }
        }
    }
    for (const auto& receiver : receivers) {
        receiver->OnLine(line);
    }
}

/// Writes all that is queued when the library is unloaded or the process ends. Built as the library loads and
/// therefore destroyed after the static objects of all that are linked with it.
struct Closer {
    Closer() = default;
    Closer(const Closer&) = delete;
    Closer& operator=(const Closer&) = delete;
    ~Closer() {
        const std::lock_guard lock(mutex);
        closed = true;
        delete std::exchange(writer, nullptr);
    }
} closer;

}  // namespace

void Logger::Put(_LogPriority priority, const char* file, const char* function, int line, const char* format,
                 ...) {
    if (static_cast<int>(priority) > threshold.load(std::memory_order_relaxed)) [[likely]] {
        return;
    }
    const int savedErrno = errno;
    if (IsWanted(priority)) {
        std::va_list arguments;
        va_start(arguments, format);
        try {
            Deliver({priority, file, function, line, Format(format, arguments)});
        } catch (const std::bad_alloc&) {
            // Lost, as the header says: logging never fails its caller.
        }
        va_end(arguments);
    }
    errno = savedErrno;
}

void LogSinks::Add(std::shared_ptr<LogSinkInterface> sink, _LogPriority highest) {
    const std::lock_guard lock(mutex);
    Configure();
    if (sinks == nullptr) {
        sinks = new std::vector<RegisteredSink>;
    }
    sinks->push_back({std::move(sink), highest});
    UpdateThreshold();
}

void LogSinks::Remove(const LogSinkInterface* sink) {
    std::shared_ptr<LogSinkInterface> last;  // released outside the lock: its destructor may log
    const std::lock_guard lock(mutex);
    if (sinks == nullptr) {
        return;
    }
    for (auto entry = sinks->begin(); entry != sinks->end(); ++entry) {
        if (entry->sink.get() == sink) {
            last = std::move(entry->sink);
            sinks->erase(entry);
            break;
        }
    }
    if (sinks->empty()) {
        delete std::exchange(sinks, nullptr);
    }
    UpdateThreshold();
}
