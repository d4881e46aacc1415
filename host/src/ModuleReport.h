#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "display/DisplayInterface.h"
#include "module/Host.h"
#include "module/ModuleLog.h"

namespace receiver {

/// Tells an operator what the module says in a run, and keeps what matters at its end. One thread at a time.
class ModuleReport {
 public:
    struct WrittenFile {
        std::string path;
        bool closed = false;

        friend bool operator==(const WrittenFile&, const WrittenFile&) = default;
    };

    /// `display` must outlive the report.
    explicit ModuleReport(DisplayInterface& display) : display_(display) {}

    /// Each status once, however often the module repeats it. `ending`: the session of these statuses is
    /// over; then that the host went offline is no fault.
    void Tell(const std::vector<ModuleStatus>& statuses, bool ending);
    void Tell(const std::vector<ModuleEvent>& events);

    /// The files of the run, in the order in which they were opened.
    const std::vector<WrittenFile>& Files() const { return files_; }
    /// The file that is open; empty when there is none.
    const std::string& OpenFile() const { return openFile_; }
    /// Faults of the stream so far: status 6.
    std::uint64_t Faults() const { return faults_; }

 private:
    void TellClosed(const std::string& path);

    DisplayInterface& display_;
    std::vector<WrittenFile> files_;
    std::string openFile_;
    std::uint64_t faults_ = 0;
    ModuleStatus told_;
};

}  // namespace receiver
