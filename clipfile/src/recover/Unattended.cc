#include "recover/Unattended.h"

#include <sched.h>
#include <signal.h>
#include <sys/prctl.h>
#include <sys/resource.h>
#include <sys/statvfs.h>
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

/// Throws when there are not so many bytes besides.
void ExpectFree(const std::filesystem::path& path, std::uint64_t size) {
    struct statvfs disk = {};
    if (statvfs(path.c_str(), &disk) != 0) {
        return;  // whoever opens the file tells why
    }
    const std::uint64_t available = std::uint64_t{disk.f_bavail} * disk.f_frsize;
    if (available < kLeftForRecorder || available - kLeftForRecorder < size) {
        throw ToolError(ExitCode::kUnreadable, path.string() + " is not recovered: its disk has " +
                                                   std::to_string(available / 1'000'000) +
                                                   " MB of free space, and what is recorded needs them.");
    }
}

}  // namespace

void GiveWay() {
    // A receiver may run as a real-time process, which its children do too. Those have no level. Idle ones
    // would get nothing on a machine that is always busy.
    const sched_param none = {};
    sched_setscheduler(0, SCHED_OTHER, &none);
    setpriority(PRIO_PROCESS, 0, kLowestPriority);
    syscall(SYS_ioprio_set, kWhoProcess, 0, kIdleClass << kClassShift);
    std::ofstream("/proc/self/oom_score_adj") << kFirstToGo;
}

void EndWithParent() {
    prctl(PR_SET_PDEATHSIG, SIGKILL);
}

void CheckRoom(const std::filesystem::path& path) {
    ExpectFree(path, 0);
}

void CheckRoomForCopy(const std::filesystem::path& path) {
    std::error_code error;
    const std::uint64_t size = std::filesystem::file_size(path, error);
    ExpectFree(path, error ? 0 : size);
}

}  // namespace clipfile
