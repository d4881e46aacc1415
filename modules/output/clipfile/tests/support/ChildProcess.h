#pragma once

#include <signal.h>
#include <spawn.h>
#include <sys/wait.h>
#include <unistd.h>

#include <stdexcept>
#include <string>
#include <vector>

/// A program that a test starts and kills at the end at the latest.
class ChildProcess {
 public:
    /// `command` begins with the path of the program. Throws `std::runtime_error` when it cannot be started.
    explicit ChildProcess(std::vector<std::string> command) {
        std::vector<char*> arguments;
        for (std::string& argument : command) {
            arguments.push_back(argument.data());
        }
        arguments.push_back(nullptr);
        if (posix_spawn(&id_, arguments[0], nullptr, nullptr, arguments.data(), environ) != 0) {
            throw std::runtime_error("cannot start " + command[0]);
        }
    }
    ~ChildProcess() { Kill(); }
    ChildProcess(const ChildProcess&) = delete;
    ChildProcess& operator=(const ChildProcess&) = delete;

    /// Ends it at once, wherever it is, and returns when it has gone. True when it still ran.
    bool Kill() {
        if (id_ <= 0) {
            return false;
        }
        kill(id_, SIGKILL);
        int status = 0;
        waitpid(id_, &status, 0);
        id_ = 0;
        return WIFSIGNALED(status) && WTERMSIG(status) == SIGKILL;
    }

 private:
    pid_t id_ = 0;
};
