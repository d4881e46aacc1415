#pragma once

#include <cstdint>
#include <memory>
#include <optional>
#include <string>

#include "common/ReceiverError.h"
#include "display/FileReport.h"
#include "output/OutputPlace.h"

namespace receiver {

/// The module writes nothing to a disk with less free space than this, in bytes.
inline constexpr std::uint64_t kMinFreeBytes = 157286400;

/// The folder under which files appear, on a disk or on a share, as the receiver itself looks at it. One
/// thread at a time uses an object. A disk may keep it waiting for any length of time, a share for some
/// seconds.
class OutputFolder {
 public:
    virtual ~OutputFolder() = default;

    /// Sees that files can be written below the folder. One missing level is made; more than one is more
    /// likely a slip or a disk that is not mounted. True when it was made. Throws `ReceiverError` with
    /// `kOutput` when the folder is missing with its parent, is none, is not writable, or has no room, and
    /// when its server cannot be reached or refuses the credentials.
    virtual bool Prepare() = 0;
    /// Bytes that may still be written below the folder; nothing when that cannot be told.
    virtual std::optional<std::uint64_t> FreeBytes() = 0;
    /// Why no file could be made in the folder `prefix` of `date`, as a sentence: others may have made them
    /// first. Empty when one could, and when that cannot be told.
    virtual std::string Obstacle(const std::string& date, const std::string& prefix) = 0;
    /// What was made to try a folder and cannot be deleted, as a sentence, once; empty when there is nothing.
    virtual std::string TakeLeftover() { return {}; }

    // Of files below the folder, with slashes.
    virtual bool Exists(const std::string& path) = 0;
    virtual RecordedFile ReadBackFile(const std::string& path) = 0;
};

std::unique_ptr<OutputFolder> OpenOutputFolder(const OutputPlace& place);

/// The parts of `OpenOutputFolder`.
std::unique_ptr<OutputFolder> OpenLocalFolder(const std::string& folder);
std::unique_ptr<OutputFolder> OpenShareFolder(const OutputPlace& place);

/// True while a thread is in the middle of something with a share, as one that waits for a server which does
/// not answer: also of the module, also when nobody waits for it any more. The end of the process would take
/// away from under it what it uses. Any thread.
bool ShareThreadsLeft();

/// What ends the run for a folder that cannot be used.
ReceiverError Unusable(const std::string& sentence);
/// The sentence for a folder with less than `kMinFreeBytes`.
std::string FullSentence(const std::string& folder, std::uint64_t freeBytes);
/// The sentence for a folder that cannot be used, for the `reason`.
std::string UnusableSentence(const std::string& folder, const std::string& reason);

}  // namespace receiver
