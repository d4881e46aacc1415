#pragma once

#include <chrono>
#include <cstddef>
#include <cstdint>
#include <string>
#include <vector>

#include "platform/SharePath.h"
#include "platform/posix/SmbLibrary.h"

namespace clipfileModule {

/// Who logs on to a server. An empty user stands for the process's own rights: those of its Kerberos ticket
/// where it has one that the server takes, else those of a guest.
struct SmbCredentials {
    /// `userName` as `DOMAIN\user`, `user@domain` or a user alone.
    static SmbCredentials Of(const std::string& userName, const std::string& password);

    std::string domain;
    std::string user;
    std::string password;
};

/// What the server says of a file or a folder.
struct SmbStatus {
    bool isFolder = false;
    /// Of a file, in bytes.
    std::uint64_t size = 0;
};

/// One connection to one share, over SMB 2 or later, encrypted as the server asks for it. That of a user is
/// signed, one with the process's own rights as the server asks for it. Never connects again by itself: a
/// connection that is lost stays lost, and all operations fail from then on.
///
/// Used by one thread from the constructor to the destructor; each operation may wait for the network, some
/// for several of its time-outs. All return an error number, 0 for success. URLs are those of `SharePath`.
class SmbClient {
 public:
    /// `answerTimeout` is how long libsmbclient waits for an answer. A server that is not there, or does not
    /// answer, is known in less.
    SmbClient(const SmbLibrary& library, const SharePath& share, const SmbCredentials& credentials,
              std::chrono::milliseconds answerTimeout);
    /// Closes the files that are still open, and disconnects.
    ~SmbClient();
    SmbClient(const SmbClient&) = delete;
    SmbClient& operator=(const SmbClient&) = delete;

    /// ENOENT when the server is there and accepts the credentials, but has no such share; EACCES when it
    /// does not accept them for the share.
    int Connect();

    int Look(const std::string& url, SmbStatus& status);
    /// Makes `url` and what is missing above it, up to the share, which is `shareUrl`. EEXIST when it is
    /// there.
    int CreateDirectories(const std::string& shareUrl, const std::string& url);
    /// Bytes that the user may still write. Of the share of `file`, where there is one: that asks the server
    /// one question, while a folder at `url` is opened and read first.
    int AvailableSpace(const std::string& url, SMBCFILE* file, std::uint64_t& bytes);
    /// Creates the file, or truncates it, and keeps other writers off it.
    int Open(const std::string& url, SMBCFILE*& file);
    /// Opens a file that is there, and keeps nobody off it.
    int OpenForReading(const std::string& url, SMBCFILE*& file);
    int Write(SMBCFILE* file, std::int64_t offset, const char* data, std::size_t size);
    /// `count` is below `size` at the end of the file alone.
    int Read(SMBCFILE* file, std::int64_t offset, char* data, std::size_t size, std::size_t& count);
    int Close(SMBCFILE* file);
    /// Deletes a file.
    int Remove(const std::string& url);

 private:
    static SmbClient& of(SMBCCTX* context);
    static void fillIn(SMBCCTX* context, const char* server, const char* share, char* workgroup,
                       int workgroupSize, char* user, int userSize, char* password, int passwordSize);
    static int onServerAdded(SMBCCTX* context, SMBCSRV* server, const char* name, const char* share,
                             const char* workgroup, const char* user);
    static int onServerRemoved(SMBCCTX* context, SMBCSRV* server);

    void leave();
    SMBCCTX* makeContext(std::chrono::milliseconds answerTimeout);
    int open(const std::string& url, int flags, smbc_share_mode shareMode, SMBCFILE*& file);

    const SmbLibrary& library_;
    const SharePath share_;
    const SmbCredentials credentials_;
    /// Of the process's Kerberos ticket, where `credentials_` has no user. Empty without one.
    std::string ticketUser_;
    const std::chrono::milliseconds probeLimit_;
    SMBCCTX* context_ = nullptr;
    /// Of libsmbclient; ours stand before them.
    smbc_add_cached_srv_fn addServer_ = nullptr;
    smbc_remove_cached_srv_fn removeServer_ = nullptr;
    /// What every operation fails with while there is no connection; 0 while there is one.
    int lost_ = 0;
    std::vector<SMBCFILE*> files_;
};

}  // namespace clipfileModule
