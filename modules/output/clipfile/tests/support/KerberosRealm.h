#pragma once

#include <memory>
#include <string>
#include <vector>

#include "support/BoundProcess.h"
#include "support/TempDir.h"

/// A realm of Kerberos with a server of its own (Debian's krb5-kdc) on the loopback interface, and with one
/// server of shares, `kHost`. The environment of the process points to it from the constructor on:
/// KRB5_CONFIG, and KRB5CCNAME with an empty cache. What is looked up by name then is that host alone, which
/// needs a process that may mount.
class KerberosRealm {
 public:
    static constexpr const char* kName = "STUDIO.TEST";
    static constexpr const char* kUser = "recorder";
    static constexpr const char* kHost = "share.studio.test";

    /// On the main thread of a process that has no other. Throws `std::runtime_error` when anything is
    /// missing.
    KerberosRealm();
    ~KerberosRealm();
    KerberosRealm(const KerberosRealm&) = delete;
    KerberosRealm& operator=(const KerberosRealm&) = delete;

    /// Lines for the section [global] of the server of shares: it takes the realm's tickets.
    std::vector<std::string> ServerSettings() const;
    /// Gets `kUser` a ticket.
    void GetTicket() const;

 private:
    void writeSettings() const;
    void nameHost() const;

    TempDir directory_;
    /// A socket.
    const int reservation_;
    const int port_;
    std::unique_ptr<BoundProcess> server_;
};
