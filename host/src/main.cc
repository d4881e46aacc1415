#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <chrono>
#include <cstdlib>
#include <cstring>
#include <iostream>
#include <memory>
#include <optional>
#include <string>
#include <system_error>
#include <thread>

#include "Receiver.h"
#include "common/ReceiverError.h"
#include "display/JsonDisplay.h"
#include "display/OutputQueue.h"
#include "display/TerminalDisplay.h"
#include "display/TextDisplay.h"
#include "operator/Keyboard.h"
#include "operator/Signals.h"
#include "options/Options.h"
#include "output/OutputFolder.h"

namespace {

using receiver::MessageStream;
using receiver::OutputQueue;

/// How long the end of a run waits for somebody who does not read.
constexpr std::chrono::seconds kReaderPatience{1};

/// Tells on threads of its own: nobody who reads holds up a recording, nor who does not read messages the
/// results. On one terminal, or in one file, all stands in the order in which it was told.
class Outlet {
 public:
    explicit Outlet(bool json) {
        const OutputQueue::Remark remark = json           ? receiver::JsonRemark
                                           : OnTerminal() ? receiver::TerminalRemark
                                                          : receiver::TextRemark;
        messageQueue_.emplace(remark);
        if (!OneFile()) {
            resultQueue_.emplace(remark);
        }
        results_.emplace(resultQueue_ ? *resultQueue_ : *messageQueue_, STDOUT_FILENO);
        messages_.emplace(*messageQueue_, STDERR_FILENO);
        if (json) {
            display_ = std::make_unique<receiver::JsonDisplay>(*results_);
        } else if (OnTerminal()) {
            display_ = std::make_unique<receiver::TerminalDisplay>(*messages_, *results_, STDERR_FILENO,
                                                                   [this] { return messageQueue_->Busy(); });
        } else {
            display_ = std::make_unique<receiver::TextDisplay>(*messages_, *results_);
        }
    }

    receiver::DisplayInterface& Display() { return *display_; }
    bool Close() {
        const bool results = !resultQueue_ || resultQueue_->Close(kReaderPatience);
        return messageQueue_->Close(kReaderPatience) && results;
    }

 private:
    static bool OnTerminal() { return isatty(STDERR_FILENO) == 1; }
    static bool OneFile() {
        struct stat results {};
        struct stat messages {};
        return fstat(STDOUT_FILENO, &results) == 0 && fstat(STDERR_FILENO, &messages) == 0 &&
               results.st_dev == messages.st_dev && results.st_ino == messages.st_ino;
    }

    std::optional<OutputQueue> messageQueue_;
    /// Null where results go the way of messages.
    std::optional<OutputQueue> resultQueue_;
    std::optional<MessageStream> messages_;
    std::optional<MessageStream> results_;
    std::unique_ptr<receiver::DisplayInterface> display_;
};

/// Whether a command line that cannot be read asks for JSON.
bool AsksForJson(int argc, char** argv) {
    return std::any_of(argv, argv + argc, [](const char* argument) {
        return argument != nullptr && std::strcmp(argument, "--json") == 0;
    });
}

int Refuse(const receiver::ReceiverError& error, bool json) {
    if (json) {
        receiver::JsonDisplay(std::cout).Failure(error.Code(), error.what());
    } else {
        std::cerr << "receiver: " << error.what() << '\n';
    }
    return static_cast<int>(error.Code());
}

bool LogsToStandardError() {
    const char* const log = std::getenv("QX_LOG");
    return log == nullptr || *log == '\0';
}

/// The end of the process writes what is left of the log, on standard error perhaps, which nobody may read.
void EndSoon(int code) {
    try {
        std::thread([code] {
            std::this_thread::sleep_for(kReaderPatience);
            _exit(code);
        }).detach();
    } catch (const std::system_error&) {
        // Without a thread the end takes as long as it takes.
    }
}

/// The end of a process destroys what its threads use. Where one of them hangs, the process ends without
/// that.
void EndAtOnce(int code) {
    std::cout.flush();
    // A fork waits until the log is written (Logger.h).
    const pid_t child = fork();
    if (child == 0) {
        _exit(0);
    }
    if (child > 0) {
        waitpid(child, nullptr, 0);
    }
    _exit(code);
}

int Run(const receiver::Options& options) {
    receiver::Signals signals(receiver::Keyboard::RestoreTerminal);
    Outlet outlet(options.json);
    const auto code = static_cast<int>(
        receiver::RunReceiver(options, receiver::OpenSource, signals, outlet.Display(), STDIN_FILENO));
    if (!outlet.Close() || LogsToStandardError()) {
        EndSoon(code);
    }
    if (receiver::ShareThreadsLeft()) {
        EndAtOnce(code);
    }
    return code;
}

}  // namespace

int main(int argc, char** argv) {
    std::optional<receiver::Options> options;
    try {
        std::string text;
        options = receiver::ParseOptions(argc, argv, text);
        if (!options) {
            std::cout << text;
            return static_cast<int>(receiver::ExitCode::kSuccess);
        }
    } catch (const receiver::ReceiverError& error) {
        return Refuse(error, AsksForJson(argc, argv));
    }
    receiver::HideCredentials(argc, argv);
    try {
        return Run(*options);
    } catch (const std::exception& error) {
        return Refuse({receiver::ExitCode::kInternal, receiver::SentenceOf(error)}, options->json);
    }
}
