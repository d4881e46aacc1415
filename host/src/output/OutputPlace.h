#pragma once

#include <cstdint>
#include <string>

#include "options/Options.h"

namespace receiver {

/// Where files go.
struct OutputPlace {
    /// What the module is told: the folder, or that it is to take the one of the settings store.
    std::string parameter;
    /// With slashes, and none at the end. A folder on a share is `//server/share/folder`.
    std::string folder;
    bool onShare = false;
    /// Last folder of the path of a file; empty for none.
    std::string prefix;
    /// With what the module logs on to a share; empty where there is neither an option nor an entry of the
    /// settings store.
    std::string user;
    std::string password;
};

/// The module's rules, with an output of our own where it would refuse: start parameters, else settings
/// store. Throws `ReceiverError` with `kUsage` for a path of a share that names none.
OutputPlace PlaceOf(const Options& options);

/// Minutes after which a file is followed by another, by the module's rules: of the settings store, else 120.
std::int64_t FileMinutes();

/// A path as the module has it, for a folder or a file of an `OutputPlace`.
std::string ModulePath(std::string path);

}  // namespace receiver
