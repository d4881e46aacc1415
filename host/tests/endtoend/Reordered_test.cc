// Sources that send their pictures in another order than they are shown in, recorded as they come. A decoder
// shows the recording as it shows the source: the same pictures at the same times.

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <sstream>
#include <string>
#include <vector>

#include "endtoend/ReceiverFixture.h"
#include "support/FreePorts.h"
#include "support/Judges.h"
#include "support/Material.h"
#include "support/Senders.h"

namespace endtoend {
namespace {

struct ReorderedCase {
    const char* name;
    const char* rate;       // as ffmpeg writes it
    double frames;          // a second
    const char* container;  // of a file; "udp" is live
    const char* fileType;
};

std::ostream& operator<<(std::ostream& out, const ReorderedCase& parameters) {
    return out << parameters.name;
}

/// A picture that a decoder shows.
struct Shown {
    std::int64_t time = 0;  // in ticks of the decoder
    std::string checksum;
};

std::vector<Shown> ShownOf(const std::filesystem::path& file) {
    const Outcome outcome = RunProgram({"ffmpeg", "-v", "error", "-i", file.string(), "-map", "0:v", "-vsync",
                                        "passthrough", "-f", "framemd5", "-"});
    EXPECT_EQ(outcome.errors, "");
    std::vector<Shown> shown;
    std::istringstream lines(outcome.output);
    for (std::string line; std::getline(lines, line);) {
        if (line.empty() || line.front() == '#') {
            continue;
        }
        std::istringstream fields(line);
        std::string stream, dts, pts, duration, size, checksum;
        fields >> stream >> dts >> pts >> duration >> size >> checksum;
        shown.push_back({std::stoll(pts), checksum});
    }
    return shown;
}

class ReorderedTest : public ReceiverFixture, public ::testing::WithParamInterface<ReorderedCase> {
 protected:
    static constexpr double kSeconds = 5;

    bool live() const { return std::string(GetParam().container) == "udp"; }
    std::filesystem::path makeSource() const {
        MaterialOptions material;
        material.rate = GetParam().rate;
        material.seconds = kSeconds;
        material.container = live() ? "ts" : GetParam().container;
        material.more = {"-bf", "3", "-x264-params",
                         "keyint=10:bframes=3:b-pyramid=normal:b-adapt=0:scenecut=0:open-gop=0"};
        return MakeMaterial(folder, material);
    }
    std::string record(const std::filesystem::path& source, std::vector<std::string> options) const {
        options.insert(options.end(), {"--file-type", GetParam().fileType, "--timecode", "10:00:00:00"});
        if (!live()) {
            options.insert(options.end(), {"--input", source.string(), "--speed", "8"});
            const Outcome outcome = RunReceiver(options);
            EXPECT_EQ(outcome.code, 0) << outcome.output << outcome.errors;
            return outcome.output + outcome.errors;
        }
        const std::string url = "udp://127.0.0.1:" + std::to_string(ports_.First());
        options.insert(options.end(), {"--input", url, "--no-reconnect", "--timeout", "1"});
        const auto receiver = Start(options);
        EXPECT_TRUE(WaitUntilBound(ports_.First()));
        const auto sender = SendTransportStream(source, url + "?pkt_size=1316");
        receiver->Wait();
        return receiver->AllText();
    }
    /// The recording shows `count` pictures of the source in a row, each a picture's time after the one
    /// before, and no more than `most`. Returns the number of the first.
    static std::size_t judge(const std::filesystem::path& recording, const std::vector<Shown>& source,
                             std::size_t count, std::size_t most) {
        const std::vector<Shown> shown = ShownOf(recording);
        EXPECT_GE(shown.size(), count);
        EXPECT_LE(shown.size(), most);
        std::size_t first = 0;
        while (first < source.size() && source[first].checksum != shown.front().checksum) {
            ++first;
        }
        for (std::size_t i = 0; i < count && i < shown.size(); ++i) {
            if (first + i >= source.size() || shown[i].checksum != source[first + i].checksum) {
                ADD_FAILURE() << "picture " << i << " is another one";
                break;
            }
            EXPECT_EQ(shown[i].time, static_cast<std::int64_t>(i) * (shown[1].time - shown[0].time));
        }
        return first;
    }

 private:
    const FreePorts ports_;
};

TEST_P(ReorderedTest, ARecordingShowsTheSourcesPicturesInTheirOrder) {
    const auto source = makeSource();
    const std::string told = record(source, {});
    const auto shown = ShownOf(source);
    ASSERT_THAT(Recordings(), ::testing::SizeIs(1)) << told;
    EXPECT_THAT(told, ::testing::Not(::testing::HasSubstr("converted")));
    const std::filesystem::path recording = Recordings()[0];
    if (live()) {
        // At the end of a live stream what the last pictures wait for may be missing.
        const std::size_t pictures = ShownOf(recording).size();
        EXPECT_GE(pictures + 10, shown.size());
        judge(recording, shown, pictures - 3, pictures);
    } else {
        EXPECT_EQ(judge(recording, shown, shown.size(), shown.size()), 0u);
    }
    EXPECT_EQ(recording.filename(), "10_00_00_00.MP4");
}

/// When a live stream begins, nobody can command.
class ReorderedFileTest : public ReorderedTest {};

TEST_P(ReorderedFileTest, ARecordEndsWithThePictureThatWasCommanded) {
    const auto source = makeSource();
    const auto shown = ShownOf(source);
    // From the IDR frame at 20 to picture 52, in the middle of what P54 is needed for.
    const std::string range =
        std::to_string(19.5 / GetParam().frames) + "-" + std::to_string(52.9 / GetParam().frames);
    record(source, {"--record", range});
    ASSERT_THAT(Recordings(), ::testing::SizeIs(1));
    // FFmpeg shows what lies behind the end of the edit of a fragmented file.
    const std::size_t hidden = std::string(GetParam().fileType) == "fragment" ? 4 : 0;
    EXPECT_EQ(judge(Recordings()[0], shown, 33, 33 + hidden), 20u);
}

constexpr ReorderedCase kFiles[] = {{"Ts25Normal", "25", 25, "ts", "normal"},
                                    {"Ts25Fragment", "25", 25, "ts", "fragment"},
                                    {"Mp429Normal", "30000/1001", 30 / 1.001, "mp4", "normal"},
                                    {"Mp450Fragment", "50", 50, "mp4", "fragment"},
                                    {"Mov59Normal", "60000/1001", 60 / 1.001, "mov", "normal"},
                                    {"Ts59Fragment", "60000/1001", 60 / 1.001, "ts", "fragment"}};
constexpr ReorderedCase kLive[] = {{"Udp25Normal", "25", 25, "udp", "normal"},
                                   {"Udp59Fragment", "60000/1001", 60 / 1.001, "udp", "fragment"}};

INSTANTIATE_TEST_SUITE_P(Files, ReorderedTest, ::testing::ValuesIn(kFiles),
                         ::testing::PrintToStringParamName());
INSTANTIATE_TEST_SUITE_P(Live, ReorderedTest, ::testing::ValuesIn(kLive),
                         ::testing::PrintToStringParamName());
INSTANTIATE_TEST_SUITE_P(Files, ReorderedFileTest, ::testing::ValuesIn(kFiles),
                         ::testing::PrintToStringParamName());

}  // namespace
}  // namespace endtoend
