#pragma once

#include <functional>
#include <nlohmann/json_fwd.hpp>
#include <optional>
#include <string>
#include <vector>

#include "control/RunState.h"

namespace receiver {

/// Bytes of a file; nothing where that can't be told. It may wait for a disk.
using FileSizer = std::function<std::optional<std::uint64_t>(const std::string& path)>;

/// Of a file on this machine.
std::optional<std::uint64_t> SizeOnDisk(const std::string& path);

/// The answer to `status`.
nlohmann::ordered_json StatusReport(const RunState::View& view, const FileSizer& sizer);

/// The answer to `files`. `present` is the address of the last frame, to which a file that is open reaches.
nlohmann::ordered_json FilesReport(const std::vector<RunFile>& files, const std::optional<Timecode>& present,
                                   const FileSizer& sizer);

/// A phase as the answer names it.
const char* NameOf(RunPhase phase);

}  // namespace receiver
