#include "output/FolderWatch.h"

#include <array>
#include <condition_variable>
#include <mutex>
#include <utility>

#include "common/ReceiverError.h"

namespace receiver {
namespace {

/// So much before midnight the folder of the next day counts as today's.
constexpr std::time_t kAhead = 60;
/// A server that does not answer, or refuses, is asked again after this many looks: it counts refused
/// passwords.
constexpr int kRestAfterFailure = 30;
constexpr std::chrono::milliseconds kEndPatience{500};

std::tm LocalTime(std::time_t time) {
    std::tm parts = {};
    localtime_r(&time, &parts);
    return parts;
}

}  // namespace

struct FolderWatch::State {
    State(std::unique_ptr<OutputFolder> watched, std::string last, TimeSource time,
          std::chrono::milliseconds every)
        : folder(std::move(watched)), prefix(std::move(last)), now(std::move(time)), interval(every) {}

    const std::unique_ptr<OutputFolder> folder;
    const std::string prefix;
    const TimeSource now;
    const std::chrono::milliseconds interval;

    mutable std::mutex mutex;
    std::condition_variable changed;
    // Guarded by mutex:
    bool ending = false;
    std::optional<std::uint64_t> freeBytes;
    std::string obstacle;
    std::string warning;
    std::string leftover;
    /// The day that was warned of.
    std::string warnedOf;
};

std::string DateOf(std::time_t time) {
    const std::tm parts = LocalTime(time);
    std::array<char, 16> text = {};
    const std::size_t size = std::strftime(text.data(), text.size(), "%Y%m%d", &parts);
    return {text.data(), size};
}

std::string DateAfter(std::time_t time) {
    std::tm parts = LocalTime(time);
    ++parts.tm_mday;
    // No clock is changed at noon.
    parts.tm_hour = 12;
    parts.tm_isdst = -1;
    return DateOf(std::mktime(&parts));
}

void ExpectDatedFolders(OutputFolder& folder, const std::string& prefix, std::time_t now) {
    for (const std::string& date : {DateOf(now), DateAfter(now)}) {
        const std::string obstacle = folder.Obstacle(date, prefix);
        if (!obstacle.empty()) {
            throw ReceiverError(ExitCode::kOutput, obstacle);
        }
    }
}

FolderWatch::FolderWatch(std::unique_ptr<OutputFolder> folder, const std::string& prefix,
                         const TimeSource& now, std::chrono::milliseconds interval)
    : state_(std::make_shared<State>(std::move(folder), prefix, now, interval)),
      thread_([state = state_] { watch(*state); }) {}

FolderWatch::~FolderWatch() {
    {
        const std::lock_guard lock(state_->mutex);
        state_->ending = true;
        state_->changed.notify_all();
    }
    thread_.End(kEndPatience);
}

void FolderWatch::watch(State& state) {
    std::unique_lock lock(state.mutex);
    while (!state.ending) {
        lock.unlock();
        look(state);
        lock.lock();
        const int looks = state.freeBytes ? 1 : kRestAfterFailure;
        state.changed.wait_for(lock, looks * state.interval, [&state] { return state.ending; });
    }
}

void FolderWatch::look(State& state) {
    std::optional<std::uint64_t> freeBytes;
    std::string obstacle;
    std::string warning;
    std::string leftover;
    const std::time_t now = state.now();
    const std::string tomorrow = DateAfter(now);
    try {
        freeBytes = state.folder->FreeBytes();
        if (freeBytes) {
            obstacle = state.folder->Obstacle(DateOf(now), state.prefix);
            if (obstacle.empty() && DateOf(now + kAhead) == tomorrow) {
                obstacle = state.folder->Obstacle(tomorrow, state.prefix);
            } else if (obstacle.empty()) {
                warning = state.folder->Obstacle(tomorrow, state.prefix);
            }
            leftover = state.folder->TakeLeftover();
        }
    } catch (const ReceiverError&) {
        // What the module writes to meets the same.
        freeBytes.reset();
    }
    const std::lock_guard lock(state.mutex);
    state.freeBytes = freeBytes;
    state.obstacle = obstacle;
    if (!warning.empty() && state.warnedOf != tomorrow) {
        state.warnedOf = tomorrow;
        state.warning = warning;
    }
    if (!leftover.empty()) {
        state.leftover = leftover;
    }
}

std::optional<std::uint64_t> FolderWatch::FreeBytes() const {
    const std::lock_guard lock(state_->mutex);
    return state_->freeBytes;
}

std::string FolderWatch::Obstacle() const {
    const std::lock_guard lock(state_->mutex);
    return state_->obstacle;
}

std::optional<std::string> FolderWatch::TakeWarning() {
    return take(state_->warning);
}

std::optional<std::string> FolderWatch::TakeLeftover() {
    return take(state_->leftover);
}

std::optional<std::string> FolderWatch::take(std::string& text) {
    const std::lock_guard lock(state_->mutex);
    std::string taken = std::exchange(text, {});
    return taken.empty() ? std::nullopt : std::optional<std::string>(std::move(taken));
}

}  // namespace receiver
