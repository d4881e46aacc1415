// A writer that hangs in a file operation is given up, and whatever it does later harms nobody.

#include <fcntl.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <unistd.h>

#include <atomic>
#include <cerrno>
#include <chrono>
#include <filesystem>
#include <functional>
#include <future>
#include <memory>
#include <ostream>
#include <string>
#include <thread>
#include <tuple>
#include <vector>

#include "fileout/FileOutput.h"
#include "support/FileOutputHarness.h"

namespace clipfileModule {
namespace {

using std::chrono::milliseconds;
using std::chrono::steady_clock;
using ::testing::ElementsAre;
using ::testing::IsEmpty;

class FileOutputHangTest : public FileOutputTest {
 protected:
    /// Calls `Stop`, which has to give up, and checks that it took its time and no more.
    void StopHanging() {
        const auto before = steady_clock::now();
        output->Stop();
        const auto took = std::chrono::duration_cast<milliseconds>(steady_clock::now() - before);
        EXPECT_GE(took, milliseconds(3500));
        EXPECT_LT(took, milliseconds(3500) + kSlack);
    }
    /// Destroys everything that the thread could reach, and lets nobody know that it is still there.
    void DestroyOwners() {
        output->Uninitialize();
        output.reset();
    }

    /// For a loaded machine.
    static constexpr milliseconds kSlack{10000};
};

TEST_F(FileOutputHangTest, AWriteThatHangsEndsWithCause27AndAFileWithoutClosingBoxes) {
    muxers.SetFifo();
    Start();
    // More than a pipe holds, and nobody reads.
    Push(0, false, 4 << 20);
    Push(1);
    ASSERT_TRUE(muxers.WaitForCall("2 Write 0"));
    std::vector<std::string> order;
    log.OnLine([&](const CapturedLine& line) {
        if (line.text.find("thread") != std::string::npos) {
            order.push_back(line.text + " " + std::to_string(Statuses().size()));
        }
    });
    StopHanging();
    log.OnLine(nullptr);
    // Each line with the number of statuses that were set before it.
    EXPECT_THAT(order, ElementsAre("wait thread start... 0", "wait thread timeout... 0",
                                   "terminate thread... 1", "wait thread end... 1"));

    EXPECT_THAT(TextsOf("Stop"), ElementsAre("start.", "wait thread start...", "wait thread timeout...",
                                             "terminate thread...", "wait thread end...", "end."));
    EXPECT_TRUE(Logged(LOG_PRIORITY_TRACE, "Stop", "wait thread timeout..."));
    EXPECT_TRUE(Logged(LOG_PRIORITY_TRACE, "Stop", "terminate thread..."));
    EXPECT_THAT(controller.Calls(), ElementsAre("post 6", "status 7 27"));
    EXPECT_THAT(MuxerCalls("Close"), IsEmpty());

    // A second Stop has nothing to end.
    log.Clear();
    output->Stop();
    EXPECT_THAT(TextsOf("Stop"), ElementsAre("start.", "end."));
    EXPECT_TRUE(output->Uninitialize());
    EXPECT_THAT(MuxerCalls("Uninitialize"), ElementsAre("1 Uninitialize"));
    output.reset();

    // Now the pipe is read, so the write returns.
    log.Clear();
    const std::string path = muxers.Files().at(0).path;
    const int reader = open(path.c_str(), O_RDONLY | O_NONBLOCK);
    ASSERT_GE(reader, 0);
    std::string content;
    char block[65536];
    const auto deadline = steady_clock::now() + FakeMuxers::kDeadline;
    while (!muxers.WaitForCall("2 gone", milliseconds(0))) {
        ASSERT_LT(steady_clock::now(), deadline);
        const ssize_t count = read(reader, block, sizeof block);
        if (count > 0) {
            content.append(block, static_cast<std::size_t>(count));
        }
    }
    for (ssize_t count = 0; (count = read(reader, block, sizeof block)) > 0;) {
        content.append(block, static_cast<std::size_t>(count));
    }
    close(reader);
    EXPECT_EQ(content, "open\nchunk 0 4194304\n" + std::string(4 << 20, '.') + "\n");
    EXPECT_THAT(MuxerCalls("2 "), ElementsAre("create 2 normal", "2 Initialize", "2 Open", "2 Write 0",
                                              "2 Uninitialize", "2 gone"));
    EXPECT_THAT(controller.Calls(), ElementsAre("post 6", "status 7 27"));
    EXPECT_THAT(log.Texts(), IsEmpty());
}

/// A place where the thread can hang.
struct Place {
    const char* name;
    /// Makes the operation call `hang` and then return what it is given.
    void (*arm)(FakePlatform& platform, FakeMuxers& muxers, std::function<bool()> hang);
    /// What the muxers got until the thread ended.
    std::vector<std::string> calls;
};

void PrintTo(const Place& place, std::ostream* out) {
    *out << place.name;
}

const std::vector<std::string> kNoFile = {"create 1 normal", "1 Initialize", "1 Uninitialize", "1 gone"};

const Place kPlaces[] = {
    {"Logon",
     [](FakePlatform& platform, FakeMuxers&, std::function<bool()> hang) {
         platform.Set([&](FakePlatform::Hooks& hooks) {
             hooks.logon = [hang](const std::string&, const std::string&, const std::string&, LogonToken&) {
                 return hang() ? 0 : EIO;
             };
         });
     },
     kNoFile},
    {"Space",
     [](FakePlatform& platform, FakeMuxers&, std::function<bool()> hang) {
         platform.Set([&](FakePlatform::Hooks& hooks) {
             hooks.availableSpace = [hang](const std::string&, std::uint64_t& bytes) {
                 bytes = 1000 * kMinFreeSpace;
                 return hang() ? 0 : EIO;
             };
         });
     },
     kNoFile},
    {"Mkdir",
     [](FakePlatform& platform, FakeMuxers&, std::function<bool()> hang) {
         platform.Set([&](FakePlatform::Hooks& hooks) {
             hooks.createDirectories = [hang](const std::string&, boost::system::error_code& error) {
                 error.clear();
                 return hang();
             };
         });
     },
     kNoFile},
    {"Open",
     [](FakePlatform&, FakeMuxers& muxers, std::function<bool()> hang) {
         muxers.SetHooks([&](FakeMuxers::Hooks& hooks) { hooks.open = hang; });
     },
     {"create 1 normal", "1 Initialize", "1 Uninitialize", "1 gone", "create 2 normal", "2 Initialize",
      "2 Open", "2 Uninitialize", "2 gone"}},
    {"SpaceForAChunk",
     [](FakePlatform& platform, FakeMuxers&, std::function<bool()> hang) {
         platform.Set([&](FakePlatform::Hooks& hooks) {
             const auto asked = std::make_shared<std::atomic<int>>(0);
             hooks.availableSpace = [hang, asked](const std::string&, std::uint64_t& bytes) {
                 bytes = 1000 * kMinFreeSpace;
                 return ++*asked == 1 || hang() ? 0 : EIO;
             };
         });
     },
     {"create 1 normal", "1 Initialize", "1 Uninitialize", "1 gone", "create 2 normal", "2 Initialize",
      "2 Open", "2 Uninitialize", "2 gone"}},
    {"Write",
     [](FakePlatform&, FakeMuxers& muxers, std::function<bool()> hang) {
         muxers.SetHooks(
             [&](FakeMuxers::Hooks& hooks) { hooks.write = [hang](std::uint64_t) { return hang(); }; });
     },
     {"create 1 normal", "1 Initialize", "1 Uninitialize", "1 gone", "create 2 normal", "2 Initialize",
      "2 Open", "2 Write 0", "2 Uninitialize", "2 gone"}},
    {"CloseAtARotation",
     [](FakePlatform&, FakeMuxers& muxers, std::function<bool()> hang) {
         muxers.SetHooks([&](FakeMuxers::Hooks& hooks) { hooks.close = hang; });
     },
     {"create 1 normal", "1 Initialize", "1 Uninitialize", "1 gone", "create 2 normal", "2 Initialize",
      "2 Open", "2 Write 0", "2 WriteTmcd", "2 Close", "2 Uninitialize", "2 gone"}},
    {"Close",
     [](FakePlatform&, FakeMuxers& muxers, std::function<bool()> hang) {
         muxers.SetHooks([&](FakeMuxers::Hooks& hooks) { hooks.close = hang; });
     },
     {"create 1 normal", "1 Initialize", "1 Uninitialize", "1 gone", "create 2 normal", "2 Initialize",
      "2 Open", "2 Write 0", "2 WriteTmcd", "2 Close", "2 Uninitialize", "2 gone"}},
};

/// What goes on when the operation returns at last.
enum class Late { kSucceeds, kFails };

void PrintTo(Late late, std::ostream* out) {
    *out << (late == Late::kSucceeds ? "succeeds" : "fails");
}

class FileOutputHangPlaceTest : public FileOutputHangTest,
                                public testing::WithParamInterface<std::tuple<Place, Late>> {};

TEST_P(FileOutputHangPlaceTest, AThreadThatWasGivenUpReachesNobodyHoweverLateItReturns) {
    const auto& [place, late] = GetParam();
    // Shared with the thread, which may outlive the test.
    struct Gate {
        std::promise<void> reached;
        std::promise<void> release;
        std::shared_future<void> released = release.get_future().share();
        std::atomic<bool> first = true;
    };
    const auto gate = std::make_shared<Gate>();
    const bool result = late == Late::kSucceeds;
    place.arm(platform, muxers, [gate, result] {
        if (gate->first.exchange(false)) {
            gate->reached.set_value();
        }
        gate->released.wait();
        return result;
    });
    if (place.name == std::string("Logon")) {
        settings.outputPath = "\\" + dir.ModulePath();
        settings.userName = "user";
    }
    settings.maxFileSize = 0;

    auto ownController = std::make_unique<ControllerRecorder>();
    auto ownBuffer = std::make_unique<TimecodeBuffer>();
    output = std::make_unique<FileOutput>();
    ASSERT_TRUE(output->Initialize(ownController.get(), ownBuffer.get(), "normal"));
    output->Start(settings);
    Push(0, true);
    if (place.name == std::string("CloseAtARotation")) {
        Push(1, true);
        gate->reached.get_future().wait();
    } else if (place.name != std::string("Close")) {
        gate->reached.get_future().wait();
        Push(1, true);
    }
    StopHanging();
    EXPECT_THAT(ownController->Calls(), ElementsAre("post 6", "status 7 27"));

    // A thread that still used one of these would be seen by the sanitizers.
    output->Uninitialize();
    output.reset();
    ownController.reset();
    ownBuffer.reset();
    log.Clear();

    gate->release.set_value();
    EXPECT_TRUE(muxers.WaitForCall(place.calls.back()));
    if (place.calls == kNoFile) {
        // The thread released the muxer that it had not replaced yet.
        EXPECT_THAT(MuxerCalls("create"), ElementsAre("create 1 normal"));
    }
    EXPECT_THAT(muxers.Calls(), testing::ElementsAreArray(place.calls));
    EXPECT_THAT(log.Texts(), IsEmpty());
}

INSTANTIATE_TEST_SUITE_P(Places, FileOutputHangPlaceTest,
                         testing::Combine(testing::ValuesIn(kPlaces),
                                          testing::Values(Late::kSucceeds, Late::kFails)),
                         [](const auto& tested) {
                             return std::string(std::get<0>(tested.param).name) +
                                    (std::get<1>(tested.param) == Late::kSucceeds ? "Succeeds" : "Fails");
                         });

TEST_F(FileOutputHangTest, AFileOutputWhoseThreadWasGivenUpCanStartAgain) {
    const auto release = std::make_shared<std::promise<void>>();
    const auto released = std::make_shared<std::shared_future<void>>(release->get_future().share());
    muxers.SetHooks([&](FakeMuxers::Hooks& hooks) {
        hooks.write = [released](std::uint64_t chunk) {
            if (chunk == 0) {
                released->wait();
            }
            return true;
        };
    });
    Start();
    Push(0);
    ASSERT_TRUE(muxers.WaitForCall("2 Write 0"));
    StopHanging();
    // Nobody takes it any more.
    EXPECT_EQ(output->PushChunk(MakeChunk(1)), 1u);

    output->Start(settings);
    Push(2);
    ASSERT_TRUE(muxers.WaitForCall("3 Write 2"));
    release->set_value();
    EXPECT_TRUE(muxers.WaitForCall("2 gone"));
    Finish();
    EXPECT_EQ(Disk().at(kToday + "1.txt"), "open, chunk 0");
    EXPECT_EQ(Disk().at(kToday + "2.txt"), "open, chunk 2, tmcd 01:02:03:02, closed");
    EXPECT_THAT(Statuses(), ElementsAre("7 27"));
}

TEST_F(FileOutputHangTest, AThreadThatEndsWithinTheTimeIsNotGivenUp) {
    std::promise<void> release;
    muxers.SetHooks([&](FakeMuxers::Hooks& hooks) {
        hooks.close = [&] {
            release.get_future().wait();
            return true;
        };
    });
    Start();
    Push(0);
    ASSERT_TRUE(muxers.WaitForCall("2 Write 0"));
    std::thread stopper([this] { output->Stop(); });
    ASSERT_TRUE(muxers.WaitForCall("2 Close"));
    release.set_value();
    stopper.join();
    EXPECT_THAT(Statuses(), IsEmpty());
    EXPECT_THAT(TextsOf("Stop"), ElementsAre("start.", "wait thread start...", "wait thread end...", "end."));
    EXPECT_EQ(Disk().at(kToday + "1.txt"), "open, chunk 0, tmcd 01:02:03:00, closed");
}

}  // namespace
}  // namespace clipfileModule
