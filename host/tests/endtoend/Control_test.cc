// The control socket of a real run: every method, and clients of every kind, while a recording runs that has
// to be whole in the end.

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/stat.h>

#include <csignal>
#include <fstream>
#include <list>
#include <nlohmann/json.hpp>
#include <sstream>

#include "common/FrameRate.h"
#include "common/Timecode.h"
#include "endtoend/ReceiverFixture.h"
#include "support/FreePorts.h"
#include "support/HttpServer.h"
#include "support/LineClient.h"

namespace endtoend {
namespace {

using Json = nlohmann::json;
using ::testing::HasSubstr;
using ::testing::SizeIs;

class ControlSocketRunTest : public ReceiverFixture {
 protected:
    std::string Path() const { return (folder.Path() / "control.sock").string(); }
    /// A run of the test picture, with an IDR frame ten times a second, whose socket listens.
    void StartRun(std::vector<std::string> options = {}) {
        options.insert(options.end(), {"--control", Path(), "--json"});
        if (std::find(options.begin(), options.end(), "--input") == options.end()) {
            options.insert(options.end(), {"--input", "test:", "--size", "320x180", "--fps", "30", "--gop",
                                           "3", "--timecode", "10:00:00:00"});
        }
        run_ = Start(options);
        ASSERT_TRUE(WaitFor([this] { return Listens(); })) << run_->AllText();
    }
    bool Listens() const {
        try {
            const LineClient client(Path());
            return true;
        } catch (const std::system_error&) {
            return false;
        }
    }
    static std::string Request(const std::string& method, const Json& params = Json::object()) {
        return Json{{"jsonrpc", "2.0"}, {"id", method}, {"method", method}, {"params", params}}.dump() + "\n";
    }
    static Json Reply(LineClient& client) {
        return Json::parse(client.Line().value_or(R"({"error":"the connection is closed"})"));
    }
    static Json Ask(LineClient& client, const std::string& method, const Json& params = Json::object()) {
        client.Send(Request(method, params));
        return Reply(client);
    }
    /// Waits until a recording has a file.
    void WaitForFile() { ASSERT_TRUE(run_->WaitForText("file_opened")) << run_->AllText(); }
    Json Summary() const {
        std::istringstream lines(run_->Output());
        Json last;
        for (std::string line; std::getline(lines, line);) {
            last = Json::parse(line);
        }
        return last;
    }
    /// Ends the run, and sees that nothing was lost, and that all `recordings` hold the frames from their
    /// first address to the one behind their last.
    void ExpectWholeEnd() {
        run_->Signal(SIGTERM);
        ASSERT_EQ(run_->Wait(), 0) << run_->AllText() << Log();
        EXPECT_FALSE(std::filesystem::exists(Path()));
        const Json summary = Summary();
        EXPECT_EQ(summary["lost"], 0);
        std::vector<std::int64_t> told;
        std::istringstream lines(run_->Output());
        std::int64_t start = 0;
        for (std::string line; std::getline(lines, line);) {
            const Json event = Json::parse(line);
            if (event["event"] == "record_started") {
                start = FrameOf(event["timecode"]);
            } else if (event["event"] == "record_stopped") {
                told.push_back(FrameOf(event["timecode"]) - start);
            }
        }
        std::vector<std::int64_t> found;
        for (const Json& file : summary["files"]) {
            EXPECT_EQ(file["problem"], nullptr);
            found.push_back(file["frames"]);
        }
        EXPECT_EQ(found, told) << run_->AllText();
    }
    static std::int64_t FrameOf(const std::string& timecode) {
        return receiver::FrameNumberOf(receiver::ParseTimecode(timecode).value(), 30);
    }

