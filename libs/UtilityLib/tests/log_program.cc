// Runs one scenario of the log, named by the first argument, in a process of its own: the log reads its
// environment once, and what it does at the end of a process is part of its contract.

#include <fcntl.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>
#include <csignal>
#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <functional>
#include <map>
#include <string>
#include <thread>
#include <vector>

#include "Logger.h"

namespace {

/// Tells the test that the scenario has come to a point.
void Say(const char* word) {
    std::printf("%s\n", word);
    std::fflush(stdout);
}

void Log(_LogPriority priority, const char* text) {
    Logger::Put(priority, "dir/file.cc", "Class::Operation", 12, "%s", text);
}

int Priorities() {
    for (const _LogPriority priority :
         {LOG_PRIORITY_OPERATOR, LOG_PRIORITY_ERROR, LOG_PRIORITY_WARNING, LOG_PRIORITY_NOTICE,
          LOG_PRIORITY_TRACE, LOG_PRIORITY_DETAIL, LOG_PRIORITY_SAMPLE}) {
        Logger::Put(priority, nullptr, nullptr, 0, "priority %d", static_cast<int>(priority));
    }
    return 0;
}

int Forms() {
    Log(LOG_PRIORITY_ERROR, "full");
    Logger::Put(LOG_PRIORITY_OPERATOR, nullptr, nullptr, 0, "OP: bare");
    Logger::Put(LOG_PRIORITY_ERROR, nullptr, "Class::Operation", 0, "function alone");
    Logger::Put(LOG_PRIORITY_ERROR, "dir/file.cc", nullptr, 7, "file alone");
    Logger::Put(LOG_PRIORITY_ERROR, nullptr, nullptr, 0, "tab\tnewline\ndelete\x7Fumlaut\xC3\xA4");
    Logger::Put(LOG_PRIORITY_ERROR, nullptr, nullptr, 0, "%s", std::string(5000, 'x').c_str());
    return 0;
}

int LooseUmask() {
    umask(0);
    Log(LOG_PRIORITY_ERROR, "line");
    return 0;
}

/// The arguments of a disabled line are never looked at: formatting this one would end the process.
int DisabledLineIsNotFormatted() {
    const auto* nowhere = reinterpret_cast<const char*>(8);
    for (int i = 0; i < 1000; ++i) {
        Logger::Put(LOG_PRIORITY_TRACE, nullptr, nullptr, 0, "%s", nowhere);
    }
    return 0;
}

/// More lines than the queue holds, while nobody reads the pipe that is the log.
int Flood() {
    for (int i = 0; i < 30000; ++i) {
        Logger::Put(LOG_PRIORITY_ERROR, nullptr, nullptr, 0, "line %d", i);
    }
    Say("flooded");
    return 0;
}

int Threads() {
    std::vector<std::thread> threads;
    for (int thread = 0; thread < 4; ++thread) {
        threads.emplace_back([thread] {
            for (int i = 0; i < 1000; ++i) {
                Logger::Put(LOG_PRIORITY_ERROR, nullptr, nullptr, 0, "thread %d line %d", thread, i);
            }
        });
    }
    for (auto& thread : threads) {
        thread.join();
    }
    return 0;
}

int Exit() {
    Log(LOG_PRIORITY_ERROR, "before exit");
    std::exit(0);
}

struct Destroyed {
    Destroyed() = default;
    Destroyed(const Destroyed&) = delete;
    Destroyed& operator=(const Destroyed&) = delete;
    ~Destroyed() { Log(LOG_PRIORITY_ERROR, "static destruction"); }
};

int StaticDestruction() {
    static const Destroyed destroyed;
    Log(LOG_PRIORITY_ERROR, "main");
    return 0;
}

/// A thread that goes on logging while the process ends around it.
int ThreadOutlivesMain() {
    Log(LOG_PRIORITY_ERROR, "main");
    std::thread([] {
        for (;;) {
            Log(LOG_PRIORITY_ERROR, "endless");
        }
    }).detach();
    return 0;
}

int Fork() {
    Log(LOG_PRIORITY_ERROR, "parent before");
    const pid_t child = fork();
    if (child == 0) {
        Log(LOG_PRIORITY_ERROR, "child");
        std::exit(0);
    }
    int status = -1;
    waitpid(child, &status, 0);
    Log(LOG_PRIORITY_ERROR, "parent after");
    return status;
}

int KeepsErrno() {
    errno = EXDEV;
    Log(LOG_PRIORITY_ERROR, "enabled");
    if (errno != EXDEV) {
        return 1;
    }
    Log(LOG_PRIORITY_SAMPLE, "disabled");
    return errno == EXDEV ? 0 : 2;
}

/// The first line reads the environment; what it says later means nothing.
int EnvironmentIsReadOnce() {
    Log(LOG_PRIORITY_ERROR, "first");
    setenv("QX_LOG_PRIORITY", "13", 1);
    Log(LOG_PRIORITY_SAMPLE, "second");
    return 0;
}

/// The signals that a thread of this process blocks, found by its name; waits until there is one.
unsigned long long BlockedSignals(const std::string& name) {
    for (;;) {
        for (const auto& task : std::filesystem::directory_iterator("/proc/self/task")) {
            std::string found;
            std::ifstream(task.path() / "comm") >> found;
            std::ifstream status(task.path() / "status");
            for (std::string line; found == name && std::getline(status, line);) {
                if (line.rfind("SigBlk:", 0) == 0) {
                    return std::strtoull(line.c_str() + 7, nullptr, 16);
                }
            }
        }
        std::this_thread::yield();
    }
}

/// The log's thread must not take signals away from the threads of the host.
int BlocksSignals() {
    Log(LOG_PRIORITY_ERROR, "line");
    const auto bit = [](int signal) { return 1ULL << (signal - 1); };
    const auto wanted = bit(SIGINT) | bit(SIGTERM) | bit(SIGUSR1) | bit(SIGPIPE);
    return (BlockedSignals("qx-log") & wanted) == wanted ? 0 : 1;
}

/// Waits for the reader of the pipe to go away, then logs.
int ReaderLeaves() {
    Log(LOG_PRIORITY_ERROR, "first");
    Say("logged");
    std::getchar();
    for (int i = 0; i < 100; ++i) {
        Log(LOG_PRIORITY_ERROR, "nobody reads");
    }
    return 0;
}

}  // namespace

int main(int argc, char** argv) {
    const std::map<std::string, std::function<int()>> scenarios = {
        {"Priorities", Priorities},
        {"Forms", Forms},
        {"LooseUmask", LooseUmask},
        {"DisabledLineIsNotFormatted", DisabledLineIsNotFormatted},
        {"Flood", Flood},
        {"Threads", Threads},
        {"Exit", Exit},
        {"StaticDestruction", StaticDestruction},
        {"ThreadOutlivesMain", ThreadOutlivesMain},
        {"Fork", Fork},
        {"KeepsErrno", KeepsErrno},
        {"EnvironmentIsReadOnce", EnvironmentIsReadOnce},
        {"BlocksSignals", BlocksSignals},
        {"ReaderLeaves", ReaderLeaves},
    };
    const auto scenario = argc > 1 ? scenarios.find(argv[1]) : scenarios.end();
    return scenario != scenarios.end() ? scenario->second() : 99;
}
