#pragma once

#include <chrono>
#include <cstddef>
#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include "common/ReceiverError.h"
#include "common/Timecode.h"
#include "display/FileReport.h"
#include "module/Host.h"

namespace receiver {

/// What was lost on the way from the source to the files, by where it was.
struct Losses {
    /// Pictures that the source's own clock says have been there, and packets that came damaged.
    std::uint64_t pictures = 0;
    std::uint64_t packets = 0;
    /// Units that the module had no room for.
    std::uint64_t video = 0;
    std::uint64_t audio = 0;
    std::uint64_t metadata = 0;
    /// KLV packets of recordings whose picture did not come.
    std::uint64_t klvPackets = 0;
};

/// What the source has been through.
struct SourceEvents {
    std::uint64_t reconnections = 0;
    std::uint64_t changes = 0;
    /// Audio frames that are silence because those of the source did not come.
    std::uint64_t silentFrames = 0;
    /// Pictures in front of the first IDR frame of a connection.
    std::uint64_t earlyPictures = 0;
    /// It is lost and not back yet.
    bool away = false;
};

/// What the receiver does at one moment.
struct Snapshot {
    /// Of the last frame.
    std::optional<Timecode> timecode;
    /// Length of the stream so far.
    double seconds = 0;
    /// The record flag of the last frame; `waiting` says that the recording is commanded and waits for an IDR
    /// frame.
    bool recording = false;
    bool waiting = false;
    double framesPerSecond = 0;
    double videoKilobits = 0;
    double audioKilobits = 0;
    std::uint64_t klvPackets = 0;
    ModuleStatus status;
    /// The file that is open; empty when there is none.
    std::string file;
    /// Bytes that may still be written where files go.
    std::optional<std::uint64_t> freeBytes;
    /// How long the disk takes to make durable what is recorded; nothing when that is not asked of it.
    std::optional<std::chrono::milliseconds> syncTime;
    /// Units that were lost anywhere between the source and the files.
    std::uint64_t lost = 0;
    /// The same by kinds; units that nobody misses count in these alone.
    Losses losses;
    SourceEvents source;
    /// Pictures that the module holds: those that wait for the other media and for the disk, each chunk that
    /// waits for the disk as one.
    std::size_t heldPictures = 0;
    /// Events that hooks were told, and those that they could not be told.
    std::uint64_t hooksTold = 0;
    std::uint64_t hooksFailed = 0;
};

/// The end of a run.
struct Summary {
    std::vector<RecordedFile> files;
    std::uint64_t lost = 0;
    ExitCode exitCode = ExitCode::kSuccess;
};

/// Tells an operator, or a program in his place, what happens. One thread at a time.
class DisplayInterface {
 public:
    virtual ~DisplayInterface() = default;
    /// A whole sentence that the operator should see.
    virtual void Notice(const std::string& sentence) = 0;
    /// A failure that ends the program.
    virtual void Failure(ExitCode code, const std::string& sentence) = 0;
    virtual void Status(const ModuleStatus& status) = 0;
    virtual void FileOpened(const std::string& path) = 0;
    virtual void FileClosed(const std::string& path) = 0;
    /// A recording begins with the frame `at`.
    virtual void RecordStarted(const Timecode& at) = 0;
    /// A recording has ended in front of the frame `at`, which may never have come.
    virtual void RecordStopped(const Timecode& at) = 0;
    /// Called several times a second.
    virtual void Show(const Snapshot& snapshot) = 0;
    virtual void Finish(const Summary& summary) = 0;
};

}  // namespace receiver
