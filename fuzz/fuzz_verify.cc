#include <sstream>

#include "MemoryFile.h"
#include "Program.h"

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    const MemoryFile file(data, size);
    std::ostringstream out;
    clipfile::RunProgram({"clipfile", "verify", "--deep", file.Path()}, out, out);
    return 0;
}
