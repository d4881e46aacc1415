#include <chrono>
#include <filesystem>
#include <thread>

#include "SentMedia.h"
#include "SourceTesting.h"
#include "support/FreePorts.h"
#include "support/Process.h"
#include "support/Senders.h"

namespace receiver {
namespace {

using std::string;

/// Whether the playlist is pulled from a web server, or read from a folder.
class HlsSource : public SourceTest, public testing::WithParamInterface<bool> {
 protected:
    void SetUp() override {
        // Noise, so that no two audio frames are alike.
        Ffmpeg(
            "-f lavfi -i testsrc2=size=128x96:rate=25:duration=5 -f lavfi -i "
            "anoisesrc=sample_rate=48000:seed=7:duration=5" +
            string(kPlainH264) + "-g 25" + kPlainAac + "a.ts");
        if (GetParam()) {
            server_ = endtoend::ServeFolder(Path(""), ports_.First());
        }
    }
    SourceOptions Options(const string& playlist) const {
        return Fast(GetParam() ? "http://127.0.0.1:" + std::to_string(ports_.First()) + "/" + playlist
                               : playlist);
    }
    /// ffmpeg, writing a playlist of the last four segments of a second each while it plays `a.ts`.
    void Play() { player_ = endtoend::WriteHls(Path("a.ts"), Path("")); }
    void WaitForPlaylist() const {
        const auto deadline = std::chrono::steady_clock::now() + endtoend::kPatience;
        while (!std::filesystem::exists(Path("live.m3u8")) && std::chrono::steady_clock::now() < deadline) {
            std::this_thread::sleep_for(std::chrono::milliseconds(5));
        }
    }

    endtoend::FreePorts ports_;
    std::unique_ptr<endtoend::Process> server_;
    std::unique_ptr<endtoend::Process> player_;
};

TEST_P(HlsSource, ACompletePlaylistIsReadFromItsBeginningToItsEnd) {
    Ffmpeg("-i a.ts -c copy -f hls -hls_time 1 -hls_playlist_type vod vod.m3u8");
    const auto source = OpenSource(Options("vod.m3u8"), notices_, nullptr);
    const auto units = ReadAll(*source);
    const SentMedia sent(Path("a.ts"));
    ExpectInStep(sent, units, 0);
    EXPECT_EQ(Of(Medium::kVideo, units).size(), sent.Pictures());
    EXPECT_EQ(source->Counts().lostFrames, 0u);
    EXPECT_EQ(notices_.sentences, std::vector<string>());
}

TEST_P(HlsSource, APlaylistThatGrowsIsALiveSource) {
    Play();
    WaitForPlaylist();
    SourceOptions options = Options("live.m3u8");
    options.reconnect = false;
    // Shorter than a segment.
    options.timeout = 0.5;
    const auto source = OpenSource(options, notices_, nullptr);
    const auto units = ReadAll(*source);
    const SentMedia sent(Path("a.ts"));
    const auto pictures = sent.Find(Medium::kVideo, units);
    ASSERT_FALSE(pictures.empty());
    // It may be joined behind a segment or two; the rest comes, to the end.
    EXPECT_EQ(pictures.front().number % 25, 0u);
    ExpectInStep(sent, units, pictures.front().number);
    EXPECT_EQ(pictures.back().number, sent.Pictures() - 1);
    EXPECT_TRUE(Of(Medium::kVideo, units).front().arrived);
    EXPECT_EQ(source->Counts().lostFrames, 0u);
    EXPECT_EQ(notices_.sentences, std::vector<string>());
}

INSTANTIATE_TEST_SUITE_P(FromAFolderAndByHttp, HlsSource, testing::Bool());

}  // namespace
}  // namespace receiver
