// Hours of stream through the built library, at many times real time, with what the process has in use on the
// way: long_recording FILETYPE MINUTES MINUTES-PER-FILE [STEP]. Prints a row of a table each STEP minutes of
// stream.

#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <exception>

#include "endtoend/LongRecording.h"

namespace {

double mebibytes(std::uint64_t bytes) {
    return static_cast<double>(bytes) / (1 << 20);
}

void record(const char* fileType, unsigned minutes, unsigned minutesPerFile, unsigned step) {
    using std::chrono::steady_clock;
    LongRecording recording(fileType, minutesPerFile);
    const auto begin = steady_clock::now();
    std::printf("%s, a file each %u min\n", fileType, minutesPerFile);
    std::printf("| Minutes | Files | Resident MiB | Heap MiB | Open files | Times real time |\n");
    std::printf("|---|---|---|---|---|---|\n");
    for (unsigned minute = 1; minute <= minutes; ++minute) {
        recording.RecordMinute();
        if (minute % step != 0 && minute != 1) {
            continue;
        }
        const double seconds = std::chrono::duration<double>(steady_clock::now() - begin).count();
        const Usage usage = Usage::Now();
        std::printf("| %u | %zu | %.1f | %.2f | %zu | %.0f |\n", minute, recording.FileCount(),
                    mebibytes(usage.residentBytes), mebibytes(usage.heapBytes), usage.openFiles,
                    minute * 60 / seconds);
        std::fflush(stdout);
    }
}

}  // namespace

int main(int argc, char** argv) {
    if (argc < 4) {
        std::fprintf(stderr, "long_recording normal|fragment MINUTES MINUTES-PER-FILE [STEP]\n");
        return 2;
    }
    const auto number = [&](int at) { return static_cast<unsigned>(std::strtoul(argv[at], nullptr, 10)); };
    try {
        record(argv[1], number(2), number(3), argc > 4 ? number(4) : 10);
    } catch (const std::exception& error) {
        std::fprintf(stderr, "%s\n", error.what());
        return 1;
    }
    return 0;
}
