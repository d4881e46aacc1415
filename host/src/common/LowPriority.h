#pragma once

#include <sched.h>
#include <sys/resource.h>

namespace receiver {

/// Lets this thread, and the programs that it starts, give way to the recording. Where the process has a
/// real-time priority, this thread has none any more.
inline void LowerPriority() {
    constexpr int kNicer = 10;
    const sched_param none{};
    sched_setscheduler(0, SCHED_OTHER, &none);
    setpriority(PRIO_PROCESS, 0, getpriority(PRIO_PROCESS, 0) + kNicer);
}

}  // namespace receiver
