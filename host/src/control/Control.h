#pragma once

#include <chrono>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "common/PatientThread.h"
#include "control/StatusReport.h"
#include "display/DisplayInterface.h"
#include "operator/CommandQueue.h"
#include "source/SourceInterface.h"

namespace receiver {

/// The control socket of a run: JSON-RPC 2.0, a message a line (docs/control.md). It is told what a display
/// is told, posts commands like every other operator, and does all else on one thread of low priority that
/// nobody waits for.
class Control {
 public:
    /// Of the end of a run. The thread gives way to everything else, and may take its time.
    static constexpr std::chrono::milliseconds kPatience{5000};

    /// Listens from now on. Throws `ReceiverError` (`kUsage`) where it can't. `sizer` tells the sizes of
    /// files.
    Control(const std::string& path, std::shared_ptr<CommandQueue> commands, FileSizer sizer);
    /// As `End`.
    ~Control();
    Control(const Control&) = delete;
    Control& operator=(const Control&) = delete;

    /// To be told all that a display is told, in this order.
    std::vector<DisplayInterface*> Displays();
    /// The source is there, or has become another one.
    void Describe(const SourceDescription& source);
    /// A unit of the source goes by.
    void LookAt(const SourceUnit& unit);
    /// What there is to tell the operator since the last call: why nobody is served any more.
    std::optional<std::string> TakeFault();
    /// The run is over and the command queue closed: clients are told what is left to be told, those that
    /// read it soon, and the socket is removed. A thread that a disk keeps for longer than `patience` is left
    /// to itself. A second time does nothing.
    void End(std::chrono::milliseconds patience = kPatience);

 private:
    struct State;
    static void Run(State& state);
    static void Serve(State& state);

    /// The thread owns it too: a disk may keep that.
    const std::shared_ptr<State> state_;
    PatientThread thread_;
};

}  // namespace receiver
