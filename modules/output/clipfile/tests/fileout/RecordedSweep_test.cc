// A short recording of two files in which one operation fails, for every place where that can happen.

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <cerrno>
#include <cstdint>
#include <filesystem>
#include <ostream>
#include <string>
#include <tuple>
#include <vector>

#include "support/BoxFinder.h"
#include "support/RecordedFilesFixture.h"
#include "support/Sanitized.h"

namespace clipfileModule {
namespace {

namespace fs = std::filesystem;
using box_finder::Children;
using box_finder::Types;
using ::testing::ElementsAre;
using ::testing::IsEmpty;

/// Lines below errors are not kept: these tests record a thousand times.
class SweepFixture : public RecordedFilesFixture {
 protected:
    SweepFixture() : RecordedFilesFixture(LOG_PRIORITY_ERROR) { settings.maxFileSize = 0; }

    /// Records two files, the second of one chunk, to a directory of its own. Everything is released then.
    void Record(const std::string& folder) {
        settings.outputPath = dir.ModulePath() + "\\" + folder;
        fs::create_directories(Root(folder));
        controller.Clear();
        log.Clear();
        chunks.clear();
        ASSERT_TRUE(Initialize(settings.fileType));
        output->Start(settings);
        for (std::size_t chunk = 0; chunk < firstFileChunks; ++chunk) {
            const bool isLast = chunk + 1 == firstFileChunks;
            Push(static_cast<unsigned char>(chunk), isLast, chunk == 0 || isLast ? kShortChunk : kOnePicture);
        }
        Push(99, true);
        Finish();
        EXPECT_FALSE(log.Contains("wait thread timeout..."));
        EXPECT_THAT(TransferStatuses(), ElementsAre("output", "standby"));
        EXPECT_EQ(faults.BlocksInUse(), 0);
    }
    fs::path Root(const std::string& folder) const { return dir.Path() / folder; }
    Bytes FileIn(const std::string& folder, std::size_t file) const {
        return muxer_stream::ReadFile(Root(folder) / kToday / kNames[file]);
    }
    std::size_t firstFileChunks = 2;
    static inline const ChunkShape kOnePicture = {{}, {}, {9}, 0};
    static inline const std::vector<std::string> kNames = {"01_02_03_00.MP4", "01_02_03_99.MP4"};
};

// ---- Operations on the file.

/// Threads meet in the same way wherever the file fails. A prime, so that no kind of operation is left out.
constexpr std::uint64_t kEachFailure = kThreadSanitizer ? 5 : 1;

struct FileSweep {
    const char* name;
    const char* type;
    FaultyFiles::Operation operation;
    bool andAllAfter;
    /// The failures are shared out to that many tests, of which this is number `part` from 1 on.
    std::uint64_t parts;
    std::uint64_t part;
};

void PrintTo(const FileSweep& sweep, std::ostream* out) {
    *out << sweep.name;
}

class RecordedSweepTest : public SweepFixture, public testing::WithParamInterface<FileSweep> {
 protected:
    /// What a muxer was asked for when an operation on its file took place.
    struct Phase {
        std::uint64_t operations;  // before it
        std::string name;          // Open, Write, WriteTmcd, Close
        std::size_t file;
    };
    /// Records without a fault, and notes which operations belong to what.
    std::vector<Phase> Observe() {
        std::vector<Phase> phases;
        std::size_t opened = 0;
        LogCapture all(LOG_PRIORITY_DETAIL);
        all.OnLine([&](const CapturedLine& line) {
            for (const char* name : {"Open", "Write", "WriteTmcd", "Close"}) {
                if (line.text == "start." && line.function->starts_with("clipfileModule::Mp4") &&
                    line.function->ends_with(std::string("::") + name)) {
                    opened += name == std::string("Open") ? 1 : 0;
                    phases.push_back({faults.Count(GetParam().operation), name, opened - 1});
                }
            }
        });
        Record("whole");
        all.OnLine(nullptr);
        whole = {FileIn("whole", 0), FileIn("whole", 1)};
        ExpectHolds(whole[0], 0, firstFileChunks);
        ExpectHolds(whole[1], firstFileChunks, 1);
        EXPECT_THAT(Statuses(), IsEmpty());
        return phases;
    }
    /// The statuses that a failure in a phase has.
    std::vector<std::string> ExpectedStatuses(const Phase& phase) const {
        if (phase.name == "Open") {
            return {"7 25"};
        }
        if (phase.name == "Close") {
            return {"7 27"};
        }
        if (phase.name == "WriteTmcd") {
            // Nobody reads its result, so that only what fails after it is told.
            return GetParam().andAllAfter ? std::vector<std::string>{"7 27"} : std::vector<std::string>{};
        }
        // The first flush of a fragmented file cannot be done again, so that its close fails as well.
        return GetParam().andAllAfter || settings.fileType == "fragment"
                   ? std::vector<std::string>{"7 26", "7 27"}
                   : std::vector<std::string>{"7 26"};
    }
    /// Looks at the file in which an operation failed.
    void ExpectFileOf(const Phase& phase, const std::string& folder) const {
        const fs::path path = Root(folder) / kToday / kNames[phase.file];
        if (GetParam().operation == FaultyFiles::kOpen) {
            EXPECT_FALSE(fs::exists(path));
            return;
        }
        ASSERT_TRUE(fs::exists(path));
        const Bytes file = muxer_stream::ReadFile(path);
        if (phase.name == "Open") {
            // Its first bytes and nothing else.
            EXPECT_LE(file.size(), 192u);
            const std::size_t same = std::min<std::size_t>(file.size(), 176);
            EXPECT_TRUE(std::equal(file.begin(), file.begin() + static_cast<std::ptrdiff_t>(same),
                                   whole[phase.file].begin()));
        } else if (phase.name == "Write" && !GetParam().andAllAfter && settings.fileType == "normal") {
            EXPECT_EQ(Types(Children(file)), "ftyp uuid mdat moov");
        } else if (phase.name == "WriteTmcd" && !GetParam().andAllAfter) {
            // Whole but for the value, which a fragmented file does not hold anyway.
            EXPECT_EQ(file.size(), whole[phase.file].size());
            EXPECT_EQ(iso::ReadMovie(file).track(1).samples.size(),
                      iso::ReadMovie(whole[phase.file]).track(1).samples.size());
        } else {
            EXPECT_NE(file, whole[phase.file]);
        }
    }

