#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "media/ParameterSets.h"

namespace clipfile {

/// What a receiver notes about the recordings that it has not closed yet: their names, and what a normal file
/// gets on closing alone.
struct Journal {
    static constexpr std::size_t kMaxSets = 8;
    static constexpr std::size_t kMaxFiles = 256;

    /// Frames in 1000 seconds, as the module names its rates: 29970.
    std::uint32_t frameRate = 0;
    std::uint32_t width = 0;
    std::uint32_t height = 0;
    /// Of the stream, the newest first. A file has one of them.
    std::vector<ParameterSets> sets;
    /// Paths below the folder that the journal stands in.
    std::vector<std::string> files;
};

/// The text of a journal: one JSON object.
std::string ToText(const Journal& journal);
/// Nothing for a text that is none, that is torn, or that names files elsewhere: anybody may have written it.
std::optional<Journal> ParseJournal(std::string_view text);

}  // namespace clipfile
