#include "display/FileReport.h"

#include <gtest/gtest.h>
#include <stdlib.h>
#include <unistd.h>

#include <cstdlib>
#include <fstream>
#include <iterator>

namespace receiver {
namespace {

TEST(FileReport, BytesHaveUnitsOfAThousand) {
    EXPECT_EQ(FormatBytes(0), "0 B");
    EXPECT_EQ(FormatBytes(999), "999 B");
    EXPECT_EQ(FormatBytes(1000), "1.0 kB");
    EXPECT_EQ(FormatBytes(999949), "999.9 kB");
    EXPECT_EQ(FormatBytes(999999), "1.0 MB");
    EXPECT_EQ(FormatBytes(157286400), "157.3 MB");
    EXPECT_EQ(FormatBytes(2000000000000000), "2000.0 TB");
}

TEST(FileReport, SecondsAreHoursMinutesSecondsAndMilliseconds) {
    EXPECT_EQ(FormatSeconds(0), "00:00:00.000");
    EXPECT_EQ(FormatSeconds(59.9996), "00:01:00.000");
    EXPECT_EQ(FormatSeconds(3723.25), "01:02:03.250");
    EXPECT_EQ(FormatSeconds(360000), "100:00:00.000");
    EXPECT_EQ(FormatSeconds(-1), "00:00:00.000");
}

TEST(FileReport, AFileThatIsGoneHasAProblem) {
    const RecordedFile file = ReadBack("/no/such/file.MP4");
    EXPECT_EQ(file.path, "/no/such/file.MP4");
    EXPECT_EQ(file.problem, "No such file or directory");
}

TEST(FileReport, AFileThatIsNoRecordingHasAProblemAndASize) {
    std::string path = ::testing::TempDir() + "receiver_report_XXXXXX";
    const int descriptor = mkstemp(path.data());
    ASSERT_GE(descriptor, 0);
    close(descriptor);
    std::ofstream(path) << "no recording";
    const auto read = [](std::int64_t offset, unsigned char* data, int size) {
        return static_cast<int>(
            std::string("no recording").copy(reinterpret_cast<char*>(data), size, offset));
    };
    for (const RecordedFile& file : {ReadBack(path), ReadBack(path, 12, read)}) {
        EXPECT_EQ(file.path, path);
        EXPECT_EQ(file.bytes, 12u);
        EXPECT_EQ(file.problem, "Invalid data found when processing input");
    }
    unlink(path.c_str());
}

TEST(FileReport, AFileThatCannotBeReadToItsEndHasAProblem) {
    const auto fails = [](std::int64_t, unsigned char*, int) { return -1; };
    EXPECT_EQ(ReadBack("//server/share/a.MP4", 12, fails).problem, "Input/output error");
}

// Hours of recording are many gigabytes, which a share would have to send.
TEST(FileReport, OfAFragmentedFileTheSamplesAreNotRead) {
    std::string path = ::testing::TempDir() + "receiver_report_XXXXXX";
    const int descriptor = mkstemp(path.data());
    ASSERT_GE(descriptor, 0);
    close(descriptor);
    const std::string command =
        "ffmpeg -v error -y -f lavfi -i testsrc2=size=640x360:rate=25 -t 10 -c:v libx264 -preset ultrafast "
        "-qp 1 "
        "-bf 0 -g 25 -movflags frag_keyframe+empty_moov+skip_trailer -use_editlist 0 -f mp4 " +
        path;
    ASSERT_EQ(std::system(command.c_str()), 0);
    std::ifstream in(path, std::ios::binary);
    const std::string content{std::istreambuf_iterator<char>(in), {}};
    ASSERT_GT(content.size(), 4U << 20U);
    std::size_t read = 0;
    const RecordedFile file =
        ReadBack("a.MP4", content.size(), [&](std::int64_t offset, unsigned char* data, int size) {
            const std::size_t count =
                content.copy(reinterpret_cast<char*>(data), static_cast<std::size_t>(size),
                             static_cast<std::size_t>(offset));
            read += count;
            return static_cast<int>(count);
        });
    EXPECT_EQ(file.problem, "");
    EXPECT_EQ(file.frames, 250U);
    EXPECT_NEAR(file.seconds, 10, 0.0005);
    EXPECT_LT(read, content.size() / 2);
    unlink(path.c_str());
}

}  // namespace
}  // namespace receiver
