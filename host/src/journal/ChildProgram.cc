#include "journal/ChildProgram.h"

#include <fcntl.h>
#include <poll.h>
#include <signal.h>
#include <spawn.h>
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

/// Our environment without what is for the module's log.
std::vector<char*> Environment() {
    std::vector<char*> variables;
    for (char** variable = environ; *variable != nullptr; ++variable) {
        if (!std::string_view(*variable).starts_with("QX_LOG")) {
            variables.push_back(*variable);
        }
    }
    variables.push_back(nullptr);
    return variables;
}

/// Attributes and file actions of a child: no signal blocked or ignored, nothing to read, all that it says to
/// one descriptor.
class Setup {
 public:
    explicit Setup(int output) {
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
        posix_spawn_file_actions_addopen(&actions_, STDIN_FILENO, "/dev/null", O_RDONLY, 0);
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

    int Spawn(pid_t& process, const std::vector<std::string>& command) const {
        std::vector<char*> arguments;
        for (const std::string& argument : command) {
            arguments.push_back(const_cast<char*>(argument.c_str()));
        }
        arguments.push_back(nullptr);
        return posix_spawn(&process, command.front().c_str(), &actions_, &attributes_, arguments.data(),
                           Environment().data());
    }

 private:
    posix_spawnattr_t attributes_;
    posix_spawn_file_actions_t actions_;
};

/// Reads to the end, or until `ending`. False then.
bool ReadAll(int descriptor, const std::atomic<bool>& ending, std::string& text) {
    std::array<char, 1024> buffer;
    while (!ending) {
        pollfd input = {descriptor, POLLIN, 0};
        if (poll(&input, 1, kLook) <= 0) {
            continue;
        }
        const ssize_t count = read(descriptor, buffer.data(), buffer.size());
        if (count == 0 || (count < 0 && errno != EINTR)) {
            return true;
        }
        if (count > 0 && text.size() < kMaxText) {
            text.append(buffer.data(), static_cast<std::size_t>(count));
        }
    }
    return false;
}

}  // namespace

ChildResult ChildProgram::Run(const std::vector<std::string>& command) {
    ChildResult result;
    std::array<int, 2> ends = {-1, -1};
    if (ending_ || pipe2(ends.data(), O_CLOEXEC) != 0) {
        result.text = std::strerror(errno);
        return result;
    }
    pid_t process = -1;
    const int error = Setup(ends[1]).Spawn(process, command);
    close(ends[1]);
    if (error == 0) {
        if (!ReadAll(ends[0], ending_, result.text)) {
            kill(process, SIGKILL);
        }
        int status = 0;
        while (waitpid(process, &status, 0) < 0 && errno == EINTR) {
        }
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