    std::unique_ptr<Process> run_;
};

TEST_F(ControlSocketRunTest, StopsStartsAndSplitsARecordingAndAnswersWithFrameAndFile) {
    StartRun();
    WaitForFile();
    LineClient client(Path());
    const Json stop = Ask(client, "record.stop")["result"];
    EXPECT_THAT(stop["file"].get<std::string>(), HasSubstr("/10_00_00_00.MP4"));
    EXPECT_EQ(stop["closed"], true);
    EXPECT_TRUE(std::filesystem::exists(stop["file"]));
    EXPECT_EQ(Ask(client, "status")["result"]["state"], "idle");
    EXPECT_EQ(Ask(client, "record.stop")["error"]["message"], "no recording runs");
    EXPECT_EQ(Ask(client, "record.split")["error"]["code"], -32002);

    const Json start = Ask(client, "record.start")["result"];
    EXPECT_GE(FrameOf(start["timecode"]), FrameOf(stop["timecode"]));
    std::string name = start["timecode"];
    std::replace(name.begin(), name.end(), ':', '_');
    EXPECT_THAT(start["file"].get<std::string>(), HasSubstr(name + ".MP4"));
    EXPECT_EQ(Ask(client, "record.start")["error"]["message"], "a recording runs already");

    const Json split = Ask(client, "record.split")["result"];
    EXPECT_GT(FrameOf(split["timecode"]), FrameOf(start["timecode"]));
    EXPECT_NE(split["file"], start["file"]);
    const Json files = Ask(client, "files")["result"]["files"];
    ASSERT_THAT(files, SizeIs(3));
    EXPECT_EQ(files[0]["path"], stop["file"]);
    EXPECT_EQ(files[0]["state"], "closed");
    EXPECT_EQ(files[0]["timecode"], "10:00:00:00");
    EXPECT_DOUBLE_EQ(files[0]["seconds"], static_cast<double>(FrameOf(stop["timecode"]) - 36000 * 30) / 30);
    EXPECT_EQ(files[0]["bytes"], std::filesystem::file_size(stop["file"]));
    EXPECT_EQ(files[2]["path"], split["file"]);
    EXPECT_EQ(files[2]["state"], "open");
    ExpectWholeEnd();
}

TEST_F(ControlSocketRunTest, TellsItsStatusAndShowsThePicture) {
    StartRun();
    WaitForFile();
    LineClient client(Path());
    struct stat socket {};
    ASSERT_EQ(stat(Path().c_str(), &socket), 0);
    EXPECT_EQ(socket.st_mode & 07777, 0660u);
    ASSERT_TRUE(WaitFor([&] { return Ask(client, "status")["result"]["source"]["video_kilobits"] > 0; }));
    const Json status = Ask(client, "status")["result"];
    EXPECT_EQ(status["state"], "recording");
    EXPECT_EQ(status["source"]["width"], 320);
    EXPECT_EQ(status["losses"]["total"], 0);
    EXPECT_GT(status["disk"]["hours"], 0);
    EXPECT_THAT(status["file"]["path"].get<std::string>(), HasSubstr("/10_00_00_00.MP4"));
    EXPECT_GT(status["file"]["seconds"], 0.5);

    const Json preview = Ask(client, "preview", {{"width", 64}})["result"];
    EXPECT_EQ(preview["width"], 64);
    EXPECT_EQ(preview["height"], 36);
    // SOI, and the first bytes of the next marker (ITU-T T.81 B.1.1.3): FF D8 FF.
    EXPECT_TRUE(preview["jpeg"].get<std::string>().starts_with("/9j/"));
    ASSERT_THAT(preview["peaks_dbfs"], SizeIs(2));
    // The tone.
    EXPECT_GT(preview["peaks_dbfs"][0], -40);
    ExpectWholeEnd();
}

TEST_F(ControlSocketRunTest, SubscribersHearWhatJsonPrints) {
    StartRun();
    WaitForFile();
    LineClient one(Path());
    LineClient other(Path());
    EXPECT_EQ(Ask(one, "events")["result"], Json::object());
    EXPECT_EQ(Ask(other, "events")["result"], Json::object());
    run_->Signal(SIGUSR2);
    const auto heard = [](LineClient& client) {
        std::vector<Json> events;
        while (const auto line = client.Line()) {
            const Json message = Json::parse(*line);
            EXPECT_EQ(message["method"], "event");
            events.push_back(message["params"]);
        }
        return events;
    };
    ASSERT_TRUE(run_->WaitForText("file_closed"));
    ExpectWholeEnd();
    const std::vector<Json> events = heard(one);
    ASSERT_FALSE(events.empty());
    EXPECT_EQ(events.back()["event"], "summary");
    std::vector<std::string> changes;
    for (const Json& event : events) {
        if (event["event"] == "record_stopped" || event["event"] == "file_closed") {
            changes.push_back(event["event"]);
            EXPECT_THAT(run_->Output(), HasSubstr(event.value("timecode", event.value("path", ""))));
        }
    }
    EXPECT_THAT(changes, ::testing::ElementsAre("record_stopped", "file_closed"));
    const std::vector<Json> others = heard(other);
    ASSERT_FALSE(others.empty());
    EXPECT_EQ(others.back(), events.back());
}

TEST_F(ControlSocketRunTest, TwoWhoStartAtOnceStartOneRecording) {
    StartRun();
    WaitForFile();
    LineClient one(Path());
    LineClient other(Path());
    ASSERT_EQ(Ask(one, "record.stop")["result"]["closed"], true);
    one.Send(Request("record.start"));
    other.Send(Request("record.start"));
    const Json first = Reply(one);
    const Json second = Reply(other);
    // The one who is later may find that it runs.
    EXPECT_TRUE(first == second || first.contains("error") || second.contains("error")) << first << second;
    EXPECT_THAT(Ask(one, "files")["result"]["files"], SizeIs(2));
    ExpectWholeEnd();
}

TEST_F(ControlSocketRunTest, HostileClientsHarmNobody) {
    StartRun();
    WaitForFile();
    LineClient good(Path());
    {
        LineClient endless(Path());
        const std::string piece(1 << 20, 'x');
        for (int i = 0; i < 10 && endless.Send(piece); ++i) {
        }
        LineClient half(Path());
        half.Send(R"({"jsonrpc":"2.0","id":1,"meth)");
    }
    LineClient garbage(Path());
    std::string bytes;
    for (int i = 0; i < 4096; ++i) {
        bytes += static_cast<char>(i * 7 % 256);
    }
    garbage.Send(bytes + "\n");
    EXPECT_EQ(Reply(garbage)["error"]["code"], -32700);
    LineClient deep(Path());
    deep.Send(R"({"jsonrpc":"2.0","id":1,"method":"status","params":)" + std::string(32000, '[') +
              std::string(32000, ']') + "}\n");
    EXPECT_EQ(Reply(deep)["error"]["code"], -32602);
    LineClient sleeper(Path());
    sleeper.Send(Request("events"));
    for (int i = 0; i < 10; ++i) {
        sleeper.Send(Request("preview", {{"width", 1280 + i * 2}}));
    }
    std::list<LineClient> crowd;
    for (int i = 0; i < 200; ++i) {
        try {
            crowd.emplace_back(Path());
            crowd.back().Send("[");
        } catch (const std::system_error&) {
            // The system refuses some itself where they come too quickly.
        }
    }
    EXPECT_EQ(Ask(good, "status")["result"]["state"], "recording");
    EXPECT_EQ(Ask(good, "status")["result"]["losses"]["total"], 0);
    crowd.clear();
    EXPECT_EQ(Ask(good, "record.stop")["result"]["closed"], true);
    ExpectWholeEnd();
}

TEST_F(ControlSocketRunTest, ARunThatWaitsForItsSourceSaysSo) {
    const FreePorts ports;
    StartRun({"--input", "udp://127.0.0.1:" + std::to_string(ports.First())});
    LineClient client(Path());
    EXPECT_EQ(Ask(client, "status")["result"]["state"], "waiting_for_source");
    EXPECT_EQ(Ask(client, "record.start")["error"]["code"], -32001);
    EXPECT_EQ(Ask(client, "preview")["error"]["code"], -32003);
    run_->Signal(SIGTERM);
    EXPECT_EQ(run_->Wait(), 0) << run_->AllText();
}

TEST_F(ControlSocketRunTest, InModeOnCommandsAreRefusedWithTheReason) {
    StartRun({"--mode", "on"});
    WaitForFile();
    LineClient client(Path());
    EXPECT_EQ(Ask(client, "record.stop")["error"]["message"],
              "in mode on everything is recorded; --mode sync takes record commands");
    ExpectWholeEnd();
}

TEST_F(ControlSocketRunTest, TheSocketOfALivingRunIsRefusedAndThatOfADeadOneTakenOver) {
    StartRun();
    const Outcome refused = RunReceiver({"--control", Path()});
    // A wrong option.
    EXPECT_EQ(refused.code, 2);
    EXPECT_EQ(refused.errors, "receiver: --control " + Path() +
                                  ": another run listens there: each one needs a socket of its own.\n");
    run_->Signal(SIGKILL);
    run_->Wait();
    ASSERT_TRUE(std::filesystem::exists(Path()));
    StartRun({"--recover", "no", "--output", (folder.Path() / "recordings").string()});
    WaitForFile();
    ExpectWholeEnd();
}

TEST_F(ControlSocketRunTest, KeysOfARunThatNeverBeganAreAnsweredAtItsEnd) {
    const FreePorts ports;
    run_ = Start(
        {"--input", "udp://127.0.0.1:" + std::to_string(ports.First()), "--no-reconnect", "--timeout", "2"},
        Process::Terminal::kPseudoTerminal);
    // Some come before anybody listens to keys.
    for (int i = 0; i < 1000 && !run_->Wait(std::chrono::milliseconds(100)); ++i) {
        run_->Type("r");
    }
    EXPECT_EQ(run_->Wait(), 3);
    EXPECT_THAT(run_->AllText(), HasSubstr("no effect: the run is over"));
}

class HookRunTest : public ControlSocketRunTest {
 protected:
    /// A script that notes each event it hears of and leaves with `code`.
    std::string Script(int code) const {
        const std::filesystem::path script = folder.Path() / "hook";
        std::ofstream(script) << "#!/bin/sh\ncat >> " << Heard().string() << "\nexit " << code << "\n";
        std::filesystem::permissions(script, std::filesystem::perms::owner_all);
        return script.string();
    }
    std::filesystem::path Heard() const { return folder.Path() / "heard"; }
    std::vector<std::string> EventsHeard() const {
        std::vector<std::string> events;
        std::ifstream lines(Heard());
        for (std::string line; std::getline(lines, line);) {
            events.push_back(Json::parse(line)["event"]);
        }
        return events;
    }
};

TEST_F(HookRunTest, AProgramHearsOfTheRecordingAndOfItsFile) {
    StartRun({"--hook", Script(0)});
    WaitForFile();
    ExpectWholeEnd();
    EXPECT_THAT(EventsHeard(), ::testing::ElementsAre("record_started", "record_stopped", "file_closed"));
}

TEST_F(HookRunTest, AProgramThatFailsIsToldAndHarmsNothing) {
    StartRun({"--hook", Script(3)});
    WaitForFile();
    LineClient client(Path());
    ASSERT_TRUE(WaitFor([&] { return Ask(client, "status")["result"]["hooks"]["failed"] == 1; }));
    ExpectWholeEnd();
    EXPECT_THAT(run_->Output(), HasSubstr("was not told of file_closed: it ended with exit code 3"));
}

TEST_F(HookRunTest, AServerHearsOfTheRecordingAndOfItsFile) {
    environment["no_proxy"] = "*";
    const HttpServer server({500, 200});
    StartRun({"--hook-url", server.Url()});
    WaitForFile();
    ExpectWholeEnd();
    std::vector<std::string> events;
    for (const std::string& request : server.Requests()) {
        events.push_back(Json::parse(request.substr(request.find("\r\n\r\n")))["event"]);
    }
    // The first one twice.
    EXPECT_THAT(events,
                ::testing::ElementsAre("record_started", "record_started", "record_stopped", "file_closed"));
}

TEST_F(HookRunTest, AProgramThatHangsHoldsUpNeitherRecordingNorEnd) {
    const std::filesystem::path script = folder.Path() / "hook";
    std::ofstream(script) << "#!/bin/sh\nexec sleep 1000\n";
    std::filesystem::permissions(script, std::filesystem::perms::owner_all);
    StartRun({"--hook", script.string()});
    WaitForFile();
    ExpectWholeEnd();
    EXPECT_THAT(run_->Output(), HasSubstr("it has not taken it before the end of the run"));
}

}  // namespace
}  // namespace endtoend
