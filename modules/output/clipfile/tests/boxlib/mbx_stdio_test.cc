#include "boxlib/mbx_stdio.h"

#include <fcntl.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cstdlib>
#include <filesystem>
#include <fstream>

#include "boxlib/support/fixture.h"

namespace {

namespace fs = std::filesystem;

class StdioTest : public testing::Test {
 protected:
    void SetUp() override {
        std::string pattern = (fs::temp_directory_path() / "mbx_stdio_XXXXXX").string();
        ASSERT_NE(mkdtemp(pattern.data()), nullptr);
        folder = pattern;
        path = (folder / "clip.MP4").string();
    }

    void TearDown() override {
        closeFile(&file);
        fs::remove_all(folder);
    }

    static void closeFile(MbxFile** opened) {
        if (*opened == nullptr) return;
        if ((*opened)->stream != nullptr) std::fclose((*opened)->stream);
        std::free(*opened);
        *opened = nullptr;
    }

    void put(const std::string& text) const { std::ofstream(path) << text; }

    std::string content() const {
        std::ifstream stream(path);
        return {std::istreambuf_iterator<char>(stream), {}};
    }

    fs::path folder;
    std::string path;
    MbxFile* file = nullptr;
};

TEST_F(StdioTest, OpenCreatesAFileForUpdate) {
    ASSERT_EQ(MbxOpenFile(path.c_str(), 0, &file), MBX_OK);
    uint64_t count = 0;
    EXPECT_EQ(MbxStdioWrite(file, "abcdef", 6, &count), MBX_OK);
    EXPECT_EQ(count, 6U);
    EXPECT_EQ(MbxStdioSeek(file, 2, 0), MBX_OK);
    EXPECT_EQ(MbxStdioWrite(file, "XY", 2, &count), MBX_OK);
    EXPECT_EQ(MbxStdioSeek(file, 0, 0), MBX_OK);
    char back[6] = {};
    EXPECT_EQ(MbxStdioRead(file, back, 6, &count), MBX_OK);
    EXPECT_EQ(std::string(back, 6), "abXYef");
    closeFile(&file);
    EXPECT_EQ(content(), "abXYef");
}

TEST_F(StdioTest, OpenTruncatesAnExistingFile) {
    put("old content");
    ASSERT_EQ(MbxOpenFile(path.c_str(), 0, &file), MBX_OK);
    EXPECT_EQ(fs::file_size(path), 0U);
}

TEST_F(StdioTest, OpenRefusesNullArguments) {
    EXPECT_EQ(MbxOpenFile(nullptr, 0, &file), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxOpenFile(path.c_str(), 0, nullptr), MBX_ERR_INVALID_ARG);
    EXPECT_FALSE(fs::exists(path));
}

TEST_F(StdioTest, OpenTakesUtf8Paths) {
    path = (folder / "\xC3\xA4 \xE3\x83\x86 \xF0\x9F\x8E\xAC.MP4").string();
    ASSERT_EQ(MbxOpenFile(path.c_str(), 0, &file), MBX_OK);
    EXPECT_TRUE(fs::exists(path));
}

TEST_F(StdioTest, OpenRefusesPathsThatAreNotUtf8) {
    const char* const kBad[] = {
        "\x80",              // a tail without its lead
        "\xC3",              // a lead without its tail
        "\xC3(",             // a lead with something else
        "\xC0\xAF",          // overlong
        "\xC1\xBF",          // overlong
        "\xE0\x9F\xBF",      // overlong
        "\xED\xA0\x80",      // a surrogate
        "\xE3\x83",          // cut short
        "\xF0\x8F\xBF\xBF",  // overlong
        "\xF4\x90\x80\x80",  // above U+10FFFF
        "\xF5\x80\x80\x80",  // no lead at all
        "\xFF",
    };
    for (const char* bad : kBad) {
        const std::string name = folder.string() + "/" + bad;
        EXPECT_EQ(MbxOpenFile(name.c_str(), 0, &file), MBX_ERR_INVALID_ARG)
            << Dump(Bytes(bad, bad + strlen(bad)));
        EXPECT_EQ(file, nullptr);
    }
    EXPECT_TRUE(fs::is_empty(folder));
}

TEST_F(StdioTest, OpenTakesTheBoundariesOfUtf8) {
    const char* const kGood[] = {"\x7F",         "\xC2\x80",     "\xDF\xBF",         "\xE0\xA0\x80",
                                 "\xED\x9F\xBF", "\xEE\x80\x80", "\xF0\x90\x80\x80", "\xF4\x8F\xBF\xBF"};
    for (const char* good : kGood) {
        const std::string name = folder.string() + "/" + good;
        EXPECT_EQ(MbxOpenFile(name.c_str(), 0, &file), MBX_OK);
        closeFile(&file);
    }
}

TEST_F(StdioTest, OpenReportsWhatCannotBeOpened) {
    EXPECT_EQ(MbxOpenFile((folder / "missing" / "clip.MP4").c_str(), 0, &file), MBX_ERR_IO);
    EXPECT_EQ(MbxOpenFile(folder.c_str(), 0, &file), MBX_ERR_IO);
    EXPECT_EQ(file, nullptr);
}

TEST_F(StdioTest, SecondWriterIsRefusedAndTheFirstFileUntouched) {
    ASSERT_EQ(MbxOpenFile(path.c_str(), 0, &file), MBX_OK);
    uint64_t count = 0;
    ASSERT_EQ(MbxStdioWrite(file, "precious", 8, &count), MBX_OK);
    ASSERT_EQ(std::fflush(file->stream), 0);
    MbxFile* second = nullptr;
    EXPECT_EQ(MbxOpenFile(path.c_str(), 0, &second), MBX_ERR_IO);
    EXPECT_EQ(second, nullptr);
    EXPECT_EQ(content(), "precious");
    closeFile(&file);
    EXPECT_EQ(content(), "precious");
    EXPECT_EQ(MbxOpenFile(path.c_str(), 0, &second), MBX_OK);  // the lock went with the stream
    closeFile(&second);
}

TEST_F(StdioTest, WriterInAnotherProcessIsRefusedToo) {
    put("theirs");
    const int other = open(path.c_str(), O_RDWR | O_CLOEXEC);
    ASSERT_EQ(flock(other, LOCK_EX), 0);
    EXPECT_EQ(MbxOpenFile(path.c_str(), 0, &file), MBX_ERR_IO);
    EXPECT_EQ(content(), "theirs");
    close(other);
}

TEST_F(StdioTest, DescriptorIsNotInheritedByPrograms) {
    ASSERT_EQ(MbxOpenFile(path.c_str(), 0, &file), MBX_OK);
    EXPECT_TRUE(fcntl(fileno(file->stream), F_GETFD) & FD_CLOEXEC);
}

TEST_F(StdioTest, FifoIsOpenedAsItIs) {
    ASSERT_EQ(mkfifo(path.c_str(), 0600), 0);
    ASSERT_EQ(MbxOpenFile(path.c_str(), 0, &file), MBX_OK);
    EXPECT_EQ(MbxStdioSeek(file, 0, 0), MBX_ERR_IO);
    uint64_t value = 7;
    EXPECT_EQ(MbxStdioTell(file, &value), MBX_ERR_IO);
    EXPECT_EQ(MbxStdioSize(file, &value), MBX_ERR_IO);
    EXPECT_EQ(value, 7U);
}

TEST_F(StdioTest, PositionsHave64Bits) {
    ASSERT_EQ(MbxOpenFile(path.c_str(), 0, &file), MBX_OK);
    const int64_t far = 5LL << 32;
    uint64_t value = 0;
    EXPECT_EQ(MbxStdioSeek(file, far, 0), MBX_OK);
    EXPECT_EQ(MbxStdioWrite(file, "x", 1, &value), MBX_OK);
    EXPECT_EQ(MbxStdioTell(file, &value), MBX_OK);
    EXPECT_EQ(value, static_cast<uint64_t>(far) + 1);
    EXPECT_EQ(MbxStdioSize(file, &value), MBX_OK);
    EXPECT_EQ(value, static_cast<uint64_t>(far) + 1);
}

TEST_F(StdioTest, SeekKnowsThreeOrigins) {
    ASSERT_EQ(MbxOpenFile(path.c_str(), 0, &file), MBX_OK);
    uint64_t value = 0;
    ASSERT_EQ(MbxStdioWrite(file, "0123456789", 10, &value), MBX_OK);
    const auto at = [this] {
        uint64_t position = 0;
        EXPECT_EQ(MbxStdioTell(file, &position), MBX_OK);
        return position;
    };
    EXPECT_EQ(MbxStdioSeek(file, 4, 0), MBX_OK);
    EXPECT_EQ(at(), 4U);
    EXPECT_EQ(MbxStdioSeek(file, -1, 1), MBX_OK);
    EXPECT_EQ(at(), 3U);
    EXPECT_EQ(MbxStdioSeek(file, -2, 2), MBX_OK);
    EXPECT_EQ(at(), 8U);
    EXPECT_EQ(MbxStdioSeek(file, 0, 3), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxStdioSeek(file, -1, 0), MBX_ERR_IO);
    EXPECT_EQ(at(), 8U);
}

TEST_F(StdioTest, SizeLeavesTheStreamWhereItStood) {
    ASSERT_EQ(MbxOpenFile(path.c_str(), 0, &file), MBX_OK);
    uint64_t value = 0;
    ASSERT_EQ(MbxStdioWrite(file, "0123456789", 10, &value), MBX_OK);
    ASSERT_EQ(MbxStdioSeek(file, 4, 0), MBX_OK);
    EXPECT_EQ(MbxStdioSize(file, &value), MBX_OK);
    EXPECT_EQ(value, 10U);
    EXPECT_EQ(MbxStdioTell(file, &value), MBX_OK);
    EXPECT_EQ(value, 4U);
}

TEST_F(StdioTest, ReadBeyondTheEndTellsWhatItMoved) {
    ASSERT_EQ(MbxOpenFile(path.c_str(), 0, &file), MBX_OK);
    uint64_t count = 0;
    ASSERT_EQ(MbxStdioWrite(file, "abc", 3, &count), MBX_OK);
    ASSERT_EQ(MbxStdioSeek(file, 1, 0), MBX_OK);
    char back[8] = {};
    EXPECT_EQ(MbxStdioRead(file, back, 8, &count), MBX_ERR_IO);
    EXPECT_EQ(count, 2U);
}

TEST_F(StdioTest, FullDeviceIsAnIoError) {
    MbxFile full = {std::fopen("/dev/full", "w")};
    ASSERT_NE(full.stream, nullptr);
    std::setvbuf(full.stream, nullptr, _IONBF, 0);
    uint64_t count = 7;
    EXPECT_EQ(MbxStdioWrite(&full, "abc", 3, &count), MBX_ERR_IO);
    EXPECT_EQ(count, 0U);
    std::fclose(full.stream);
}

TEST_F(StdioTest, OneCallMovesAtMostASigned32BitCount) {
    ASSERT_EQ(MbxOpenFile(path.c_str(), 0, &file), MBX_OK);
    char byte = 0;
    for (const uint64_t size : {1ULL << 31, (1ULL << 32) + 1, UINT64_MAX + 0ULL}) {
        uint64_t count = 7;
        EXPECT_EQ(MbxStdioWrite(file, &byte, size, &count), MBX_ERR_IO);
        EXPECT_EQ(count, 0U);
        count = 7;
        EXPECT_EQ(MbxStdioRead(file, &byte, size, &count), MBX_ERR_IO);
        EXPECT_EQ(count, 0U);
    }
    EXPECT_EQ(fs::file_size(path), 0U);
}

TEST_F(StdioTest, NullStreamIsAnInvalidArgument) {
    MbxFile closed = {nullptr};
    uint64_t value = 7;
    char byte = 0;
    for (MbxFile* handle : {static_cast<MbxFile*>(nullptr), &closed}) {
        EXPECT_EQ(MbxStdioRead(handle, &byte, 1, &value), MBX_ERR_INVALID_ARG);
        EXPECT_EQ(MbxStdioWrite(handle, &byte, 1, &value), MBX_ERR_INVALID_ARG);
        EXPECT_EQ(MbxStdioSeek(handle, 0, 0), MBX_ERR_INVALID_ARG);
        EXPECT_EQ(MbxStdioTell(handle, &value), MBX_ERR_INVALID_ARG);
        EXPECT_EQ(MbxStdioSize(handle, &value), MBX_ERR_INVALID_ARG);
    }
    EXPECT_EQ(value, 7U);
}

TEST_F(StdioTest, NullBufferOrResultIsAnInvalidArgument) {
    ASSERT_EQ(MbxOpenFile(path.c_str(), 0, &file), MBX_OK);
    uint64_t value = 7;
    char byte = 0;
    EXPECT_EQ(MbxStdioRead(file, nullptr, 1, &value), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxStdioRead(file, &byte, 1, nullptr), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxStdioWrite(file, nullptr, 1, &value), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxStdioWrite(file, &byte, 1, nullptr), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxStdioTell(file, nullptr), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxStdioSize(file, nullptr), MBX_ERR_INVALID_ARG);
}

TEST(StdioCallbacksTest, TableIsCompleteAndWorks) {
    MbxCallbacks table = {};
    MbxStdioCallbacks(&table);
    EXPECT_EQ(table.user_data, nullptr);
    MbxContext* context = nullptr;
    ASSERT_EQ(MbxCreateContext(&table, &context), MBX_OK);
    void* block = MbxAlloc(context, 1, 100);
    EXPECT_NE(block, nullptr);
    MbxFree(context, block);
    EXPECT_EQ(MbxDestroyContext(context), MBX_OK);
}

TEST(StdioCallbacksTest, CopiesObserveTheirContract) {
    MbxCallbacks t = {};
    MbxStdioCallbacks(&t);
    char to[4] = {'.', '.', '.', '.'};
    EXPECT_EQ(t.memcpy(nullptr, to, 4, "ab", 2), to);
    EXPECT_EQ(std::string(to, 4), "ab..");
    EXPECT_EQ(t.memcpy(nullptr, to, 4, "zz", 0), to);
    EXPECT_EQ(t.memcpy(nullptr, to, 1, "zz", 2), nullptr);
    EXPECT_EQ(t.memcpy(nullptr, nullptr, 4, "zz", 2), nullptr);
    EXPECT_EQ(t.memcpy(nullptr, to, 4, nullptr, 2), nullptr);
    EXPECT_EQ(t.memmove(nullptr, to + 1, 3, to, 3), to + 1);
    EXPECT_EQ(std::string(to, 4), "aab.");
    EXPECT_EQ(t.memmove(nullptr, to, 1, to, 2), nullptr);
    EXPECT_EQ(t.memmove(nullptr, nullptr, 1, to, 1), nullptr);
    EXPECT_EQ(t.memmove(nullptr, to, 1, nullptr, 1), nullptr);
    EXPECT_EQ(t.strncpy(nullptr, to, 4, "xyz", 3), to);
    EXPECT_EQ(std::string(to, 4), "xyz.");
    EXPECT_EQ(t.strncpy(nullptr, to, 2, "xyz", 3), nullptr);
    EXPECT_EQ(t.strncpy(nullptr, nullptr, 4, "xyz", 3), nullptr);
    EXPECT_EQ(t.strncpy(nullptr, to, 4, nullptr, 3), nullptr);
    EXPECT_EQ(t.memset(nullptr, to, 'q', 2), to);
    EXPECT_EQ(std::string(to, 4), "qqz.");
    EXPECT_EQ(t.memcmp(nullptr, "abc", "abd", 2), 0);
    EXPECT_LT(t.memcmp(nullptr, "abc", "abd", 3), 0);
    EXPECT_EQ(t.strncmp(nullptr, "ab", "ab", 9), 0);
    EXPECT_GT(t.strncmp(nullptr, "b", "a", 1), 0);
}

}  // namespace
