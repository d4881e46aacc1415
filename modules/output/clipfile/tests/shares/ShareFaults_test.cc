// What a recording to a share meets on its way: full, frozen, killed and cut-off servers.

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/mount.h>

#include <chrono>
#include <functional>
#include <ostream>
#include <string>

#include "shares/ShareRecordingFixture.h"
#include "support/PrivateMounts.h"
#include "support/Sanitized.h"

namespace {

using std::chrono::milliseconds;
using std::chrono::steady_clock;
using ::testing::AnyOf;
using ::testing::ElementsAre;
using ::testing::IsEmpty;
using ::testing::Pair;

/// What `FileOutput::Stop` waits at the most.
constexpr milliseconds kStopWait(3500);

struct Fault {
    const char* name;
    std::function<void(SambaServer&)> begin;
    std::function<void(SambaServer&)> end;
};

void PrintTo(const Fault& fault, std::ostream* out) {
    *out << fault.name;
}

class ShareFault : public ShareRecording, public ::testing::WithParamInterface<Fault> {
 protected:
    /// Nobody gave the writer up: it ended by itself, with the cause that it met.
    void ExpectWriterEndedItself(const FakeHost& host) {
        EXPECT_FALSE(log_.Contains("wait thread timeout..."));
        EXPECT_THAT(failures(host), ElementsAre(Pair(7, AnyOf(22, 26))));
    }
    void ExpectNextRecordingWorks(SambaServer& server) {
        log_.Clear();
        FakeHost next;
        setUp(next, server.Path() + "\\next");
        std::filesystem::create_directory(server.Folder() / "next");
        Record(next);
        EXPECT_THAT(failures(next), IsEmpty());
        ExpectRecorded(server.Folder() / "next");
    }
};

TEST_P(ShareFault, InTheMiddleOfAFileEndsTheRecordingAndTheNextOneWorks) {
    SambaServer server;
    FakeHost host;
    setUp(host, server.Path());
    Life life(*this, host);
    life.Push(kFrames);
    ASSERT_TRUE(life.RunUntil([&] { return countPrefix(log_, "OP: FILE CREATE. ") > 0; }));
    GetParam().begin(server);
    // The next chunk meets the fault.
    life.Push(16);
    EXPECT_TRUE(waitUntil([&] { return host.GetStatus() == 7; }));
    life.End();
    ExpectWriterEndedItself(host);
    GetParam().end(server);
    ExpectNextRecordingWorks(server);
}

TEST_P(ShareFault, BehindTheCommandToStopStillEndsInTime) {
    SambaServer server;
    FakeHost host;
    setUp(host, server.Path());
    Life life(*this, host);
    life.Push(kFrames);
    ASSERT_TRUE(life.RunUntil([&] { return countPrefix(log_, "OP: FILE CREATE. ") > 0; }));
    GetParam().begin(server);
    life.Push(16);
    const auto before = steady_clock::now();
    life.End();
    EXPECT_LT(steady_clock::now() - before, kStopWait + milliseconds(1500));  // for a loaded machine
    EXPECT_THAT(host.Statuses().back(), Pair(7, ::testing::_));
    // Sanitizers cost more time than a writer has left when its operation has reached its limit.
    if (!clipfileModule::kSanitized) {
        EXPECT_FALSE(log_.Contains("wait thread timeout..."));
    }
    GetParam().end(server);
    ExpectNextRecordingWorks(server);
}

INSTANTIATE_TEST_SUITE_P(Servers, ShareFault,
                         ::testing::Values(Fault{"Frozen", &SambaServer::Freeze, &SambaServer::Thaw},
                                           Fault{"Killed", &SambaServer::Kill, &SambaServer::Start},
                                           Fault{"Restarted",
                                                 [](SambaServer& server) {
                                                     server.Kill();
                                                     server.Start();
                                                 },
                                                 [](SambaServer&) {}},
                                           Fault{"CutOff", &SambaServer::CutConnections,
                                                 [](SambaServer&) {}}),
                         [](const auto& tested) { return std::string(tested.param.name); });

TEST_F(ShareRecording, AServerThatIsFrozenFromTheStartFailsTheLogonWithinItsTimeOut) {
    SambaServer server;
    server.Freeze();
    FakeHost host;
    setUp(host, server.Path());
    Life life(*this, host);
    life.Push(kFrames);
    EXPECT_TRUE(waitUntil([&] { return host.GetStatus() == 7; }));
    life.End();
    EXPECT_THAT(failures(host), ElementsAre(Pair(7, 21)));
    // ETIMEDOUT is 6e.
    EXPECT_TRUE(log_.Contains("LogonUser call failed. 0, 6e, " + server.Path() + ", recorder, " +
                              SambaServer::kPassword));
    server.Thaw();
    log_.Clear();
    FakeHost next;
    setUp(next, server.Path());
    Record(next);
    EXPECT_THAT(failures(next), IsEmpty());
    ExpectRecorded(server.Folder());
}

TEST_F(ShareRecording, AFullShareEndsWithCause23AndAClosedFileAndIsUsedWhenItHasRoom) {
    constexpr std::uint64_t kMinFreeSpace = 157286400;
    constexpr std::uint64_t kRoom = 1U << 20U;
    SambaServer server(SambaServer::Shares{{"rec", {}}}, {}, [](const std::filesystem::path& folder) {
        ASSERT_TRUE(UsePrivateMounts()) << "this test has to mount a file system";
        const std::string size = "size=" + std::to_string(kMinFreeSpace + kRoom);
        ASSERT_EQ(mount("tmpfs", folder.c_str(), "tmpfs", 0, size.c_str()), 0);
    });
    FakeHost host;
    setUp(host, server.Path());
    {
        Life life(*this, host);
        PacedPush push(life.Library().Stream());
        for (std::uint64_t n = 0; host.GetStatus() != 7; ++n) {
            ASSERT_LT(n, 20000U) << "the share does not fill";
            life.Push(push, 1);
        }
        life.End();
    }
    EXPECT_THAT(failures(host), ElementsAre(Pair(7, 23)));
    EXPECT_EQ(countPrefix(log_, "no disk freespace. "), 1U);
    ExpectRecorded(server.Folder());

    for (const auto& entry : std::filesystem::directory_iterator(server.Folder())) {
        std::filesystem::remove_all(entry);
    }
    log_.Clear();
    FakeHost next;
    setUp(next, server.Path());
    Record(next);
    EXPECT_THAT(failures(next), IsEmpty());
    ExpectRecorded(server.Folder());
    umount2(server.Folder().c_str(), MNT_DETACH);
}

}  // namespace
