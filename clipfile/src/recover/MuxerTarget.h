#pragma once

#include <filesystem>

#include "platform/PlatformInterface.h"

namespace clipfile {

/// While it lives, the module's muxers write to `path`, a new or empty file, instead of one that they name
/// themselves, and stamp it with `opened` as the time of its opening. One at a time, on one thread.
///
/// The muxers reach files and clock through `GetFileAccess` and `GetPlatform`, which this program has of its
/// own: a recovered file stands where its user wants it, and nothing of the module's network access is
/// linked.
class MuxerTarget {
 public:
    MuxerTarget(const std::filesystem::path& path, const clipfileModule::LocalTime& opened);
    ~MuxerTarget();
    MuxerTarget(const MuxerTarget&) = delete;
    MuxerTarget& operator=(const MuxerTarget&) = delete;

    /// The system's number for the first operation on the file that failed, or 0.
    int Error() const;
};

/// Seconds since 1904, as files hold them, taken apart: they are the local time of recording read as UTC.
clipfileModule::LocalTime FromMp4Time(std::uint64_t seconds);
/// A moment in seconds since 1970, in the local time zone.
clipfileModule::LocalTime ToLocalTime(std::int64_t seconds);

}  // namespace clipfile
