#pragma once

#include <chrono>
#include <cstdint>
#include <ctime>
#include <functional>
#include <memory>
#include <optional>
#include <string>

#include "common/PatientThread.h"
#include "output/OutputFolder.h"

namespace receiver {

/// The local date as the module names folders: "20261121".
std::string DateOf(std::time_t time);
/// That of the next day, however many hours the clock is changed by in between.
std::string DateAfter(std::time_t time);

/// Throws `ReceiverError` with `kOutput` when others have made the folder of today or of tomorrow and keep us
/// out.
void ExpectDatedFolders(OutputFolder& folder, const std::string& prefix, std::time_t now);

/// Looks at the output folder during a run, on a thread of its own: a disk or a server that does not answer
/// holds up nobody. The operations may be called from any thread.
class FolderWatch {
 public:
    using TimeSource = std::function<std::time_t()>;

    static constexpr std::chrono::milliseconds kInterval{1000};

    /// Begins at once.
    FolderWatch(
        std::unique_ptr<OutputFolder> folder, const std::string& prefix,
        const TimeSource& now = [] { return std::time(nullptr); },
        std::chrono::milliseconds interval = kInterval);
    /// A look that hangs is left to itself.
    ~FolderWatch();
    FolderWatch(const FolderWatch&) = delete;
    FolderWatch& operator=(const FolderWatch&) = delete;

    /// As of the latest look.
    std::optional<std::uint64_t> FreeBytes() const;
    /// Why no file could be made today, or in a minute: a sentence, or empty.
    std::string Obstacle() const;
    /// The same about tomorrow, once for each day.
    std::optional<std::string> TakeWarning();
    /// What a look has made and cannot delete, as a sentence, once.
    std::optional<std::string> TakeLeftover();

 private:
    struct State;

    static void watch(State& state);
    static void look(State& state);
    std::optional<std::string> take(std::string& text);

    const std::shared_ptr<State> state_;
    PatientThread thread_;
};

}  // namespace receiver
