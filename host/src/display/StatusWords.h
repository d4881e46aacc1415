#pragma once

#include <string>

#include "module/Host.h"

namespace receiver {

/// What a status of the module means, in the words of the operator's documentation: "buffering", "the disk is
/// too slow: more than 48 chunks wait for it". A pair that the documentation does not know gives its
/// numbers.
std::string StatusWords(const ModuleStatus& status);

}  // namespace receiver
