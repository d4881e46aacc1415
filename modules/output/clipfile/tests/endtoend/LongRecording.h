#pragma once

#include <malloc.h>
#include <unistd.h>

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <stdexcept>
#include <string>
#include <vector>

#include "endtoend/LoadedModule.h"
#include "endtoend/NumberedStream.h"
#include "endtoend/PacedPush.h"
#include "support/FakeHost.h"
#include "support/TempDir.h"

/// What a process has in use.
struct Usage {
    std::uint64_t residentBytes = 0;
    std::uint64_t heapBytes = 0;
    std::size_t openFiles = 0;

    static Usage Now() {
        Usage usage;
        std::uint64_t pages = 0;
        std::ifstream("/proc/self/statm") >> pages >> pages;
        usage.residentBytes = pages * static_cast<std::uint64_t>(sysconf(_SC_PAGESIZE));
        const struct mallinfo2 heap = mallinfo2();
        usage.heapBytes = heap.uordblks + heap.hblkhd;
        usage.openFiles =
            static_cast<std::size_t>(std::distance(std::filesystem::directory_iterator("/proc/self/fd"), {}));
        return usage;
    }
};

/// A stream at 25 frames a second, recorded by the built library as fast as it takes it. Of the files only
/// the last two are kept.
class LongRecording {
 public:
    LongRecording(const std::string& fileType, unsigned minutesPerFile) {
        const std::string settings = (directory_.Path() / "settings.ini").string();
        std::ofstream(settings) << "[Qx/Other/MP4FileOut]\nMP4MaxFileSize=" << minutesPerFile << "\n";
        setenv("QX_SETTINGS", settings.c_str(), 1);
        host_.texts = {{"-outputPath", (directory_.Path() / "out").string()}, {"-fileType", fileType}};
        host_.numbers["-encodedFPS"] = 25000;
        std::filesystem::create_directory(directory_.Path() / "out");
        if (!library_.Module().Initialize(&host_)) {
            throw std::runtime_error("the module cannot be initialised");
        }
        library_.Notify().NotifyOnlineStatus();
    }
    ~LongRecording() { library_.Module().Uninitialize(); }
    LongRecording(const LongRecording&) = delete;
    LongRecording& operator=(const LongRecording&) = delete;

    /// Records one more minute of stream. Throws `std::runtime_error` when the module reports a fault.
    void RecordMinute() {
        static constexpr std::uint64_t kFramesPerMinute = std::uint64_t{60} * 25;
        const stream_units::StreamClock& clock = stream_.clock;
        for (const std::uint64_t end = next_ + kFramesPerMinute; next_ < end; ++next_) {
            for (std::uint64_t k = clock.AudioBefore(next_); k < clock.AudioBefore(next_ + 1); ++k) {
                push_.Audio(*stream_.Audio(k));
            }
            push_.Meta(*stream_.Meta(next_, true));
            push_.Video(*stream_.Video(next_));
        }
        if (host_.Statuses().size() > 1) {  // the first says that buffering has started
            throw std::runtime_error("the module reports a fault");
        }
        // Names are timecodes, so they rise with the time.
        std::vector<std::filesystem::path> kept = files();
        std::sort(kept.begin(), kept.end());
        for (std::size_t i = 0; i + 2 < kept.size(); ++i) {
            std::filesystem::remove(kept[i]);
            ++removed_;
        }
    }
    /// Files that were begun.
    std::size_t FileCount() const { return removed_ + files().size(); }

 private:
    std::vector<std::filesystem::path> files() const {
        std::vector<std::filesystem::path> files;
        for (const auto& entry : std::filesystem::recursive_directory_iterator(directory_.Path() / "out")) {
            if (entry.is_regular_file()) {
                files.push_back(entry.path());
            }
        }
        return files;
    }

    TempDir directory_;
    FakeHost host_;
    const NumberedStream stream_{stream_units::kRate25};
    LoadedModule library_;
    PacedPush push_{library_.Stream()};
    std::uint64_t next_ = 0;
    std::size_t removed_ = 0;
};
