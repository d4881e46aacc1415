// What a share takes: the stream that recordings are written through, beside `smbclient put` of the same
// bytes. The server is a Samba on the same machine; TMPDIR=/dev/shm keeps disks out of the figures.

#include <benchmark/benchmark.h>
#include <sys/resource.h>

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <memory>
#include <string>
#include <vector>

#include "platform/posix/SmbStream.h"
#include "support/SambaServer.h"
#include "support/TempDir.h"

namespace {

using clipfileModule::SharePath;
using clipfileModule::SmbCredentials;
using clipfileModule::SmbLibrary;
using clipfileModule::SmbSession;
using clipfileModule::SmbStream;

constexpr std::size_t kFileSize = std::size_t{512} << 20U;
/// A picture at 50 Mbit/s and 60 frames a second.
constexpr std::size_t kWriteSize = 100000;

double processorSeconds(int who) {
    rusage usage = {};
    getrusage(who, &usage);
    const auto seconds = [](const timeval& time) {
        return static_cast<double>(time.tv_sec) + static_cast<double>(time.tv_usec) / 1e6;
    };
    return seconds(usage.ru_utime) + seconds(usage.ru_stime);
}

/// Processor seconds of the client alone, for each GB.
void report(benchmark::State& state, double processor) {
    const auto bytes = static_cast<double>(state.iterations()) * static_cast<double>(kFileSize);
    state.SetBytesProcessed(static_cast<std::int64_t>(bytes));
    state.counters["cpu_s_per_GB"] = processor / (bytes / 1e9);
}

/// From the logon to the closed file.
void BM_Stream(benchmark::State& state) {
    const SambaServer server;
    const std::vector<char> picture(kWriteSize, 'x');
    std::string reason;
    const SmbLibrary* const library = SmbLibrary::Get(reason);
    SharePath path;
    if (library == nullptr || !SharePath::Parse(server.Path() + "\\file", path)) {
        state.SkipWithError("no libsmbclient");
        return;
    }
    const double before = processorSeconds(RUSAGE_SELF);
    for (auto _ : state) {
        const auto session = std::make_shared<SmbSession>(
            *library, path, SmbCredentials::Of(SambaServer::kUser, SambaServer::kPassword));
        std::FILE* const file = SmbStream::OpenFile(session, path.Url());
        if (file == nullptr) {
            state.SkipWithError("the share cannot be written to");
            return;
        }
        std::size_t left = kFileSize;
        while (left != 0 && std::ferror(file) == 0) {
            left -= std::fwrite(picture.data(), 1, std::min(left, picture.size()), file);
        }
        if (std::fclose(file) != 0 || left != 0) {
            state.SkipWithError("the file cannot be written");
            return;
        }
    }
    report(state, processorSeconds(RUSAGE_SELF) - before);
}
BENCHMARK(BM_Stream)->Unit(benchmark::kMillisecond)->UseRealTime();

void BM_SmbclientPut(benchmark::State& state) {
    const SambaServer server;
    const TempDir directory;
    std::ofstream(directory.Path() / "login")
        << "username = " << SambaServer::kUser << "\npassword = " << SambaServer::kPassword << "\n";
    {
        std::ofstream file(directory.Path() / "file", std::ios::binary);
        const std::vector<char> block(1U << 20U, 'x');
        for (std::size_t left = kFileSize; left != 0; left -= block.size()) {
            file.write(block.data(), static_cast<std::streamsize>(block.size()));
        }
    }
    // Signed, as the connection of a user is.
    const std::string command = "smbclient --option='client signing = required' -A '" +
                                (directory.Path() / "login").string() + "' -p " +
                                std::to_string(server.Port()) + " //127.0.0.1/rec -c 'put \"" +
                                (directory.Path() / "file").string() + "\" file' >/dev/null 2>&1";
    const double before = processorSeconds(RUSAGE_CHILDREN);
    for (auto _ : state) {
        if (std::system(command.c_str()) != 0) {
            state.SkipWithError("smbclient has failed");
            return;
        }
    }
    report(state, processorSeconds(RUSAGE_CHILDREN) - before);
}
BENCHMARK(BM_SmbclientPut)->Unit(benchmark::kMillisecond)->UseRealTime();

}  // namespace
