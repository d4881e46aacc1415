#include "common/ChildProgram.h"

#include <fcntl.h>
#include <poll.h>
#include <signal.h>
#include <spawn.h>
#include <sys/mman.h>
#include <sys/wait.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <cstring>
#include <string_view>

namespace receiver {
namespace {

/// What is kept of what a program says.
constexpr std::size_t kMaxText = 16'000;
/// How often `End` is looked for, in milliseconds.
constexpr int kLook = 50;

using Clock = std::chrono::steady_clock;

/// What is added, and our environment without what is for the module's log.
std::vector<char*> Environment(const std::vector<std::string>& added) {
    std::vector<char*> variables;
    for (const std::string& variable : added) {
        variables.push_back(const_cast<char*>(variable.c_str()));
    }
    for (char** variable = environ; *variable != nullptr; ++variable) {
        if (!std::string_view(*variable).starts_with("QX_LOG")) {
            variables.push_back(*variable);
        }
    }
    variables.push_back(nullptr);
    return variables;
}

/// A descriptor to read `text` from; -1 where there is none. A pipe would have to be filled while the program
/// runs, and might break.
int InputOf(const std::string& text) {
    const int file = memfd_create("input", MFD_CLOEXEC);
    if (file >= 0 && (write(file, text.data(), text.size()) != static_cast<ssize_t>(text.size()) ||
                      lseek(file, 0, SEEK_SET) != 0)) {
        close(file);
        return -1;
    }
    return file;
}

/// Attributes and file actions of a child: no signal blocked or ignored, all that it says to one descriptor.
class Setup {
 public:
    Setup(int input, int output) {
        posix_spawnattr_init(&attributes_);
        posix_spawn_file_actions_init(&actions_);
        sigset_t none;
        sigset_t all;
        sigemptyset(&none);
        sigfillset(&all);
        posix_spawnattr_setsigmask(&attributes_, &none);
        posix_spawnattr_setsigdefault(&attributes_, &all);
        posix_spawnattr_setpgroup(&attributes_, 0);
        posix_spawnattr_setflags(&attributes_,
                                 POSIX_SPAWN_SETSIGMASK | POSIX_SPAWN_SETSIGDEF | POSIX_SPAWN_SETPGROUP);
        posix_spawn_file_actions_adddup2(&actions_, input, STDIN_FILENO);
        posix_spawn_file_actions_adddup2(&actions_, output, STDOUT_FILENO);
        posix_spawn_file_actions_adddup2(&actions_, output, STDERR_FILENO);
        // A file that the module has open would stay locked by it.
        posix_spawn_file_actions_addclosefrom_np(&actions_, STDERR_FILENO + 1);
    }
    ~Setup() {
        posix_spawn_file_actions_destroy(&actions_);
        posix_spawnattr_destroy(&attributes_);
    }
    Setup(const Setup&) = delete;
    Setup& operator=(const Setup&) = delete;

    int Spawn(pid_t& process, const ChildTask& task) const {
        std::vector<char*> arguments;
        for (const std::string& argument : task.command) {
            arguments.push_back(const_cast<char*>(argument.c_str()));
        }
        arguments.push_back(nullptr);
        return posix_spawn(&process, task.command.front().c_str(), &actions_, &attributes_, arguments.data(),
                           Environment(task.environment).data());
    }

 private:
    posix_spawnattr_t attributes_;
    posix_spawn_file_actions_t actions_;
};

/// Reads what is there, without a wait. False at the end.
bool Read(int descriptor, std::string& text) {
    std::array<char, 1024> buffer;
    for (;;) {
        const ssize_t count = read(descriptor, buffer.data(), buffer.size());
        if (count <= 0) {
            return count < 0 && (errno == EAGAIN || errno == EINTR);
        }
        if (text.size() < kMaxText) {
            text.append(buffer.data(), static_cast<std::size_t>(count));
        }
    }
}

/// Collects the process if it has ended.
bool HasEnded(pid_t process, int& status) {
    return waitpid(process, &status, WNOHANG) == process;
}

/// Follows a process until it has ended, whoever holds its output, and gives what it has left. It is killed
/// when it is to end or the deadline comes.
int Follow(pid_t process, int output, const std::atomic<bool>& ending, Clock::time_point deadline,
           std::string& text) {
    int status = 0;
    bool open = true;
    while (!HasEnded(process, status)) {
        if (ending || Clock::now() >= deadline) {
            kill(-process, SIGKILL);
            while (waitpid(process, &status, 0) < 0 && errno == EINTR) {
            }
            break;
        }
        // A closed output tells nothing more: then it is the pause alone.
        pollfd input = {open ? output : -1, POLLIN, 0};
        if (poll(&input, 1, kLook) > 0) {
            open = Read(output, text);
        }
    }
    if (open) {
        Read(output, text);
    }
    return status;
}

}  // namespace

ChildResult ChildProgram::Run(const ChildTask& task) {
    ChildResult result;
    std::array<int, 2> ends = {-1, -1};
    const int input = InputOf(task.input);
    if (ending_ || input < 0 || pipe2(ends.data(), O_CLOEXEC) != 0) {
        result.text = ending_ ? "it was ended" : std::strerror(errno);
        close(input);
        return result;
    }
    pid_t process = -1;
    const int error = Setup(input, ends[1]).Spawn(process, task);
    close(input);
    close(ends[1]);
    if (error == 0) {
        const auto deadline = task.limit ? Clock::now() + *task.limit : Clock::time_point::max();
        fcntl(ends[0], F_SETFL, O_NONBLOCK);
        const int status = Follow(process, ends[0], ending_, deadline, result.text);
        result.timedOut = !ending_ && WIFSIGNALED(status) && Clock::now() >= deadline;
        result.code = !ending_ && WIFEXITED(status) ? WEXITSTATUS(status) : -1;
    } else {
        result.text = std::strerror(error);
    }
    close(ends[0]);
    return result;
}

void ChildProgram::End() {
    ending_ = true;
}

}  // namespace receiver
