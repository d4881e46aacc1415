#pragma once

#include <optional>
#include <string>

#include "options/Options.h"
#include "output/OutputPlace.h"

namespace receiver {

/// Says in the environment where the module's log goes, before anything has been logged: to the file of the
/// options, else to the one that is set there, else to the output folder, or, where that is on a share, to
/// the log folder of the service (LOGS_DIRECTORY) or the folder in which the receiver was started.
///
/// Throws `ReceiverError` with `kOutput` when there is a password and the file cannot be written: standard
/// error would take its place, and a refused logon puts the password there. For the same reason a file that
/// was there, and that everybody on the machine can read, gives a warning.
std::optional<std::string> SetUpLog(const Options& options, const OutputPlace& place);

}  // namespace receiver
