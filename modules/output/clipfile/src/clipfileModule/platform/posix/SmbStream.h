#pragma once

#include <cstddef>
#include <cstdint>
#include <cstdio>
#include <memory>
#include <string>
#include <vector>

#include "platform/posix/SmbSession.h"

namespace clipfileModule {

/// A file on a share as a stdio stream, open for reading and writing, with positions of 64 bits. What is
/// written in one piece, whatever number of calls it took, goes to the server in requests of `kRequestSize`;
/// the stream itself has no buffer, because stdio empties that at each seek, reads ahead after it, and box
/// writers seek before every box. So `fflush` does not reach the server: closing does, and the session's look
/// at the free space, which comes before every chunk. A write that fails later than its call fails every
/// later call.
class SmbStream {
 public:
    /// Large enough that the time of a request goes into its transfer.
    static constexpr std::size_t kRequestSize = 1U << 20U;

    /// Creates or truncates `url`. Null, with `errno` set, when that fails. The stream keeps the session.
    static std::FILE* OpenFile(const std::shared_ptr<SmbSession>& session, const std::string& url);

    SmbStream(const std::shared_ptr<SmbSession>& session, SMBCFILE* file);
    ~SmbStream();
    SmbStream(const SmbStream&) = delete;
    SmbStream& operator=(const SmbStream&) = delete;

    SMBCFILE* File() const { return file_; }
    /// Sends what is held back. Returns the error number of the stream.
    int Flush();

    // As the operations of a cookie: on a failure, the return value is what fopencookie(3) wants and `errno`
    // is set.
    std::int64_t Write(const char* data, std::size_t size);
    std::int64_t Read(char* data, std::size_t size);
    bool Seek(std::int64_t& offset, int origin);
    bool Close();

 private:
    const std::shared_ptr<SmbSession> session_;
    SMBCFILE* const file_;
    std::int64_t position_ = 0;
    /// Nobody else writes to the file, so that the server need not be asked.
    std::int64_t length_ = 0;
    /// Written, not sent, from `pendingAt_` on.
    std::shared_ptr<std::vector<char>> pending_ = std::make_shared<std::vector<char>>();
    std::int64_t pendingAt_ = 0;
    int error_ = 0;
};

}  // namespace clipfileModule
