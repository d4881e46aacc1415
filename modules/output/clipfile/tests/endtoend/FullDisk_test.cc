// The built library fills a file system of its own.

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/mount.h>

#include <cstdint>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <ostream>
#include <string>
#include <vector>

#include "LogCapture.h"
#include "endtoend/LoadedModule.h"
#include "endtoend/NumberedStream.h"
#include "endtoend/PacedPush.h"
#include "endtoend/RecordedFiles.h"
#include "support/FakeHost.h"
#include "support/LogLines.h"
#include "support/PrivateMounts.h"
#include "support/TempDir.h"

namespace {

using ::testing::ElementsAre;
using ::testing::Pair;

constexpr std::uint64_t kMinFreeSpace = 157286400;
constexpr std::uint64_t kRoom = 10 << 20;

struct Recording {
    const char* fileType;
    std::uint32_t maxMinutes;
};

void PrintTo(const Recording& recording, std::ostream* out) {
    *out << recording.fileType << ", " << recording.maxMinutes << " min";
}

class FullDisk : public ::testing::TestWithParam<Recording> {
 protected:
    void SetUp() override {
        std::filesystem::create_directory(disk_);
        ASSERT_TRUE(UsePrivateMounts()) << "this test has to mount a file system";
        ASSERT_EQ(mount("tmpfs", disk_.c_str(), "tmpfs", 0,
                        ("size=" + std::to_string(kMinFreeSpace + kRoom)).c_str()),
                  0)
            << "this test has to mount a file system";
        std::ofstream(directory_.Path() / "settings.ini")
            << "[Qx/Other/MP4FileOut]\nMP4MaxFileSize=" << GetParam().maxMinutes << "\n";
        setenv("QX_SETTINGS", (directory_.Path() / "settings.ini").c_str(), 1);
    }
    void TearDown() override { umount2(disk_.c_str(), MNT_DETACH); }

    LogCapture log_{LOG_PRIORITY_TRACE};
    TempDir directory_;
    const std::filesystem::path disk_ = directory_.Path() / "disk";
    /// Pictures of up to 60000 bytes.
    const NumberedStream stream_{stream_units::kRate25, 20};
};

TEST_P(FullDisk, EndsWithCause23AndAllFilesClosedAndReadable) {
    FakeHost host;
    host.texts = {{"-outputPath", disk_.string()}, {"-fileType", GetParam().fileType}};
    host.numbers["-encodedFPS"] = 25000;
    LoadedModule library;
    ASSERT_TRUE(library.Module().Initialize(&host));
    library.Notify().NotifyOnlineStatus();
    PacedPush push(library.Stream());
    const stream_units::StreamClock& clock = stream_.clock;
    for (std::uint64_t n = 0; host.GetStatus() != 7; ++n) {
        ASSERT_LT(n, 20000U) << "the file system does not fill";
        for (std::uint64_t k = clock.AudioBefore(n); k < clock.AudioBefore(n + 1); ++k) {
            push.Audio(*stream_.Audio(k));
        }
        push.Meta(*stream_.Meta(n, true));
        push.Video(*stream_.Video(n));
    }
    EXPECT_TRUE(library.Module().Uninitialize());
    EXPECT_THAT(host.Statuses(), ElementsAre(Pair(4, 0), Pair(7, 23)));
    EXPECT_TRUE(waitForPrefix(log_, GetParam().maxMinutes == 0 && countPrefix(log_, "no disk freespace.") == 0
                                        ? "no disk free space. "
                                        : "no disk freespace. "));
    // Less than is asked for is left, and no more was taken than a fragment and the closing boxes.
    const std::uint64_t available = std::filesystem::space(disk_).available;
    EXPECT_LT(available, kMinFreeSpace + 4096);
    EXPECT_GT(available, kMinFreeSpace - kRoom);

    std::uint64_t next = 0;
    for (const std::string& name : RecordedNames(log_)) {
        SCOPED_TRACE(name);
        EXPECT_EQ(name, stream_.FileName(next));
        const RecordedFile file(FindRecording(disk_, name));
        EXPECT_EQ(file.Movie().fragmented, GetParam().fileType == std::string("fragment"));
        EXPECT_EQ(file.Movie().indexed, file.Movie().fragmented);
        for (const iso::Sample& sample : file.Samples(kRecordedVideo)) {
            ASSERT_EQ(file.BytesOf(sample), stream_.VideoSample(next)) << "picture " << next;
            ++next;
        }
        EXPECT_EQ(file.Samples(kRecordedMeta).size(), file.Samples(kRecordedVideo).size());
    }
    EXPECT_GT(next, 0U);
    EXPECT_EQ(next % 8, 0U);
}

INSTANTIATE_TEST_SUITE_P(Files, FullDisk,
                         ::testing::Values(Recording{"normal", 60}, Recording{"fragment", 60},
                                           Recording{"normal", 0}, Recording{"fragment", 0}),
                         [](const auto& tested) {
                             return std::string(tested.param.fileType) +
                                    (tested.param.maxMinutes == 0 ? "AtEachSyncPoint" : "OneFile");
                         });

}  // namespace
