// fopencookie is an extension; its positions have 64 bits.
#ifndef _GNU_SOURCE
#define _GNU_SOURCE
#endif

#include "platform/posix/SmbStream.h"

#include <algorithm>
#include <cerrno>
#include <limits>

namespace clipfileModule {

namespace {

SmbStream& streamOf(void* cookie) {
    return *static_cast<SmbStream*>(cookie);
}

ssize_t readCookie(void* cookie, char* data, std::size_t size) {
    return streamOf(cookie).Read(data, size);
}

ssize_t writeCookie(void* cookie, const char* data, std::size_t size) {
    return streamOf(cookie).Write(data, size);
}

int seekCookie(void* cookie, off64_t* offset, int origin) {
    std::int64_t position = *offset;
    const bool moved = streamOf(cookie).Seek(position, origin);
    *offset = position;
    return moved ? 0 : -1;
}

int closeCookie(void* cookie) {
    const std::unique_ptr<SmbStream> stream(&streamOf(cookie));
    return stream->Close() ? 0 : EOF;
}

}  // namespace

std::FILE* SmbStream::OpenFile(const std::shared_ptr<SmbSession>& session, const std::string& url) {
    SMBCFILE* file = nullptr;
    if (const int error = session->Open(url, file)) {
        errno = error;
        return nullptr;
    }
    auto stream = std::make_unique<SmbStream>(session, file);
    std::FILE* const opened =
        fopencookie(stream.get(), "w+b", {readCookie, writeCookie, seekCookie, closeCookie});
    if (opened == nullptr) {
        const int error = errno;
        stream->Close();
        errno = error;
        return nullptr;
    }
    stream.release();
    std::setvbuf(opened, nullptr, _IONBF, 0);
    return opened;
}

SmbStream::SmbStream(const std::shared_ptr<SmbSession>& session, SMBCFILE* file)
    : session_(session), file_(file) {
    pending_->reserve(kRequestSize);
    session_->AddStream(*this);
}

SmbStream::~SmbStream() {
    session_->RemoveStream(*this);
}

int SmbStream::Flush() {
    if (error_ == 0 && !pending_->empty()) {
        error_ = session_->Write(file_, pendingAt_, pending_);
        if (error_ == 0) {
            pending_->clear();
        }
    }
    return error_;
}

std::int64_t SmbStream::Write(const char* data, std::size_t size) {
    std::size_t taken = 0;
    while (taken != size) {
        const bool continues = position_ == pendingAt_ + static_cast<std::int64_t>(pending_->size());
        if ((!continues || pending_->size() == kRequestSize || error_ != 0) && Flush() != 0) {
            errno = error_;
            return 0;
        }
        if (pending_->empty()) {
            pendingAt_ = position_;
        }
        const std::size_t count = std::min(size - taken, kRequestSize - pending_->size());
        pending_->insert(pending_->end(), data + taken, data + taken + count);
        taken += count;
        position_ += static_cast<std::int64_t>(count);
        length_ = std::max(length_, position_);
    }
    return static_cast<std::int64_t>(size);
}

std::int64_t SmbStream::Read(char* data, std::size_t size) {
    std::vector<char> read;
    int error = Flush();
    if (error == 0) {
        error = session_->Read(file_, position_, std::min(size, kRequestSize), read);
    }
    if (error != 0) {
        errno = error;
        return -1;
    }
    std::copy(read.begin(), read.end(), data);
    position_ += static_cast<std::int64_t>(read.size());
    return static_cast<std::int64_t>(read.size());
}

bool SmbStream::Seek(std::int64_t& offset, int origin) {
    const std::int64_t from = origin == SEEK_SET ? 0 : origin == SEEK_CUR ? position_ : length_;
    if (offset < -from || offset > std::numeric_limits<std::int64_t>::max() - from) {
        errno = EINVAL;
        return false;
    }
    position_ = from + offset;
    offset = position_;
    return true;
}

bool SmbStream::Close() {
    const int flushed = Flush();
    const int closed = session_->Close(file_);
    const int error = flushed != 0 ? flushed : closed;
    if (error != 0) {
        errno = error;
    }
    return error == 0;
}

}  // namespace clipfileModule
