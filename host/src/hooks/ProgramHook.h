#pragma once

#include <chrono>
#include <string>

#include "common/ChildProgram.h"
#include "hooks/HookTargetInterface.h"

namespace receiver {

/// Runs a program for each event, without a shell and without arguments: the facts are in its environment,
/// and the event as JSON on its standard input. It is killed, with all that it has started in its process
/// group, when it takes longer than its limit. Neither it nor the thread that delivers goes before others.
class ProgramHook final : public HookTargetInterface {
 public:
    static constexpr std::chrono::seconds kLimit{30};

    explicit ProgramHook(std::string program, std::chrono::milliseconds limit = kLimit)
        : program_(std::move(program)), limit_(limit) {}

    std::optional<std::string> Deliver(const HookEvent& event) override;
    void End() override { child_.End(); }
    std::string Name() const override { return "hook " + program_; }

 private:
    const std::string program_;
    const std::chrono::milliseconds limit_;
    ChildProgram child_;
};

}  // namespace receiver
