#include "support/KerberosRealm.h"

#include <sys/mount.h>
#include <unistd.h>

#include <cstdlib>
#include <fstream>
#include <stdexcept>

#include "support/PrivateMounts.h"
#include "support/WaitUntil.h"

namespace {

constexpr const char* kPassword = "secret";

void run(const std::string& command) {
    if (std::system((command + " >/dev/null 2>&1").c_str()) != 0) {
        throw std::runtime_error("this has failed: " + command);
    }
}

}  // namespace

KerberosRealm::KerberosRealm() : reservation_(free_port::Reserve()), port_(free_port::Of(reservation_)) {
    writeSettings();
    setenv("KRB5_CONFIG", (directory_.Path() / "krb5.conf").c_str(), 1);
    setenv("KRB5_KDC_PROFILE", (directory_.Path() / "kdc.conf").c_str(), 1);
    setenv("KRB5CCNAME", ("FILE:" + (directory_.Path() / "cache").string()).c_str(), 1);
    nameHost();
    const std::string realm = std::string(" -r ") + kName;
    run(BoundProcess::Find("kdb5_util") + realm + " create -s -P master");
    const std::string service = std::string("cifs/") + kHost;
    for (const std::string& request :
         {std::string("addprinc -pw ") + kPassword + " " + kUser, "addprinc -randkey " + service,
          "ktadd -k " + (directory_.Path() / "keytab").string() + " " + service}) {
        run(BoundProcess::Find("kadmin.local") + realm + " -q '" + request + "'");
    }
    server_ = std::make_unique<BoundProcess>(
        std::vector<std::string>{BoundProcess::Find("krb5kdc"), "-n", "-r", kName});
    if (!waitUntil([this] { return free_port::TakesConnections(port_) || server_->HasEnded(); }) ||
        server_->HasEnded()) {
        throw std::runtime_error("krb5kdc does not start");
    }
}

KerberosRealm::~KerberosRealm() {
    close(reservation_);
    umount2("/etc/hosts", MNT_DETACH);
}

void KerberosRealm::writeSettings() const {
    const std::string address = "127.0.0.1:" + std::to_string(port_);
    const std::string folder = directory_.Path().string();
    std::ofstream(directory_.Path() / "krb5.conf")
        << "[libdefaults]\ndefault_realm = " << kName
        << "\ndns_lookup_realm = false\ndns_lookup_kdc = false\ndns_canonicalize_hostname = false\nrdns = "
           "false\n"
        << "[realms]\n"
        << kName << " = {\nkdc = " << address << "\n}\n[domain_realm]\n"
        << kHost << " = " << kName << "\n";
    // A server of shares that is no member of a domain has no use for a PAC, and refuses it.
    std::ofstream(directory_.Path() / "kdc.conf")
        << "[kdcdefaults]\nkdc_listen = " << address << "\nkdc_tcp_listen = " << address << "\n[realms]\n"
        << kName << " = {\ndatabase_name = " << folder << "/principal\nkey_stash_file = " << folder
        << "/stash\nacl_file = " << folder << "/acl\nmax_life = 10h\ndisable_pac = true\n}\n"
        << "[logging]\nkdc = FILE:" << folder << "/kdc.log\n";
}

void KerberosRealm::nameHost() const {
    const std::string hosts = (directory_.Path() / "hosts").string();
    std::ofstream(hosts) << "127.0.0.1 localhost " << kHost << "\n";
    if (!UsePrivateMounts() || mount(hosts.c_str(), "/etc/hosts", nullptr, MS_BIND, nullptr) != 0) {
        throw std::runtime_error("this test has to mount a file");
    }
}

std::vector<std::string> KerberosRealm::ServerSettings() const {
    return {std::string("realm = ") + kName, "kerberos method = dedicated keytab",
            "dedicated keytab file = " + (directory_.Path() / "keytab").string()};
}

void KerberosRealm::GetTicket() const {
    run(std::string("echo ") + kPassword + " | " + BoundProcess::Find("kinit") + " " + kUser);
}
