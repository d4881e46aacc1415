// Positions of 64 bits also where the system's own default is 32.
#define _FILE_OFFSET_BITS 64

#include "platform/posix/SmbClient.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <sys/statvfs.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <chrono>
#include <cstdio>
#include <optional>

#include "platform/posix/PosixPlatform.h"
#include "platform/posix/TcpProbe.h"

namespace clipfileModule {

namespace {

/// Fields of this size, with the terminator, are what libsmbclient copies credentials through.
constexpr std::size_t kFieldSize = 256;

/// Below the time-out of an operation, so that a server that is switched off is known by its own error.
std::chrono::milliseconds probeLimit(std::chrono::milliseconds answerTimeout) {
    return answerTimeout * 5 / 8;
}

/// What the last call left in `errno`, which it does not always set.
int lastError() {
    return errno != 0 ? errno : EIO;
}

int resultOf(bool success) {
    return success ? 0 : lastError();
}

void dropMessage(void* /*data*/, int /*level*/, const char* /*message*/) {}

void knowNobody(SMBCCTX* /*context*/, const char* /*server*/, const char* /*share*/, char* /*workgroup*/,
                int /*workgroupSize*/, char* /*user*/, int /*userSize*/, char* /*password*/,
                int /*passwordSize*/) {}

/// By default libsmbclient asks the server for an echo before operations, and connects again by itself.
int trustServer(SMBCCTX* /*context*/, SMBCSRV* /*server*/) {
    return 0;
}

/// Stands around calls over a connection. Takes `ProcessLock`, but only where the library takes no threads.
class Turn {
 public:
    explicit Turn(const SmbLibrary& library) {
        if (!library.takesThreads) {
            lock_.emplace(SmbLibrary::ProcessLock());
        }
    }
    Turn(const Turn&) = delete;
    Turn& operator=(const Turn&) = delete;

 private:
    std::optional<MutexLock> lock_;
};

/// Connections that begin meanwhile are signed, whatever else smb.conf(5) says. A server that would rather
/// make a guest of who it does not know has no key to sign with, and that logon fails. Under `ProcessLock`.
class RequiredSigning {
 public:
    explicit RequiredSigning(const SmbLibrary& library)
        // -1 wraps to the first name.
        : library_(library), before_(kNames.at(static_cast<std::size_t>(library.clientSigning()) + 1)) {
        set("required");
    }
    ~RequiredSigning() { set(before_); }
    RequiredSigning(const RequiredSigning&) = delete;
    RequiredSigning& operator=(const RequiredSigning&) = delete;

 private:
    /// From the number -1 on.
    static constexpr std::array<const char*, 5> kNames{"default", "disabled", "if_required", "desired",
                                                       "required"};

    void set(const char* value) const { library_.setParameter(-1, "client signing", value); }

