#pragma once

#include <cstdint>

#include "boxlib/mbx_types.h"

namespace clipfileModule {

/// How muxers reach their files, and memory for the boxes.
struct FileAccess {
    MbxCallbacks callbacks;
    /// Creates a file, or truncates it; contract as `MbxOpenFile`, but for the path, which is one of the
    /// module.
    MbxStatus (*open)(const char* path, std::uint32_t unused, MbxFile** file);
};

/// Through stdio and malloc, also to files on network shares.
FileAccess GetFileAccess();

}  // namespace clipfileModule
