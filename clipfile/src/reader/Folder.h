#pragma once

#include <filesystem>
#include <string>
#include <vector>

namespace clipfile {

/// What was found below a folder.
struct FolderListing {
    /// Files that have a recording's extension, in the order of their paths.
    std::vector<std::string> files;
    /// A sentence for each folder that could not be read, or not to its end.
    std::vector<std::string> faults;
};

/// Searches a folder and all below it. Symbolic links to folders are not followed.
FolderListing FilesIn(const std::filesystem::path& folder);

}  // namespace clipfile
