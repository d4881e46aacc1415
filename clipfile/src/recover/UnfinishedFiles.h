#pragma once

#include <filesystem>
#include <string>
#include <vector>

namespace clipfile {

/// Recordings below a folder that are not closed, in the order of their paths. What cannot be read or is no
/// recording is passed over; symbolic links to folders are not followed.
std::vector<std::string> UnfinishedIn(const std::filesystem::path& folder);

}  // namespace clipfile
