#pragma once

#include <functional>

namespace receiver {

/// True when the operator ends the run. Asked again and again, on one thread, while something is waited for;
/// an empty one is never asked.
using StopCheck = std::function<bool()>;

}  // namespace receiver
