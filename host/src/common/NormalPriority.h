#pragma once

#include <sys/types.h>

namespace receiver {

/// Takes from the calling thread what puts the process before others: real-time scheduling, a nice value
/// below 0, and a priority at the disk. What it starts inherits that. What the system refuses stays.
void TakeNormalPriority();

/// Has the system end another process no later than others when memory runs out.
void SpareNoMore(pid_t process);

}  // namespace receiver
