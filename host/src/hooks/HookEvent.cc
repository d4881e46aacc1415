#include "hooks/HookEvent.h"

#include <algorithm>
#include <array>
#include <nlohmann/json.hpp>

#include "QxModuleStatus.h"

namespace receiver {
namespace {

using Json = nlohmann::ordered_json;

constexpr std::array<const char*, 4> kTold{"file_closed", "record_started", "record_stopped", "failure"};

bool IsTold(const Json& event) {
    const auto name = event.value("event", std::string());
    if (name == "status") {
        const int status = event.value("status", 0);
        return status == QxStatus::kStreamFault || status == QxStatus::kFailed;
    }
    return std::find(kTold.begin(), kTold.end(), name) != kTold.end();
}

std::string VariableOf(const std::string& name, const Json& value) {
    std::string variable = "CLIPFILE_";
    for (const char letter : name) {
        variable += letter >= 'a' && letter <= 'z' ? static_cast<char>(letter - 'a' + 'A') : letter;
    }
    return variable + "=" + (value.is_string() ? value.get<std::string>() : value.dump());
}

}  // namespace

std::optional<HookEvent> HookEventOf(std::string_view line) {
    const Json event = Json::parse(line, nullptr, false);
    if (!event.is_object() || !IsTold(event)) {
        return std::nullopt;
    }
    HookEvent told;
    told.name = event["event"];
    told.json = line;
    for (const auto& [name, value] : event.items()) {
        told.environment.push_back(VariableOf(name, value));
    }
    return told;
}

}  // namespace receiver
