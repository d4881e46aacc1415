#pragma once

#include <filesystem>
#include <memory>
#include <string>
#include <vector>

#include "common/PatientThread.h"
#include "options/Options.h"

namespace receiver {

/// Sees to the files that receivers before this one have left open in the output folder: tells them, and has
/// the program `clipfile` recover them one by one, beside the recording and giving way to it. All on a thread
/// of its own. The operations may be called from any thread.
class BackgroundRecovery {
 public:
    /// Begins at once. With `kAsk` files are recovered once `Agree` is called, with `kNo` never.
    BackgroundRecovery(const std::filesystem::path& folder, RecoverMode mode,
                       const std::filesystem::path& program = DefaultProgram());
    ~BackgroundRecovery();
    BackgroundRecovery(const BackgroundRecovery&) = delete;
    BackgroundRecovery& operator=(const BackgroundRecovery&) = delete;

    /// Stops a recovery that is going on; the next receiver begins it again. One that a disk holds up is left
    /// to itself. All sentences are there then. So the destructor does too.
    void End();
    /// The operator wants what was asked. False when nothing was.
    bool Agree();
    /// What an operator should know, since the last call: sentences without full stop.
    std::vector<std::string> TakeSentences();

    /// The program `clipfile` that belongs to this build. It may be missing; empty when nobody can tell where
    /// it would be.
    static std::filesystem::path DefaultProgram();

 private:
    struct State;

    static void run(State& state);

    const std::shared_ptr<State> state_;
    PatientThread thread_;
};

}  // namespace receiver
