#pragma once

#include <chrono>
#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "common/PatientThread.h"

namespace receiver {

/// Makes durable what is recorded on a disk: what a file holds so far every few seconds while it grows, the
/// rest when it is closed, and the folders that its name stands in. It opens what it writes out, by its path,
/// on a thread of its own: neither the writer of a file nor anybody else waits for it. The operations belong
/// to one thread.
class BackgroundSync {
 public:
    enum class Kind { kFile, kFolder };
    /// Gives the error number of the system, 0 for success. It may take any length of time.
    using Call = std::function<int(const std::string& path, Kind kind)>;

    struct Settings {
        /// The output folder, and whether this run has made it.
        std::string folder;
        bool folderIsNew = false;
        /// From one time to the next. A time that comes while the last one still lasts is skipped.
        std::chrono::milliseconds interval{2000};
        /// What takes longer is told, and told again after so long.
        std::chrono::milliseconds slow{1000};
        std::chrono::milliseconds reminder{60000};
        /// At the end the disk is waited for.
        std::chrono::milliseconds endPatience{5000};
    };

    /// Begins at once.
    explicit BackgroundSync(const Settings& settings, const Call& call = Sync);
    ~BackgroundSync();
    BackgroundSync(const BackgroundSync&) = delete;
    BackgroundSync& operator=(const BackgroundSync&) = delete;

    /// The files that are open, and those that were closed since the last call, as the module names them,
    /// with slashes. One that opened and closed in between is among the latter alone.
    void SetFiles(const std::vector<std::string>& open, const std::vector<std::string>& closed);
    /// The run is over: all files are written out once more. One that a disk holds up is left to itself.
    void End();

    /// How long the disk took the last time, or takes now where that is longer. Nothing before the first
    /// time.
    std::optional<std::chrono::milliseconds> Latency() const;
    /// What an operator should know, since the last call: sentences without full stop.
    std::vector<std::string> TakeSentences();
    /// Files of which the disk has refused something that the module took for written.
    std::uint64_t Faults() const;

    /// Writes a file's data out (fdatasync), or the names in a folder (fsync). A link in the place of a file
    /// is not followed.
    static int Sync(const std::string& path, Kind kind);

 private:
    struct State;

    static void run(State& state);

    const std::shared_ptr<State> state_;
    PatientThread thread_;
};

}  // namespace receiver
