#include "Output.h"

#include <nlohmann/json.hpp>

namespace clipfile {

using Json = nlohmann::ordered_json;

void PrintJson(std::ostream& out, const Json& json) {
    out << json.dump(-1, ' ', false, Json::error_handler_t::replace) << '\n';
}

void TellFault(const std::string& path, const std::string& sentence, bool json, std::ostream& out,
               std::ostream& errors) {
    if (json) {
        PrintJson(out, {{"file", path}, {"error", sentence}});
    } else {
        errors << "clipfile: " << sentence << '\n';
    }
}

}  // namespace clipfile
