#include "support/SambaServer.h"

#include <pwd.h>
#include <signal.h>
#include <unistd.h>

#include <algorithm>
#include <cstdio>
#include <fstream>
#include <stdexcept>

#include "support/WaitUntil.h"

namespace {

std::string ownName() {
    const passwd* const entry = getpwuid(geteuid());
    return entry != nullptr ? entry->pw_name : "root";
}

}  // namespace

SambaServer::SambaServer(const Shares& shares, const std::vector<std::string>& settings,
                         const std::function<void(const std::filesystem::path&)>& prepare)
    : folder_(directory_.Path() / "shared"),
      reservation_(free_port::Reserve()),
      port_(free_port::Of(reservation_)) {
    std::filesystem::create_directory(folder_);
    if (prepare) {
        prepare(folder_);
    }
    const std::string state = (directory_.Path() / "state").string();
    std::filesystem::create_directory(state);
    std::ofstream(directory_.Path() / "users.map")
        << ownName() << " = " << kUser << " STUDIO\\" << kUser << "\n";
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

std::string SambaServer::Path(const std::string& share, const std::string& host) const {
    return "\\\\" + host + ":" + std::to_string(port_) + "\\" + share;
}

void SambaServer::addUser() {
    const std::string command = BoundProcess::Find("smbpasswd") + " -c '" +
                                (directory_.Path() / "smb.conf").string() + "' -a -s '" + ownName() +
                                "' >/dev/null 2>&1";
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
    server_ = std::make_unique<BoundProcess>(
        std::vector<std::string>{BoundProcess::Find("smbd"), "--foreground", "--no-process-group", "-s",
                                 (directory_.Path() / "smb.conf").string()});
    if (!waitUntil([this] { return free_port::TakesConnections(port_) || server_->HasEnded(); }) ||
        server_->HasEnded()) {
        server_ = nullptr;
        throw std::runtime_error("smbd does not start");
    }
    // The connection that was tried has its own process for a moment.
    if (!waitUntil([this] { return children().size() <= 2; })) {
        throw std::runtime_error("smbd has more helpers than are known here");
    }
    helpers_ = children();
}

void SambaServer::Kill() {
    if (server_ != nullptr) {
        server_ = nullptr;
        // Its helpers hold the socket that it listened on, and end on their own.
        if (!waitUntil([this] { return !free_port::TakesConnections(port_); })) {
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
    kill(server_->Id(), number);
    for (const pid_t child : children()) {
        kill(child, number);
    }
}

std::vector<pid_t> SambaServer::children() const {
    const std::string id = std::to_string(server_->Id());
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
