#include <sstream>

#include "MemoryFile.h"
#include "common/ToolError.h"
#include "inspect/BoxTree.h"
#include "inspect/Inspection.h"
#include "inspect/JsonReport.h"
#include "inspect/Plot.h"
#include "inspect/TextReport.h"
#include "inspect/Thumbnails.h"

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    const MemoryFile memory(data, size);
    std::ostringstream out;
    constexpr std::size_t kRows = 20;
    try {
        const clipfile::InputFile file(memory.Path());
        clipfile::PrintBoxes(out, file, kRows);
        clipfile::BoxesToJson(file, kRows);
        const clipfile::Inspection inspection = clipfile::Inspect(file);
        clipfile::PrintText(out, inspection);
        clipfile::ToJson(inspection);
        clipfile::PrintPlot(out, file, inspection);
        clipfile::MakeThumbnails(file, inspection);
    } catch (const clipfile::ToolError&) {
        return 0;
    }
    return 0;
}
