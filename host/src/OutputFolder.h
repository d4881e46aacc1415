#pragma once

#include <cstdint>
#include <optional>
#include <string>

namespace receiver {

/// The module writes nothing to a disk with less free space than this, in bytes.
inline constexpr std::uint64_t kMinFreeBytes = 157286400;

/// Bytes that may still be written below `folder`; nothing when the system does not say.
std::optional<std::uint64_t> FreeBytes(const std::string& folder);

/// Sees that files can be written below `folder`. One missing level is made; more than one is more likely a
/// slip or a disk that is not mounted. True when it was made. Throws `ReceiverError` with `kOutput` when the
/// folder is missing with its parent, is none, is not writable, or has no room.
bool PrepareOutputFolder(const std::string& folder);

}  // namespace receiver
