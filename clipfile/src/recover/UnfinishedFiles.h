#pragma once

#include <filesystem>

#include "reader/Folder.h"

namespace clipfile {

/// Files below a folder that are not known to be closed: unfinished recordings, and what cannot be read or is
/// no recording, which recovery tells the reason of.
FolderListing UnfinishedIn(const std::filesystem::path& folder);

/// Whether a file can be read and is no recording, since it is empty or was cut in front of its first sample:
/// nothing will ever be recovered from it.
bool HoldsNothing(const std::filesystem::path& path);

}  // namespace clipfile
