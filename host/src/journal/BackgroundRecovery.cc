#include "journal/BackgroundRecovery.h"

#include <condition_variable>
#include <exception>
#include <mutex>
#include <set>
#include <system_error>
#include <utility>

#include "common/ChildProgram.h"
#include "journal/JournalFile.h"
#include "journal/UnfinishedFiles.h"

namespace receiver {
namespace {

namespace fs = std::filesystem;

constexpr std::chrono::milliseconds kRecoveryPatience{2000};

// Exit codes of the program.
constexpr int kDone = 0;
/// Nothing can be recovered, now or later.
constexpr int kHopeless = 1;

/// The first line of what the program has said, as one of our own sentences.
std::string SentenceOf(const std::string& text) {
    constexpr std::string_view kName = "clipfile: ";
    std::string line = text.substr(0, text.find('\n'));
    if (line.starts_with(kName)) {
        line.erase(0, kName.size());
    }
    if (line.ends_with('.')) {
        line.pop_back();
    }
    return line;
}

/// All lines of what the program has said.
std::vector<std::string> SentencesOf(std::string text) {
    std::vector<std::string> sentences;
    while (!text.empty()) {
        sentences.push_back(SentenceOf(text));
        const std::size_t end = text.find('\n');
        text.erase(0, end == std::string::npos ? end : end + 1);
    }
    return sentences;
}

}  // namespace

struct BackgroundRecovery::State {
    State(fs::path where, RecoverMode how, fs::path with)
        : folder(std::move(where)), mode(how), program(std::move(with)) {}

    const fs::path folder;
    const RecoverMode mode;
    const fs::path program;
    ChildProgram child;

    std::mutex mutex;
    std::condition_variable changed;
    // Guarded by mutex:
    std::vector<std::string> sentences;
    bool asked = false;
    bool agreed = false;
    bool ending = false;

    void Tell(const std::string& sentence) {
        const std::lock_guard lock(mutex);
        sentences.push_back(sentence);
    }
    bool Ending() {
        const std::lock_guard lock(mutex);
        return ending;
    }
    /// False when nobody agrees before the end.
    bool WaitForAgreement() {
        std::unique_lock lock(mutex);
        asked = true;
        changed.wait(lock, [this] { return agreed || ending; });
        return agreed && !ending;
    }
    /// Tells the files of a journal, each once however many name it. Whether there are any.
    bool Tell(const UnfinishedFiles& files);
    void Recover(UnfinishedFiles& files);
    void Recover(UnfinishedFiles& files, const fs::path& path);
    void Work();

    /// The thread's own: the files that were told.
    std::set<fs::path> told;
};

bool BackgroundRecovery::State::Tell(const UnfinishedFiles& files) {
    const char* const what = mode == RecoverMode::kYes  ? "; it is recovered in the background"
                             : mode == RecoverMode::kNo ? "; clipfile recover makes a whole file of it"
                                                        : "; press y to have it recovered";
    for (const fs::path& path : files.Paths()) {
        if (told.insert(path).second) {
            Tell(path.string() + " was never closed: its receiver is gone" + what);
        }
    }
    for (const std::string& obstacle : files.Obstacles()) {
        Tell(obstacle);
    }
    return !files.Paths().empty();
}

void BackgroundRecovery::State::Recover(UnfinishedFiles& files) {
    for (const fs::path& path : std::vector(files.Paths())) {
        if (Ending()) {
            Tell(path.string() + " is not recovered yet: the next receiver goes on with it");
        } else {
            Recover(files, path);
        }
    }
}

void BackgroundRecovery::State::Recover(UnfinishedFiles& files, const fs::path& path) {
    const ChildResult result =
        child.Run({{program.string(), "recover", "--unattended", fs::absolute(path).string()}});
    if (Ending() && result.code < 0) {
        Tell(path.string() + " is not recovered yet: the next receiver goes on with it");
        return;
    }
    if (result.code < 0) {
        Tell(path.string() + " is not recovered: " + program.string() + " did not run to its end" +
             (result.text.empty() ? "" : ": " + SentenceOf(result.text)));
        return;
    }
    for (const std::string& sentence : SentencesOf(result.text)) {
        Tell(sentence);
    }
    // Any other failure may pass: a full disk, a file that somebody holds.
    if (result.code == kDone || result.code == kHopeless) {
        files.Forget(path);
    }
}

/// One journal is held at a time, however many there are.
void BackgroundRecovery::State::Work() {
    clipfile::RemoveTornJournals(folder);
    std::vector<fs::path> found;
    for (const fs::path& journal : clipfile::JournalsIn(folder)) {
        const auto files = UnfinishedFiles::Take(journal);
        if (files && Tell(*files)) {
            found.push_back(journal);
        }
    }
    if (found.empty() || mode == RecoverMode::kNo || (mode == RecoverMode::kAsk && !WaitForAgreement())) {
        return;
    }
    if (program.empty()) {
        Tell("nothing is recovered: the program clipfile cannot be found");
        return;
    }
    for (const fs::path& journal : found) {
        if (auto files = UnfinishedFiles::Take(journal)) {
            Recover(*files);
        }
    }
}

BackgroundRecovery::BackgroundRecovery(const fs::path& folder, RecoverMode mode, const fs::path& program)
    : state_(std::make_shared<State>(folder, mode, program)), thread_([state = state_] { run(*state); }) {}

BackgroundRecovery::~BackgroundRecovery() {
    End();
}

void BackgroundRecovery::End() {
    {
        const std::lock_guard lock(state_->mutex);
        state_->ending = true;
        state_->changed.notify_all();
    }
    state_->child.End();
    thread_.End(kRecoveryPatience);
}

bool BackgroundRecovery::Agree() {
    const std::lock_guard lock(state_->mutex);
    const bool wasAsked = std::exchange(state_->asked, false);
    state_->agreed = state_->agreed || wasAsked;
    state_->changed.notify_all();
    return wasAsked;
}

std::vector<std::string> BackgroundRecovery::TakeSentences() {
    const std::lock_guard lock(state_->mutex);
    return std::exchange(state_->sentences, {});
}

fs::path BackgroundRecovery::DefaultProgram() {
    std::error_code error;
    const fs::path self = fs::read_symlink("/proc/self/exe", error);
    if (error) {
        // Without its folder it would be that of the current one, which anybody may have put there.
        return {};
    }
    const fs::path folder = self.parent_path();
    for (const char* const place : {"", "../clipfile"}) {
        const fs::path program = folder / place / "clipfile";
        if (fs::is_regular_file(program, error)) {
            return program.lexically_normal();
        }
    }
    return folder / "clipfile";
}

void BackgroundRecovery::run(State& state) {
    try {
        state.Work();
    } catch (const std::exception& error) {
        state.Tell(std::string("files that were never closed are not recovered: ") + error.what());
    }
}

}  // namespace receiver
