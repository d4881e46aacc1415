#pragma once

#include <optional>

#include "ModuleReport.h"
#include "display/DisplayInterface.h"
#include "journal/BackgroundRecovery.h"
#include "journal/RecordingJournal.h"
#include "options/Options.h"
#include "output/OutputPlace.h"
#include "source/SourceInterface.h"

namespace receiver {

/// What a run does about crashes: it keeps a journal for the one that may come, and sees to the files of
/// those that have been. On a share it does neither. One thread at a time.
class CrashRecovery {
 public:
    /// `display` must outlive it. `hasTerminal`: somebody can be asked.
    CrashRecovery(const Options& options, const OutputPlace& place, DisplayInterface& display,
                  bool hasTerminal);

    void Describe(const SourceDescription& source);
    void LookAt(const SourceUnit& unit);
    /// Follows the files of the run, and tells what there is to tell.
    void Follow(const ModuleReport& report);
    /// The run is over: stops what goes on in the background, and tells the rest.
    void End(const ModuleReport& report);
    /// The operator agrees to what was asked. False when nothing was.
    bool Agree() { return recovery_ && recovery_->Agree(); }

 private:
    DisplayInterface& display_;
    std::optional<RecordingJournal> journal_;
    std::optional<BackgroundRecovery> recovery_;
};

}  // namespace receiver
