#pragma once

#include <sys/types.h>

#include <filesystem>
#include <functional>
#include <memory>
#include <string>
#include <vector>

#include "support/BoundProcess.h"
#include "support/TempDir.h"

/// Debian's smbd on a free port of the loopback interface, with settings, users and state in a directory of
/// its own: nothing of the system's Samba is read or changed. It runs with the rights of the test, and never
/// longer. Its user is `kUser`, under any domain.
class SambaServer {
 public:
    static constexpr const char* kUser = "recorder";
    static constexpr const char* kPassword = "p\xC3\xA4ss word";

    struct Share {
        std::string name;
        /// Lines of smb.conf(5).
        std::vector<std::string> settings;
    };
    using Shares = std::vector<Share>;

    /// Serves `Folder` as each of the shares. `settings` are lines for the section [global]. Throws
    /// `std::runtime_error` when there is no smbd, or it does not start.
    /// `prepare` gets the folder before anyone serves it.
    explicit SambaServer(const Shares& shares = {{"rec", {}}}, const std::vector<std::string>& settings = {},
                         const std::function<void(const std::filesystem::path&)>& prepare = {});
    ~SambaServer();
    SambaServer(const SambaServer&) = delete;
    SambaServer& operator=(const SambaServer&) = delete;

    /// What is shared.
    const std::filesystem::path& Folder() const { return folder_; }
    int Port() const { return port_; }
    /// `\\server\share`, as the module's settings hold it. `host` is a name of the loopback interface's
    /// address.
    std::string Path(const std::string& share = "rec", const std::string& host = "127.0.0.1") const;

    void Start();
    /// Ends it at once, in the middle of what it does, with all connections.
    void Kill();
    /// Ends the connections that there are; new ones are taken.
    void CutConnections();
    /// It stops answering, while its sockets stay.
    void Freeze();
    void Thaw();

 private:
    void addUser();
    void signalServer(int number) const;
    std::vector<pid_t> children() const;

    TempDir directory_;
    const std::filesystem::path folder_;
    /// A socket.
    const int reservation_;
    const int port_;
    /// Null while it does not run.
    std::unique_ptr<BoundProcess> server_;
    /// Its helpers, which belong to no connection.
    std::vector<pid_t> helpers_;
};
