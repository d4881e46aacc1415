#pragma once

#include <boost/system/error_code.hpp>
#include <chrono>
#include <cstdint>
#include <cstdio>
#include <string>
#include <thread>

namespace clipfileModule {

/// A moment as the clocks on the wall show it.
struct LocalTime {
    int year = 0;
    /// From 1.
    int month = 0;
    int day = 0;
    int hour = 0;
    int minute = 0;
    int second = 0;
};

/// A logon for network access, as the system names it.
using LogonToken = std::intptr_t;
constexpr LogonToken kNoLogon = -1;

/// What `TestExistence` returns when there is nothing at a path: ENOENT, which is 2 everywhere.
constexpr int kNoSuchPath = 2;

/// Everything of the module that differs between systems. Each system has a folder beside this file, which
/// alone includes headers of that system.
///
/// Paths are strings as the module builds them: UTF-8, separated by backslashes. Operations that return an
/// error number return 0 for success. All operations may be called from any thread; those on paths may wait
/// for a disk for any length of time.
///
/// Paths that count as remote (`IsSharePath`) go to network shares with the rights of the calling thread, and
/// never to the local disk.
class PlatformInterface {
 public:
    virtual ~PlatformInterface() = default;

    /// The system clock.
    virtual std::chrono::system_clock::time_point Now() const = 0;
    /// `time` in the local time zone, cut to whole seconds.
    virtual LocalTime ToLocalTime(std::chrono::system_clock::time_point time) const = 0;

    /// `path` as the system's file operations take it, in UTF-8. The one place where separators change.
    virtual std::string NativePath(const std::string& path) const = 0;
    /// Bytes that the caller may still write to the file system of `path`, without what is kept back for
    /// others. Returns the system's error number, which leaves `bytes` alone.
    virtual int AvailableSpace(const std::string& path, std::uint64_t& bytes) const = 0;
    /// 0 when there is a file, a directory or anything else at `path`, else the `errno` of looking:
    /// `kNoSuchPath` for nothing, another number when that cannot be told.
    virtual int TestExistence(const std::string& path) const = 0;
    /// True when there is anything at `path`. A failure other than a missing path or a missing part of it
    /// throws `boost::filesystem::filesystem_error`; on a share, where failures are to be expected, it counts
    /// as nothing there.
    virtual bool Exists(const std::string& path) const = 0;
    /// Makes the directory `path` with all missing levels above it. True when it was made; false with `error`
    /// set when that failed, and with `error` clear when there was nothing to make.
    virtual bool CreateDirectories(const std::string& path, boost::system::error_code& error) const = 0;

    /// 0 when shares can be reached at all, else an error number, and `reason` then says why not.
    virtual int ShareSupport(std::string& reason) const = 0;
    /// Creates the file at `path`, which is on a share, or truncates it, as a stream for reading and writing
    /// that keeps other writers off. Null when that fails, with the reason in `errno`. Local files are the
    /// box library's.
    virtual std::FILE* OpenOnShare(const std::string& path) const = 0;

    /// Logs on with credentials that count for network access alone; nobody uses them yet. `domain` is the
    /// path on the share. Returns the system's error number, which leaves `token` alone; the calling thread
    /// then has no rights on shares any more.
    virtual int Logon(const std::string& userName, const std::string& domain, const std::string& password,
                      LogonToken& token) const = 0;
    /// From now on the calling thread, and no other, uses the logon. Ends with the thread. Returns the
    /// system's error number.
    virtual int Impersonate(LogonToken token) const = 0;
    /// Releases a token of `Logon`.
    virtual void CloseLogon(LogonToken token) const = 0;

    /// Gives up a thread that hangs in a file operation, by force where the system can end a thread from
    /// outside. Returns at once; `thread` is then not joinable. The thread may go on at any later time: what
    /// it uses must belong to it, and its code stays loaded until the process ends.
    virtual void GiveUp(std::thread& thread) const = 0;
};

/// The system that the module runs on. Never destroyed: a thread that was given up may use it while the
/// process ends.
const PlatformInterface& GetPlatform();

}  // namespace clipfileModule
