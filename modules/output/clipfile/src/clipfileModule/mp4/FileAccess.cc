// By itself, so that a program of tests can have files that fail.

#include "mp4/FileAccess.h"

#include <cstdlib>

#include "boxlib/mbx_stdio.h"
#include "platform/PlatformInterface.h"
#include "platform/SharePath.h"

namespace clipfileModule {

namespace {

MbxStatus openOnShare(const char* path, MbxFile** file) {
    auto* const cell = static_cast<MbxFile*>(std::malloc(sizeof(MbxFile)));
    if (cell == nullptr) {
        return MBX_ERR_NO_MEMORY;
    }
    cell->stream = GetPlatform().OpenOnShare(path);
    if (cell->stream == nullptr) {
        std::free(cell);
        return MBX_ERR_IO;
    }
    *file = cell;
    return MBX_OK;
}

MbxStatus openFile(const char* path, std::uint32_t unused, MbxFile** file) {
    return IsSharePath(path) ? openOnShare(path, file)
                             : MbxOpenFile(GetPlatform().NativePath(path).c_str(), unused, file);
}

}  // namespace

FileAccess GetFileAccess() {
    FileAccess access = {};
    MbxStdioCallbacks(&access.callbacks);
    access.open = openFile;
    return access;
}

}  // namespace clipfileModule
