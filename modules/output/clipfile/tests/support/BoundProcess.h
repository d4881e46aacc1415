#pragma once

#include <sys/types.h>

#include <string>
#include <vector>

/// A server that a test runs, with all processes that it starts in turn. It ends with this object, at once,
/// and also when the test's own process ends in any way, and when it is frozen.
class BoundProcess {
 public:
    /// The program's path first. Throws `std::runtime_error` when it cannot be started.
    explicit BoundProcess(const std::vector<std::string>& command);
    ~BoundProcess();
    BoundProcess(const BoundProcess&) = delete;
    BoundProcess& operator=(const BoundProcess&) = delete;

    /// Its number, and that of the process group of all that belongs to it.
    pid_t Id() const { return id_; }
    bool HasEnded();

    /// The path of one of the system's programs. Throws `std::runtime_error` when it is not installed.
    static std::string Find(const std::string& program);

 private:
    pid_t id_ = 0;
    bool ended_ = false;
    /// Held open for as long as it may run.
    int lifeline_ = -1;
};

namespace free_port {

/// A socket with a free port of the loopback interface, for as long as it is open: nobody else is given that
/// port. A server that shares ports or reuses addresses (SO_REUSEPORT, SO_REUSEADDR, socket(7)) can listen
/// beside it. Who shares already when a port is chosen may be given one that another test shares.
int Reserve();
int Of(int descriptor);
bool TakesConnections(int port);

}  // namespace free_port
