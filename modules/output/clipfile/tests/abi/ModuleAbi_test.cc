// A host that was compiled without a look at this repository, before the built library.

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <functional>
#include <memory>
#include <string>
#include <thread>
#include <utility>
#include <vector>

#include "HostProcess.h"

namespace {

using ::testing::AnyOf;
using ::testing::ElementsAre;
using ::testing::HasSubstr;
using ::testing::IsEmpty;
using ::testing::Not;
using ::testing::Pair;
using ::testing::SizeIs;

using Push = void (QxModuleStreamInterface::*)(const std::shared_ptr<StreamData>&);

/// The event thread and three queue threads.
constexpr int kModuleThreads = 4;

/// A host of a module that never records, so that what it sees does not depend on the stream.
void ConfigureIdle(RecordingHost& host) {
    host.texts["-outputPath"] = "/srv/recordings";
    host.texts["-outputMode"] = "off";
}

/// True once nobody but the caller holds the unit: its queue thread has let go of it.
bool IsReleased(const std::shared_ptr<StreamData>& unit) {
    return unit.use_count() == 1;
}

/// Steps 4 and 5: the other two interfaces, and the first status.
struct Interfaces {
    QxModuleStreamInterface* stream = nullptr;
    QxModuleNotifyInterface* notify = nullptr;

    void Get(QxModuleInterface& module) {
        EXPECT_TRUE(module.GetStreamInterface(&stream));
        EXPECT_TRUE(module.GetNotifyInterface(&notify));
        ASSERT_NE(stream, nullptr);
        ASSERT_NE(notify, nullptr);
    }
};

/// Three of the host's threads push, each its own medium, fewer units than a queue holds. Returns when the
/// module has let go of all of them.
void PushStream(QxModuleStreamInterface& stream, const std::function<void()>& meanwhile) {
    std::vector<std::shared_ptr<StreamData>> video;
    std::vector<std::shared_ptr<StreamData>> audio;
    std::vector<std::shared_ptr<StreamData>> meta;
    for (std::uint64_t i = 0; i < 40; ++i) {
        video.push_back(MakeVideo(i * 3600, i * 40));
        audio.push_back(MakeAudio(i * 1024, i * 1024 / 48));
        meta.push_back(MakeMeta(i * 3600, i * 40, false));
    }
    const auto pushAll = [&stream](const std::vector<std::shared_ptr<StreamData>>& units, Push push) {
        for (const auto& unit : units) {
            (stream.*push)(unit);
        }
    };
    std::thread videoThread([&] { pushAll(video, &QxModuleStreamInterface::PushVideo); });
    std::thread audioThread([&] { pushAll(audio, &QxModuleStreamInterface::PushAudio); });
    std::thread metaThread([&] { pushAll(meta, &QxModuleStreamInterface::PushMeta); });
    meanwhile();
    videoThread.join();
    audioThread.join();
    metaThread.join();
    for (const auto* units : {&video, &audio, &meta}) {
        for (const auto& unit : *units) {
            EXPECT_TRUE(WaitUntil([&] { return IsReleased(unit); }));
        }
    }
}

/// The order of calls of a host from `Initialize` to `Uninitialize`.
void RunWholeOrder(QxModuleInterface& module, bool executeFirst) {
    RecordingHost host;
    ConfigureIdle(host);
    const int before = CountThreads();
    ASSERT_TRUE(module.Initialize(&host));
    EXPECT_EQ(CountThreads(), before + kModuleThreads);

    Interfaces interfaces;
    if (executeFirst) {
        EXPECT_TRUE(module.Execute());
        interfaces.Get(module);
    } else {
        interfaces.Get(module);
        EXPECT_TRUE(module.Execute());
    }
    ASSERT_NE(interfaces.notify, nullptr);
    QxModuleNotifyInterface& notify = *interfaces.notify;

    // A status that was posted before the event thread came to its wait goes out with the next event.
    QxInputOutputConnectRequest connect;
    connect.framerate = 59940;
    ASSERT_TRUE(WaitUntil([&] {
        EXPECT_EQ(notify.NotifyInputOutputConnectRequest(&connect), 0U);
        return !host.Transmissions().empty();
    }));
    EXPECT_THAT(host.Transmissions(), ElementsAre(ElementsAre(Pair("file_output_status", "standby"))));

    PushStream(*interfaces.stream, [&] {
        notify.NotifyOnlineStatus();
        notify.NotifyOfflineStatus();
    });
    EXPECT_THAT(host.Statuses(), ElementsAre(Pair(4, 0), Pair(6, 26), Pair(3, 0)));

    EXPECT_TRUE(module.Uninitialize());
    // A joined thread leaves the list of tasks a moment later.
    EXPECT_TRUE(WaitUntil([&] { return CountThreads() == before; })) << CountThreads();
    // The end stops buffering once more when it finds the event thread at work on an event.
    EXPECT_THAT(host.Statuses(), AnyOf(ElementsAre(Pair(4, 0), Pair(6, 26), Pair(3, 0)),
                                       ElementsAre(Pair(4, 0), Pair(6, 26), Pair(3, 0), Pair(3, 0))));
    EXPECT_THAT(host.Transmissions(), SizeIs(1));
}

class ModuleAbi : public ::testing::Test {
 protected:
    void SetUp() override {
        module_ = library_.Get();
        ASSERT_NE(module_, nullptr);
        library_.StartLog();
    }

