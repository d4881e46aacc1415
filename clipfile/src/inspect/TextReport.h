#pragma once

#include <ostream>

#include "inspect/Inspection.h"

namespace clipfile {

/// Tells what is in a file, for a person: one line on the whole, one a track, one on the profile.
void PrintText(std::ostream& out, const Inspection& inspection);

}  // namespace clipfile
