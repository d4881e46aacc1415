#pragma once

#include <filesystem>
#include <string>
#include <vector>

namespace clipfile {

/// Files below a folder that have a recording's extension, in the order of their paths. Folders that cannot
/// be read are passed over, and symbolic links to folders are not followed.
std::vector<std::string> FilesIn(const std::filesystem::path& folder);

}  // namespace clipfile