    LoadedModule library_;
    QxModuleInterface* module_ = nullptr;
};

TEST_F(ModuleAbi, EntryGivesTheSameObjectEachTime) {
    QxModuleInterface* again = nullptr;
    EXPECT_TRUE(library_.Entry()(&again));
    EXPECT_EQ(again, module_);
}

TEST_F(ModuleAbi, LoadingStartsNoThread) {
    library_.Unload();
    const int before = CountThreads();
    const LoadedModule loaded;
    ASSERT_NE(loaded.Get(), nullptr);
    EXPECT_EQ(CountThreads(), before);
}

TEST_F(ModuleAbi, IntervalAndReservedOperationsAnswerBeforeInitialize) {
    unsigned int interval = 0;
    EXPECT_TRUE(module_->GetModuleInterval(&interval));
    EXPECT_EQ(interval, 10000U);
    EXPECT_TRUE(module_->ReservedOperationA());
    EXPECT_TRUE(module_->ReservedOperationB());
    EXPECT_EQ(module_->ReservedOperationC(), 0);
}

TEST_F(ModuleAbi, IntervalAndReservedOperationsAnswerTheSameWhileRunning) {
    RecordingHost host;
    ConfigureIdle(host);
    ASSERT_TRUE(module_->Initialize(&host));
    unsigned int interval = 0;
    EXPECT_TRUE(module_->GetModuleInterval(&interval));
    EXPECT_EQ(interval, 10000U);
    EXPECT_TRUE(module_->ReservedOperationA());
    EXPECT_TRUE(module_->ReservedOperationB());
    EXPECT_EQ(module_->ReservedOperationC(), 0);
    EXPECT_THAT(host.Statuses(), IsEmpty());
    EXPECT_TRUE(module_->Uninitialize());
}

TEST_F(ModuleAbi, InterfacesStayTheSameUntilUnload) {
    Interfaces built;
    built.Get(*module_);
    RecordingHost host;
    ConfigureIdle(host);
    ASSERT_TRUE(module_->Initialize(&host));
    Interfaces running;
    running.Get(*module_);
    EXPECT_TRUE(module_->Uninitialize());
    Interfaces ended;
    ended.Get(*module_);
    EXPECT_EQ(built.stream, running.stream);
    EXPECT_EQ(built.notify, running.notify);
    EXPECT_EQ(built.stream, ended.stream);
    EXPECT_EQ(built.notify, ended.notify);
}

TEST_F(ModuleAbi, WholeOrderOfCallsRunsTwice) {
    RunWholeOrder(*module_, false);
    RunWholeOrder(*module_, false);
}

TEST_F(ModuleAbi, ExecuteMayComeBeforeTheInterfaces) {
    RunWholeOrder(*module_, true);
}

TEST_F(ModuleAbi, WholeOrderRunsAgainAfterUnloadAndReload) {
    RunWholeOrder(*module_, false);
    library_.Unload();
    EXPECT_FALSE(LoadedModule::IsLoaded());
    const LoadedModule again;
    ASSERT_NE(again.Get(), nullptr);
    again.StartLog();
    RunWholeOrder(*again.Get(), false);
}

TEST_F(ModuleAbi, FailedInitializeSetsStatus7Cause2AndLeavesNoThread) {
    const LogTail log;
    RecordingHost host;
    const int before = CountThreads();
    EXPECT_FALSE(module_->Initialize(&host));
    EXPECT_EQ(CountThreads(), before);
    EXPECT_THAT(host.Statuses(), ElementsAre(Pair(7, 2)));
    EXPECT_EQ(host.GetStatus(), 7);
    EXPECT_TRUE(
        WaitUntil([&] { return log.Text().find("end. file output path is none.") != std::string::npos; }));
}

TEST_F(ModuleAbi, FailedInitializeSetsNoStatusWhereItIs7Already) {
    RecordingHost host;
    host.SetStatus(7, 21);
    EXPECT_FALSE(module_->Initialize(&host));
    EXPECT_THAT(host.Statuses(), ElementsAre(Pair(7, 21)));
}

TEST_F(ModuleAbi, LibraryCanBeUnloadedAndLoadedAfterAFailedInitialize) {
    RecordingHost host;
    ASSERT_FALSE(module_->Initialize(&host));
    library_.Unload();
    EXPECT_FALSE(LoadedModule::IsLoaded());
    const LoadedModule again;
    ASSERT_NE(again.Get(), nullptr);
    again.StartLog();
    RunWholeOrder(*again.Get(), false);
}

TEST_F(ModuleAbi, ParametersAreAskedForInOrderWithTheirDefaults) {
    RecordingHost host;
    ConfigureIdle(host);
    ASSERT_TRUE(module_->Initialize(&host));
    EXPECT_TRUE(module_->Uninitialize());
    EXPECT_THAT(host.Questions(),
                ElementsAre("-filePrefix=Unknown-Model", "-outputPath=none", "-userName=operator",
                            "-password=a b;c", "-fileType=normal", "-naluType=normal", "-outputMode=on",
                            "-encodedHeight=720", "-encodedWidth=1280", "-encodedFPS=29970",
                            "-encodedBPS=60000", "-recordRules=kept", "-pictureOrder=presentation"));
}

TEST_F(ModuleAbi, ParametersOfTheHostArrive) {
    const LogTail log;
    RecordingHost host;
    host.texts = {{"-outputPath", "/srv/recordings"},
                  {"-fileType", "fragment"},
                  {"-naluType", "direct"},
                  {"-outputMode", "off"}};
    ASSERT_TRUE(module_->Initialize(&host));
    EXPECT_TRUE(module_->Uninitialize());
    ASSERT_TRUE(WaitUntil([&] { return log.Text().find("outputMode = ") != std::string::npos; }));
    EXPECT_THAT(log.Text(), HasSubstr("max filesize = 60."));
    EXPECT_THAT(log.Text(), HasSubstr("file output path = \\srv\\recordings."));
    EXPECT_THAT(log.Text(), HasSubstr("fileType   = fragment."));
    EXPECT_THAT(log.Text(), HasSubstr("naluType   = direct."));
    EXPECT_THAT(log.Text(), HasSubstr("outputMode = off."));
}

TEST_F(ModuleAbi, FieldsOfTheConnectRequestArrive) {
    const LogTail log;
    RecordingHost host;
    ConfigureIdle(host);
    ASSERT_TRUE(module_->Initialize(&host));
    Interfaces interfaces;
    interfaces.Get(*module_);
    QxInputOutputConnectRequest connect;
    connect.framerate = 50000;
    connect.width = 1920;
    connect.height = 1080;
    connect.bitrate = 60001;
    connect.properties = {{"filePrefix", "Studio 1"}, {"other", "value"}};
    EXPECT_EQ(interfaces.notify->NotifyInputOutputConnectRequest(&connect), 0U);
    EXPECT_TRUE(module_->Uninitialize());
    ASSERT_TRUE(WaitUntil([&] { return log.Text().find("height    : 1080.") != std::string::npos; }));
    EXPECT_THAT(log.Text(), HasSubstr("framerate : 50000."));
    EXPECT_THAT(log.Text(), HasSubstr("bitrate   : 60001."));
    EXPECT_THAT(log.Text(), HasSubstr("width     : 1920."));
}

TEST_F(ModuleAbi, DisconnectOfAnotherKindIsRefusedAndOutputGoesOn) {
    RecordingHost host;
    ConfigureIdle(host);
    ASSERT_TRUE(module_->Initialize(&host));
    Interfaces interfaces;
    interfaces.Get(*module_);
    interfaces.notify->NotifyOnlineStatus();
    QxInputOutputDisconnectionRequest disconnect;
    disconnect.connectionKind = 2;
    EXPECT_EQ(interfaces.notify->NotifyInputOutputDisconnectionRequest(&disconnect), 3U);
    EXPECT_THAT(host.Statuses(), ElementsAre(Pair(4, 0)));
    disconnect.connectionKind = 1;
    EXPECT_EQ(interfaces.notify->NotifyInputOutputDisconnectionRequest(&disconnect), 0U);
    EXPECT_THAT(host.Statuses(), ElementsAre(Pair(4, 0), Pair(3, 0)));
    EXPECT_TRUE(module_->Uninitialize());
}

TEST_F(ModuleAbi, RepliesAndPropertiesAreTakenUnread) {
    RecordingHost host;
    ConfigureIdle(host);
    ASSERT_TRUE(module_->Initialize(&host));
    Interfaces interfaces;
    interfaces.Get(*module_);
    EXPECT_EQ(interfaces.notify->NotifyModuleConnectionRequestReply(nullptr), 0U);
    EXPECT_EQ(interfaces.notify->NotifySetPropertiesRequest(nullptr), 0U);
    EXPECT_THAT(host.Statuses(), IsEmpty());
    EXPECT_TRUE(module_->Uninitialize());
}

TEST_F(ModuleAbi, PushReservedKeepsNothing) {
    RecordingHost host;
    ConfigureIdle(host);
    ASSERT_TRUE(module_->Initialize(&host));
    Interfaces interfaces;
    interfaces.Get(*module_);
    const auto unit = MakeVideo(0, 0);
    // More often than any queue has places, and never is the unit held.
    for (int i = 0; i < 200; ++i) {
        interfaces.stream->PushReserved(unit);
        ASSERT_TRUE(IsReleased(unit));
    }
    EXPECT_TRUE(module_->Uninitialize());
}

TEST_F(ModuleAbi, UnitWithoutPayloadIsTakenAndLetGo) {
    RecordingHost host;
    ConfigureIdle(host);
    ASSERT_TRUE(module_->Initialize(&host));
    Interfaces interfaces;
    interfaces.Get(*module_);
    for (const Push push : {&QxModuleStreamInterface::PushVideo, &QxModuleStreamInterface::PushAudio,
                            &QxModuleStreamInterface::PushMeta}) {
        const auto unit = std::make_shared<StreamData>();
        (interfaces.stream->*push)(unit);
        EXPECT_TRUE(WaitUntil([&] { return IsReleased(unit); }));
    }
    EXPECT_TRUE(module_->Uninitialize());
}

TEST_F(ModuleAbi, UnitsAreIgnoredWhileTheStatusIs7) {
    RecordingHost host;
    ConfigureIdle(host);
    ASSERT_TRUE(module_->Initialize(&host));
    Interfaces interfaces;
    interfaces.Get(*module_);
    host.SetStatus(7, 21);
    const auto unit = MakeVideo(0, 0);
    interfaces.stream->PushVideo(unit);
    interfaces.stream->PushAudio(unit);
    interfaces.stream->PushMeta(unit);
    EXPECT_TRUE(IsReleased(unit));
    EXPECT_TRUE(module_->Uninitialize());
}

/// The record flag, the timecode and the media clock of a unit are read from the places where the host put
/// them.
TEST_F(ModuleAbi, FieldsOfAUnitArrive) {
    const LogTail log;
    RecordingHost host;
    ConfigureIdle(host);
    host.texts["-outputMode"] = "sync";
    ASSERT_TRUE(module_->Initialize(&host));
    Interfaces interfaces;
    interfaces.Get(*module_);
    const auto hasLogged = [&](const std::string& line) {
        return [&log, line] { return log.Text().find(line) != std::string::npos; };
    };
    interfaces.stream->PushMeta(MakeMeta(8589934592, 1000, false));
    EXPECT_TRUE(WaitUntil(hasLogged("OP: REC FLAG ON -> OFF.")));
    EXPECT_THAT(log.Text(), Not(HasSubstr("OP: REC FLAG OFF -> ON.")));
    interfaces.stream->PushMeta(MakeMeta(8589938192, 1040, true));
    EXPECT_TRUE(WaitUntil(hasLogged("OP: REC FLAG OFF -> ON.")));
    EXPECT_TRUE(WaitUntil(hasLogged("OP: REC START. 10:11:12:13. RTPTS = 8589938192. -> -1")));
    EXPECT_TRUE(module_->Uninitialize());
}

/// The lines of the log at priority 5 since `log`, by their text.
int CountWarnings(const LogTail& log, const std::string& text) {
    int count = 0;
    const std::string all = log.Text();
    for (std::size_t at = all.find(text); at != std::string::npos; at = all.find(text, at + 1)) {
        const std::size_t begin = all.rfind('\n', at) + 1;
        count += all.substr(begin, at - begin).find("] 5 ") != std::string::npos ? 1 : 0;
    }
    return count;
}

/// A host that calls everything before, after or between its lives, each breach one line.
TEST_F(ModuleAbi, CallsOutsideALifeChangeNothingAndAreLoggedOnce) {
    Interfaces interfaces;
    interfaces.Get(*module_);
    RecordingHost failing;
    const auto breach = [&] {
        const LogTail log;
        const int threads = CountThreads();
        EXPECT_TRUE(module_->Uninitialize());
        EXPECT_TRUE(module_->Execute());
        const auto unit = MakeMeta(0, 0, true);
        for (int i = 0; i < 60; ++i) {
            interfaces.stream->PushVideo(unit);
            interfaces.stream->PushAudio(unit);
            interfaces.stream->PushMeta(unit);
        }
        EXPECT_TRUE(IsReleased(unit));
        QxInputOutputConnectRequest connect;
        QxInputOutputDisconnectionRequest disconnect;
        disconnect.connectionKind = 1;
        EXPECT_EQ(interfaces.notify->NotifyInputOutputConnectRequest(&connect), 3U);
        EXPECT_EQ(interfaces.notify->NotifyModuleConnectionRequestReply(nullptr), 3U);
        EXPECT_EQ(interfaces.notify->NotifyInputOutputDisconnectionRequest(&disconnect), 3U);
        EXPECT_EQ(interfaces.notify->NotifySetPropertiesRequest(nullptr), 3U);
        interfaces.notify->NotifyOnlineStatus();
        interfaces.notify->NotifyOfflineStatus();
        EXPECT_EQ(CountThreads(), threads);
        ASSERT_TRUE(
            WaitUntil([&] { return CountWarnings(log, "NotifyOfflineStatus is called without") == 1; }));
        EXPECT_EQ(CountWarnings(log, "uninitialize is called without initialize."), 1);
        EXPECT_EQ(CountWarnings(log, "execute is called without initialize."), 1);
        EXPECT_EQ(CountWarnings(log, "unit is pushed without initialize."), 1);
        EXPECT_EQ(CountWarnings(log, "Request is called without initialize."), 3);
        EXPECT_EQ(CountWarnings(log, "RequestReply is called without initialize."), 1);
        EXPECT_EQ(CountWarnings(log, "NotifyOnlineStatus is called without initialize."), 1);
        EXPECT_EQ(CountWarnings(log, " without initialize."), 9);
    };
    breach();
    RunWholeOrder(*module_, false);
    breach();
    EXPECT_FALSE(module_->Initialize(&failing));
    breach();
    EXPECT_THAT(failing.Statuses(), ElementsAre(Pair(7, 2)));
    RunWholeOrder(*module_, false);
}

TEST_F(ModuleAbi, ASecondInitializeLeavesTheRunningLifeAsItIs) {
    const LogTail log;
    RecordingHost host;
    ConfigureIdle(host);
    const int before = CountThreads();
    ASSERT_TRUE(module_->Initialize(&host));
    RecordingHost other;
    EXPECT_TRUE(module_->Initialize(&other));
    EXPECT_EQ(CountThreads(), before + kModuleThreads);
    EXPECT_THAT(other.Questions(), IsEmpty());
    Interfaces interfaces;
    interfaces.Get(*module_);
    interfaces.notify->NotifyOnlineStatus();
    interfaces.notify->NotifyOfflineStatus();
    EXPECT_THAT(host.Statuses(), ElementsAre(Pair(4, 0), Pair(6, 26), Pair(3, 0)));
    EXPECT_THAT(other.Statuses(), IsEmpty());
    EXPECT_TRUE(module_->Uninitialize());
    EXPECT_TRUE(WaitUntil([&] { return CountThreads() == before; })) << CountThreads();
    EXPECT_TRUE(WaitUntil([&] { return CountWarnings(log, "initialize is called twice.") == 1; }));
}

TEST_F(ModuleAbi, UnitsAreIgnoredBehindAStatus7OfTheModuleWhateverTheHostHolds) {
    RecordingHost host;
    host.texts["-outputPath"] = "/proc/no/such/folder";
    host.texts["-outputMode"] = "on";
    host.numbers["-encodedFPS"] = 25000;
    ASSERT_TRUE(module_->Initialize(&host));
    Interfaces interfaces;
    interfaces.Get(*module_);
    interfaces.notify->NotifyOnlineStatus();
    // Nothing but audio: the cache passes its limit before a chunk was made, which is final.
    std::uint64_t k = 0;
    ASSERT_TRUE(WaitUntil([&] {
        interfaces.stream->PushAudio(MakeAudio(k * 1024, k * 1024 / 48));
        ++k;
        return host.GetStatus() == 7;
    }));
    host.SetStatus(0, 0);
    const auto unit = MakeVideo(0, 0);
    interfaces.stream->PushVideo(unit);
    interfaces.stream->PushMeta(unit);
    EXPECT_TRUE(IsReleased(unit));
    interfaces.notify->NotifyOfflineStatus();
    EXPECT_THAT(host.Statuses(), ElementsAre(Pair(4, 0), Pair(6, 24), Pair(7, 26), Pair(0, 0)));
    EXPECT_TRUE(module_->Uninitialize());
}

}  // namespace
