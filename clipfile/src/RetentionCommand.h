#pragma once

#include <ostream>

#include "common/ToolError.h"
#include "retention/Retention.h"

namespace CLI {
class App;
}

namespace clipfile {

/// The command `retention` of the program. It must outlive the parsing of the command line.
class RetentionCommand {
 public:
    /// Gives the program the command with its options.
    CLI::App* AddTo(CLI::App& app);
    /// Tells each file that goes, or that stays though it should go.
    ExitCode Run(std::ostream& out, std::ostream& errors) const;

 private:
    void Print(const RetentionStep& step, std::ostream& out) const;

    RetentionOptions options_;
    bool json_ = false;
};

}  // namespace clipfile
