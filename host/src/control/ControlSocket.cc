#include "control/ControlSocket.h"

#include <fcntl.h>
#include <sys/file.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/un.h>
#include <unistd.h>

#include <cerrno>
#include <chrono>
#include <cstring>
#include <filesystem>
#include <thread>

#include "common/ReceiverError.h"

namespace receiver {
namespace {

constexpr mode_t kRights = 0660;
constexpr int kBacklog = 16;
/// Another run looks at the same folder for milliseconds.
constexpr std::chrono::milliseconds kLockPatience{2000};
constexpr std::chrono::milliseconds kLockPause{10};

ReceiverError Unusable(const std::string& path, const std::string& reason) {
    return {ExitCode::kUsage, "--control " + path + ": " + reason};
}

std::string SystemReason() {
    return std::strerror(errno);
}

/// Its folder belongs to one run at a time while that looks whose a name is. Where it can't be locked, as in
/// one that may not be read, two runs that start at the same instant may both take a name over.
class FolderLock {
 public:
    explicit FolderLock(const std::string& path) {
        const std::filesystem::path folder = std::filesystem::path(path).parent_path();
        descriptor_ = open(folder.empty() ? "." : folder.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC);
        const auto deadline = std::chrono::steady_clock::now() + kLockPatience;
        while (descriptor_ >= 0 && flock(descriptor_, LOCK_EX | LOCK_NB) != 0 && errno == EWOULDBLOCK &&
               std::chrono::steady_clock::now() < deadline) {
            std::this_thread::sleep_for(kLockPause);
        }
    }
    ~FolderLock() {
        if (descriptor_ >= 0) {
            close(descriptor_);
        }
    }
    FolderLock(const FolderLock&) = delete;
    FolderLock& operator=(const FolderLock&) = delete;

 private:
    int descriptor_ = -1;
};

sockaddr_un AddressOf(const std::string& path) {
    sockaddr_un address{};
    address.sun_family = AF_UNIX;
    if (path.size() >= sizeof address.sun_path) {
        throw Unusable(path, "the name of a socket has at most " +
                                 std::to_string(sizeof address.sun_path - 1) + " bytes");
    }
    std::memcpy(address.sun_path, path.c_str(), path.size());
    return address;
}

/// Takes the name from a run that is gone.
void TakeOver(const std::string& path, const sockaddr_un& address) {
    struct stat found {};
    if (lstat(path.c_str(), &found) != 0) {
        return;
    }
    if (!S_ISSOCK(found.st_mode)) {
        throw Unusable(path, "there is something else of that name");
    }
    const int probe = socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC | SOCK_NONBLOCK, 0);
    const bool dead = probe >= 0 &&
                      connect(probe, reinterpret_cast<const sockaddr*>(&address), sizeof address) != 0 &&
                      errno == ECONNREFUSED;
    if (probe >= 0) {
        close(probe);
    }
    if (!dead) {
        throw Unusable(path, "another run listens there: each one needs a socket of its own");
    }
    if (unlink(path.c_str()) != 0) {
        throw Unusable(path, "the socket of a run that is gone can't be removed: " + SystemReason());
    }
}

}  // namespace

ControlSocket::ControlSocket(const std::string& path) : path_(path) {
    try {
        Listen();
    } catch (...) {
        if (descriptor_ >= 0) {
            close(descriptor_);
        }
        throw;
    }
}

void ControlSocket::Listen() {
    const sockaddr_un address = AddressOf(path_);
    const FolderLock lock(path_);
    TakeOver(path_, address);
    descriptor_ = socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC | SOCK_NONBLOCK, 0);
    // The name gets the rights of the socket without those that the umask takes away: at no time too many.
    if (descriptor_ < 0 || fchmod(descriptor_, kRights) != 0 ||
        bind(descriptor_, reinterpret_cast<const sockaddr*>(&address), sizeof address) != 0) {
        throw Unusable(path_, "no socket can be made there: " + SystemReason());
    }
    removed_ = false;
    struct stat made {};
    if (lstat(path_.c_str(), &made) == 0) {
        device_ = made.st_dev;
        node_ = made.st_ino;
    }
    if (chmod(path_.c_str(), kRights) != 0 || listen(descriptor_, kBacklog) != 0) {
        const std::string reason = SystemReason();
        Remove();
        throw Unusable(path_, "nothing can listen there: " + reason);
    }
}

ControlSocket::~ControlSocket() {
    Remove();
    close(descriptor_);
}

int ControlSocket::Accept() const {
    return accept4(descriptor_, nullptr, nullptr, SOCK_CLOEXEC | SOCK_NONBLOCK);
}

void ControlSocket::Refuse() const {
    shutdown(descriptor_, SHUT_RDWR);
    // Those who wait would wait for ever.
    for (int client = Accept(); client >= 0; client = Accept()) {
        close(client);
    }
}

void ControlSocket::Remove() {
    struct stat found {};
    if (!removed_ && lstat(path_.c_str(), &found) == 0 && found.st_dev == device_ && found.st_ino == node_) {
        unlink(path_.c_str());
    }
    removed_ = true;
}

}  // namespace receiver
