#pragma once

#include <exception>

#include "common/Log.h"

namespace clipfileModule {

/// One run of a function as the log shows it: "start." on entry, and "end." on exit, with the result where
/// the function has one. A function that is left by an exception has no last line. Made by
/// `CLIPFILE_LOG_SCOPE`.
class LogScope {
 public:
    /// Opens a run whose first line has been logged. `file` and `function` must outlive it.
    LogScope(_LogPriority priority, const char* file, const char* function, int line)
        : priority_(priority), file_(file), function_(function), line_(line) {}
    LogScope(const LogScope&) = delete;
    LogScope& operator=(const LogScope&) = delete;
    ~LogScope() {
        if (std::uncaught_exceptions() == exceptions_) {
            End();
        }
    }

    const char* Function() const { return function_; }

    /// Notes the result for the last line, "end. name = 1.", and passes it on. `name` must outlive the run.
    template <typename Result>
    Result Return(const char* name, Result result) {
        resultName_ = name;
        result_ = static_cast<int>(result);
        return result;
    }

    /// Logs the last line here, for what comes behind it while the function is left: the delivery of statuses
    /// that were held back, for one.
    void End() {
        if (!open_) {
            return;
        }
        open_ = false;
        if (resultName_ == nullptr) {
            Logger::Put(priority_, file_, function_, line_, "end.");
        } else {
            Logger::Put(priority_, file_, function_, line_, "end. %s = %d.", resultName_, result_);
        }
    }
    /// Ends the run with a line of its own, `text`.
    void EndAs(_LogPriority priority, const char* text) {
        open_ = false;
        Logger::Put(priority, file_, function_, line_, "%s", text);
    }
    /// Ends the run without a line.
    void Dismiss() { open_ = false; }

 private:
    const _LogPriority priority_;
    const char* const file_;
    const char* const function_;
    const int line_;
    const int exceptions_ = std::uncaught_exceptions();
    const char* resultName_ = nullptr;
    int result_ = 0;
    bool open_ = true;
};

}  // namespace clipfileModule

/// Logs "start." and defines `scope`, which logs "end." when the function is left. What is given behind the
/// priority goes on the first line: CLIPFILE_LOG_SCOPE(scope, LOG_PRIORITY_TRACE, " event_id = %d.", id).
#define CLIPFILE_LOG_SCOPE(scope, priority, ...)                                                           \
    static constexpr auto kScopeFunction = ::clipfileModule::NameFunction(__PRETTY_FUNCTION__, kLogClass); \
    ::Logger::Put(priority, __FILE__, kScopeFunction.text, __LINE__, "start." __VA_ARGS__);                \
    ::clipfileModule::LogScope scope(priority, __FILE__, kScopeFunction.text, __LINE__)
