#pragma once

#include <algorithm>
#include <chrono>
#include <condition_variable>
#include <cstddef>
#include <functional>
#include <memory>
#include <mutex>
#include <optional>
#include <ostream>
#include <string>
#include <string_view>
#include <thread>
#include <utility>
#include <vector>

#include "LogSink.h"

/// A log line as a test sees it.
struct CapturedLine {
    _LogPriority priority;
    /// Empty where the caller passed null, which is not the same as "".
    std::optional<std::string> file;
    std::optional<std::string> function;
    int line;
    std::string text;
    std::thread::id thread;
};

inline std::ostream& operator<<(std::ostream& out, const CapturedLine& line) {
    return out << static_cast<int>(line.priority) << " " << line.file.value_or("null") << ":" << line.line
               << " " << line.function.value_or("null") << ": " << line.text;
}

/// Captures every log line of the process from construction to destruction. All operations may be called from
/// any thread. Texts are compared whole.
///
/// Lines can also be used to force a schedule: `BlockAt` holds the thread that logs a given line inside its
/// `Logger::Put`, and `OnLine` runs code there.
class LogCapture {
    struct GateState {
        std::function<bool(const CapturedLine&)> matches;
        bool reached = false;
        bool released = false;
    };
    class Sink;

 public:
    /// No wait of a healthy test comes near this, also on a loaded machine and under a sanitizer.
    static constexpr std::chrono::seconds kDeadline{30};

    /// Holds the first thread that logs a matching line, until `Release` or destruction. The line itself is
    /// already captured while its thread is held.
    class [[nodiscard]] Gate {
     public:
        Gate(std::shared_ptr<Sink> sink, std::shared_ptr<GateState> state)
            : sink_(std::move(sink)), state_(std::move(state)) {}
        Gate(Gate&&) = default;
        Gate& operator=(Gate&&) = delete;
        ~Gate() { Release(); }

        /// True once a thread is held, or was; false when none came before the deadline.
        [[nodiscard]] bool WaitReached(std::chrono::milliseconds deadline = kDeadline) const {
            std::unique_lock lock(sink_->mutex);
            return sink_->changed.wait_for(lock, deadline, [this] { return state_->reached; });
        }
        /// Lets the thread go on; a gate that was not reached yet holds nobody any more.
        void Release() {
            if (!state_) {
                return;
            }
            const std::lock_guard lock(sink_->mutex);
            state_->released = true;
            sink_->changed.notify_all();
        }

     private:
        std::shared_ptr<Sink> sink_;
        std::shared_ptr<GateState> state_;
    };

    explicit LogCapture(_LogPriority highest = LOG_PRIORITY_SAMPLE) : sink_(std::make_shared<Sink>()) {
        LogSinks::Add(sink_, highest);
    }
    LogCapture(const LogCapture&) = delete;
    LogCapture& operator=(const LogCapture&) = delete;
    ~LogCapture() {
        LogSinks::Remove(sink_.get());
        const std::lock_guard lock(sink_->mutex);
        for (const auto& gate : sink_->gates) {
            gate->released = true;
        }
        sink_->changed.notify_all();
    }

    std::vector<CapturedLine> Lines() const {
        const std::lock_guard lock(sink_->mutex);
        return sink_->lines;
    }
    /// The texts of all lines up to the priority, in order.
    std::vector<std::string> Texts(_LogPriority highest = LOG_PRIORITY_SAMPLE) const {
        std::vector<std::string> texts;
        for (auto& line : Lines()) {
            if (line.priority <= highest) {
                texts.push_back(std::move(line.text));
            }
        }
        return texts;
    }
    /// Forgets the lines captured so far.
    void Clear() {
        const std::lock_guard lock(sink_->mutex);
        sink_->lines.clear();
    }

