#pragma once

#include <filesystem>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "StreamAnalyzer.h"
#include "common/PatientThread.h"
#include "journal/Journal.h"
#include "source/SourceInterface.h"

namespace receiver {

/// Keeps a journal of the files that are recorded in the output folder, for who recovers them after a crash.
/// It is there while files are open. A thread of its own writes it: a disk that does not answer holds up
/// nobody. The operations belong to one thread.
class RecordingJournal {
 public:
    explicit RecordingJournal(const std::filesystem::path& folder);
    /// Waits for what is to be written, but not for long. The journal of files that are still open stays.
    ~RecordingJournal();
    RecordingJournal(const RecordingJournal&) = delete;
    RecordingJournal& operator=(const RecordingJournal&) = delete;

    void Describe(const SourceDescription& source);
    /// Looks for parameter sets, in IDR frames.
    void LookAt(const SourceUnit& unit);
    /// The files that are not closed, as the module names them, with slashes.
    void SetOpenFiles(const std::vector<std::string>& files);
    /// Why no journal can be kept, once: a sentence.
    std::optional<std::string> TakeWarning();

 private:
    struct State;

    void Publish();
    static void write(State& state);

    const std::filesystem::path folder_;
    nal_access::StreamAnalyzer analyzer_;
    clipfile::Journal journal_;
    std::vector<std::string> openFiles_;
    const std::shared_ptr<State> state_;
    PatientThread thread_;
};

}  // namespace receiver
