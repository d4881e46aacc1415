#include "common/NormalPriority.h"

#include <sched.h>
#include <sys/resource.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <fstream>
#include <string>

namespace receiver {
namespace {

// ioprio_set(2); the C library has no names for them.
constexpr int kThread = 1;
/// No priority at the disk of its own: it follows the nice value.
constexpr int kByNice = 0;

}  // namespace

void TakeNormalPriority() {
    const sched_param none{};
    sched_setscheduler(0, SCHED_OTHER, &none);
    if (getpriority(PRIO_PROCESS, 0) < 0) {
        setpriority(PRIO_PROCESS, 0, 0);
    }
    syscall(SYS_ioprio_set, kThread, 0, kByNice);
}

void SpareNoMore(pid_t process) {
    const std::string path = "/proc/" + std::to_string(process) + "/oom_score_adj";
    int score = 0;
    if (std::ifstream(path) >> score && score < 0) {
        std::ofstream(path) << 0;
    }
}

}  // namespace receiver
