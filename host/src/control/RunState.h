#pragma once

#include <chrono>
#include <cstdint>
#include <deque>
#include <functional>
#include <mutex>
#include <optional>
#include <string>
#include <vector>

#include "display/DisplayInterface.h"
#include "source/SourceInterface.h"

namespace receiver {

/// What a run does at the moment, in one word.
enum class RunPhase {
    /// The source is not there yet.
    kWaitingForSource,
    kIdle,
    /// A recording is commanded and waits for an IDR frame.
    kWaitingForIdr,
    kRecording,
    /// The source is lost and not back yet.
    kSourceLost,
    /// The module has failed for good.
    kFailed,
    kEnded,
};

/// A file of the run.
struct RunFile {
    using WallClock = std::chrono::system_clock;

    std::string path;
    /// Of its first frame, as its name says.
    std::optional<Timecode> start;
    /// The frame behind its last one, once that is known.
    std::optional<Timecode> end;
    FrameRate frameRate;
    WallClock::time_point opened;
    std::optional<WallClock::time_point> closed;
    /// Number of its recording in the run, from 1.
    std::uint64_t recording = 0;
};

/// Seconds from one address to another one, counted on over midnight.
double SecondsBetween(const Timecode& from, const Timecode& to, const FrameRate& rate);

/// What is to be known of a run: it is told all that a display is told, and may be asked from any thread.
class RunState final : public DisplayInterface {
 public:
    using WallClock = RunFile::WallClock;

    /// Files and recordings that are kept in mind: the newest ones.
    static constexpr std::size_t kKept = 1000;

    struct View {
        RunPhase phase = RunPhase::kWaitingForSource;
        /// Since when.
        WallClock::time_point since;
        WallClock::time_point started;
        std::optional<SourceDescription> source;
        Snapshot snapshot;
        /// Statuses 6 and 7 of the module.
        std::uint64_t faults = 0;
        /// Of the whole run.
        std::uint64_t files = 0;
        std::uint64_t recordings = 0;
        /// The one that was opened last and is not closed.
        std::optional<RunFile> openFile;
    };

    /// `changed` is called behind each change, on the thread that tells it.
    explicit RunState(std::function<void()> changed,
                      std::function<WallClock::time_point()> clock = WallClock::now);

    /// The source is there, or has become another one.
    void Describe(const SourceDescription& source);

    bool HasSource() const;
    /// The file with which the latest recording that began at `start` began; nothing before there is one.
    std::optional<RunFile> FirstFileFrom(const Timecode& start) const;
    /// The last file of the latest recording that ended at `end`.
    std::optional<RunFile> LastFileTo(const Timecode& end) const;
    View Look() const;
    /// In the order in which they were opened.
    std::vector<RunFile> Files() const;

    // DisplayInterface
    void Notice(const std::string& /*sentence*/) override {}
    void Failure(ExitCode code, const std::string& sentence) override;
    void Status(const ModuleStatus& status) override;
    void FileOpened(const std::string& path) override;
    void FileClosed(const std::string& path) override;
    void RecordStarted(const Timecode& at) override;
    void RecordStopped(const Timecode& at) override;
    void Show(const Snapshot& snapshot) override;
    void Finish(const Summary& summary) override;

 private:
    struct Recording {
        std::uint64_t number = 0;
        Timecode start;
        /// The frame behind its last one.
        std::optional<Timecode> end;
    };

    /// Makes a change under the lock, and tells of it.
    void Change(const std::function<void()>& change);
    RunPhase Phase() const;
    const Recording* RecordingFrom(const std::optional<Timecode>& start) const;
    bool HasFile(const Recording& recording) const;

    const std::function<void()> changed_;
    const std::function<WallClock::time_point()> clock_;
    mutable std::mutex mutex_;
    // Guarded by mutex_:
    View view_;
    std::deque<RunFile> files_;
    std::deque<Recording> recordings_;
    bool failed_ = false;
    bool ended_ = false;
};

}  // namespace receiver
