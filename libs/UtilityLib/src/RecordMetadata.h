#pragma once

#include <optional>

#include "AnnexBReader.h"
#include "Timecode.h"

namespace nal_access {

/// Both read the sets of a metadata payload whose identifier is the system's own; docs/metadata-format.md
/// describes them. The first item that can be read counts.

/// Item E101: one byte, 0 or 1. Other sizes and values are no record flag.
std::optional<bool> ReadRecordFlag(Bytes payload);

/// Item E102: five bytes, hours, minutes, seconds, frames, and flags with drop frame in bit 0. Other sizes,
/// and addresses that are not valid at `rate` (see `IsValid`), are no timecode.
std::optional<Timecode> ReadTimecode(Bytes payload, unsigned int rate);

}  // namespace nal_access
