#include "LogWriter.h"

#include <fcntl.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <csignal>
#include <string>
#include <thread>

#include "log_process.h"

namespace {

using ::testing::EndsWith;

/// A named pipe in the place of the log's file: it refuses and takes lines as its reader goes and comes.
class LogPipe : public ::testing::Test {
 protected:
    LogPipe() {
        EXPECT_EQ(mkfifo(path_.c_str(), 0600), 0);
        Open();
    }
    ~LogPipe() override { Close(); }

    void Open() {
        reader_ = open(path_.c_str(), O_RDONLY | O_NONBLOCK | O_CLOEXEC);
        EXPECT_EQ(fcntl(reader_, F_SETFL, 0), 0);
    }
    void Close() {
        if (reader_ >= 0) {
            close(reader_);
            reader_ = -1;
        }
    }
    static std::string ReadLine(int from) {
        std::string line;
        char c = 0;
        while (read(from, &c, 1) == 1 && c != '\n') {
            line += c;
        }
        return line;
    }

    const TemporaryFolder folder_;
    const std::string path_ = folder_.File("log");
    int reader_ = -1;
};

/// Standard error of this process, as long as it lives.
class StandardErrorPipe {
 public:
    StandardErrorPipe() : saved_(dup(STDERR_FILENO)) {
        EXPECT_EQ(pipe2(ends_, O_CLOEXEC), 0);
        dup2(ends_[1], STDERR_FILENO);
    }
    StandardErrorPipe(const StandardErrorPipe&) = delete;
    StandardErrorPipe& operator=(const StandardErrorPipe&) = delete;
    ~StandardErrorPipe() {
        dup2(saved_, STDERR_FILENO);
        close(saved_);
        close(ends_[0]);
        close(ends_[1]);
    }
    int Reader() const { return ends_[0]; }

 private:
    int ends_[2] = {-1, -1};
    int saved_;
};

TEST_F(LogPipe, GetsEachLineWithoutAnotherOneBehindIt) {
    LogWriter writer(path_);
    writer.Write("one");
    EXPECT_THAT(ReadLine(reader_), EndsWith("] one"));
    writer.Write("two");
    EXPECT_THAT(ReadLine(reader_), EndsWith("] two"));
}

TEST_F(LogPipe, GetsTheNumberOfLinesThatWereRefusedBefore) {
    LogWriter writer(path_);
    writer.Write("one");
    EXPECT_THAT(ReadLine(reader_), EndsWith("] one"));
    Close();
    {
        const StandardErrorPipe standardError;
        writer.Write("two");
        EXPECT_THAT(ReadLine(standardError.Reader()),
                    EndsWith("] 5 The log cannot be written (Broken pipe)."));
    }
    Open();
    writer.Write("three");
    EXPECT_THAT(ReadLine(reader_), EndsWith("] 5 1 log lines were lost here."));
    EXPECT_THAT(ReadLine(reader_), EndsWith("] three"));
    writer.Write("four");
    EXPECT_THAT(ReadLine(reader_), EndsWith("] four"));
}

TEST_F(LogPipe, GetsATornLineClosedBeforeTheNextOne) {
    std::signal(SIGPIPE, SIG_IGN);
    LogFile file(path_);
    const std::string line(100000, 'x');  // more than a pipe holds
    bool written = true;
    int error = 0;
    std::thread writer([&] {
        written = file.Write(line);
        error = errno;
    });
    char first = 0;
    EXPECT_EQ(read(reader_, &first, 1), 1);
    Close();
    writer.join();
    EXPECT_FALSE(written);
    EXPECT_EQ(error, EPIPE);
    Open();
    std::thread next([&] { written = file.Write("next\n"); });
    const std::string torn = ReadLine(reader_);
    EXPECT_EQ(torn, std::string(torn.size(), 'x'));
    EXPECT_LT(torn.size(), line.size());
    EXPECT_EQ(ReadLine(reader_), "next");
    next.join();
    EXPECT_TRUE(written);
}

TEST(LogFile, TakesStandardErrorForAnEmptyPath) {
    const LogFile file("");
    EXPECT_TRUE(file.IsStandardError());
    EXPECT_EQ(file.Error(), 0);
}

TEST(LogFile, TakesStandardErrorForAPathThatCannotBeOpened) {
    const TemporaryFolder folder;
    const LogFile file(folder.File("missing/log"));
    EXPECT_TRUE(file.IsStandardError());
    EXPECT_EQ(file.Error(), ENOENT);
}

TEST(LogWriter, WritesALineDirectly) {
    const TemporaryFolder folder;
    LogWriter::WriteDirectly(folder.File("log"), "line");
    EXPECT_THAT(ReadFile(folder.File("log")), EndsWith("] line\n"));
}

TEST(LogWriter, LeavesTheProcessAliveWhenADirectLineFindsNoReader) {
    // The read end of the only pipe in the place of standard error is closed: SIGPIPE would end this process.
    const int saved = dup(STDERR_FILENO);
    int ends[2];
    ASSERT_EQ(pipe2(ends, O_CLOEXEC), 0);
    close(ends[0]);
    dup2(ends[1], STDERR_FILENO);
    std::signal(SIGPIPE, SIG_DFL);
    LogWriter::WriteDirectly("", "line");
    sigset_t pending;
    sigpending(&pending);
    EXPECT_EQ(sigismember(&pending, SIGPIPE), 0);
    dup2(saved, STDERR_FILENO);
    close(saved);
    close(ends[1]);
}

}  // namespace
