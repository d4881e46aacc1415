#pragma once

#include <cstddef>
#include <cstdint>
#include <memory>
#include <string>
#include <vector>

#include "platform/posix/SmbClient.h"
#include "platform/posix/TimedWorker.h"

namespace clipfileModule {

class SmbStream;

/// How long somebody may be kept waiting.
struct SmbLimits {
    /// By an operation. A writer that is told to stop in the middle of one still ends within the time that it
    /// is given.
    std::chrono::milliseconds operation{3000};
    /// By one answer of the server. Longer than an operation: a time-out of libsmbclient's own looks like
    /// other errors, and does not make the operations that follow fail at once.
    std::chrono::milliseconds answer{4000};
    /// By the farewell to the server.
    std::chrono::milliseconds end{300};
};

/// The connection of one writing thread to a share, whose operations all return within their limit.
/// Behind it a thread of its own drives the client. Once an operation has passed the limit every later one
/// fails with ETIMEDOUT at once, and that thread frees the connection when it can.
///
/// One thread at a time uses a session and its streams. Operations return an error number, 0 for success.
class SmbSession {
 public:
    /// Connects; `ConnectResult` tells how that went. Throws `std::system_error` when no thread can be
    /// started.
    SmbSession(const SmbLibrary& library, const SharePath& share, const SmbCredentials& credentials,
               const SmbLimits& limits = {});
    SmbSession(const SmbSession&) = delete;
    SmbSession& operator=(const SmbSession&) = delete;

    /// As `SmbClient::Connect`. Every operation returns it when it is not 0.
    int ConnectResult() const { return connectResult_; }
    bool IsOf(const SharePath& share) const { return share.ShareUrl() == share_.ShareUrl(); }
    const SmbCredentials& Credentials() const { return credentials_; }

    int Look(const std::string& url, SmbStatus& status);
    int CreateDirectories(const std::string& url);
    /// What the streams of this session hold back is sent first.
    int AvailableSpace(const std::string& url, std::uint64_t& bytes);
    int Open(const std::string& url, SMBCFILE*& file);
    /// `size` is that of the file.
    int OpenForReading(const std::string& url, SMBCFILE*& file, std::uint64_t& size);
    /// Leaves `data` alone afterwards, unless the time-out has passed.
    int Write(SMBCFILE* file, std::int64_t offset, const std::shared_ptr<const std::vector<char>>& data);
    /// `data` gets fewer octets than `size` at the end of the file alone.
    int Read(SMBCFILE* file, std::int64_t offset, std::size_t size, std::vector<char>& data);
    int Close(SMBCFILE* file);
    int Remove(const std::string& url);

    void AddStream(SmbStream& stream) { streams_.push_back(&stream); }
    void RemoveStream(SmbStream& stream);

 private:
    const SharePath share_;
    const SmbCredentials credentials_;
    /// Not owned.
    std::vector<SmbStream*> streams_;
    TimedWorker<SmbClient> worker_;
    int connectResult_ = 0;
};

}  // namespace clipfileModule
