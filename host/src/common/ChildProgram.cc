#include "common/ChildProgram.h"

#include <fcntl.h>
#include <poll.h>
#include <signal.h>
#include <spawn.h>
#include <sys/mman.h>
#include <sys/syscall.h>
#include <sys/wait.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <cstring>
#include <string_view>

#include "common/NormalPriority.h"

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

/// Reads a piece of what a program says. False when there is none: none yet, or none any more.
bool Read(int output, std::string& text) {
    std::array<char, 1024> buffer;
    const ssize_t count = read(output, buffer.data(), buffer.size());
    if (count > 0 && text.size() < kMaxText) {
        text.append(buffer.data(), static_cast<std::size_t>(count));
    }
    return count > 0;
}

/// Reads what a program says until it ends, or until `ending` or the deadline: nothing then, else its status.
std::optional<int> Follow(pid_t process, int output, const std::atomic<bool>& ending,
                          Clock::time_point deadline, std::string& text) {
    // Without one the end is seen at the next look.
    const int end = static_cast<int>(syscall(SYS_pidfd_open, process, 0));
    std::array<pollfd, 2> polled{{{output, POLLIN, 0}, {end, POLLIN, 0}}};
    int status = 0;
    pid_t ended = 0;
    while (ended == 0 && !ending && Clock::now() < deadline) {
        const bool happened = poll(polled.data(), polled.size(), kLook) > 0;
        if (happened && polled[0].revents != 0 && !Read(output, text)) {
            // It may have closed its output long before it ends.
            polled[0].fd = -1;
        }
        ended = waitpid(process, &status, WNOHANG);
    }
    close(end);
    // What it has said at last. Others may hold its output, and say more and more.
    while (ended != 0 && text.size() < kMaxText && Read(output, text)) {
    }
    return ended == 0 ? std::nullopt : std::optional(status);
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
    // Its other end is the child's, and blocks.
    fcntl(ends[0], F_SETFL, O_NONBLOCK);
    pid_t process = -1;
    const int error = Setup(input, ends[1]).Spawn(process, task);
    close(input);
    close(ends[1]);
    if (error == 0) {
        SpareNoMore(process);
        const auto deadline = task.limit ? Clock::now() + *task.limit : Clock::time_point::max();
        std::optional<int> status = Follow(process, ends[0], ending_, deadline, result.text);
        if (!status) {
            result.timedOut = !ending_;
            kill(-process, SIGKILL);
            while (waitpid(process, &status.emplace(0), 0) < 0 && errno == EINTR) {
            }
        } else if (WIFEXITED(*status)) {
            result.code = WEXITSTATUS(*status);
        }
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
