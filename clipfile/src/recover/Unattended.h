#pragma once

#include <filesystem>

namespace clipfile {

/// Gives way to everything else on the machine, for the rest of this process: processor, disk, memory. What
/// the system does not allow stays as it is.
void GiveWay();

/// Throws `ToolError` when the disk of a file has no room for a second one of its size, with some left for a
/// recorder.
void CheckRoom(const std::filesystem::path& path);

}  // namespace clipfile
