// Positions have 64 bits whatever the system's own default is.
#define _FILE_OFFSET_BITS 64

#include "boxlib/platform/stream_file.h"

#include <fcntl.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>

static_assert(sizeof(off_t) == 8);

namespace {

// Contract: advisory-lock. False when another writer holds the file. A file system without locks protects
// nothing, but can be recorded to.
bool lockAgainstWriters(int descriptor) {
    int result = 0;
    do {
        result = flock(descriptor, LOCK_EX | LOCK_NB);
    } while (result != 0 && errno == EINTR);
    return result == 0 || errno != EWOULDBLOCK;
}

// Truncates what has a length. As with fopen, a FIFO or a device is taken as it is.
bool truncateFile(int descriptor) {
    struct stat status = {};
    if (fstat(descriptor, &status) != 0) return false;
    return !S_ISREG(status.st_mode) || ftruncate(descriptor, 0) == 0;
}

}  // namespace

std::FILE* MbxOpenStream(const char* path) {
    // Not fopen: its "w" truncates before a lock can be taken.
    const int descriptor = open(path, O_RDWR | O_CREAT | O_CLOEXEC, 0666);
    if (descriptor < 0) return nullptr;
    std::FILE* stream = nullptr;
    if (lockAgainstWriters(descriptor) && truncateFile(descriptor)) stream = fdopen(descriptor, "w+b");
    if (stream == nullptr) close(descriptor);
    return stream;
}

bool MbxSeekStream(std::FILE* stream, int64_t offset, int origin) {
    return fseeko(stream, offset, origin) == 0;
}

int64_t MbxTellStream(std::FILE* stream) {
    return ftello(stream);
}
