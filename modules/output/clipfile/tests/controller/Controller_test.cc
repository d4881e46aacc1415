#include "controller/Controller.h"

#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "LogCapture.h"
#include "common/Log.h"
#include "support/ControllerPeer.h"
#include "support/FakeHost.h"
#include "support/FakeRegistry.h"
#include "support/Sanitized.h"
#include "support/ThreadCount.h"
#include "support/WaitUntil.h"

namespace clipfileModule {
namespace {

/// Sanitizers see in the first thousand what there is to see.
constexpr int kLivesInARow = kSanitized ? 1000 : 10000;

const std::string kFolder = "modules/output/clipfile/src/clipfileModule/controller/";

/// A controller that has not been initialised, its host and its settings store.
class ControllerTest : public testing::Test {
 protected:
    void SetUp() override {
        // The log has a thread of its own from its first written line on.
        CLIPFILE_LOG_PLAIN(LOG_PRIORITY_OPERATOR, "OP: test");
    }
    void TearDown() override {
        if (running_) {
            controller_.Uninitialize();
        }
    }
    bool Initialize() {
        running_ = controller_.Initialize(&host_);
        return running_;
    }
    void Uninitialize() {
        controller_.Uninitialize();
        running_ = false;
    }
    /// Texts of the lines that `function` logged, in order, each checked for priority and source.
    std::vector<std::string> TextsOf(const std::string& function, const std::string& file = "Controller.cc") {
        std::vector<std::string> texts;
        for (const CapturedLine& line : log_.Lines()) {
            if (line.function == "clipfileModule::Controller::" + function) {
                EXPECT_EQ(line.priority, line.text == "get max file size failed." ? LOG_PRIORITY_WARNING
                                                                                  : LOG_PRIORITY_TRACE)
                    << line;
                EXPECT_EQ(line.file, kFolder + file) << line;
                EXPECT_GT(line.line, 0) << line;
                texts.push_back(line.text);
            }
        }
        return texts;
    }

    LogCapture log_;
    FakeRegistry registry_;
    FakeHost host_;
    Controller controller_;
    ControllerPeer peer_{controller_};

