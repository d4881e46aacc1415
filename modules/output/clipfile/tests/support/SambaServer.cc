#include "support/SambaServer.h"

#include <arpa/inet.h>
#include <fcntl.h>
#include <netinet/in.h>
#include <pwd.h>
#include <signal.h>
#include <spawn.h>
#include <sys/socket.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <cstdint>
#include <cstdio>
#include <fstream>
#include <stdexcept>

#include "support/WaitUntil.h"

namespace {

sockaddr_in loopback(int port) {
    sockaddr_in address = {};
    address.sin_family = AF_INET;
    address.sin_port = htons(static_cast<std::uint16_t>(port));
    address.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
    return address;
}

/// A socket with a free port, for as long as it is open: nobody else is given that port, also while no server
/// listens there. smbd listens beside it, since it shares ports too (SO_REUSEPORT, socket(7)). Who shares
/// already when a port is chosen may be given one that another test shares.
int reservePort() {
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

int portOf(int descriptor) {
    sockaddr_in address = {};
    socklen_t size = sizeof address;
    getsockname(descriptor, reinterpret_cast<sockaddr*>(&address), &size);
    return ntohs(address.sin_port);
}

bool takesConnections(int port) {
    const int descriptor = socket(AF_INET, SOCK_STREAM | SOCK_CLOEXEC, 0);
    const sockaddr_in address = loopback(port);
    const bool connected =
        connect(descriptor, reinterpret_cast<const sockaddr*>(&address), sizeof address) == 0;
    close(descriptor);
    return connected;
}

std::string ownName() {
    const passwd* const entry = getpwuid(geteuid());
    return entry != nullptr ? entry->pw_name : "root";
}

std::string find(const char* program) {
    for (const char* folder : {"/usr/sbin/", "/usr/bin/"}) {
        if (access((std::string(folder) + program).c_str(), X_OK) == 0) {
            return std::string(folder) + program;
        }
    }
    throw std::runtime_error(std::string("no ") + program + ": scripts/bootstrap installs it");
}

}  // namespace

SambaServer::SambaServer(const Shares& shares, const std::vector<std::string>& settings,
                         const std::function<void(const std::filesystem::path&)>& prepare)
    : folder_(directory_.Path() / "shared"), reservation_(reservePort()), port_(portOf(reservation_)) {
    std::filesystem::create_directory(folder_);
    if (prepare) {
        prepare(folder_);
    }
    const std::string state = (directory_.Path() / "state").string();
    std::filesystem::create_directory(state);
    std::ofstream(directory_.Path() / "users.map") << ownName() << " = " << kUser << "\n";
    std::ofstream file(directory_.Path() / "smb.conf");
    file << "[global]\nserver role = standalone server\nworkgroup = STUDIO\ndisable netbios = yes\n"
         << "interfaces = 127.0.0.1\nbind interfaces only = yes\nsmb ports = " << port_ << "\n";
    for (const char* folder : {"private dir", "lock directory", "state directory", "cache directory",
                               "pid directory", "ncalrpc dir", "binddns dir"}) {
        file << folder << " = " << state << "\n";
    }
    file << "log file = " << (directory_.Path() / "log.%m").string()
         << "\npassdb backend = smbpasswd:" << state
         << "/smbpasswd\nusername map = " << (directory_.Path() / "users.map").string()
         << "\nguest account = " << ownName() << "\nload printers = no\nprinting = bsd\n"
         << "rpc_server:spoolss = disabled\n";
    for (const std::string& line : settings) {
        file << line << "\n";
    }
    for (const Share& share : shares) {
        file << "[" << share.name << "]\npath = " << folder_.string() << "\nread only = no\n";
        for (const std::string& line : share.settings) {
            file << line << "\n";
        }
    }
    file.close();
    addUser();
    Start();
}

SambaServer::~SambaServer() {
    Kill();
    close(reservation_);
}

std::string SambaServer::Path(const std::string& share) const {
    return "\\\\127.0.0.1:" + std::to_string(port_) + "\\" + share;
}

void SambaServer::addUser() {
    const std::string command = find("smbpasswd") + " -c '" + (directory_.Path() / "smb.conf").string() +
                                "' -a -s '" + ownName() + "' >/dev/null 2>&1";
    FILE* const program = popen(command.c_str(), "w");
    if (program == nullptr) {
        throw std::runtime_error("cannot start smbpasswd");
    }
    fprintf(program, "%s\n%s\n", kPassword, kPassword);
    if (pclose(program) != 0) {
        throw std::runtime_error("smbpasswd has failed");
    }
}

void SambaServer::Start() {
    // Whatever ends this process closes the pipe, and that ends the server, also one that is frozen.
    static const char* const kWithLifeline = "(read -r _ <&3; kill -KILL 0) & exec \"$0\" \"$@\"";
    std::vector<std::string> command = {"/bin/sh",      "-c",
                                        kWithLifeline,  find("smbd"),
                                        "--foreground", "--no-process-group",
                                        "-s",           (directory_.Path() / "smb.conf").string()};
    std::vector<char*> arguments;
    for (std::string& argument : command) {
        arguments.push_back(argument.data());
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
    const auto ended = [this] { return waitpid(id_, nullptr, WNOHANG) != 0; };
    if (error != 0 || !waitUntil([&] { return takesConnections(port_) || ended(); }) || ended()) {
        id_ = 0;
        close(lifeline_);
        throw std::runtime_error("smbd does not start");
    }
    // The connection that was tried has its own process for a moment.
    if (!waitUntil([this] { return children().size() <= 2; })) {
        throw std::runtime_error("smbd has more helpers than are known here");
    }
    helpers_ = children();
}

void SambaServer::Kill() {
    if (id_ > 0) {
        kill(-id_, SIGKILL);
        waitpid(id_, nullptr, 0);
        close(lifeline_);
        id_ = 0;
        // Its helpers hold the socket that it listened on, and end on their own.
        if (!waitUntil([this] { return !takesConnections(port_); })) {
            fprintf(stderr, "smbd still listens at port %d\n", port_);
        }
    }
}

void SambaServer::CutConnections() {
    for (const pid_t child : children()) {
        if (std::find(helpers_.begin(), helpers_.end(), child) == helpers_.end()) {
            kill(child, SIGKILL);
        }
    }
}

void SambaServer::Freeze() {
    signalServer(SIGSTOP);
}

void SambaServer::Thaw() {
    signalServer(SIGCONT);
}

void SambaServer::signalServer(int number) const {
    kill(id_, number);
    for (const pid_t child : children()) {
        kill(child, number);
    }
}

std::vector<pid_t> SambaServer::children() const {
    const std::string id = std::to_string(id_);
    std::ifstream file("/proc/" + id + "/task/" + id + "/children");
    std::vector<pid_t> found;
    for (pid_t child = 0; file >> child;) {
        // Names of the server's own begin with that of the program.
        std::string name;
        std::ifstream("/proc/" + std::to_string(child) + "/comm") >> name;
        if (name.rfind("smbd", 0) == 0) {
            found.push_back(child);
        }
    }
    return found;
}