    /// The two files of a recording without a fault.
    std::vector<Bytes> whole;
};

TEST_P(RecordedSweepTest, EachFailureHasItsStatusEndsTheRecordingAndLeavesTheFileAsItStands) {
    const FileSweep& sweep = GetParam();
    settings.fileType = sweep.type;
    if (settings.fileType == "fragment") {
        // One more than the part in `moov` has.
        firstFileChunks = 33;
    }
    const std::vector<Phase> phases = Observe();
    const std::uint64_t operations = faults.Count(sweep.operation);
    ASSERT_GT(operations, 1u);
    const std::size_t openFiles = CountOpenFiles();

    for (std::uint64_t n = sweep.part; n <= operations; n += kEachFailure * sweep.parts) {
        SCOPED_TRACE("failure " + std::to_string(n));
        const Phase& phase =
            *std::find_if(phases.rbegin(), phases.rend(), [&](const Phase& at) { return at.operations < n; });
        SCOPED_TRACE(phase.name + " of file " + std::to_string(phase.file));
        faults.Reset();
        faults.FailAt(sweep.operation, n, sweep.andAllAfter);
        Record("run");

        EXPECT_EQ(Statuses(), ExpectedStatuses(phase));
        EXPECT_GT(
            log.CountIf([](const CapturedLine& line) { return line.text.ends_with(", result = 257."); }), 0u);
        const bool recordingWentOn = Statuses().empty();
        if (phase.file == 1) {
            EXPECT_EQ(FileIn("run", 0), whole[0]);
        } else if (recordingWentOn) {
            EXPECT_EQ(FileIn("run", 1), whole[1]);
        }
        ExpectFileOf(phase, "run");
        const std::size_t made =
            recordingWentOn ? 2 : phase.file + (sweep.operation == FaultyFiles::kOpen ? 0 : 1);
        EXPECT_EQ(FilesUnder(Root("run")).size(), made);
        ASSERT_EQ(CountOpenFiles(), openFiles);
        fs::remove_all(Root("run"));
        if (HasFailure()) {
            break;
        }
    }
}

INSTANTIATE_TEST_SUITE_P(
    Operations, RecordedSweepTest,
    testing::Values(FileSweep{"NormalOpen", "normal", FaultyFiles::kOpen, false, 1, 1},
                    FileSweep{"NormalWrite", "normal", FaultyFiles::kWrite, false, 1, 1},
                    FileSweep{"NormalWriteAndAllAfter", "normal", FaultyFiles::kWrite, true, 1, 1},
                    FileSweep{"NormalShortWrite", "normal", FaultyFiles::kShortWrite, false, 1, 1},
                    FileSweep{"NormalSeek", "normal", FaultyFiles::kSeek, false, 1, 1},
                    FileSweep{"NormalSeekAndAllAfter", "normal", FaultyFiles::kSeek, true, 1, 1},
                    FileSweep{"FragmentOpen", "fragment", FaultyFiles::kOpen, false, 1, 1},
                    FileSweep{"FragmentWrite1", "fragment", FaultyFiles::kWrite, false, 3, 1},
                    FileSweep{"FragmentWrite2", "fragment", FaultyFiles::kWrite, false, 3, 2},
                    FileSweep{"FragmentWrite3", "fragment", FaultyFiles::kWrite, false, 3, 3},
                    FileSweep{"FragmentSeek1", "fragment", FaultyFiles::kSeek, false, 3, 1},
                    FileSweep{"FragmentSeek2", "fragment", FaultyFiles::kSeek, false, 3, 2},
                    FileSweep{"FragmentSeek3", "fragment", FaultyFiles::kSeek, false, 3, 3}),
    [](const auto& sweep) { return std::string(sweep.param.name); });

// ---- Operations on directories and names.

/// A call of the system whose `failing`-th use fails, counted in `count`.
struct SystemSweep {
    const char* name;
    const char* status;
    void (*arm)(FakePlatform& platform, int& count, int failing);
    /// Chunks that each of the two files holds when that use fails; nothing for a file that is not there.
    std::vector<std::vector<std::size_t>> held;
};

void PrintTo(const SystemSweep& sweep, std::ostream* out) {
    *out << sweep.name;
}

const SystemSweep kSystemSweeps[] = {
    {"Mkdir",
     "7 24",
     [](FakePlatform& platform, int& count, int failing) {
         platform.Set([&count, failing](FakePlatform::Hooks& hooks) {
             // No directory is found, so that each file asks for one.
             hooks.exists = [](const std::string&) { return false; };
             hooks.createDirectories = [&count, failing](const std::string& path,
                                                         boost::system::error_code& error) {
                 if (++count == failing) {
                     error = boost::system::errc::make_error_code(boost::system::errc::no_space_on_device);
                     return false;
                 }
                 FakePlatform::Real().CreateDirectories(path, error);
                 error.clear();
                 return true;
             };
         });
     },
     {{}, {2}}},
    {"Stat",
     "7 25",
     [](FakePlatform& platform, int& count, int failing) {
         platform.Set([&count, failing](FakePlatform::Hooks& hooks) {
             hooks.testExistence = [&count, failing](const std::string& path) {
                 return ++count == failing ? EIO : FakePlatform::Real().TestExistence(path);
             };
         });
     },
     {{}, {2}}},
    {"Space",
     "7 22",
     [](FakePlatform& platform, int& count, int failing) {
         platform.Set([&count, failing](FakePlatform::Hooks& hooks) {
             hooks.availableSpace = [&count, failing](const std::string&, std::uint64_t& bytes) {
                 bytes = 1000 * kMinFreeSpace;
                 return ++count == failing ? EIO : 0;
             };
         });
     },
     // For the file, for each of its two chunks, for the second file, for its chunk.
     {{}, {0}, {1}, {2}, {2, 0}}},
};

class SystemSweepTest : public SweepFixture,
                        public testing::WithParamInterface<std::tuple<SystemSweep, const char*>> {};

TEST_P(SystemSweepTest, EachFailureHasItsCauseAndLeavesWholeFilesAlone) {
    const auto& [sweep, type] = GetParam();
    settings.fileType = type;
    int count = 0;
    const std::size_t openFiles = CountOpenFiles();
    for (std::size_t n = 1; n <= sweep.held.size() + 1; ++n) {
        SCOPED_TRACE("failure " + std::to_string(n));
        count = 0;
        sweep.arm(platform, count, static_cast<int>(n));
        Record("run");
        const bool passed = n > sweep.held.size();
        EXPECT_EQ(count, static_cast<int>(passed ? sweep.held.size() : n));
        EXPECT_EQ(Statuses(), passed ? std::vector<std::string>{} : std::vector<std::string>{sweep.status});
        const std::vector<std::size_t> held = passed ? std::vector<std::size_t>{2, 1} : sweep.held[n - 1];
        ASSERT_EQ(FilesUnder(Root("run")).size(), held.size());
        for (std::size_t file = 0; file < held.size(); ++file) {
            ExpectHolds(FileIn("run", file), file == 0 ? 0 : 2, held[file]);
        }
        EXPECT_EQ(CountOpenFiles(), openFiles);
        fs::remove_all(Root("run"));
    }
}

INSTANTIATE_TEST_SUITE_P(Calls, SystemSweepTest,
                         testing::Combine(testing::ValuesIn(kSystemSweeps),
                                          testing::Values("normal", "fragment")),
                         [](const auto& tested) {
                             return std::string(std::get<0>(tested.param).name) + "_" +
                                    std::get<1>(tested.param);
                         });

}  // namespace
}  // namespace clipfileModule
