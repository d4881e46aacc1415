// By itself, so that a program of tests can have files that fail.

#include "mp4/FileAccess.h"

#include "boxlib/mbx_stdio.h"

namespace clipfileModule {

FileAccess GetFileAccess() {
    FileAccess access = {};
    MbxStdioCallbacks(&access.callbacks);
    access.open = MbxOpenFile;
    return access;
}

}  // namespace clipfileModule
