#pragma once

#include <filesystem>

namespace clipfile {

/// Gives way to everything else on the machine, for the rest of this process: processor, disk, memory. What
/// the system does not allow stays as it is.
void GiveWay();

/// Ends this process with the one that has started it: nobody else knows of its work.
void EndWithParent();

/// Throws `ToolError` when the disk of a file has not even left what a recorder needs.
void CheckRoom(const std::filesystem::path& path);
/// The same when it has no room for a second file of that size besides.
void CheckRoomForCopy(const std::filesystem::path& path);

}  // namespace clipfile
