#pragma once

#include <filesystem>

#include "reader/Folder.h"

namespace clipfile {

/// Files below a folder that are not known to be closed: unfinished recordings, and what cannot be read or is
/// no recording, which recovery tells the reason of.
FolderListing UnfinishedIn(const std::filesystem::path& folder);

}  // namespace clipfile
