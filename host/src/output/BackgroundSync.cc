#include "output/BackgroundSync.h"

#include <fcntl.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <condition_variable>
#include <cstdio>
#include <cstring>
#include <filesystem>
#include <mutex>
#include <set>
#include <utility>

namespace receiver {
namespace {

using Clock = std::chrono::steady_clock;

std::string InSeconds(std::chrono::milliseconds time) {
    std::array<char, 32> text{};
    std::snprintf(text.data(), text.size(), "%.1f s", static_cast<double>(time.count()) / 1000);
    return text.data();
}

/// True for errors of a disk that has not kept what a write gave it, as it often learns only later
/// (fsync(2)).
bool LosesData(int error) {
    return error == EIO || error == ENOSPC || error == EDQUOT;
}

/// The folders with the names that lead to `file`, the nearest first.
std::vector<std::string> FoldersOf(const std::string& file, const std::string& folder, bool folderIsNew) {
    const std::filesystem::path top = std::filesystem::path(folder).lexically_normal();
    std::vector<std::string> folders;
    std::filesystem::path at = std::filesystem::path(file).lexically_normal().parent_path();
    while (at != top && at.has_relative_path()) {
        folders.push_back(at.string());
        at = at.parent_path();
    }
    folders.push_back(top.string());
    if (folderIsNew) {
        const std::filesystem::path parent = top.parent_path();
        folders.push_back(parent.empty() ? "." : parent.string());
    }
    return folders;
}

}  // namespace

struct BackgroundSync::State {
    State(Settings options, Call function) : settings(std::move(options)), call(std::move(function)) {}

    /// One time: `files` and, where they are new, their folders.
    void SyncAll(const std::vector<std::string>& files);
    /// False when that has failed.
    bool SyncOne(const std::string& path, Kind kind);

    const Settings settings;
    const Call call;

    /// The thread's own: files whose folders are durable.
    std::set<std::string> named;

    mutable std::mutex mutex;
    std::condition_variable changed;
    // Guarded by mutex:
    std::vector<std::string> open;
    std::vector<std::string> closed;
    bool ending = false;
    bool done = false;
    std::optional<std::chrono::milliseconds> last;
    std::optional<Clock::time_point> begun;
    std::optional<Clock::time_point> reminded;
    std::set<std::string> failed;
    std::uint64_t faults = 0;
    std::vector<std::string> sentences;
};

bool BackgroundSync::State::SyncOne(const std::string& path, Kind kind) {
    const int error = call(path, kind);
    // Some file systems cannot synchronise folders (fsync(2), EINVAL).
    if (error == 0 || (kind == Kind::kFolder && error == EINVAL)) {
        return true;
    }
    // A file is announced before it is made, and one that is gone is told at the end of the run.
    if (error == ENOENT) {
        return false;
    }
    const std::lock_guard lock(mutex);
    if (failed.insert(path).second) {
        const bool lost = kind == Kind::kFile && LosesData(error);
        faults += lost ? 1 : 0;
        sentences.push_back(lost ? "the disk has not kept all that was written to " + path + ": " +
                                       std::strerror(error) + "; look at its log, and verify the file"
                                 : path + " cannot be made durable: " + std::strerror(error));
    }
    return false;
}

void BackgroundSync::State::SyncAll(const std::vector<std::string>& files) {
    for (const std::string& file : files) {
        if (!SyncOne(file, Kind::kFile) || named.count(file) != 0) {
            continue;
        }
        const std::vector<std::string> folders = FoldersOf(file, settings.folder, settings.folderIsNew);
        if (std::all_of(folders.begin(), folders.end(),
                        [this](const std::string& folder) { return SyncOne(folder, Kind::kFolder); })) {
            named.insert(file);
        }
    }
    std::erase_if(named, [&files](const std::string& file) {
        return std::find(files.begin(), files.end(), file) == files.end();
    });
}

int BackgroundSync::Sync(const std::string& path, Kind kind) {
    // A FIFO that took the place of a file would keep an open for reading waiting.
    const int flags = O_RDONLY | O_CLOEXEC | O_NONBLOCK | (kind == Kind::kFolder ? O_DIRECTORY : O_NOFOLLOW);
    const int descriptor = open(path.c_str(), flags);
    if (descriptor < 0) {
        return errno;
    }
    int result = 0;
    do {
        result = kind == Kind::kFolder ? fsync(descriptor) : fdatasync(descriptor);
    } while (result != 0 && errno == EINTR);
    const int error = result == 0 ? 0 : errno;
    close(descriptor);
    return error;
}

BackgroundSync::BackgroundSync(const Settings& settings, const Call& call)
    : state_(std::make_shared<State>(settings, call)), thread_([state = state_] { run(*state); }) {}

BackgroundSync::~BackgroundSync() {
    End();
}

void BackgroundSync::SetFiles(const std::vector<std::string>& open, const std::vector<std::string>& closed) {
    const std::lock_guard lock(state_->mutex);
    state_->open = open;
    state_->closed.insert(state_->closed.end(), closed.begin(), closed.end());
}

void BackgroundSync::End() {
    {
        const std::lock_guard lock(state_->mutex);
        if (state_->ending) {
            return;
        }
        state_->ending = true;
        state_->changed.notify_all();
    }
    thread_.End(state_->settings.endPatience);
    const std::lock_guard lock(state_->mutex);
    if (!state_->done) {
        state_->sentences.push_back(
            "the disk still writes out what was recorded; a power cut now may cost some of it");
    }
}

std::optional<std::chrono::milliseconds> BackgroundSync::Latency() const {
    const std::lock_guard lock(state_->mutex);
    std::optional<std::chrono::milliseconds> latency = state_->last;
    if (state_->begun) {
        const auto now = std::chrono::duration_cast<std::chrono::milliseconds>(Clock::now() - *state_->begun);
        latency = std::max(latency.value_or(now), now);
    }
    return latency;
}

std::vector<std::string> BackgroundSync::TakeSentences() {
    const std::optional<std::chrono::milliseconds> latency = Latency();
    const std::lock_guard lock(state_->mutex);
    std::vector<std::string> sentences = std::exchange(state_->sentences, {});
    const auto now = Clock::now();
    const Settings& settings = state_->settings;
    if (latency > settings.slow && (!state_->reminded || now - *state_->reminded >= settings.reminder)) {
        state_->reminded = now;
        sentences.push_back("the disk takes " + InSeconds(*latency) +
                            " to make durable what is recorded, and a power cut costs so much more");
    }
    return sentences;
}

std::uint64_t BackgroundSync::Faults() const {
    const std::lock_guard lock(state_->mutex);
    return state_->faults;
}

void BackgroundSync::run(State& state) {
    std::unique_lock lock(state.mutex);
    auto due = Clock::now();
    for (bool last = false; !last;) {
        for (const auto now = Clock::now(); due <= now;) {
            due += state.settings.interval;
        }
        last = state.changed.wait_until(lock, due, [&state] { return state.ending; });
        std::vector<std::string> files = std::exchange(state.closed, {});
        files.insert(files.end(), state.open.begin(), state.open.end());
        if (files.empty()) {
            continue;
        }
        const auto begun = Clock::now();
        state.begun = begun;
        lock.unlock();
        state.SyncAll(files);
        lock.lock();
        state.begun.reset();
        state.last = std::chrono::duration_cast<std::chrono::milliseconds>(Clock::now() - begun);
    }
    state.done = true;
}

}  // namespace receiver
