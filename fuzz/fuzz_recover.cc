#include <stdlib.h>

#include "MemoryFile.h"
#include "TemporaryFolder.h"
#include "common/ToolError.h"
#include "recover/Recovery.h"

extern "C" int LLVMFuzzerInitialize(int*, char***) {
    return setenv("QX_LOG_PRIORITY", "0", 1);
}

/// The file is also the one whose parameter sets are taken, where it has some.
extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    static const TemporaryFolder folder;
    const MemoryFile memory(data, size);
    try {
        clipfile::RecoverFile(memory.Path(), {memory.Path(), folder.Path(), false});
    } catch (const clipfile::ToolError&) {
        return 0;
    }
    folder.Clear();
    return 0;
}
