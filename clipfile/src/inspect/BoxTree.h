#pragma once

#include <cstddef>
#include <nlohmann/json.hpp>
#include <ostream>

#include "reader/InputFile.h"

namespace clipfile {

/// Boxes that a listing shows at most. A hostile file can have one every eight bytes.
inline constexpr std::size_t kMaxBoxes = 100000;

/// Lists the boxes of any MP4 file: a line each, indented by depth, with offset and size, then its fields by
/// their names in the standard and the first `maxRows` rows of its table.
void PrintBoxes(std::ostream& out, const InputFile& file, std::size_t maxRows);

/// The same as an array of boxes with their `children`.
nlohmann::ordered_json BoxesToJson(const InputFile& file, std::size_t maxRows);

}  // namespace clipfile
