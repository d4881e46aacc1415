#include "MemoryFile.h"
#include "common/ToolError.h"
#include "verify/Verification.h"

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    const MemoryFile memory(data, size);
    try {
        std::vector<clipfile::Verification> files;
        files.push_back(clipfile::VerifyFile(memory.Path(), {.deep = true}));
        files.push_back(files.front());
        clipfile::VerifyNeighbours(files);
    } catch (const clipfile::ToolError&) {
        return 0;
    }
    return 0;
}
