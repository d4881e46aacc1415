#pragma once

#include <iosfwd>

#include "inspect/Inspection.h"

namespace clipfile {

/// Draws a recording over its time as an SVG document: the sizes of its pictures, IDR pictures by themselves,
/// the pictures in each group, and the time that each chunk of pictures and of sound covers. Of a long
/// recording each dot stands for the largest of some neighbours, so that the document stays small. Throws
/// `ToolError` with one sentence for a file without tables.
void PrintPlot(std::ostream& out, const InputFile& file, const Inspection& inspection);

}  // namespace clipfile
