// How a recovered file takes its name, and what keeps it from taking that of a good one.

#include <fcntl.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include "recover/RecoveryFixture.h"
#include "support/AnotherUser.h"
#include "support/BoxFinder.h"
#include "support/SystemCalls.h"

namespace clipfile {
namespace {

using test_stream::MakePlainStream;
using test_stream::ReadAll;
using test_stream::Record;
using test_stream::WriteAll;

const RecoveryOptions kInPlace = {{}, {}, true};

bool IsFolderOpen(int descriptor) {
    struct stat status = {};
    return fstat(descriptor, &status) == 0 && S_ISDIR(status.st_mode);
}

class ReplacementTest : public RecoveryFixture {
 protected:
    void recordUnfinished(std::size_t chunks = 32) {
        Record(original(), {"fragment", clipfileModule::RecordRules::kExact, false}, MakePlainStream(chunks));
    }
    std::size_t fileCount() const {
        return static_cast<std::size_t>(
            std::distance(std::filesystem::directory_iterator(folder_.Path()), {}));
    }

    SystemCallGuard guard_;
};

TEST_F(ReplacementTest, AFileThatIsClosedJustBeforeItIsLockedIsLeftAlone) {
    recordUnfinished();
    Record(path("closed.mp4"), {"fragment", clipfileModule::RecordRules::kExact, true}, MakePlainStream(70));
    const Data closed = ReadAll(path("closed.mp4"));
    SystemCalls().flock = [&] {
        WriteAll(original(), closed);
        return 0;
    };
    EXPECT_FALSE(RecoverFile(original(), kInPlace).isRecovered);
    EXPECT_EQ(ReadAll(original()), closed);
}

TEST_F(ReplacementTest, AFileThatChangesMeanwhileIsNotReplaced) {
    recordUnfinished();
    Data longer = ReadAll(original());
    longer.push_back(0);
    SystemCalls().fsync = [&](int) {
        WriteAll(original(), longer);
        return 0;
    };
    EXPECT_EQ(failure(kInPlace), original().string() + " has changed while it was recovered.");
    EXPECT_EQ(ReadAll(original()), longer);
    EXPECT_EQ(fileCount(), 1U);
}

TEST_F(ReplacementTest, AFileWithMoreThanAChunkBehindADamageIsNotReplaced) {
    recordUnfinished(96);
    Data bytes = ReadAll(original());
    const auto moof = box_finder::Find(bytes, "moof:2");
    // The track of its first `tfhd`: moof, mfhd, traf, tfhd, version and flags.
    bytes[moof.offset + 8 + 16 + 8 + 8 + 4 + 3] = 99;
    WriteAll(original(), bytes);
    const std::string left = std::to_string(bytes.size() - moof.offset);
    EXPECT_EQ(failure(kInPlace), original().string() + " cannot be recovered: in place it would lose the " +
                                     left +
                                     " bytes behind its last whole picture, which are more than a chunk; "
                                     "recover it without --in-place.");
    EXPECT_EQ(ReadAll(original()), bytes);
    EXPECT_EQ(fileCount(), 1U);
    EXPECT_EQ(RecoverFile(original(), {}).pictures, 512U);
}

TEST_F(ReplacementTest, WhereNamesCannotBeTakenWithFlagsALinkGivesTheName) {
    for (const int error : {EINVAL, ENOSYS}) {
        recordUnfinished();
        SystemCalls().renameWithFlags = [&] { return error; };
        EXPECT_EQ(RecoverFile(original(), {}).written, recovered());
        EXPECT_EQ(fileCount(), 2U);
        std::filesystem::remove(recovered());
    }
}

TEST_F(ReplacementTest, AFolderThatCannotBeSynchronizedIsNoFailure) {
    recordUnfinished();
    int error = EINVAL;
    SystemCalls().fsync = [&](int descriptor) { return IsFolderOpen(descriptor) ? error : 0; };
    EXPECT_TRUE(RecoverFile(original(), {}).isRecovered);
    std::filesystem::remove(recovered());
    error = EIO;
    EXPECT_NE(failure(), "");
}

TEST_F(ReplacementTest, ALockThatTheSystemRefusesIsTold) {
    recordUnfinished();
    SystemCalls().flock = [] { return ENOLCK; };
    EXPECT_EQ(RecoverFile(original(), {}).lockFault, "No locks available");
    SystemCalls().flock = nullptr;
    EXPECT_EQ(RecoverFile(original(), kInPlace).lockFault, "");
}

TEST_F(ReplacementTest, AFileThatIsVerifiedTakesThePlaceOfItsOriginal) {
    recordUnfinished();
    const Data before = ReadAll(original());
    RecoveryOptions options;
    options.verify = [&](const std::filesystem::path& file, const std::filesystem::path& name) {
        EXPECT_TRUE(std::filesystem::exists(file));
        EXPECT_EQ(name, recovered());
        EXPECT_FALSE(std::filesystem::exists(name)) << "it has no name before";
        EXPECT_EQ(ReadAll(original()), before) << "the original is kept until then";
        return std::vector<std::string>();
    };
    const RecoveryResult result = RecoverFile(original(), options);
    EXPECT_EQ(result.written, original());
    EXPECT_EQ(result.defects, std::vector<std::string>());
    Record(path("closed.mp4"), {"fragment", clipfileModule::RecordRules::kExact, true}, MakePlainStream(32));
    EXPECT_EQ(ReadAll(original()), ReadAll(path("closed.mp4")));
    EXPECT_EQ(fileCount(), 2U);
}

TEST_F(ReplacementTest, AFileWithDefectsStaysBesideItsOriginal) {
    recordUnfinished();
    const Data before = ReadAll(original());
    RecoveryOptions options;
    options.verify = [](const auto&, const auto&) { return std::vector<std::string>{"Something is wrong."}; };
    const RecoveryResult result = RecoverFile(original(), options);
    EXPECT_EQ(result.written, recovered());
    EXPECT_EQ(result.defects, std::vector<std::string>{"Something is wrong."});
    EXPECT_EQ(ReadAll(original()), before);
}

TEST_F(ReplacementTest, AVerifiedFileThatLacksMoreThanAChunkStaysBesideItsOriginal) {
    recordUnfinished(96);
    Data bytes = ReadAll(original());
    bytes[box_finder::Find(bytes, "moof:2").offset + 8 + 16 + 8 + 8 + 4 + 3] = 99;
    WriteAll(original(), bytes);
    RecoveryOptions options;
    options.verify = [](const auto&, const auto&) { return std::vector<std::string>(); };
    EXPECT_EQ(RecoverFile(original(), options).written, recovered());
    EXPECT_EQ(ReadAll(original()), bytes);
}

TEST_F(ReplacementTest, AnOriginalThatChangesWhileTheNewFileIsVerifiedIsNotReplaced) {
    recordUnfinished();
    Data longer = ReadAll(original());
    longer.push_back(0);
    RecoveryOptions options;
    options.verify = [&](const auto&, const auto&) {
        WriteAll(original(), longer);
        return std::vector<std::string>();
    };
    EXPECT_EQ(failure(options), original().string() + " has changed while it was recovered.");
    EXPECT_EQ(ReadAll(original()), longer);
    EXPECT_EQ(fileCount(), 1U);
}

TEST_F(ReplacementTest, ARecoveryThatIsKilledWhileItVerifiesIsDoneAgain) {
    recordUnfinished();
    RecoveryOptions options;
    const pid_t killed = fork();
    if (killed == 0) {
        options.verify = [](const auto&, const auto&) -> std::vector<std::string> { _exit(0); };
        failure(options);
    }
    ASSERT_EQ(waitpid(killed, nullptr, 0), killed);
    EXPECT_EQ(fileCount(), 2U);
    options.verify = [](const auto&, const auto&) { return std::vector<std::string>(); };
    EXPECT_EQ(RecoveredBefore(original(), options), std::nullopt);
    EXPECT_EQ(RecoverFile(original(), options).written, original());
    EXPECT_EQ(fileCount(), 1U);
}

TEST_F(ReplacementTest, ADiskThatFillsUpEndsTheRecoveryAndGetsItsRoomBack) {
    recordUnfinished();
    std::vector<int> looks;
    RecoveryOptions options;
    options.verify = [&](const auto&, const auto&) {
        looks.push_back(0);
        return std::vector<std::string>{"Something is wrong."};
    };
    options.checkRoom = [&] {
        looks.push_back(1);
        if (looks.size() == 3) {
            throw ToolError(ExitCode::kUnreadable, "full");
        }
    };
    EXPECT_EQ(failure(options), "full") << "while it is verified somebody else has filled it";
    EXPECT_EQ(looks, (std::vector<int>{1, 0, 1}));
    EXPECT_EQ(fileCount(), 1U);
    looks.assign(2, 0);
    EXPECT_EQ(failure(options), "full") << "once it is written";
    EXPECT_EQ(looks, (std::vector<int>{0, 0, 1}));
    EXPECT_EQ(fileCount(), 1U);
}

TEST_F(ReplacementTest, AFileIsRecoveredByOneProgramAtATime) {
    recordUnfinished();
    RecoveryOptions options;
    options.verify = [&](const auto&, const auto&) {
        EXPECT_EQ(failure(),
                  original().string() + " is still being recorded, or recovered by another program.");
        return std::vector<std::string>();
    };
    EXPECT_EQ(RecoverFile(original(), options).written, original());
}

TEST_F(ReplacementTest, WhereOnlyFilesOpenForWritingAreLockedAloneItIsOpenedSo) {
    recordUnfinished();
    int refused = 0;
    SystemCalls().flock = [&] { return refused++ == 0 ? EBADF : 0; };
    EXPECT_EQ(RecoverFile(original(), {}).lockFault, "");
    EXPECT_GE(refused, 2);
}

TEST_F(ReplacementTest, WhatAKilledRecoveryHasLeftIsRemovedAndWhatIsInWorkStays) {
    recordUnfinished();
    const auto work = [&](const std::string& letters) {
        return path("." + recovered().filename().string() + ".clipfile-" + letters);
    };
    for (const char* const letters : {"a1B2c3", "inWork", "1x"}) {
        WriteAll(work(letters), {1});
    }
    const int held = open(work("inWork").c_str(), O_RDWR | O_CLOEXEC);
    ASSERT_EQ(flock(held, LOCK_EX | LOCK_NB), 0);
    RecoverFile(original(), {});
    EXPECT_FALSE(std::filesystem::exists(work("a1B2c3")));
    EXPECT_TRUE(std::filesystem::exists(work("inWork")));
    EXPECT_TRUE(std::filesystem::exists(work("1x"))) << "another kind of name";
    close(held);
}

TEST_F(ReplacementTest, InAFolderThatNobodyMayWriteToNothingIsRecovered) {
    recordUnfinished();
    const Data before = ReadAll(original());
    std::filesystem::permissions(original(), std::filesystem::perms(0444));
    std::filesystem::permissions(folder_.Path(), std::filesystem::perms(0555));
    {
        const AnotherUser other;
        ASSERT_TRUE(other.IsOther());
        EXPECT_EQ(failure(), recovered().string() + " cannot be written: Permission denied.");
    }
    std::filesystem::permissions(folder_.Path(), std::filesystem::perms(0755));
    EXPECT_EQ(ReadAll(original()), before);
    EXPECT_EQ(fileCount(), 1U);
}

TEST_F(ReplacementTest, TheOwnerStaysTheSame) {
    // Only root gives files away; anybody else's stay their own.
    const uid_t owner = geteuid() == 0 ? 4711 : geteuid();
    const gid_t group = geteuid() == 0 ? 4712 : getegid();
    recordUnfinished();
    ASSERT_EQ(chown(original().c_str(), owner, group), 0);
    RecoverFile(original(), kInPlace);
    struct stat status = {};
    ASSERT_EQ(stat(original().c_str(), &status), 0);
    EXPECT_EQ(status.st_uid, owner);
    EXPECT_EQ(status.st_gid, group);
}

}  // namespace
}  // namespace clipfile
