#pragma once

#include <nlohmann/json_fwd.hpp>
#include <ostream>
#include <string>

namespace clipfile {

/// Writes one JSON value on a line. Names of files need not be UTF-8.
void PrintJson(std::ostream& out, const nlohmann::ordered_json& json);

/// Tells why a file or folder could not be worked on: as an object with `json`, else on `errors`.
void TellFault(const std::string& path, const std::string& sentence, bool json, std::ostream& out,
               std::ostream& errors);

}  // namespace clipfile
