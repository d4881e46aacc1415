#include "support/FakePlatform.h"

#include <mutex>
#include <utility>

#include "platform/SharePath.h"
#include "platform/posix/PosixPlatform.h"

using clipfileModule::LocalTime;
using clipfileModule::LogonToken;
using clipfileModule::PlatformInterface;
using clipfileModule::PosixPlatform;

namespace {

/// The hooks of the `FakePlatform` that lives, else empty ones.
class HookTable {
 public:
    std::shared_ptr<const FakePlatform::Hooks> Get() {
        const std::lock_guard lock(mutex_);
        return hooks_;
    }
    void Set(std::shared_ptr<const FakePlatform::Hooks> hooks) {
        const std::lock_guard lock(mutex_);
        hooks_ = std::move(hooks);
    }
    static HookTable& Instance() {
        static HookTable& table = *new HookTable;
        return table;
    }

 private:
    std::mutex mutex_;
    std::shared_ptr<const FakePlatform::Hooks> hooks_ = std::make_shared<FakePlatform::Hooks>();
};

/// Goes to the hook where there is one, else to the real system.
class HookedPlatform : public PlatformInterface {
 public:
    std::chrono::system_clock::time_point Now() const override {
        const auto hooks = HookTable::Instance().Get();
        return hooks->now ? hooks->now() : real_.Now();
    }
    LocalTime ToLocalTime(std::chrono::system_clock::time_point time) const override {
        const auto hooks = HookTable::Instance().Get();
        return hooks->toLocalTime ? hooks->toLocalTime(time) : real_.ToLocalTime(time);
    }
    std::string NativePath(const std::string& path) const override { return real_.NativePath(path); }
    int AvailableSpace(const std::string& path, std::uint64_t& bytes) const override {
        const auto hooks = HookTable::Instance().Get();
        return hooks->availableSpace ? hooks->availableSpace(path, bytes)
                                     : real_.AvailableSpace(realPath(*hooks, path), bytes);
    }
    int TestExistence(const std::string& path) const override {
        const auto hooks = HookTable::Instance().Get();
        return hooks->testExistence ? hooks->testExistence(path)
                                    : real_.TestExistence(realPath(*hooks, path));
    }
    bool Exists(const std::string& path) const override {
        const auto hooks = HookTable::Instance().Get();
        return hooks->exists ? hooks->exists(path) : real_.Exists(realPath(*hooks, path));
    }
    bool CreateDirectories(const std::string& path, boost::system::error_code& error) const override {
        const auto hooks = HookTable::Instance().Get();
        return hooks->createDirectories ? hooks->createDirectories(path, error)
                                        : real_.CreateDirectories(realPath(*hooks, path), error);
    }
    int ShareSupport(std::string& reason) const override {
        const auto hooks = HookTable::Instance().Get();
        if (hooks->shareSupport) {
            return hooks->shareSupport(reason);
        }
        return hooks->logon ? 0 : real_.ShareSupport(reason);
    }
    std::FILE* OpenOnShare(const std::string& path) const override { return real_.OpenOnShare(path); }
    int Logon(const std::string& userName, const std::string& domain, const std::string& password,
              LogonToken& token) const override {
        const auto hooks = HookTable::Instance().Get();
        return hooks->logon ? hooks->logon(userName, domain, password, token)
                            : real_.Logon(userName, domain, password, token);
    }
    int Impersonate(LogonToken token) const override {
        const auto hooks = HookTable::Instance().Get();
        return hooks->impersonate ? hooks->impersonate(token) : real_.Impersonate(token);
    }
    void CloseLogon(LogonToken token) const override {
        const auto hooks = HookTable::Instance().Get();
        hooks->closeLogon ? hooks->closeLogon(token) : real_.CloseLogon(token);
    }
    void GiveUp(std::thread& thread) const override {
        const auto hooks = HookTable::Instance().Get();
        hooks->giveUp ? hooks->giveUp(thread) : real_.GiveUp(thread);
    }

 private:
    static std::string realPath(const FakePlatform::Hooks& hooks, const std::string& path) {
        return hooks.realPath ? hooks.realPath(path) : path;
    }

    PosixPlatform real_;
};

}  // namespace

FakePlatform::FakePlatform() = default;

FakePlatform::~FakePlatform() {
    HookTable::Instance().Set(std::make_shared<Hooks>());
}

void FakePlatform::Set(const std::function<void(Hooks&)>& change) {
    auto hooks = std::make_shared<Hooks>(*HookTable::Instance().Get());
    change(*hooks);
    HookTable::Instance().Set(std::move(hooks));
}

void FakePlatform::SetLocalTime(const LocalTime& time) {
    Set([&](Hooks& hooks) { hooks.toLocalTime = [time](auto) { return time; }; });
}

void FakePlatform::SetAvailableSpace(std::uint64_t bytes) {
    Set([&](Hooks& hooks) {
        hooks.availableSpace = [bytes](const std::string&, std::uint64_t& available) {
            available = bytes;
            return 0;
        };
    });
}

void FakePlatform::SetAvailableSpaceError(int error) {
    Set([&](Hooks& hooks) {
        hooks.availableSpace = [error](const std::string&, std::uint64_t&) { return error; };
    });
}

void FakePlatform::ServeSharesFromDisk() {
    Set([](Hooks& hooks) {
        hooks.realPath = [](const std::string& path) {
            return clipfileModule::IsSharePath(path) ? path.substr(1) : path;
        };
    });
}

const PlatformInterface& FakePlatform::Real() {
    static const PlatformInterface& real = *new PosixPlatform;
    return real;
}

namespace clipfileModule {

const PlatformInterface& GetPlatform() {
    static const PlatformInterface& platform = *new HookedPlatform;
    return platform;
}

}  // namespace clipfileModule
