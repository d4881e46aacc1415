#pragma once

#include <nlohmann/json.hpp>

#include "inspect/Inspection.h"

namespace clipfile {

/// The same for programs. Names and meanings of the members are told in docs/clipfile.md.
nlohmann::ordered_json ToJson(const Inspection& inspection);

}  // namespace clipfile
