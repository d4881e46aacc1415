#include "recover/Unattended.h"

#include <sys/resource.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <cstdint>
#include <fstream>
#include <system_error>

#include "common/ToolError.h"

namespace clipfile {

namespace {

/// Of the processor's levels and of those of memory (proc(5)) the last.
constexpr int kLowestPriority = 19;
constexpr int kFirstToGo = 1000;
/// ioprio_set(2), which the C library does not declare: this process, served when no one else asks.
constexpr int kWhoProcess = 1;
constexpr int kIdleClass = 3;
constexpr int kClassShift = 13;
/// An hour at 50 Mbit/s is 22 GB; so much is recorded in three minutes.
constexpr std::uint64_t kLeftForRecorder = 1'000'000'000;

}  // namespace

void GiveWay() {
    setpriority(PRIO_PROCESS, 0, kLowestPriority);
    syscall(SYS_ioprio_set, kWhoProcess, 0, kIdleClass << kClassShift);
    std::ofstream("/proc/self/oom_score_adj") << kFirstToGo;
}

void CheckRoom(const std::filesystem::path& path) {
    std::error_code error;
    const std::uint64_t size = std::filesystem::file_size(path, error);
    const std::filesystem::space_info space = std::filesystem::space(path, error);
    if (!error && space.available < size + kLeftForRecorder) {
        throw ToolError(ExitCode::kUnreadable, path.string() + " is not recovered: its disk has " +
                                                   std::to_string(space.available / 1'000'000) +
                                                   " MB of free space, and what is recorded needs them.");
    }
}

}  // namespace clipfile
