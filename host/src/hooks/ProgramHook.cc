#include "hooks/ProgramHook.h"

#include "common/NormalPriority.h"

namespace receiver {

std::optional<std::string> ProgramHook::Deliver(const HookEvent& event) {
    // Recording comes before what a hook does with the disk.
    TakeNormalPriority();
    const ChildResult result = child_.Run(
        {.command = {program_}, .environment = event.environment, .input = event.json, .limit = limit_});
    if (result.code == 0) {
        return std::nullopt;
    }
    std::string reason = result.timedOut   ? "it took longer than " + std::to_string(limit_.count()) + " ms"
                         : result.code > 0 ? "it ended with exit code " + std::to_string(result.code)
                                           : "it did not run to its end";
    if (const std::string line = result.text.substr(0, result.text.find('\n')); !line.empty()) {
        reason += ": " + line;
    }
    return reason;
}

}  // namespace receiver
