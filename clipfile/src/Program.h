#pragma once

#include <ostream>
#include <string>
#include <vector>

#include "common/ToolError.h"

namespace clipfile {

/// Runs the program with its arguments, the name of the program first. Results go to `out`, and a sentence
/// for each file that could not be worked on to `errors`.
ExitCode RunProgram(const std::vector<std::string>& arguments, std::ostream& out, std::ostream& errors);

}  // namespace clipfile
