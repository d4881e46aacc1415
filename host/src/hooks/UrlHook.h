#pragma once

#include <chrono>
#include <condition_variable>
#include <mutex>
#include <string>
#include <vector>

#include "hooks/HookTargetInterface.h"

namespace receiver {

/// Posts each event as JSON to an address. What may pass, as a server that is away or answers with 429 or
/// 5xx, is tried again after each of some pauses; any other answer but 2xx is final.
class UrlHook final : public HookTargetInterface {
 public:
    using Pauses = std::vector<std::chrono::milliseconds>;

    /// Of an attempt.
    static constexpr std::chrono::seconds kLimit{10};

    /// `url` is http:// or https://.
    explicit UrlHook(std::string url,
                     Pauses pauses = {std::chrono::seconds(1), std::chrono::seconds(5),
                                      std::chrono::seconds(15)},
                     std::chrono::milliseconds limit = kLimit);

    std::optional<std::string> Deliver(const HookEvent& event) override;
    void End() override;
    std::string Name() const override;

 private:
    /// The outcome of an attempt.
    struct Attempt {
        /// Why it failed; empty when it did not.
        std::string problem;
        bool mayPass = false;
    };

    Attempt Post(const std::string& json);
    bool Ending();
    /// False when it was told to end.
    bool Pause(std::chrono::milliseconds pause);

    const std::string url_;
    const Pauses pauses_;
    const std::chrono::milliseconds limit_;
    std::mutex mutex_;
    std::condition_variable changed_;
    // Guarded by mutex_:
    bool ending_ = false;
};

}  // namespace receiver
