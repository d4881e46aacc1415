#pragma once

#include <gtest/gtest.h>

#include <chrono>
#include <filesystem>
#include <map>
#include <memory>
#include <string>
#include <thread>
#include <vector>

#include "support/Process.h"
#include "support/TemporaryFolder.h"

namespace endtoend {

/// The exit code of a run that can write nothing to its output folder.
inline constexpr int kOutput = 6;

/// Runs the program as its users do, from the outside alone.
class ReceiverFixture : public ::testing::Test {
 protected:
    ReceiverFixture();

    /// The receiver with `options` behind --module, and with the folder of this test as --output unless
    /// `options` name one.
    std::vector<std::string> CommandOf(const std::vector<std::string>& options) const;
    std::unique_ptr<Process> Start(const std::vector<std::string>& options,
                                   Process::Terminal terminal = Process::Terminal::kNone) const;
    /// Runs it to its end.
    Outcome RunReceiver(const std::vector<std::string>& options) const;

    /// Where recordings go. It exists.
    std::filesystem::path OutputFolder() const { return folder.Path() / "recordings"; }
    std::vector<std::filesystem::path> Recordings() const { return RecordingsIn(OutputFolder()); }
    /// The module's log.
    std::string Log() const;

    /// True as soon as `condition` holds; false when that takes longer than any healthy program needs.
    template <typename Condition>
    [[nodiscard]] static bool WaitFor(Condition condition) {
        const auto deadline = std::chrono::steady_clock::now() + kPatience;
        while (!condition()) {
            if (std::chrono::steady_clock::now() > deadline) {
                return false;
            }
            std::this_thread::sleep_for(std::chrono::milliseconds(10));
        }
        return true;
    }

    TemporaryFolder folder;
    std::map<std::string, std::string> environment;
};

}  // namespace endtoend