    /// Waits until `predicate`, called with all lines under the lock of the capture, is true. False when that
    /// did not happen before the deadline.
    template <typename Predicate>
    [[nodiscard]] bool WaitFor(Predicate predicate, std::chrono::milliseconds deadline = kDeadline) const {
        std::unique_lock lock(sink_->mutex);
        return sink_->changed.wait_for(lock, deadline,
                                       [&] { return predicate(std::as_const(sink_->lines)); });
    }
    /// Waits until `text` was logged `count` times.
    [[nodiscard]] bool WaitForText(std::string_view text, std::size_t count = 1,
                                   std::chrono::milliseconds deadline = kDeadline) const {
        return WaitFor([&](const auto& lines) { return CountIn(lines, HasText(text)) >= count; }, deadline);
    }

    std::size_t Count(std::string_view text) const { return CountIn(Lines(), HasText(text)); }
    /// Lines with this priority, function and text; a null function means one that was passed as null.
    std::size_t Count(_LogPriority priority, const char* function, std::string_view text) const {
        return CountIn(Lines(), [&](const CapturedLine& line) {
            return line.priority == priority && line.text == text &&
                   (function == nullptr ? !line.function : line.function == function);
        });
    }
    std::size_t CountIf(const std::function<bool(const CapturedLine&)>& matches) const {
        return CountIn(Lines(), matches);
    }
    bool Contains(std::string_view text) const { return Count(text) > 0; }
    bool Contains(_LogPriority priority, const char* function, std::string_view text) const {
        return Count(priority, function, text) > 0;
    }
    /// The first line with this text.
    std::optional<CapturedLine> Find(std::string_view text) const { return FindIf(HasText(text)); }
    std::optional<CapturedLine> FindIf(const std::function<bool(const CapturedLine&)>& matches) const {
        const auto lines = Lines();
        const auto found = std::find_if(lines.begin(), lines.end(), matches);
        return found == lines.end() ? std::nullopt : std::optional(*found);
    }

    Gate BlockAt(std::function<bool(const CapturedLine&)> matches) {
        auto state = std::make_shared<GateState>();
        state->matches = std::move(matches);
        const std::lock_guard lock(sink_->mutex);
        sink_->gates.push_back(state);
        return Gate(sink_, std::move(state));
    }
    Gate BlockAtText(std::string text) {
        return BlockAt([text = std::move(text)](const CapturedLine& line) { return line.text == text; });
    }
    /// Runs `hook` on the logging thread after each line, under no lock. It replaces the one before it.
    void OnLine(std::function<void(const CapturedLine&)> hook) {
        const std::lock_guard lock(sink_->mutex);
        sink_->hook = std::move(hook);
    }

 private:
    static std::function<bool(const CapturedLine&)> HasText(std::string_view text) {
        return [text](const CapturedLine& line) { return line.text == text; };
    }
    static std::size_t CountIn(const std::vector<CapturedLine>& lines,
                               const std::function<bool(const CapturedLine&)>& matches) {
        return static_cast<std::size_t>(std::count_if(lines.begin(), lines.end(), matches));
    }

    class Sink : public LogSinkInterface {
     public:
        void OnLine(const LogLine& line) override {
            const auto text = [](const char* from) {
                return from != nullptr ? std::optional<std::string>(from) : std::nullopt;
            };
            const CapturedLine captured{line.priority, text(line.file),        text(line.function),
                                        line.line,     std::string(line.text), std::this_thread::get_id()};
            std::unique_lock lock(mutex);
            lines.push_back(captured);
            changed.notify_all();
            for (const auto& entry : gates) {
                const auto gate = entry;  // the list may grow during the wait
                if (!gate->reached && !gate->released && gate->matches(captured)) {
                    gate->reached = true;
                    changed.notify_all();
                    changed.wait(lock, [&] { return gate->released; });
                    break;
                }
            }
            const auto run = hook;
            lock.unlock();
            if (run) {
                run(captured);
            }
        }

        std::mutex mutex;
        std::condition_variable changed;
        // Guarded by mutex:
        std::vector<CapturedLine> lines;
        std::vector<std::shared_ptr<GateState>> gates;
        std::function<void(const CapturedLine&)> hook;
    };

    const std::shared_ptr<Sink> sink_;
};
