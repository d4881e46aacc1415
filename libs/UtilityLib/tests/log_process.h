#pragma once

#include <fcntl.h>
#include <gtest/gtest.h>
#include <spawn.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <string>
#include <vector>

extern char** environ;

/// A folder of its own for one test.
class TemporaryFolder {
 public:
    TemporaryFolder() {
        std::string name = (std::filesystem::temp_directory_path() / "logger_test.XXXXXX").string();
        path_ = mkdtemp(name.data());
    }
    TemporaryFolder(const TemporaryFolder&) = delete;
    TemporaryFolder& operator=(const TemporaryFolder&) = delete;
    ~TemporaryFolder() { std::filesystem::remove_all(path_); }
    std::string File(const std::string& name) const { return (path_ / name).string(); }

 private:
    std::filesystem::path path_;
};

inline std::string ReadFile(const std::string& path) {
    std::ifstream file(path, std::ios::binary);
    return {std::istreambuf_iterator<char>(file), {}};
}

/// A program with the environment of this one, but for the variables of the log, which are only those given.
/// Its standard output and input are pipes, its standard error is a file.
class LogProcess {
 public:
    LogProcess(const TemporaryFolder& folder, std::vector<std::string> command,
               std::vector<std::string> variables)
        : errorPath_(folder.File("stderr")) {
        std::vector<char*> arguments;
        for (auto& argument : command) {
            arguments.push_back(argument.data());
        }
        arguments.push_back(nullptr);
        std::vector<char*> environment;
        for (char** entry = environ; *entry != nullptr; ++entry) {
            if (std::string(*entry).rfind("QX_", 0) != 0) {
                environment.push_back(*entry);
            }
        }
        for (auto& variable : variables) {
            environment.push_back(variable.data());
        }
        environment.push_back(nullptr);

        int output[2];
        int input[2];
        EXPECT_EQ(pipe2(output, O_CLOEXEC), 0);
        EXPECT_EQ(pipe2(input, O_CLOEXEC), 0);
        posix_spawn_file_actions_t actions;
        posix_spawn_file_actions_init(&actions);
        posix_spawn_file_actions_adddup2(&actions, input[0], STDIN_FILENO);
        posix_spawn_file_actions_adddup2(&actions, output[1], STDOUT_FILENO);
        posix_spawn_file_actions_addopen(&actions, STDERR_FILENO, errorPath_.c_str(),
                                         O_WRONLY | O_CREAT | O_TRUNC | O_APPEND, 0600);
        EXPECT_EQ(
            posix_spawn(&process_, arguments[0], &actions, nullptr, arguments.data(), environment.data()), 0);
        posix_spawn_file_actions_destroy(&actions);
        close(output[1]);
        close(input[0]);
        output_ = output[0];
        input_ = input[1];
    }
    LogProcess(const LogProcess&) = delete;
    LogProcess& operator=(const LogProcess&) = delete;
    ~LogProcess() {
        if (process_ > 0) {
            Wait();
        }
        close(output_);
    }

    /// Reads a line that the program says; empty when it says none any more.
    std::string Hear() const {
        std::string line;
        char c = 0;
        while (read(output_, &c, 1) == 1 && c != '\n') {
            line += c;
        }
        return line;
    }
    /// Ends the program's input.
    void Continue() {
        if (input_ >= 0) {
            close(input_);
            input_ = -1;
        }
    }
    /// The exit code; 128 and the signal for a program that one has ended.
    int Wait() {
        Continue();
        int status = 0;
        EXPECT_EQ(waitpid(process_, &status, 0), process_);
        process_ = -1;
        return WIFEXITED(status) ? WEXITSTATUS(status) : 128 + WTERMSIG(status);
    }
    std::string StandardError() const { return ReadFile(errorPath_); }

 private:
    std::string errorPath_;
    pid_t process_ = -1;
    int output_ = -1;
    int input_ = -1;
};
