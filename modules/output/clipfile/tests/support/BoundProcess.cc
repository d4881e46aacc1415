#include "support/BoundProcess.h"

#include <arpa/inet.h>
#include <fcntl.h>
#include <netinet/in.h>
#include <signal.h>
#include <spawn.h>
#include <sys/socket.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cstdint>
#include <stdexcept>

namespace {

sockaddr_in loopback(int port) {
    sockaddr_in address = {};
    address.sin_family = AF_INET;
    address.sin_port = htons(static_cast<std::uint16_t>(port));
    address.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
    return address;
}

}  // namespace

BoundProcess::BoundProcess(const std::vector<std::string>& command) {
    // Whatever ends this process closes the pipe, and that ends the server, also one that is frozen.
    static const char* const kWithLifeline = "(read -r _ <&3; kill -KILL 0) & exec \"$0\" \"$@\"";
    std::vector<std::string> words = {"/bin/sh", "-c", kWithLifeline};
    words.insert(words.end(), command.begin(), command.end());
    std::vector<char*> arguments;
    for (std::string& word : words) {
        arguments.push_back(word.data());
    }
    arguments.push_back(nullptr);
    int ends[2] = {};
    if (pipe2(ends, O_CLOEXEC) != 0) {
        throw std::runtime_error("no pipe");
    }
    lifeline_ = ends[1];
    posix_spawnattr_t attributes;
    posix_spawnattr_init(&attributes);
    posix_spawnattr_setflags(&attributes, POSIX_SPAWN_SETPGROUP);
    posix_spawn_file_actions_t actions;
    posix_spawn_file_actions_init(&actions);
    posix_spawn_file_actions_addopen(&actions, STDIN_FILENO, "/dev/null", O_RDONLY, 0);
    posix_spawn_file_actions_adddup2(&actions, ends[0], 3);
    const int error = posix_spawn(&id_, arguments[0], &actions, &attributes, arguments.data(), environ);
    posix_spawn_file_actions_destroy(&actions);
    posix_spawnattr_destroy(&attributes);
    close(ends[0]);
    if (error != 0) {
        close(lifeline_);
        throw std::runtime_error("cannot start " + command.front());
    }
}

BoundProcess::~BoundProcess() {
    kill(-id_, SIGKILL);
    if (!ended_) {
        waitpid(id_, nullptr, 0);
    }
    close(lifeline_);
}

bool BoundProcess::HasEnded() {
    ended_ = ended_ || waitpid(id_, nullptr, WNOHANG) != 0;
    return ended_;
}

std::string BoundProcess::Find(const std::string& program) {
    for (const char* folder : {"/usr/sbin/", "/usr/bin/"}) {
        if (access((folder + program).c_str(), X_OK) == 0) {
            return folder + program;
        }
    }
    throw std::runtime_error("no " + program + ": scripts/bootstrap installs it");
}

namespace free_port {

int Reserve() {
    const int descriptor = socket(AF_INET, SOCK_STREAM | SOCK_CLOEXEC, 0);
    const int on = 1;
    const sockaddr_in address = loopback(0);
    if (bind(descriptor, reinterpret_cast<const sockaddr*>(&address), sizeof address) != 0 ||
        setsockopt(descriptor, SOL_SOCKET, SO_REUSEADDR, &on, sizeof on) != 0 ||
        setsockopt(descriptor, SOL_SOCKET, SO_REUSEPORT, &on, sizeof on) != 0) {
        close(descriptor);
        throw std::runtime_error("no free port");
    }
    return descriptor;
}

int Of(int descriptor) {
    sockaddr_in address = {};
    socklen_t size = sizeof address;
    getsockname(descriptor, reinterpret_cast<sockaddr*>(&address), &size);
    return ntohs(address.sin_port);
}

bool TakesConnections(int port) {
    const int descriptor = socket(AF_INET, SOCK_STREAM | SOCK_CLOEXEC, 0);
    const sockaddr_in address = loopback(port);
    const bool connected =
        connect(descriptor, reinterpret_cast<const sockaddr*>(&address), sizeof address) == 0;
    close(descriptor);
    return connected;
}

}  // namespace free_port