    const SmbLibrary& library_;
    const char* const before_;
};

/// An SMB2 NEGOTIATE request (MS-SMB2 2.2.1.2 and 2.2.3) with its length in front (2.1), to which every
/// server has an answer, if it is that it knows none of the dialects.
const std::string& negotiateRequest() {
    using namespace std::string_literals;
    static const std::string request =
        "\x00\x00\x00\x6C"s            // length
        "\xFESMB\x40\x00"s             // protocol, size of the header
        + std::string(6, '\0')         // credit charge, status
        + "\x00\x00\x01\x00"s          // command, credits
        + std::string(48, '\0')        // flags to signature
        + "\x24\x00\x04\x00\x01\x00"s  // size of the body, dialects, signing enabled
        + std::string(30, '\0')        // capabilities, client, negotiate contexts
        + "\x02\x02\x10\x02\x00\x03\x02\x03"s;
    return request;
}

/// Keeps what all contexts share alive. Under `ProcessLock`.
void keepLibraryInitialised(const SmbLibrary& library) {
    static SMBCCTX* kept = nullptr;
    if (kept == nullptr) {
        kept = library.newContext();
        if (kept != nullptr) {
            // Its messages would go to the standard output of the host.
            library.setLogCallback(kept, nullptr, dropMessage);
            library.setFunctionAuthDataWithContext(kept, knowNobody);
            library.initContext(kept);
        }
    }
}

}  // namespace

SmbCredentials SmbCredentials::Of(const std::string& userName, const std::string& password) {
    if (const std::size_t separator = userName.find('\\'); separator != std::string::npos) {
        return {userName.substr(0, separator), userName.substr(separator + 1), password};
    }
    if (const std::size_t separator = userName.rfind('@'); separator != std::string::npos) {
        return {userName.substr(separator + 1), userName.substr(0, separator), password};
    }
    return {"", userName, password};
}

SmbClient::SmbClient(const SmbLibrary& library, const SharePath& share, const SmbCredentials& credentials,
                     std::chrono::milliseconds answerTimeout)
    : library_(library),
      share_(share),
      credentials_(credentials),
      probeLimit_(probeLimit(answerTimeout)),
      lost_(ENOTCONN) {
    ++SmbLibrary::Clients();
    MutexLock lock(SmbLibrary::ProcessLock());
    if (credentials_.user.empty()) {
        ticketUser_ = library_.TicketUser();
    }
    context_ = makeContext(answerTimeout);
}

SmbClient::~SmbClient() {
    if (context_ != nullptr) {
        leave();
    }
    --SmbLibrary::Clients();
}

void SmbClient::leave() {
    while (!files_.empty()) {
        Close(files_.back());
    }
    {
        // Tells the server, without the lock; what is left to free then waits for nobody.
        const Turn turn(library_);
        library_.getFunctionPurgeCachedServers(context_)(context_);
    }
    MutexLock lock(SmbLibrary::ProcessLock());
    library_.freeContext(context_, 1);
}

SMBCCTX* SmbClient::makeContext(std::chrono::milliseconds answerTimeout) {
    keepLibraryInitialised(library_);
    SMBCCTX* const context = library_.newContext();
    if (context == nullptr) {
        return nullptr;
    }
    library_.setDebug(context, 0);
    library_.setTimeout(context, static_cast<int>(answerTimeout.count()));
    library_.setOptionUserData(context, this);
    library_.setFunctionAuthDataWithContext(context, fillIn);
    // A user is what it looks for tickets with: without one it is a guest at once.
    library_.setUser(context, credentials_.user.empty() ? ticketUser_.c_str() : credentials_.user.c_str());
    library_.setWorkgroup(context, credentials_.domain.c_str());
    // Credentials that are refused would else be followed by an attempt as a guest, of the library's own.
    library_.setOptionNoAutoAnonymousLogin(context, credentials_.user.empty() ? 0 : 1);
    library_.setOptionUseKerberos(context, ticketUser_.empty() ? 0 : 1);
    library_.setOptionUseCCache(context, 0);
    library_.setFunctionCheckServer(context, trustServer);
    addServer_ = library_.getFunctionAddCachedServer(context);
    library_.setFunctionAddCachedServer(context, onServerAdded);
    removeServer_ = library_.getFunctionRemoveCachedServer(context);
    library_.setFunctionRemoveCachedServer(context, onServerRemoved);
    if (library_.initContext(context) == nullptr ||
        library_.setOptionProtocols(context, "SMB2_02", nullptr) == 0) {
        library_.freeContext(context, 1);
        return nullptr;
    }
    return context;
}

SmbClient& SmbClient::of(SMBCCTX* context) {
    std::string reason;
    return *static_cast<SmbClient*>(SmbLibrary::Get(reason)->getOptionUserData(context));
}

void SmbClient::fillIn(SMBCCTX* context, const char* /*server*/, const char* /*share*/, char* workgroup,
                       int workgroupSize, char* user, int userSize, char* password, int passwordSize) {
    const auto fill = [](char* field, int size, const std::string& text) {
        std::snprintf(field, static_cast<std::size_t>(size), "%s", text.c_str());
    };
    const SmbClient& self = of(context);
    const SmbCredentials& credentials = self.credentials_;
    fill(workgroup, workgroupSize, credentials.domain);
    fill(user, userSize, credentials.user.empty() ? self.ticketUser_ : credentials.user);
    fill(password, passwordSize, credentials.password);
}

int SmbClient::onServerAdded(SMBCCTX* context, SMBCSRV* server, const char* name, const char* share,
                             const char* workgroup, const char* user) {
    SmbClient& self = of(context);
    const int result = self.addServer_(context, server, name, share, workgroup, user);
    if (result == 0) {
        self.lost_ = 0;
    }
    return result;
}

int SmbClient::onServerRemoved(SMBCCTX* context, SMBCSRV* server) {
    SmbClient& self = of(context);
    self.lost_ = ECONNABORTED;
    return self.removeServer_(context, server);
}

int SmbClient::Connect() {
    if (context_ == nullptr) {
        return ENOMEM;
    }
    if (std::max({credentials_.domain.size(), credentials_.user.size(), credentials_.password.size(),
                  ticketUser_.size()}) >= kFieldSize) {
        return lost_ = EINVAL;
    }
    // Resolving, reaching and waking the server can take long; what holds the lock below must not wait for
    // that.
    if (const int unreachable = ProbeTcp(share_.Server(), share_.Port(), probeLimit_, negotiateRequest())) {
        return lost_ = unreachable;
    }
    MutexLock lock(SmbLibrary::ProcessLock());
    std::optional<RequiredSigning> signing;
    if (!credentials_.user.empty()) {
        signing.emplace(library_);
    }
    struct stat status = {};
    errno = 0;
    const int result = library_.getFunctionStat(context_)(context_, share_.ShareUrl().c_str(), &status);
    if (lost_ != 0) {
        lost_ = result != 0 ? lastError() : EIO;
    }
    // A root that may not be looked at can have folders that may be written to.
    return lost_;
}

int SmbClient::Look(const std::string& url, SmbStatus& status) {
    if (lost_ != 0) {
        return lost_;
    }
    const Turn turn(library_);
    struct stat found = {};
    errno = 0;
    if (library_.getFunctionStat(context_)(context_, url.c_str(), &found) != 0) {
        return lastError();
    }
    status = {S_ISDIR(found.st_mode), static_cast<std::uint64_t>(found.st_size)};
    return 0;
}

int SmbClient::CreateDirectories(const std::string& shareUrl, const std::string& url) {
    if (lost_ != 0) {
        return lost_;
    }
    if (url.size() <= shareUrl.size()) {
        return EEXIST;
    }
    const auto make = [this](const std::string& folder) {
        const Turn turn(library_);
        errno = 0;
        return resultOf(library_.getFunctionMkdir(context_)(context_, folder.c_str(), 0777) == 0);
    };
    const int error = make(url);
    if (error != ENOENT) {
        return error;
    }
    const std::string above = url.substr(0, url.rfind('/'));
    const int errorAbove = above.size() > shareUrl.size() ? CreateDirectories(shareUrl, above) : error;
    return errorAbove == 0 || errorAbove == EEXIST ? make(url) : errorAbove;
}

int SmbClient::AvailableSpace(const std::string& url, SMBCFILE* file, std::uint64_t& bytes) {
    if (lost_ != 0) {
        return lost_;
    }
    const Turn turn(library_);
    struct statvfs status = {};
    errno = 0;
    std::string path = url;
    const int result = file != nullptr
                           ? library_.getFunctionFstatVFS(context_)(context_, file, &status)
                           : library_.getFunctionStatVFS(context_)(context_, path.data(), &status);
    // A question without an answer counts as success there, with nothing filled in.
    if (result != 0 || status.f_bsize == 0 || status.f_frsize == 0) {
        return lastError();
    }
    // Here the second one is sectors in a block (MS-FSCC 2.5.4), unlike in POSIX.
    bytes = PosixPlatform::ToBytes(PosixPlatform::ToBytes(status.f_bavail, status.f_frsize), status.f_bsize);
    return 0;
}

int SmbClient::Open(const std::string& url, SMBCFILE*& file) {
    return open(url, O_RDWR | O_CREAT | O_TRUNC, SMBC_SHAREMODE_DENY_WRITE, file);
}

int SmbClient::OpenForReading(const std::string& url, SMBCFILE*& file) {
    return open(url, O_RDONLY, SMBC_SHAREMODE_DENY_NONE, file);
}

int SmbClient::open(const std::string& url, int flags, smbc_share_mode shareMode, SMBCFILE*& file) {
    if (lost_ != 0) {
        return lost_;
    }
    const Turn turn(library_);
    library_.setOptionOpenShareMode(context_, shareMode);
    errno = 0;
    SMBCFILE* const opened = library_.getFunctionOpen(context_)(context_, url.c_str(), flags, 0666);
    if (opened == nullptr) {
        return lastError();
    }
    files_.push_back(opened);
    file = opened;
    return 0;
}

int SmbClient::Write(SMBCFILE* file, std::int64_t offset, const char* data, std::size_t size) {
    if (lost_ != 0) {
        return lost_;
    }
    const Turn turn(library_);
    errno = 0;
    if (library_.getFunctionLseek(context_)(context_, file, offset, SEEK_SET) != offset) {
        return lastError();
    }
    while (size != 0) {
        errno = 0;
        const ssize_t written = library_.getFunctionWrite(context_)(context_, file, data, size);
        if (written <= 0) {
            return lastError();
        }
        data += written;
        size -= static_cast<std::size_t>(written);
    }
    return 0;
}

int SmbClient::Read(SMBCFILE* file, std::int64_t offset, char* data, std::size_t size, std::size_t& count) {
    if (lost_ != 0) {
        return lost_;
    }
    const Turn turn(library_);
    count = 0;
    errno = 0;
    if (library_.getFunctionLseek(context_)(context_, file, offset, SEEK_SET) != offset) {
        return lastError();
    }
    while (count != size) {
        errno = 0;
        const ssize_t read = library_.getFunctionRead(context_)(context_, file, data + count, size - count);
        if (read < 0) {
            return lastError();
        }
        if (read == 0) {
            break;
        }
        count += static_cast<std::size_t>(read);
    }
    return 0;
}

int SmbClient::Close(SMBCFILE* file) {
    const Turn turn(library_);
    files_.erase(std::remove(files_.begin(), files_.end(), file), files_.end());
    errno = 0;
    return resultOf(library_.getFunctionClose(context_)(context_, file) == 0);
}

int SmbClient::Remove(const std::string& url) {
    if (lost_ != 0) {
        return lost_;
    }
    const Turn turn(library_);
    errno = 0;
    return resultOf(library_.getFunctionUnlink(context_)(context_, url.c_str()) == 0);
}

}  // namespace clipfileModule
