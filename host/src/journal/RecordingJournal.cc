#include "journal/RecordingJournal.h"

#include <algorithm>
#include <condition_variable>
#include <exception>
#include <mutex>
#include <utility>

#include "StreamData.h"
#include "journal/JournalFile.h"

namespace receiver {
namespace {

constexpr std::chrono::milliseconds kEndPatience{500};

std::vector<unsigned char> BytesOf(const nal_access::NalUnit& unit) {
    return {unit.data.get(), unit.data.get() + unit.size};
}

bool AreSame(const clipfile::ParameterSets& a, const clipfile::ParameterSets& b) {
    return a.sps == b.sps && a.pps == b.pps;
}

}  // namespace

struct RecordingJournal::State {
    explicit State(const std::filesystem::path& folder) : file(folder) {}

    /// The thread's own.
    clipfile::JournalFile file;

    std::mutex mutex;
    std::condition_variable changed;
    // Guarded by mutex:
    std::optional<clipfile::Journal> next;
    bool ending = false;
    bool warned = false;
    std::string warning;
};

RecordingJournal::RecordingJournal(const std::filesystem::path& folder)
    : folder_(folder.lexically_normal()),
      state_(std::make_shared<State>(folder_)),
      thread_([state = state_] { write(*state); }) {}

RecordingJournal::~RecordingJournal() {
    {
        const std::lock_guard lock(state_->mutex);
        state_->ending = true;
        state_->changed.notify_all();
    }
    thread_.End(kEndPatience);
}

void RecordingJournal::Describe(const SourceDescription& source) {
    journal_.frameRate = source.frameRate.key;
    journal_.width = source.width;
    journal_.height = source.height;
}

void RecordingJournal::LookAt(const SourceUnit& unit) {
    if (unit.medium != Medium::kVideo || !unit.keyFrame) {
        return;
    }
    const auto data = std::make_shared<StreamData>();
    data->size = unit.size;
    data->payload = unit.data.get();
    nal_access::NalUnit sps;
    nal_access::NalUnit pps;
    // As the module does, so that these are the sets that it gives to the file.
    if (!analyzer_.IsAccessUnitStart(data, sps, pps) || sps.size == 0 || pps.size == 0) {
        return;
    }
    clipfile::ParameterSets found{BytesOf(sps), BytesOf(pps)};
    auto& sets = journal_.sets;
    if (!sets.empty() && AreSame(sets.front(), found)) {
        return;
    }
    std::erase_if(sets, [&](const auto& known) { return AreSame(known, found); });
    sets.insert(sets.begin(), std::move(found));
    if (sets.size() > clipfile::Journal::kMaxSets) {
        sets.pop_back();
    }
    Publish();
}

void RecordingJournal::SetOpenFiles(const std::vector<std::string>& files) {
    if (files == openFiles_) {
        return;
    }
    openFiles_ = files;
    journal_.files.clear();
    for (const std::string& file : files) {
        const std::filesystem::path below =
            std::filesystem::path(file).lexically_normal().lexically_relative(folder_);
        // One elsewhere would make the journal none.
        if (!below.empty() && *below.begin() != "..") {
            journal_.files.push_back(below.string());
        }
    }
    if (journal_.files.size() > clipfile::Journal::kMaxFiles) {
        journal_.files.erase(
            journal_.files.begin(),
            journal_.files.end() - static_cast<std::ptrdiff_t>(clipfile::Journal::kMaxFiles));
    }
    Publish();
}

void RecordingJournal::Publish() {
    const std::lock_guard lock(state_->mutex);
    state_->next = journal_;
    state_->changed.notify_all();
}

std::optional<std::string> RecordingJournal::TakeWarning() {
    const std::lock_guard lock(state_->mutex);
    std::string warning = std::exchange(state_->warning, {});
    return warning.empty() ? std::nullopt : std::optional<std::string>(std::move(warning));
}

void RecordingJournal::write(State& state) {
    std::unique_lock lock(state.mutex);
    while (true) {
        state.changed.wait(lock, [&state] { return state.next || state.ending; });
        if (!state.next) {
            break;
        }
        const clipfile::Journal journal = std::move(*std::exchange(state.next, std::nullopt));
        lock.unlock();
        std::string fault;
        try {
            if (journal.files.empty()) {
                state.file.Remove();
            } else {
                state.file.Write(journal);
            }
        } catch (const std::exception& error) {
            fault = std::string("no journal can be kept, ") + error.what() +
                    ": files that a crash leaves open will have to be recovered by hand";
        }
        lock.lock();
        if (!fault.empty() && !std::exchange(state.warned, true)) {
            state.warning = fault;
        }
    }
}

}  // namespace receiver
