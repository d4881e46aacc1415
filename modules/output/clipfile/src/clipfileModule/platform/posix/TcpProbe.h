#pragma once

#include <chrono>
#include <string>

namespace clipfileModule {

/// Whether a server takes connections at a port: 0, also when `host` cannot be resolved, for there are other
/// ways to do that; else the error number of the last address tried, ETIMEDOUT after `limit`. The limit does
/// not count for resolving.
int ProbeTcp(const std::string& host, const std::string& port, std::chrono::milliseconds limit);

}  // namespace clipfileModule
