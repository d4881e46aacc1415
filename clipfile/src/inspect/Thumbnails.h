#pragma once

#include <vector>

#include "inspect/Inspection.h"

namespace clipfile {

/// A contact sheet of IDR pictures from beginning to end, in their order row by row: a PNG file. Of a long
/// recording 24 pictures at equal distances, of a short one each. Throws `ToolError` with one sentence for a
/// file without tables, or of which no picture decodes.
std::vector<unsigned char> MakeThumbnails(const InputFile& file, const Inspection& inspection);

}  // namespace clipfile
