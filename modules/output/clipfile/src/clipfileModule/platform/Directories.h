#pragma once

// The part of `PlatformInterface` that is the same on all systems that Boost.Filesystem knows. Paths are
// native ones, in UTF-8.

#include <boost/system/error_code.hpp>
#include <string>

namespace clipfileModule {

/// True when there is anything at `nativePath`. Throws `boost::filesystem::filesystem_error` on any failure
/// but a missing path.
bool PathExists(const std::string& nativePath);

/// Makes `nativePath` with all missing levels; results as `PlatformInterface::CreateDirectories`.
bool MakeDirectories(const std::string& nativePath, boost::system::error_code& error);

}  // namespace clipfileModule
