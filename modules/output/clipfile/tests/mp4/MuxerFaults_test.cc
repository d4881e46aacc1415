// A short recording with one operation that fails, for every place in it where that can happen.

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <filesystem>
#include <memory>
#include <optional>
#include <string>

#include "mp4/Mp4MuxerFactory.h"
#include "support/MuxerFixture.h"

namespace clipfileModule {
namespace {

using golden::kTimecode;
using muxer_stream::Bytes;
using muxer_stream::MakeChunk;

const muxer_stream::ChunkShape kSmallChunk = {{5, 5}, {6}, {12, 9}, 0};

struct Sweep {
    const char* name;
    const char* type;
    int chunks;
    FaultyFiles::Operation operation;
    bool andAllAfter;
    long status;
    RecordRules rules = RecordRules::kKept;
};

std::ostream& operator<<(std::ostream& out, const Sweep& sweep) {
    return out << sweep.name;
}

std::size_t openFiles() {
    return static_cast<std::size_t>(std::distance(std::filesystem::directory_iterator("/proc/self/fd"), {}));
}

class MuxerFaults : public ::testing::TestWithParam<Sweep> {
 protected:
    MuxerFaults() { muxer_stream::StopTheClock(platform); }

    /// Records with the `nth` operation failing as FileOutput would: after a failed write nothing but the end
    /// of the file follows. True when every step succeeded; `file` then gets its bytes.
    bool record(std::uint64_t nth, Bytes& file) {
        const Sweep& sweep = GetParam();
        const TempDir directory;
        FaultyFiles faults;
        if (nth != 0) {
            faults.FailAt(sweep.operation, nth, sweep.andAllAfter);
        }
        std::shared_ptr<Mp4Muxer> muxer;
        EXPECT_TRUE(Mp4MuxerFactory().Create(sweep.type, muxer));
        bool good = muxer->Initialize();
        OutputSettings settings = muxer_stream::MakeSettings(directory, 29970);
        settings.recordRules = sweep.rules;
        good = good && muxer->Open(settings, kTimecode, true);
        for (int i = 0; good && i < sweep.chunks; ++i) {
            if (i == 0) {
                static_cast<void>(muxer->GetBoxSize());
            }
            good = muxer->Write(MakeChunk(kSmallChunk, static_cast<unsigned char>(i)));
        }
        if (muxer->IsOpen()) {
            // Its bytes may still fail to be a file: no step that failed is taken back.
            const bool timecode = muxer->WriteTmcd(kTimecode);
            const bool closed = muxer->Close();
            good = good && timecode && closed;
        }
        EXPECT_FALSE(muxer->IsOpen());
        EXPECT_TRUE(muxer->Uninitialize());
        EXPECT_EQ(faults.BlocksInUse(), 0);
        if (good) {
            file = muxer_stream::ReadFile(directory.Path() / "01_02_03_04.MP4");
        }
        count = faults.Count(sweep.operation);
        return good;
    }

    FakePlatform platform;
    std::uint64_t count = 0;
};

TEST_P(MuxerFaults, GiveTheirStatusLeakNothingAndLeaveNoFileOpen) {
    const Sweep& sweep = GetParam();
    Bytes whole;
    ASSERT_TRUE(record(0, whole));
    const std::uint64_t operations = count;
    ASSERT_GT(operations, 0U);
    const std::size_t files = openFiles();

    std::uint64_t failed = 0;
    for (std::uint64_t n = 1; n <= operations; ++n) {
        const LogCapture log(LOG_PRIORITY_ERROR);
        Bytes file;
        const bool good = record(n, file);
        const std::string status = "result = " + std::to_string(sweep.status) + ".";
        const auto named = log.CountIf(
            [&](const CapturedLine& line) { return line.text.find(status) != std::string::npos; });
        EXPECT_GT(named, 0U) << sweep.name << ", operation " << n << ": no line names the status";
        if (good) {
            // What failed was the measure of what closing adds, which is no part of the file.
            EXPECT_EQ(file, whole) << n;
        } else {
            ++failed;
        }
        ASSERT_EQ(openFiles(), files) << n;
    }
    EXPECT_GT(failed, operations / 2);
    Bytes again;
    EXPECT_TRUE(record(operations + 1, again));
    EXPECT_EQ(again, whole);
}

INSTANTIATE_TEST_SUITE_P(
    Recordings, MuxerFaults,
    ::testing::Values(
        Sweep{"NormalOpen", "normal", 3, FaultyFiles::kOpen, false, MBX_ERR_IO},
        Sweep{"NormalWrite", "normal", 3, FaultyFiles::kWrite, false, MBX_ERR_IO},
        Sweep{"NormalWriteAndAllAfter", "normal", 3, FaultyFiles::kWrite, true, MBX_ERR_IO},
        Sweep{"NormalShortWrite", "normal", 3, FaultyFiles::kShortWrite, false, MBX_ERR_IO},
        Sweep{"NormalSeek", "normal", 3, FaultyFiles::kSeek, false, MBX_ERR_IO},
        Sweep{"NormalSeekAndAllAfter", "normal", 3, FaultyFiles::kSeek, true, MBX_ERR_IO},
        Sweep{"NormalAlloc", "normal", 3, FaultyFiles::kAlloc, false, MBX_ERR_NO_MEMORY},
        Sweep{"NormalAllocAndAllAfter", "normal", 3, FaultyFiles::kAlloc, true, MBX_ERR_NO_MEMORY},
        Sweep{"FragmentOpen", "fragment", 34, FaultyFiles::kOpen, false, MBX_ERR_IO},
        Sweep{"FragmentWrite", "fragment", 34, FaultyFiles::kWrite, false, MBX_ERR_IO},
        Sweep{"FragmentWriteAndAllAfter", "fragment", 34, FaultyFiles::kWrite, true, MBX_ERR_IO},
        Sweep{"FragmentShortWrite", "fragment", 34, FaultyFiles::kShortWrite, false, MBX_ERR_IO},
        Sweep{"FragmentSeek", "fragment", 34, FaultyFiles::kSeek, false, MBX_ERR_IO},
        Sweep{"FragmentSeekAndAllAfter", "fragment", 34, FaultyFiles::kSeek, true, MBX_ERR_IO},
        Sweep{"FragmentAlloc", "fragment", 34, FaultyFiles::kAlloc, false, MBX_ERR_NO_MEMORY},
        Sweep{"FragmentAllocAndAllAfter", "fragment", 34, FaultyFiles::kAlloc, true, MBX_ERR_NO_MEMORY},
        Sweep{"ExactFragmentWrite", "fragment", 34, FaultyFiles::kWrite, false, MBX_ERR_IO,
              RecordRules::kExact},
        Sweep{"ExactFragmentSeekAndAllAfter", "fragment", 34, FaultyFiles::kSeek, true, MBX_ERR_IO,
              RecordRules::kExact},
        Sweep{"ExactFragmentAlloc", "fragment", 34, FaultyFiles::kAlloc, false, MBX_ERR_NO_MEMORY,
              RecordRules::kExact}),
    [](const auto& sweep) { return std::string(sweep.param.name); });

}  // namespace
}  // namespace clipfileModule
