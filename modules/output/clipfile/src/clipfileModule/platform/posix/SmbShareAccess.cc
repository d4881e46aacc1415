#include <cerrno>
#include <memory>
#include <system_error>

#include "platform/SharePath.h"
#include "platform/posix/ShareAccess.h"
#include "platform/posix/SmbSession.h"
#include "platform/posix/SmbStream.h"

namespace clipfileModule::share_access {

namespace {

/// What a thread may do on shares, and over which connection.
struct ThreadRights {
    std::shared_ptr<SmbSession> session;
    /// The error number of a logon that failed. Such a thread has no rights on shares: not those of the
    /// process either, which would let a wrong password write as a guest.
    int refused = 0;
};

/// In the block that a thread has from its start. One that comes with its first use is freed by whichever
/// thread gets the stack next, which the thread sanitizer cannot follow for a thread that was given up.
[[gnu::tls_model("initial-exec")]] thread_local ThreadRights rights;

/// What a token points to.
struct AcceptedLogon {
    std::shared_ptr<SmbSession> session;
};

AcceptedLogon* logonOf(LogonToken token) {
    return reinterpret_cast<AcceptedLogon*>(token);
}

/// A session that has tried to connect. The result is that of `ConnectResult`.
int begin(const SharePath& share, const SmbCredentials& credentials, std::shared_ptr<SmbSession>& session) {
    std::string reason;
    const SmbLibrary* const library = SmbLibrary::Get(reason);
    if (library == nullptr) {
        return ENOTSUP;
    }
    try {
        session = std::make_shared<SmbSession>(*library, share, credentials);
    } catch (const std::system_error& error) {
        return error.code().value();
    }
    return session->ConnectResult();
}

/// Takes `path` apart and finds the calling thread's session for it, or begins one.
int findSession(const std::string& path, SharePath& share) {
    if (rights.refused != 0) {
        return rights.refused;
    }
    if (!SharePath::Parse(path, share)) {
        return EINVAL;
    }
    if (rights.session != nullptr && rights.session->IsOf(share)) {
        return rights.session->ConnectResult();
    }
    const SmbCredentials credentials =
        rights.session != nullptr ? rights.session->Credentials() : SmbCredentials();
    return begin(share, credentials, rights.session);
}

}  // namespace

int Support(std::string& reason) {
    return SmbLibrary::Get(reason) != nullptr ? 0 : ENOTSUP;
}

int Logon(const std::string& userName, const std::string& share, const std::string& password,
          LogonToken& token) {
    SharePath target;
    if (!SharePath::Parse(share, target)) {
        return rights.refused = EINVAL;
    }
    std::shared_ptr<SmbSession> session;
    const int error = begin(target, SmbCredentials::Of(userName, password), session);
    // A share that is not there is no fault of the credentials; who uses it is told.
    if (error != 0 && error != ENOENT) {
        return rights.refused = error;
    }
    token = reinterpret_cast<LogonToken>(new AcceptedLogon{session});
    return 0;
}

int Impersonate(LogonToken token) {
    rights = {logonOf(token)->session, 0};
    return 0;
}

void CloseLogon(LogonToken token) {
    const std::unique_ptr<AcceptedLogon> logon(logonOf(token));
    if (rights.session == logon->session) {
        rights.session = nullptr;
    }
}

int AvailableSpace(const std::string& path, std::uint64_t& bytes) {
    SharePath share;
    const int error = findSession(path, share);
    return error != 0 ? error : rights.session->AvailableSpace(share.Url(), bytes);
}

int TestExistence(const std::string& path) {
    SharePath share;
    const int error = findSession(path, share);
    SmbStatus status;
    return error != 0 ? error : rights.session->Look(share.Url(), status);
}

int CreateDirectories(const std::string& path) {
    SharePath share;
    const int error = findSession(path, share);
    return error != 0 ? error : rights.session->CreateDirectories(share.Url());
}

std::FILE* OpenFile(const std::string& path) {
    SharePath share;
    if (const int error = findSession(path, share)) {
        errno = error;
        return nullptr;
    }
    return SmbStream::OpenFile(rights.session, share.Url());
}

}  // namespace clipfileModule::share_access