 private:
    bool running_ = false;
};

TEST_F(ControllerTest, WithoutAnyOutputPathInitializeFailsWithStatus7Cause2AndNoThread) {
    const std::size_t threads = threadCount();
    EXPECT_FALSE(Initialize());
    EXPECT_EQ(host_.Statuses(), (std::vector<FakeHost::Status>{{7, 2}}));
    EXPECT_EQ(host_.GetStatus(), 7);
    EXPECT_EQ(threadCount(), threads);
    const auto line = log_.Find("end. file output path is none.");
    ASSERT_TRUE(line);
    EXPECT_EQ(line->priority, LOG_PRIORITY_ERROR);
    EXPECT_EQ(line->file, kFolder + "Controller.cc");
    EXPECT_EQ(line->function, "clipfileModule::Controller::Initialize");
}

TEST_F(ControllerTest, AFailedInitializeDoesNotSetStatus7Again) {
    host_.ForceStatus(7);
    EXPECT_FALSE(Initialize());
    EXPECT_TRUE(host_.Statuses().empty());
}

TEST_F(ControllerTest, AnEmptyOutputPathParameterFailsAlthoughTheStoreHasAPath) {
    registry_.Set("MP4OutputPath", "D:\\clips");
    host_.texts["-outputPath"] = "";
    EXPECT_FALSE(Initialize());
    EXPECT_EQ(host_.Statuses(), (std::vector<FakeHost::Status>{{7, 2}}));
}

TEST_F(ControllerTest, ForwardSlashesOfTheOutputPathParameterBecomeBackslashes) {
    registry_.Set("MP4OutputPath", "D:/elsewhere");
    host_.texts["-outputPath"] = "/mnt/clips/a";
    ASSERT_TRUE(Initialize());
    EXPECT_EQ(peer_.Settings().outputPath, "\\mnt\\clips\\a");
    EXPECT_TRUE(log_.Contains(LOG_PRIORITY_TRACE, "clipfileModule::Controller::Initialize",
                              "file output path = \\mnt\\clips\\a."));
}

TEST_F(ControllerTest, ForwardSlashesOfTheStoredOutputPathStay) {
    registry_.Set("MP4OutputPath", "/mnt/clips/a");
    ASSERT_TRUE(Initialize());
    EXPECT_EQ(peer_.Settings().outputPath, "/mnt/clips/a");
}

TEST_F(ControllerTest, WithoutAMaximalFileSizeItIs120AndInitializeGoesOn) {
    registry_.Set("MP4OutputPath", "a");
    ASSERT_TRUE(Initialize());
    EXPECT_EQ(peer_.Settings().maxFileSize, 120U);
    EXPECT_EQ(
        TextsOf("getStaticConfig"),
        (std::vector<std::string>{"get max file size failed.", "max filesize = 120.", "end. result = 1."}));
}

TEST_F(ControllerTest, TheStoredMaximalFileSizeIsTaken) {
    registry_.Set("MP4OutputPath", "a");
    registry_.Set("MP4MaxFileSize", 4294967295U);
    ASSERT_TRUE(Initialize());
    EXPECT_EQ(peer_.Settings().maxFileSize, 4294967295U);
    EXPECT_EQ(TextsOf("getStaticConfig"),
              (std::vector<std::string>{"max filesize = 4294967295.", "end. result = 1."}));
}

TEST_F(ControllerTest, TheStoreIsAskedForTextsInKeyOrderAndThenForTheNumber) {
    registry_.Set("MP4OutputPath", "a");
    ASSERT_TRUE(Initialize());
    EXPECT_EQ(registry_.AskedKeys(), (std::vector<std::string>{
                                         "Qx/Other/MP4FileOut/MP4AuthPassword",
                                         "Qx/Other/MP4FileOut/MP4AuthUserName",
                                         "Qx/Other/MP4FileOut/MP4OutputPath",
                                         "Qx/Other/MP4FileOut/MP4MaxFileSize",
                                     }));
}

TEST_F(ControllerTest, StartParametersHaveTheirDefaults) {
    registry_.Set("MP4OutputPath", "a");
    registry_.Set("MP4AuthUserName", "stored user");
    registry_.Set("MP4AuthPassword", "stored password");
    ASSERT_TRUE(Initialize());
    const OutputSettings settings = peer_.Settings();
    EXPECT_EQ(settings.filePrefix, "Unknown-Model");
    EXPECT_EQ(settings.userName, "stored user");
    EXPECT_EQ(settings.password, "stored password");
    EXPECT_EQ(settings.fileType, "normal");
    EXPECT_EQ(settings.naluType, "normal");
    EXPECT_EQ(settings.outputMode, "on");
    EXPECT_EQ(settings.height, 720U);
    EXPECT_EQ(settings.width, 1280U);
    EXPECT_EQ(settings.framerate, 29970U);
    EXPECT_EQ(settings.bitrate, 60000U);
    EXPECT_EQ(settings.streamStart, 0U);
    EXPECT_EQ(settings.sps.size, 0U);
    EXPECT_EQ(settings.pps.size, 0U);
}

TEST_F(ControllerTest, StartParametersOverrideTheStore) {
    registry_.Set("MP4OutputPath", "a");
    registry_.Set("MP4AuthUserName", "stored user");
    registry_.Set("MP4AuthPassword", "stored password");
    host_.texts = {{"-filePrefix", "CAM1"}, {"-outputPath", "b"},      {"-userName", "user"},
                   {"-password", "secret"}, {"-fileType", "fragment"}, {"-naluType", "direct"},
                   {"-outputMode", "sync"}};
    host_.numbers = {
        {"-encodedHeight", 1080}, {"-encodedWidth", 1920}, {"-encodedFPS", 25000}, {"-encodedBPS", 8000}};
    ASSERT_TRUE(Initialize());
    const OutputSettings settings = peer_.Settings();
    EXPECT_EQ(settings.filePrefix, "CAM1");
    EXPECT_EQ(settings.outputPath, "b");
    EXPECT_EQ(settings.userName, "user");
    EXPECT_EQ(settings.password, "secret");
    EXPECT_EQ(settings.fileType, "fragment");
    EXPECT_EQ(settings.naluType, "direct");
    EXPECT_EQ(settings.outputMode, "sync");
    EXPECT_EQ(settings.height, 1080U);
    EXPECT_EQ(settings.width, 1920U);
    EXPECT_EQ(settings.framerate, 25000U);
    EXPECT_EQ(settings.bitrate, 8000U);
}

TEST_F(ControllerTest, TextsEndAtTheirFirstZeroByte) {
    registry_.Set("MP4OutputPath", std::string("stored\0path", 11));
    registry_.Set("MP4AuthUserName", std::string("user\0\0", 6));
    host_.texts = {{"-filePrefix", std::string("CAM1\0\0\0\0", 8)},
                   {"-outputPath", std::string("none\0padding", 12)},
                   {"-password", std::string("\0secret", 7)},
                   {"-outputMode", std::string("sync\0", 5)}};
    ASSERT_TRUE(Initialize());
    const OutputSettings settings = peer_.Settings();
    EXPECT_EQ(settings.filePrefix, "CAM1");
    EXPECT_EQ(settings.outputPath, "stored");
    EXPECT_EQ(settings.userName, "user");
    EXPECT_EQ(settings.password, "");
    EXPECT_EQ(settings.outputMode, "sync");
}

TEST_F(ControllerTest, AnOutputPathOfAZeroByteIsNone) {
    host_.texts["-outputPath"] = std::string("\0/mnt", 5);
    EXPECT_FALSE(Initialize());
    EXPECT_TRUE(log_.Find("end. file output path is none."));
}

TEST_F(ControllerTest, StartParametersAreAskedForInTheirOrder) {
    registry_.Set("MP4OutputPath", "a");
    ASSERT_TRUE(Initialize());
    EXPECT_EQ(host_.AskedParameters(),
              (std::vector<std::string>{"-filePrefix", "-outputPath", "-userName", "-password", "-fileType",
                                        "-naluType", "-outputMode", "-encodedHeight", "-encodedWidth",
                                        "-encodedFPS", "-encodedBPS", "-recordRules", "-pictureOrder"}));
}

TEST_F(ControllerTest, RecordRulesAreKeptUnlessExactAreAskedFor) {
    registry_.Set("MP4OutputPath", "a");
    ASSERT_TRUE(Initialize());
    EXPECT_EQ(peer_.Settings().recordRules, RecordRules::kKept);
    Uninitialize();
    host_.texts["-recordRules"] = "exact";
    ASSERT_TRUE(Initialize());
    EXPECT_EQ(peer_.Settings().recordRules, RecordRules::kExact);
    EXPECT_TRUE(
        log_.Contains(LOG_PRIORITY_TRACE, "clipfileModule::Controller::Initialize", "recordRules = exact."));
    Uninitialize();
    host_.texts["-recordRules"] = "kept";
    ASSERT_TRUE(Initialize());
    EXPECT_EQ(peer_.Settings().recordRules, RecordRules::kKept);
    EXPECT_FALSE(log_.Find("unknown record rules \"kept\", \"kept\" is used."));
}

TEST_F(ControllerTest, UnknownRecordRulesAreSaidAndCountAsKept) {
    registry_.Set("MP4OutputPath", "a");
    host_.texts["-recordRules"] = "Exact";
    ASSERT_TRUE(Initialize());
    EXPECT_EQ(peer_.Settings().recordRules, RecordRules::kKept);
    const auto line = log_.Find("unknown record rules \"Exact\", \"kept\" is used.");
    ASSERT_TRUE(line);
    EXPECT_EQ(line->priority, LOG_PRIORITY_WARNING);
}

TEST_F(ControllerTest, PicturesComeInTheOrderOfShowingUnlessThatOfDecodingIsAnnounced) {
    registry_.Set("MP4OutputPath", "a");
    ASSERT_TRUE(Initialize());
    EXPECT_EQ(peer_.Settings().pictureOrder, PictureOrder::kPresentation);
    Uninitialize();
    host_.texts["-pictureOrder"] = "decoding";
    ASSERT_TRUE(Initialize());
    EXPECT_EQ(peer_.Settings().pictureOrder, PictureOrder::kDecoding);
    EXPECT_TRUE(log_.Contains(LOG_PRIORITY_TRACE, "clipfileModule::Controller::Initialize",
                              "pictureOrder = decoding."));
    Uninitialize();
    host_.texts["-pictureOrder"] = "presentation";
    ASSERT_TRUE(Initialize());
    EXPECT_EQ(peer_.Settings().pictureOrder, PictureOrder::kPresentation);
    EXPECT_FALSE(log_.Find("unknown picture order \"presentation\", \"presentation\" is used."));
}

TEST_F(ControllerTest, AHostThatAnswersNothingForThePictureOrderHasNone) {
    registry_.Set("MP4OutputPath", "a");
    host_.texts["-pictureOrder"] = "";
    ASSERT_TRUE(Initialize());
    EXPECT_EQ(peer_.Settings().pictureOrder, PictureOrder::kPresentation);
    EXPECT_FALSE(log_.Find("unknown picture order \"\", \"presentation\" is used."));
}

TEST_F(ControllerTest, AnUnknownPictureOrderIsSaidAndCountsAsThatOfShowing) {
    registry_.Set("MP4OutputPath", "a");
    host_.texts["-pictureOrder"] = "Decoding";
    ASSERT_TRUE(Initialize());
    EXPECT_EQ(peer_.Settings().pictureOrder, PictureOrder::kPresentation);
    const auto line = log_.Find("unknown picture order \"Decoding\", \"presentation\" is used.");
    ASSERT_TRUE(line);
    EXPECT_EQ(line->priority, LOG_PRIORITY_WARNING);
}

TEST_F(ControllerTest, InitializeLogsItsWay) {
    registry_.Set("MP4OutputPath", "a");
    ASSERT_TRUE(Initialize());
    EXPECT_EQ(TextsOf("Initialize"),
              (std::vector<std::string>{"start.", "file output path = a.", "fileType   = normal.",
                                        "naluType   = normal.", "outputMode = on.", "count = 0.",
                                        "count = 1.", "count = 2.", "end."}));
}

TEST_F(ControllerTest, InitializeStartsFourThreadsAndUninitializeEndsThem) {
    registry_.Set("MP4OutputPath", "a");
    const std::size_t threads = threadCount();
    ASSERT_TRUE(Initialize());
    EXPECT_EQ(threadCount(), threads + 4);
    EXPECT_EQ(peer_.QueueCount(), 3U);
    Uninitialize();
    // The system may still show a thread for a moment after it was joined.
    EXPECT_TRUE(waitUntil([&] { return threadCount() == threads; }));
    EXPECT_EQ(peer_.QueueCount(), 0U);
}

TEST_F(ControllerTest, QueueThreadsComeUpOneAfterTheOther) {
    registry_.Set("MP4OutputPath", "a");
    ASSERT_TRUE(Initialize());
    std::vector<std::string> lines;
    for (const CapturedLine& line : log_.Lines()) {
        if (line.function == "clipfileModule::Controller::queueing" || line.text.rfind("count", 0) == 0) {
            lines.push_back(line.text);
        }
    }
    EXPECT_EQ(lines, (std::vector<std::string>{"start.", "count = 0.", "start.", "count = 1.", "start.",
                                               "count = 2."}));
}

TEST_F(ControllerTest, UninitializeLogsItsWay) {
    registry_.Set("MP4OutputPath", "a");
    ASSERT_TRUE(Initialize());
    Uninitialize();
    EXPECT_EQ(TextsOf("Uninitialize"),
              (std::vector<std::string>{"start.", "start join...", "end join", "end."}));
    EXPECT_EQ(TextsOf("queueing", "ControllerStream.cc"),
              (std::vector<std::string>{"start.", "start.", "start.", "end.", "end.", "end."}));
}

TEST_F(ControllerTest, WithStatus7SetStatusDoesNotReachTheHost) {
    registry_.Set("MP4OutputPath", "a");
    ASSERT_TRUE(Initialize());
    controller_.SetStatus(6, 22);
    host_.ForceStatus(7);
    controller_.SetStatus(6, 23);
    controller_.SetStatus(7, 26);
    EXPECT_EQ(host_.Statuses(), (std::vector<FakeHost::Status>{{6, 22}}));
}

TEST_F(ControllerTest, RunsAgainAfterUninitialize) {
    registry_.Set("MP4OutputPath", "a");
    for (int round = 0; round < 3; ++round) {
        ASSERT_TRUE(Initialize());
        const std::size_t before = host_.Transmissions().size();
        // A status that is posted before the event thread waits stays for the next post.
        EXPECT_TRUE(waitUntil([&] {
            controller_.Execute();
            return host_.Transmissions().size() > before;
        }));
        Uninitialize();
        EXPECT_EQ(peer_.WaitingEvents(), 0U);
    }
}

TEST_F(ControllerTest, InitializeFollowedAtOnceByUninitializeEndsThousandsOfTimes) {
    registry_.Set("MP4OutputPath", "a");
    for (int round = 0; round < kLivesInARow; ++round) {
        ASSERT_TRUE(Initialize());
        Uninitialize();
        log_.Clear();
    }
}

}  // namespace
}  // namespace clipfileModule
