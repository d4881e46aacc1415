#include "reader/InputFile.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <system_error>

#include "common/ToolError.h"
#include "reader/FormatError.h"

namespace clipfile {

namespace {

ToolError Unreadable(const std::filesystem::path& path, const std::string& what) {
    return {ExitCode::kUnreadable, path.string() + " " + what + "."};
}

std::string Reason(int error) {
    return std::generic_category().message(error);
}

}  // namespace

InputFile::InputFile(const std::filesystem::path& path) : path_(path) {
    // A pipe that nobody writes to must not hold the program up.
    descriptor_ = open(path.c_str(), O_RDONLY | O_CLOEXEC | O_NONBLOCK);
    if (descriptor_ < 0) {
        throw Unreadable(path, errno == ENOENT ? "does not exist" : "cannot be opened: " + Reason(errno));
    }
    struct stat status = {};
    if (fstat(descriptor_, &status) != 0) {
        const int error = errno;
        close(descriptor_);
        throw Unreadable(path, "cannot be examined: " + Reason(error));
    }
    std::string fault;
    if (S_ISDIR(status.st_mode)) {
        fault = "is a folder, not a file";
    } else if (!S_ISREG(status.st_mode)) {
        fault = "is no regular file";
    } else if (status.st_size == 0) {
        fault = "is empty";
    }
    if (!fault.empty()) {
        close(descriptor_);
        throw NoRecordingError(path.string() + " " + fault + ".");
    }
    size_ = static_cast<std::uint64_t>(status.st_size);
    modifiedSeconds_ = status.st_mtim.tv_sec;
}

InputFile::~InputFile() {
    close(descriptor_);
}

void InputFile::Read(std::uint64_t offset, std::span<unsigned char> buffer) const {
    if (offset > size_ || buffer.size() > size_ - offset) {
        throw FormatError(offset, "The file ends inside of what begins at " + std::to_string(offset) + ".");
    }
    while (!buffer.empty()) {
        const ssize_t count = pread(descriptor_, buffer.data(), buffer.size(), static_cast<off_t>(offset));
        if (count < 0 && errno == EINTR) {
            continue;
        }
        if (count < 0) {
            throw Unreadable(path_, "cannot be read at " + std::to_string(offset) + ": " + Reason(errno));
        }
        if (count == 0) {
            throw Unreadable(path_, "has become shorter while it was read");
        }
        buffer = buffer.subspan(static_cast<std::size_t>(count));
        offset += static_cast<std::uint64_t>(count);
    }
}

std::vector<unsigned char> InputFile::Read(std::uint64_t offset, std::size_t size) const {
    if (offset > size_ || size > size_ - offset) {
        throw FormatError(offset, "The file ends inside of what begins at " + std::to_string(offset) + ".");
    }
    std::vector<unsigned char> bytes(size);
    Read(offset, std::span(bytes));
    return bytes;
}

}  // namespace clipfile
