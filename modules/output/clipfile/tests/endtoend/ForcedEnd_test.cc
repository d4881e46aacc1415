// A disk dies under the built library, and the host goes on without it.

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cerrno>
#include <chrono>
#include <cstdint>
#include <memory>
#include <ostream>
#include <string>

#include "LogCapture.h"
#include "Logger.h"
#include "endtoend/LoadedModule.h"
#include "endtoend/NumberedStream.h"
#include "endtoend/PacedPush.h"
#include "endtoend/RecordedFiles.h"
#include "support/FakeHost.h"
#include "support/HangingFileSystem.h"
#include "support/LogLines.h"
#include "support/TempDir.h"
#include "support/ThreadCount.h"
#include "support/WaitUntil.h"

namespace {

using std::chrono::milliseconds;
using std::chrono::steady_clock;
using ::testing::Contains;
using ::testing::Each;
using ::testing::IsEmpty;
using ::testing::Not;
using ::testing::Pair;
using ::testing::StartsWith;

struct Hang {
    const char* fileType;
    /// How the write that hung ends at last; 0 for success.
    int error;
};

void PrintTo(const Hang& hang, std::ostream* out) {
    *out << hang.fileType << ", error " << hang.error;
}

class ForcedEnd : public ::testing::TestWithParam<Hang> {
 protected:
    static constexpr const char* kName = "09_59_50_00.MP4";

    /// A host that records from the start, as long as it is online.
    static std::unique_ptr<FakeHost> makeHost(const std::filesystem::path& output) {
        auto host = std::make_unique<FakeHost>();
        host->texts = {{"-outputPath", output.string()}, {"-fileType", GetParam().fileType}};
        host->numbers["-encodedFPS"] = 25000;
        return host;
    }
    /// A library that stayed in memory knows whether it was online.
    static void goOnline(QxModuleNotifyInterface& notify) {
        notify.NotifyOfflineStatus();
        notify.NotifyOnlineStatus();
    }
    void pushFrame(PacedPush& push, std::uint64_t n) const {
        for (std::uint64_t k = stream_.clock.AudioBefore(n); k < stream_.clock.AudioBefore(n + 1); ++k) {
            push.Audio(*stream_.Audio(k));
        }
        push.Meta(*stream_.Meta(n, true));
        push.Video(*stream_.Video(n));
    }

    LogCapture log_{LOG_PRIORITY_TRACE};
    TempDir directory_;
    HangingFileSystem disk_{directory_};
    const NumberedStream stream_{stream_units::kRate25};
};

TEST_P(ForcedEnd, TheHostEndsInTimeAndUnloadsAndNothingIsTouchedWhenTheDiskAnswers) {
    Logger::Put(LOG_PRIORITY_OPERATOR, nullptr, nullptr, 0, "the log has its thread from here on");
    auto library = std::make_unique<LoadedModule>();
    std::unique_ptr<FakeHost> host = makeHost(disk_.Path());
    const std::size_t threads = threadCount();

    ASSERT_TRUE(library->Module().Initialize(host.get()));
    goOnline(library->Notify());
    {
        PacedPush push(library->Stream());
        std::uint64_t n = 0;
        for (; n < 300; ++n) {
            pushFrame(push, n);
        }
        ASSERT_TRUE(waitForPrefix(log_, "ST: out_filename = "));
        disk_.Hang();
        // A fragment is 256 pictures, so either kind of file comes to write.
        for (; !disk_.IsHanging() && n < 600; ++n) {
            pushFrame(push, n);
        }
    }
    ASSERT_TRUE(disk_.IsHanging());

    const auto before = steady_clock::now();
    EXPECT_TRUE(library->Module().Uninitialize());
    const auto took = steady_clock::now() - before;
    EXPECT_GE(took, milliseconds(3500));
    EXPECT_LT(took, milliseconds(13500));  // for a loaded machine
    EXPECT_EQ(host->Statuses().back(), (FakeHost::Status{7, 27}));
    EXPECT_TRUE(log_.Contains("wait thread timeout..."));
    EXPECT_TRUE(library->Unload());
    // The thread that was given up returns into the library's code.
    EXPECT_TRUE(LoadedModule::IsInMemory());
    EXPECT_EQ(threadCount(), threads + 1);

    // A thread that still used the host, or anything of the module that is gone, would be seen by the
    // sanitizers.
    host.reset();
    library.reset();
    log_.Clear();
    disk_.Answer(GetParam().error);
    EXPECT_TRUE(waitUntil([&] { return threadCount() == threads; }));
    if (GetParam().error == 0) {
        EXPECT_THAT(log_.Texts(), IsEmpty());
    } else {
        // What the muxer finds goes to the log, and nowhere else.
        EXPECT_THAT(log_.Texts(), Each(StartsWith("error. error_line = ")));
    }

    // The file is what it was.
    const auto left = ReadWholeFile(FindRecording(disk_.Store(), kName));
    EXPECT_EQ(std::string(left.begin() + 4, left.begin() + 8), "ftyp");
    const std::string text(left.begin(), left.end());
    EXPECT_EQ(text.find("mfra"), std::string::npos);
    if (GetParam().fileType == std::string("normal")) {
        EXPECT_EQ(text.find("moov"), std::string::npos);
        for (std::uint64_t n = 0; n < 8; ++n) {
            EXPECT_NE(text.find(stream_units::Mark('V', n)), std::string::npos) << n;
        }
    }

    // And the module has another life, on a disk that answers.
    TempDir healthy;
    log_.Clear();
    std::unique_ptr<FakeHost> next = makeHost(healthy.Path());
    {
        LoadedModule again;
        ASSERT_TRUE(again.Module().Initialize(next.get()));
        goOnline(again.Notify());
        PacedPush push(again.Stream());
        for (std::uint64_t n = 0; n < 100; ++n) {
            pushFrame(push, n);
        }
        ASSERT_TRUE(waitForPrefix(log_, "ST: out_filename = "));
        EXPECT_TRUE(again.Module().Uninitialize());
    }
    EXPECT_THAT(next->Statuses(), Not(Contains(Pair(7, ::testing::_))));
    const RecordedFile file(FindRecording(healthy.Path(), kName));
    ASSERT_FALSE(file.Samples(kRecordedVideo).empty());
    for (std::uint64_t n = 0; n < file.Samples(kRecordedVideo).size(); ++n) {
        EXPECT_EQ(file.BytesOf(file.Samples(kRecordedVideo)[n]), stream_.VideoSample(n));
    }
    EXPECT_EQ(threadCount(), threads);
}

INSTANTIATE_TEST_SUITE_P(Files, ForcedEnd,
                         ::testing::Values(Hang{"normal", 0}, Hang{"normal", EIO}, Hang{"fragment", 0},
                                           Hang{"fragment", EIO}),
                         [](const auto& tested) {
                             return std::string(tested.param.fileType) +
                                    (tested.param.error == 0 ? "WriteSucceeds" : "WriteFails");
                         });

}  // namespace
