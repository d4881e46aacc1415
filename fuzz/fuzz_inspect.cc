#include <sstream>

#include "MemoryFile.h"
#include "Program.h"

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    const MemoryFile file(data, size);
    std::ostringstream out;
    clipfile::RunProgram({"clipfile", "inspect", file.Path()}, out, out);
    clipfile::RunProgram({"clipfile", "inspect", "--json", file.Path()}, out, out);
    clipfile::RunProgram({"clipfile", "inspect", "--boxes", file.Path()}, out, out);
    clipfile::RunProgram({"clipfile", "inspect", "--boxes", "--json", file.Path()}, out, out);
    return 0;
}
