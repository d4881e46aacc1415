#include "support/Process.h"

#include <fcntl.h>
#include <poll.h>
#include <spawn.h>
#include <stdlib.h>
#include <sys/wait.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <csignal>
#include <system_error>

namespace endtoend {
namespace {

void check(int error, const char* what) {
    if (error != 0) {
        throw std::system_error(error, std::generic_category(), what);
    }
}

std::array<int, 2> makePipe() {
    std::array<int, 2> ends{};
    check(pipe2(ends.data(), O_CLOEXEC) == 0 ? 0 : errno, "pipe2");
    return ends;
}

std::vector<std::string> mergedEnvironment(const std::map<std::string, std::string>& additions) {
    std::map<std::string, std::string> merged = additions;
    for (char** entry = environ; *entry != nullptr; ++entry) {
        const std::string text = *entry;
        const std::size_t at = text.find('=');
        merged.emplace(text.substr(0, at), text.substr(at + 1));
    }
    std::vector<std::string> lines;
    for (const auto& [name, value] : merged) {
        lines.push_back(name + "=" + value);
    }
    return lines;
}

std::vector<char*> pointersTo(std::vector<std::string>& texts) {
    std::vector<char*> pointers;
    for (std::string& text : texts) {
        pointers.push_back(text.data());
    }
    pointers.push_back(nullptr);
    return pointers;
}

}  // namespace

Process::Process(const std::vector<std::string>& command,
                 const std::map<std::string, std::string>& environment, Terminal terminal) {
    posix_spawn_file_actions_t files;
    check(posix_spawn_file_actions_init(&files), "posix_spawn_file_actions_init");
    posix_spawnattr_t attributes;
    check(posix_spawnattr_init(&attributes), "posix_spawnattr_init");
    // ctest ignores SIGHUP in some of its own lives; the program starts with the usual dispositions.
    sigset_t signals;
    sigemptyset(&signals);
    posix_spawnattr_setsigmask(&attributes, &signals);
    for (const int number : {SIGHUP, SIGINT, SIGTERM, SIGPIPE, SIGQUIT}) {
        sigaddset(&signals, number);
    }
    posix_spawnattr_setsigdefault(&attributes, &signals);
    short flags = POSIX_SPAWN_SETSIGDEF | POSIX_SPAWN_SETSIGMASK;

    std::vector<int> childEnds;
    if (terminal == Terminal::kPseudoTerminal) {
        terminal_ = posix_openpt(O_RDWR | O_NOCTTY | O_CLOEXEC);
        check(terminal_ >= 0 && grantpt(terminal_) == 0 && unlockpt(terminal_) == 0 ? 0 : errno, "pty");
        std::array<char, 128> name{};
        check(ptsname_r(terminal_, name.data(), name.size()), "ptsname_r");
        // The first terminal that the leader of a session opens becomes the session's own.
        flags = static_cast<short>(flags | POSIX_SPAWN_SETSID);
        posix_spawn_file_actions_addopen(&files, 0, name.data(), O_RDWR, 0);
        posix_spawn_file_actions_adddup2(&files, 0, 1);
        posix_spawn_file_actions_adddup2(&files, 0, 2);
        outputFile_ = terminal_;
    } else {
        posix_spawn_file_actions_addopen(&files, 0, "/dev/null", O_RDONLY, 0);
        const auto output = makePipe();
        const auto errors = makePipe();
        posix_spawn_file_actions_adddup2(&files, output[1], 1);
        posix_spawn_file_actions_adddup2(&files, errors[1], 2);
        outputFile_ = output[0];
        errorFile_ = errors[0];
        childEnds = {output[1], errors[1]};
    }
    posix_spawnattr_setflags(&attributes, flags);

    std::vector<std::string> arguments = command;
    std::vector<std::string> variables = mergedEnvironment(environment);
    const int error = posix_spawnp(&pid_, command.front().c_str(), &files, &attributes,
                                   pointersTo(arguments).data(), pointersTo(variables).data());
    posix_spawn_file_actions_destroy(&files);
    posix_spawnattr_destroy(&attributes);
    for (const int end : childEnds) {
        close(end);
    }
    check(error, command.front().c_str());

    openReaders_ = errorFile_ >= 0 ? 2 : 1;
    readers_.emplace_back([this] { read(outputFile_, output_); });
    if (errorFile_ >= 0) {
        readers_.emplace_back([this] { read(errorFile_, errors_); });
    }
}

Process::~Process() {
    if (!exitCode_) {
        kill(pid_, SIGKILL);
        finish(kPatience);
    }
    for (std::thread& reader : readers_) {
        reader.join();
    }
    for (const int file : {outputFile_, errorFile_}) {
        if (file >= 0) {
            close(file);
        }
    }
}

void Process::read(int file, std::string& into) {
    std::array<char, 4096> bytes{};
    while (true) {
        pollfd ready{file, POLLIN, 0};
        if (poll(&ready, 1, 20) <= 0 && !closing_) {
            continue;
        }
        const ssize_t count = closing_ ? 0 : ::read(file, bytes.data(), bytes.size());
        const std::lock_guard<std::mutex> lock(mutex_);
        // A terminal whose other side is gone gives EIO.
        if (count <= 0) {
            --openReaders_;
            changed_.notify_all();
            return;
        }
        into.append(bytes.data(), static_cast<std::size_t>(count));
        changed_.notify_all();
    }
}

bool Process::finish(std::chrono::milliseconds patience) {
    const auto deadline = std::chrono::steady_clock::now() + patience;
    int status = 0;
    pid_t ended = 0;
    while ((ended = waitpid(pid_, &status, WNOHANG)) == 0) {
        if (std::chrono::steady_clock::now() > deadline) {
            return false;
        }
        // Until there is output, or for a moment: nothing signals the end of a process that others may wait
        // for too.
        std::unique_lock<std::mutex> lock(mutex_);
        changed_.wait_for(lock, std::chrono::milliseconds(5));
    }
    exitCode_ = WIFEXITED(status) ? WEXITSTATUS(status) : 128 + WTERMSIG(status);
    return true;
}

std::optional<int> Process::Wait(std::chrono::milliseconds patience) {
    if (!exitCode_ && !finish(patience)) {
        return std::nullopt;
    }
    std::unique_lock<std::mutex> lock(mutex_);
    changed_.wait_for(lock, std::chrono::seconds(5), [this] { return openReaders_ == 0; });
    return exitCode_;
}

bool Process::WaitForText(const std::string& text, std::chrono::milliseconds patience) {
    std::unique_lock<std::mutex> lock(mutex_);
    const auto found = [&] {
        return output_.find(text) != std::string::npos || errors_.find(text) != std::string::npos;
    };
    changed_.wait_for(lock, patience, [&] { return found() || openReaders_ == 0; });
    return found();
}

std::string Process::Output() const {
    const std::lock_guard<std::mutex> lock(mutex_);
    return output_;
}

std::string Process::Errors() const {
    const std::lock_guard<std::mutex> lock(mutex_);
    return errors_;
}

std::string Process::AllText() const {
    const std::lock_guard<std::mutex> lock(mutex_);
    return output_ + errors_;
}

void Process::Signal(int number) const {
    if (!exitCode_) {
        kill(pid_, number);
    }
}

void Process::Type(const std::string& keys) const {
    const ssize_t written = write(terminal_, keys.data(), keys.size());
    check(written == static_cast<ssize_t>(keys.size()) ? 0 : EIO, "write");
}

void Process::CloseTerminal() {
    closing_ = true;
    readers_.front().join();
    readers_.clear();
    // The last holder of the other side: the system hangs up on the session, and writing fails from here on.
    close(terminal_);
    outputFile_ = -1;
}

Outcome RunProgram(const std::vector<std::string>& command,
                   const std::map<std::string, std::string>& environment) {
    Process process(command, environment);
    Outcome outcome;
    outcome.code = process.Wait().value_or(-1);
    outcome.output = process.Output();
    outcome.errors = process.Errors();
    return outcome;
}

}  // namespace endtoend
