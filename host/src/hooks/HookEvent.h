#pragma once

#include <optional>
#include <string>
#include <string_view>
#include <vector>

namespace receiver {

/// Something that hooks are told.
struct HookEvent {
    /// "file_closed", as `--json` names it.
    std::string name;
    /// The object that `--json` prints, on a line.
    std::string json;
    /// Each member of the object: "CLIPFILE_PATH=...". A zero byte in a value ends it.
    std::vector<std::string> environment;
};

/// Reads an event of `JsonDisplay`. Nothing for one that hooks are not told: they hear of files that are
/// closed, of recordings that begin and end, of faults of the module (statuses 6 and 7), and of the failure
/// that ends a run.
std::optional<HookEvent> HookEventOf(std::string_view line);

}  // namespace receiver
