// Record commands in quick succession: each takes effect, in its order, and the files hold the frames between
// them.

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <csignal>
#include <nlohmann/json.hpp>
#include <sstream>

#include "endtoend/ReceiverFixture.h"
#include "endtoend/RecordingCheck.h"
#include "support/Material.h"

namespace endtoend {
namespace {

using ::testing::SizeIs;

struct Case {
    const char* name;
    const char* rate;
    const char* exactRate;
    std::size_t pictureGroup;
    bool fragmented;
};

std::ostream& operator<<(std::ostream& out, const Case& parameters) {
    return out << parameters.name;
}

class QuickCommandsTest : public ReceiverFixture, public ::testing::WithParamInterface<Case> {
 protected:
    QuickCommandsTest() {
        MaterialOptions options;
        options.rate = GetParam().exactRate;
        options.pictureGroup = static_cast<int>(GetParam().pictureGroup);
        options.seconds = 5;
        sent_.emplace(MakeMaterial(folder, options));
        expected_.rate = *receiver::ParseFrameRate(GetParam().rate);
        expected_.fragmented = GetParam().fragmented;
        expected_.timecode = *receiver::ParseTimecode("10:00:00:00");
        expected_.timecode.dropFrame = expected_.rate.dropFrame;
        receiver_ = Start({"--input", sent_->file.string(), "--timecode", "10:00:00:00", "--json",
                           "--file-type", GetParam().fragmented ? "fragment" : "normal"});
        WaitForEvents("record_started", 1);
    }

    /// Numbers of the frames at which that happened so far.
    std::vector<std::size_t> FramesOf(const std::string& event) const {
        std::vector<std::size_t> frames;
        std::istringstream lines(receiver_->Output());
        for (std::string line; std::getline(lines, line) && !lines.eof();) {
            const auto object = nlohmann::json::parse(line);
            if (object["event"] == event) {
                const auto timecode = receiver::ParseTimecode(object["timecode"].get<std::string>());
                frames.push_back(
                    static_cast<std::size_t>(NumberOf(*timecode) - NumberOf(expected_.timecode)));
            }
        }
        return frames;
    }
    void WaitForEvents(const std::string& event, std::size_t count) const {
        EXPECT_TRUE(WaitFor([&] { return FramesOf(event).size() >= count; })) << receiver_->AllText();
    }
    std::int64_t NumberOf(const receiver::Timecode& timecode) const {
        return receiver::FrameNumberOf(timecode, expected_.rate.timecodeFrames);
    }
    std::size_t IdrFrameAtOrAfter(std::size_t frame) const {
        const std::size_t group = GetParam().pictureGroup;
        return (frame + group - 1) / group * group;
    }
    /// Waits for the end of the source, and sees that there is a file for each recording that was told of,
    /// with the frames from its start to its stop.
    void ExpectFilesAsTold() {
        ASSERT_EQ(receiver_->Wait(), 0) << receiver_->AllText() << Log();
        starts_ = FramesOf("record_started");
        stops_ = FramesOf("record_stopped");
        const auto recordings = Recordings();
        ASSERT_EQ(starts_.size(), stops_.size());
        ASSERT_THAT(recordings, SizeIs(starts_.size())) << receiver_->AllText();
        for (std::size_t i = 0; i < recordings.size(); ++i) {
            const Range range = CheckRecording(recordings[i], *sent_, expected_);
            EXPECT_EQ(range.first, starts_[i]);
            EXPECT_EQ(range.first + range.count, stops_[i]);
        }
        EXPECT_EQ(stops_.back(), sent_->media.video.size());
    }

    std::optional<Sent> sent_;
    Expected expected_;
    std::unique_ptr<Process> receiver_;
    std::vector<std::size_t> starts_;
    std::vector<std::size_t> stops_;
};

TEST_P(QuickCommandsTest, AStopAndAStartDirectlyBehindItGiveTwoFiles) {
    receiver_->Signal(SIGUSR2);
    receiver_->Signal(SIGUSR1);
    ExpectFilesAsTold();
    ASSERT_THAT(starts_, SizeIs(2));
    EXPECT_EQ(starts_[1], IdrFrameAtOrAfter(stops_[0]));
}

TEST_P(QuickCommandsTest, ASplitGivesTwoFilesWithEveryFrame) {
    receiver_->Signal(SIGRTMIN);
    ExpectFilesAsTold();
    ASSERT_THAT(starts_, SizeIs(2));
    EXPECT_EQ(starts_[1], stops_[0]);
    EXPECT_EQ(starts_[1] % GetParam().pictureGroup, 0U);
}

TEST_P(QuickCommandsTest, SeveralInARowWithASplitInTheMiddle) {
    receiver_->Signal(SIGUSR2);
    WaitForEvents("record_stopped", 1);
    receiver_->Signal(SIGUSR1);
    WaitForEvents("record_started", 2);
    receiver_->Signal(SIGRTMIN);
    WaitForEvents("record_started", 3);
    receiver_->Signal(SIGUSR2);
    receiver_->Signal(SIGUSR1);
    ExpectFilesAsTold();
    ASSERT_THAT(starts_, SizeIs(4));
    EXPECT_EQ(starts_[2], stops_[1]);
    EXPECT_EQ(starts_[3], IdrFrameAtOrAfter(stops_[2]));
}

INSTANTIATE_TEST_SUITE_P(Rates, QuickCommandsTest,
                         ::testing::Values(Case{"Normal25", "25", "25", 10, false},
                                           Case{"Normal2997", "29.97", "30000/1001", 12, false},
                                           Case{"Fragment50", "50", "50", 25, true}),
                         ::testing::PrintToStringParamName());

}  // namespace
}  // namespace endtoend
