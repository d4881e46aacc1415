#pragma once

#include <gtest/gtest.h>

#include <filesystem>
#include <map>
#include <memory>
#include <string>
#include <vector>

#include "support/Process.h"
#include "support/TemporaryFolder.h"

namespace endtoend {

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

    TemporaryFolder folder;
    std::map<std::string, std::string> environment;
};

}  // namespace endtoend
