#include "platform/posix/SmbSession.h"

#include <algorithm>
#include <utility>

#include "platform/posix/SmbStream.h"

namespace clipfileModule {

// A job may outlive the call that gave it to the worker: it takes copies, and puts results where both look.

SmbSession::SmbSession(const SmbLibrary& library, const SharePath& share, const SmbCredentials& credentials,
                       const SmbLimits& limits)
    : share_(share),
      credentials_(credentials),
      worker_(
          [&library, share, credentials, answer = limits.answer] {
              return std::make_unique<SmbClient>(library, share, credentials, answer);
          },
          limits.operation, limits.end) {
    connectResult_ = worker_.Run([](SmbClient& client) { return client.Connect(); });
}

int SmbSession::Look(const std::string& url, SmbStatus& status) {
    if (connectResult_ != 0) {
        return connectResult_;
    }
    const auto result = std::make_shared<SmbStatus>();
    const int error = worker_.Run([url, result](SmbClient& client) { return client.Look(url, *result); });
    if (error == 0) {
        status = *result;
    }
    return error;
}

int SmbSession::CreateDirectories(const std::string& url) {
    return connectResult_ != 0 ? connectResult_
                               : worker_.Run([shareUrl = share_.ShareUrl(), url](SmbClient& client) {
                                     return client.CreateDirectories(shareUrl, url);
                                 });
}

int SmbSession::AvailableSpace(const std::string& url, std::uint64_t& bytes) {
    if (connectResult_ != 0) {
        return connectResult_;
    }
    for (SmbStream* const stream : streams_) {
        // A failure is the stream's: it fails with it from now on.
        stream->Flush();
    }
    SMBCFILE* const file = streams_.empty() ? nullptr : streams_.back()->File();
    const auto result = std::make_shared<std::uint64_t>(0);
    const int error = worker_.Run(
        [url, file, result](SmbClient& client) { return client.AvailableSpace(url, file, *result); });
    if (error == 0) {
        bytes = *result;
    }
    return error;
}

int SmbSession::Open(const std::string& url, SMBCFILE*& file) {
    if (connectResult_ != 0) {
        return connectResult_;
    }
    const auto result = std::make_shared<SMBCFILE*>(nullptr);
    const int error = worker_.Run([url, result](SmbClient& client) { return client.Open(url, *result); });
    if (error == 0) {
        file = *result;
    }
    return error;
}

int SmbSession::OpenForReading(const std::string& url, SMBCFILE*& file, std::uint64_t& size) {
    if (connectResult_ != 0) {
        return connectResult_;
    }
    const auto opened = std::make_shared<SMBCFILE*>(nullptr);
    const auto status = std::make_shared<SmbStatus>();
    const int error = worker_.Run([url, opened, status](SmbClient& client) {
        const int failure = client.Look(url, *status);
        return failure != 0 ? failure : client.OpenForReading(url, *opened);
    });
    if (error == 0) {
        file = *opened;
        size = status->size;
    }
    return error;
}

int SmbSession::Write(SMBCFILE* file, std::int64_t offset,
                      const std::shared_ptr<const std::vector<char>>& data) {
    return worker_.Run([file, offset, data](SmbClient& client) {
        return client.Write(file, offset, data->data(), data->size());
    });
}

int SmbSession::Read(SMBCFILE* file, std::int64_t offset, std::size_t size, std::vector<char>& data) {
    const auto result = std::make_shared<std::vector<char>>(size);
    const int error = worker_.Run([file, offset, result](SmbClient& client) {
        std::size_t count = 0;
        const int failure = client.Read(file, offset, result->data(), result->size(), count);
        result->resize(count);
        return failure;
    });
    if (error == 0) {
        data = std::move(*result);
    }
    return error;
}

int SmbSession::Close(SMBCFILE* file) {
    return worker_.Run([file](SmbClient& client) { return client.Close(file); });
}

int SmbSession::Remove(const std::string& url) {
    return connectResult_ != 0 ? connectResult_
                               : worker_.Run([url](SmbClient& client) { return client.Remove(url); });
}

void SmbSession::RemoveStream(SmbStream& stream) {
    streams_.erase(std::remove(streams_.begin(), streams_.end(), &stream), streams_.end());
}

}  // namespace clipfileModule
