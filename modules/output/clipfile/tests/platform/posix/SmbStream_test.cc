#include "platform/posix/SmbStream.h"

#include <gtest/gtest.h>

#include <cerrno>
#include <cstdint>
#include <cstdio>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <memory>
#include <random>
#include <string>
#include <vector>

#include "support/SambaServer.h"

namespace clipfileModule {
namespace {

class SmbStreamTest : public ::testing::Test {
 protected:
    static SharePath parsed(const std::string& path) {
        SharePath share;
        EXPECT_TRUE(SharePath::Parse(path, share)) << path;
        return share;
    }
    std::shared_ptr<SmbSession> session() {
        std::string reason;
        const SmbLibrary* const library = SmbLibrary::Get(reason);
        auto made = std::make_shared<SmbSession>(
            *library, parsed(server.Path()), SmbCredentials::Of(SambaServer::kUser, SambaServer::kPassword));
        EXPECT_EQ(made->ConnectResult(), 0);
        return made;
    }
    std::FILE* open(const std::shared_ptr<SmbSession>& session) {
        return SmbStream::OpenFile(session, parsed(server.Path() + "\\file").Url());
    }
    std::string atServer() const {
        std::ifstream in(server.Folder() / "file", std::ios::binary);
        return {std::istreambuf_iterator<char>(in), std::istreambuf_iterator<char>()};
    }
    std::uint64_t space(SmbSession& session) const {
        std::uint64_t bytes = 0;
        EXPECT_EQ(session.AvailableSpace(parsed(server.Path()).Url(), bytes), 0);
        return bytes;
    }

    SambaServer server;
};

TEST_F(SmbStreamTest, HoldsWhatAnyOrderOfWritesAndSeeksLeavesInALocalFile) {
    std::FILE* const stream = open(session());
    std::FILE* const local = std::tmpfile();
    ASSERT_NE(stream, nullptr);
    std::mt19937 random(1);
    std::vector<char> data(3 * SmbStream::kRequestSize);
    for (char& octet : data) {
        octet = static_cast<char>(random());
    }
    for (int i = 0; i < 300; ++i) {
        // Small ones mostly, and some that are longer than a request.
        const std::size_t size = random() % (i % 20 == 0 ? data.size() : 3000);
        if (random() % 3 == 0) {
            const long position = static_cast<long>(random() % (4 * SmbStream::kRequestSize));
            ASSERT_EQ(fseeko(stream, position, SEEK_SET), 0);
            ASSERT_EQ(fseeko(local, position, SEEK_SET), 0);
        }
        ASSERT_EQ(std::fwrite(data.data(), 1, size, stream), size);
        ASSERT_EQ(std::fwrite(data.data(), 1, size, local), size);
        ASSERT_EQ(ftello(stream), ftello(local));
    }
    ASSERT_EQ(fseeko(stream, -100, SEEK_END), 0);
    ASSERT_EQ(fseeko(local, -100, SEEK_END), 0);
    char read[200];
    char expected[200];
    ASSERT_EQ(std::fread(read, 1, sizeof read, stream), 100U);
    ASSERT_EQ(std::fread(expected, 1, sizeof expected, local), 100U);
    EXPECT_EQ(std::string(read, 100), std::string(expected, 100));
    EXPECT_EQ(std::fclose(stream), 0);

    std::rewind(local);
    std::string all(std::filesystem::file_size(server.Folder() / "file"), '\0');
    EXPECT_EQ(std::fread(all.data(), 1, all.size(), local), all.size());
    EXPECT_EQ(std::fgetc(local), EOF);
    std::fclose(local);
    EXPECT_TRUE(atServer() == all);
}

TEST_F(SmbStreamTest, SendsWhatItHoldsBackWhenTheSpaceIsAskedForAndWhenItIsClosed) {
    const std::shared_ptr<SmbSession> made = session();
    std::FILE* const stream = open(made);
    ASSERT_EQ(std::fputs("one", stream), 1);
    EXPECT_EQ(atServer(), "");
    space(*made);
    EXPECT_EQ(atServer(), "one");
    ASSERT_EQ(std::fputs(" two", stream), 1);
    EXPECT_EQ(std::fclose(stream), 0);
    EXPECT_EQ(atServer(), "one two");
}

TEST_F(SmbStreamTest, HasPositionsOf64Bits) {
    std::FILE* const stream = open(session());
    constexpr off_t kFar = (off_t{5} << 30U) + 7;
    ASSERT_EQ(fseeko(stream, kFar, SEEK_SET), 0);
    ASSERT_EQ(std::fputs("far", stream), 1);
    EXPECT_EQ(ftello(stream), kFar + 3);
    ASSERT_EQ(fseeko(stream, 0, SEEK_END), 0);
    EXPECT_EQ(ftello(stream), kFar + 3);
    EXPECT_NE(fseeko(stream, -1, SEEK_SET), 0);
    EXPECT_EQ(std::fclose(stream), 0);
    EXPECT_EQ(std::filesystem::file_size(server.Folder() / "file"), static_cast<std::uint64_t>(kFar) + 3);
}

TEST_F(SmbStreamTest, AWriteThatFailsLateFailsAllLaterOnesAndTheClose) {
    const std::shared_ptr<SmbSession> made = session();
    std::FILE* const stream = open(made);
    ASSERT_EQ(std::fputs("one", stream), 1);
    server.Kill();
    std::uint64_t bytes = 42;
    EXPECT_NE(made->AvailableSpace(parsed(server.Path()).Url(), bytes), 0);
    EXPECT_EQ(bytes, 42U);
    EXPECT_EQ(std::fputs("two", stream), EOF);
    EXPECT_EQ(std::fclose(stream), EOF);
}

TEST_F(SmbStreamTest, AServerThatIsFrozenCostsOneTimeOutAndNoMore) {
    auto made = session();
    std::FILE* const stream = open(made);
    ASSERT_EQ(std::fputs("one", stream), 1);
    server.Freeze();
    const auto before = std::chrono::steady_clock::now();
    std::uint64_t bytes = 0;
    EXPECT_EQ(made->AvailableSpace(parsed(server.Path()).Url(), bytes), ETIMEDOUT);
    SmbStatus status;
    EXPECT_EQ(made->Look(parsed(server.Path()).Url(), status), ETIMEDOUT);
    EXPECT_EQ(std::fclose(stream), EOF);
    made.reset();
    const auto took = std::chrono::steady_clock::now() - before;
    EXPECT_GE(took, SmbLimits().operation);
    EXPECT_LT(took, SmbLimits().operation + std::chrono::seconds(2));  // for a loaded machine
    server.Thaw();
}

TEST_F(SmbStreamTest, AFileThatCannotBeOpenedSaysWhy) {
    const std::shared_ptr<SmbSession> made = session();
    errno = 0;
    EXPECT_EQ(SmbStream::OpenFile(made, parsed(server.Path() + "\\none\\file").Url()), nullptr);
    EXPECT_EQ(errno, ENOENT);
}

}  // namespace
}  // namespace clipfileModule
