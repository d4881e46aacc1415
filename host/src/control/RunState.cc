#include "control/RunState.h"

#include <algorithm>
#include <charconv>
#include <utility>

#include "QxModuleStatus.h"

namespace receiver {
namespace {

/// The address in the name of a file, HH_MM_SS_FF.
std::optional<Timecode> AddressIn(const std::string& path, bool dropFrame) {
    constexpr std::size_t kLength = 11;
    std::string name = path.substr(path.rfind('/') + 1).substr(0, kLength);
    std::replace(name.begin(), name.end(), '_', ':');
    std::optional<Timecode> address = ParseTimecode(name);
    if (address) {
        address->dropFrame = dropFrame;
    }
    return address;
}

}  // namespace

double SecondsBetween(const Timecode& from, const Timecode& to, const FrameRate& rate) {
    const auto number = [&rate](const Timecode& address) {
        return FrameNumberOf(address, rate.timecodeFrames);
    };
    constexpr Timecode kLast{23, 59, 59, 0, false};
    Timecode last = kLast;
    last.frames = static_cast<std::uint8_t>(rate.timecodeFrames - 1);
    last.dropFrame = from.dropFrame;
    std::int64_t frames = number(to) - number(from);
    if (frames < 0) {
        frames += number(last) + 1;
    }
    return static_cast<double>(frames * rate.denominator) / static_cast<double>(rate.numerator);
}

RunState::RunState(std::function<void()> changed, std::function<WallClock::time_point()> clock)
    : changed_(std::move(changed)), clock_(std::move(clock)) {
    view_.started = view_.since = clock_();
}

void RunState::Change(const std::function<void()>& change) {
    {
        const std::lock_guard lock(mutex_);
        change();
        if (const RunPhase phase = Phase(); phase != view_.phase) {
            view_.phase = phase;
            view_.since = clock_();
        }
    }
    changed_();
}

RunPhase RunState::Phase() const {
    if (ended_) {
        return RunPhase::kEnded;
    }
    if (failed_) {
        return RunPhase::kFailed;
    }
    if (!view_.source) {
        return RunPhase::kWaitingForSource;
    }
    if (!recordings_.empty() && !recordings_.back().end) {
        return RunPhase::kRecording;
    }
    if (view_.snapshot.source.away) {
        return RunPhase::kSourceLost;
    }
    return view_.snapshot.waiting ? RunPhase::kWaitingForIdr : RunPhase::kIdle;
}

void RunState::Describe(const SourceDescription& source) {
    Change([&] { view_.source = source; });
}

bool RunState::HasSource() const {
    const std::lock_guard lock(mutex_);
    return view_.source.has_value();
}

std::optional<RunFile> RunState::FirstFileFrom(const Timecode& start) const {
    const std::lock_guard lock(mutex_);
    const Recording* const recording = RecordingFrom(start);
    const auto found = std::find_if(files_.begin(), files_.end(), [&](const RunFile& file) {
        return recording != nullptr && file.recording == recording->number;
    });
    return found == files_.end() ? std::nullopt : std::optional(*found);
}

std::optional<RunFile> RunState::LastFileTo(const Timecode& end) const {
    const std::lock_guard lock(mutex_);
    const auto recording = std::find_if(recordings_.rbegin(), recordings_.rend(),
                                        [&](const Recording& one) { return one.end == end; });
    const auto found = std::find_if(files_.rbegin(), files_.rend(), [&](const RunFile& file) {
        return recording != recordings_.rend() && file.recording == recording->number;
    });
    return found == files_.rend() ? std::nullopt : std::optional(*found);
}

RunState::View RunState::Look() const {
    const std::lock_guard lock(mutex_);
    View view = view_;
    if (!files_.empty() && !files_.back().closed) {
        view.openFile = files_.back();
    }
    return view;
}

std::vector<RunFile> RunState::Files() const {
    const std::lock_guard lock(mutex_);
    return {files_.begin(), files_.end()};
}

const RunState::Recording* RunState::RecordingFrom(const std::optional<Timecode>& start) const {
    const auto found = std::find_if(recordings_.rbegin(), recordings_.rend(),
                                    [&](const Recording& one) { return one.start == start; });
    return found == recordings_.rend() ? nullptr : &*found;
}

bool RunState::HasFile(const Recording& recording) const {
    return std::any_of(files_.begin(), files_.end(),
                       [&](const RunFile& file) { return file.recording == recording.number; });
}

void RunState::Failure(ExitCode, const std::string&) {
    Change([&] { ended_ = true; });
}

void RunState::Status(const ModuleStatus& status) {
    Change([&] {
        view_.snapshot.status = status;
        view_.faults += status.status == QxStatus::kStreamFault || status.status == QxStatus::kFailed ? 1 : 0;
        failed_ = failed_ || status.status == QxStatus::kFailed;
    });
}

void RunState::FileOpened(const std::string& path) {
    Change([&] {
        RunFile file;
        file.path = path;
        file.opened = clock_();
        file.start = AddressIn(path, !recordings_.empty() && recordings_.back().start.dropFrame);
        file.frameRate = view_.source ? view_.source->frameRate : FrameRate();
        const Recording* const begun = RecordingFrom(file.start);
        if (begun != nullptr && !HasFile(*begun)) {
            file.recording = begun->number;
            file.end = begun->end;
        } else if (!files_.empty()) {
            // It goes on where the one before it ends.
            file.recording = files_.back().recording;
            file.end = std::exchange(files_.back().end, file.start);
        }
        ++view_.files;
        files_.push_back(std::move(file));
        if (files_.size() > kKept) {
            files_.pop_front();
        }
    });
}

void RunState::FileClosed(const std::string& path) {
    Change([&] {
        for (RunFile& file : files_) {
            if (file.path == path && !file.closed) {
                file.closed = clock_();
            }
        }
    });
}

void RunState::RecordStarted(const Timecode& at) {
    Change([&] {
        recordings_.push_back({++view_.recordings, at, std::nullopt});
        if (recordings_.size() > kKept) {
            recordings_.pop_front();
        }
    });
}

void RunState::RecordStopped(const Timecode& at) {
    Change([&] {
        if (recordings_.empty()) {
            return;
        }
        recordings_.back().end = at;
        if (!files_.empty() && files_.back().recording == recordings_.back().number) {
            files_.back().end = at;
        }
    });
}

void RunState::Show(const Snapshot& snapshot) {
    Change([&] { view_.snapshot = snapshot; });
}

void RunState::Finish(const Summary&) {
    Change([&] { ended_ = true; });
}

}  // namespace receiver
