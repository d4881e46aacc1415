#pragma once

#include <ostream>
#include <string>

#include "common/ToolError.h"

namespace clipfile {

/// A question to the control socket of a receiver.
struct ControlCall {
    std::string socket;
    std::string method;
    /// An object of JSON; empty without one.
    std::string params;
};

/// Asks, and prints the result on a line. Of `events` it prints each event, until the receiver ends. An error
/// that the receiver answers with is told in words (`kDefects`). Throws `ToolError`: `kUsage` for params that
/// are no object, `kUnreadable` where no receiver listens or it goes before it has answered.
ExitCode CallControl(const ControlCall& call, std::ostream& out, std::ostream& errors);

}  // namespace clipfile
