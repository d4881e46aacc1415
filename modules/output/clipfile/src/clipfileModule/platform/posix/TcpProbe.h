#pragma once

#include <chrono>
#include <string>

struct addrinfo;

namespace clipfileModule {

/// Whether one of `addresses` takes connections, and has sent or closed something in answer to `request`
/// where that is not empty: 0, also when there are none; ETIMEDOUT when none did within `limit` and not all
/// have refused; else the error number of the last one. All are tried at once: one that drops what is sent to
/// it costs the others no time.
int ProbeTcp(const addrinfo* addresses, std::chrono::milliseconds limit, const std::string& request = {});
/// The same for the addresses of `host`; 0 when it cannot be resolved, for there are other ways to do that.
/// The limit does not count for resolving.
int ProbeTcp(const std::string& host, const std::string& port, std::chrono::milliseconds limit,
             const std::string& request = {});

}  // namespace clipfileModule
