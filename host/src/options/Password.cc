#include "options/Password.h"

#include <fcntl.h>
#include <stdlib.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <cstring>

#include "common/ReceiverError.h"

namespace receiver {
namespace {

ReceiverError Wrong(const std::string& name, const std::string& file, const std::string& what) {
    return {ExitCode::kUsage, name + " " + file + " " + what};
}

/// Up to the end of the line, or of the file. What comes behind it, of a pipe for one, is left there.
bool ReadLine(int file, std::string& line) {
    std::array<char, 512> data{};
    while (line.find('\n') == std::string::npos) {
        const ssize_t count = read(file, data.data(), data.size());
        if (count < 0 && errno == EINTR) {
            continue;
        }
        if (count <= 0) {
            return count == 0;
        }
        line.append(data.data(), static_cast<std::size_t>(count));
    }
    return true;
}

}  // namespace

std::string ReadPasswordFile(const std::string& name, const std::string& file) {
    const int descriptor = open(file.c_str(), O_RDONLY | O_CLOEXEC);
    struct stat status = {};
    std::string line;
    bool read = descriptor >= 0 && fstat(descriptor, &status) == 0;
    // A pipe belongs to those who hold its ends.
    const bool shared = S_ISREG(status.st_mode) && (status.st_mode & S_IROTH) != 0;
    read = read && (shared || ReadLine(descriptor, line));
    const int error = errno;
    if (descriptor >= 0) {
        close(descriptor);
    }
    if (!read) {
        throw Wrong(name, file, std::string("cannot be read: ") + std::strerror(error) + ".");
    }
    if (shared) {
        throw Wrong(name, file,
                    "can be read by everybody on this machine; keep it to its owner (chmod 600).");
    }
    line.erase(std::min(line.find('\n'), line.size()));
    if (line.ends_with('\r')) {
        line.pop_back();
    }
    if (line.empty()) {
        throw Wrong(name, file, "has no password in its first line.");
    }
    return line;
}

std::optional<std::string> PasswordOfService() {
    if (const char* const folder = getenv("CREDENTIALS_DIRECTORY")) {
        const std::string file = std::string(folder) + "/" + kPasswordCredential;
        if (access(file.c_str(), F_OK) == 0) {
            return ReadPasswordFile("the credential", file);
        }
    }
    const char* const set = getenv(kPasswordVariable);
    return set != nullptr && *set != '\0' ? std::optional<std::string>(set) : std::nullopt;
}

void HidePasswordVariable() {
    if (char* const set = getenv(kPasswordVariable)) {
        std::memset(set, 'x', std::strlen(set));
        unsetenv(kPasswordVariable);
    }
}

}  // namespace receiver
