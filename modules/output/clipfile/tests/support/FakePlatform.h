#pragma once

// Takes the place of `GetPlatform` in a test program: linking FakePlatform.cc puts a system before the module
// whose clock, disk space, failures and logon a test decides about.

#include <boost/system/error_code.hpp>
#include <chrono>
#include <cstdint>
#include <functional>
#include <memory>
#include <string>
#include <thread>

#include "platform/PlatformInterface.h"

/// While it lives, operations with a hook here do what the hook does, on the thread that calls them; all
/// others are those of the real system. One at a time. Hooks are set before the threads that use them start;
/// a call that is in a hook when the object goes keeps the hook.
class FakePlatform {
 public:
    struct Hooks {
        std::function<std::chrono::system_clock::time_point()> now;
        std::function<clipfileModule::LocalTime(std::chrono::system_clock::time_point)> toLocalTime;
        std::function<int(const std::string& path, std::uint64_t& bytes)> availableSpace;
        std::function<int(const std::string& path)> testExistence;
        std::function<bool(const std::string& path)> exists;
        std::function<bool(const std::string& path, boost::system::error_code& error)> createDirectories;
        /// 0 by default when there is a hook for `logon`.
        std::function<int(std::string& reason)> shareSupport;
        /// The path that the real system gets, for the operations without a hook.
        std::function<std::string(const std::string& path)> realPath;
        std::function<int(const std::string& userName, const std::string& domain, const std::string& password,
                          clipfileModule::LogonToken& token)>
            logon;
        std::function<int(clipfileModule::LogonToken token)> impersonate;
        std::function<void(clipfileModule::LogonToken token)> closeLogon;
        std::function<void(std::thread& thread)> giveUp;
    };

    FakePlatform();
    ~FakePlatform();
    FakePlatform(const FakePlatform&) = delete;
    FakePlatform& operator=(const FakePlatform&) = delete;

    /// Changes the hooks for all calls from now on. Any thread.
    void Set(const std::function<void(Hooks&)>& change);

    // The common cases.
    void SetLocalTime(const clipfileModule::LocalTime& time);
    void SetAvailableSpace(std::uint64_t bytes);
    void SetAvailableSpaceError(int error);
    /// Shares are folders of this disk: `\\folder\name` is `\folder\name`.
    void ServeSharesFromDisk();

    /// The real system.
    static const clipfileModule::PlatformInterface& Real();
};
