#pragma once

#include <chrono>
#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include "ModuleReport.h"
#include "display/DisplayInterface.h"
#include "journal/BackgroundRecovery.h"
#include "journal/RecordingJournal.h"
#include "options/Options.h"
#include "output/BackgroundSync.h"
#include "output/OutputPlace.h"
#include "source/SourceInterface.h"

namespace receiver {

/// What a run does about crashes and power cuts: it keeps a journal and makes durable what is recorded for
/// the one that may come, and sees to the files of those that have been. On a share it does nothing. One
/// thread at a time.
class CrashRecovery {
 public:
    /// `display` must outlive it. `folderIsNew`: this run has made the output folder. `hasTerminal`: somebody
    /// can be asked.
    CrashRecovery(const Options& options, const OutputPlace& place, bool folderIsNew,
                  DisplayInterface& display, bool hasTerminal);

    void Describe(const SourceDescription& source);
    void LookAt(const SourceUnit& unit);
    /// Follows the files of the run, and tells what there is to tell.
    void Follow(const ModuleReport& report);
    /// The run is over: stops what goes on in the background, and tells the rest.
    void End(const ModuleReport& report);
    /// How long the disk takes to make durable what is recorded; nothing when that is not asked of it.
    std::optional<std::chrono::milliseconds> SyncLatency() const;
    /// Files of which the disk has refused something that the module took for written.
    std::uint64_t SyncFaults() const { return sync_ ? sync_->Faults() : 0; }
    /// The operator agrees to what was asked. False when nothing was.
    bool Agree() { return recovery_ && recovery_->Agree(); }

 private:
    void Tell(const std::vector<std::string>& sentences);

    DisplayInterface& display_;
    std::optional<RecordingJournal> journal_;
    std::optional<BackgroundRecovery> recovery_;
    std::optional<BackgroundSync> sync_;
    /// Of each file of the run, whether it was closed when it was last looked at.
    std::vector<bool> wasClosed_;
};

}  // namespace receiver
