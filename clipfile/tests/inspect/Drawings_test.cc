// What `inspect` draws, judged by ffmpeg and by numbers in the document.

#include <gtest/gtest.h>

#include <sstream>

#include "common/ToolError.h"
#include "inspect/Plot.h"
#include "inspect/Thumbnails.h"
#include "support/CodedMedia.h"
#include "support/TempDir.h"
#include "support/TestStream.h"

namespace clipfile {
namespace {

using clipfileModule::RecordRules;

class DrawingsTest : public testing::TestWithParam<const char*> {
 protected:
    void record(const test_stream::Stream& stream, bool close = true) const {
        test_stream::Record(path(), {GetParam(), RecordRules::kExact, close}, stream);
    }
    std::filesystem::path path() const { return folder_.Path() / "a<&>.MP4"; }
    std::string plot() const {
        const InputFile file(path());
        std::ostringstream out;
        PrintPlot(out, file, Inspect(file));
        return out.str();
    }
    std::vector<unsigned char> thumbnails() const {
        const InputFile file(path());
        return MakeThumbnails(file, Inspect(file));
    }
    /// The text of a failure.
    template <typename Work>
    static std::string failure(Work work) {
        try {
            work();
        } catch (const ToolError& error) {
            return error.what();
        }
        return "";
    }
    /// What ffprobe says of a picture.
    std::string probe(const std::vector<unsigned char>& png) const {
        test_stream::WriteAll(folder_.Path() / "sheet.png", png);
        return RunProgram(folder_,
                          "ffprobe -v error -show_entries stream=codec_name,width,height -of csv=p=0 '" +
                              (folder_.Path() / "sheet.png").string() + "'")
            .output;
    }
    /// Mean brightness of a place of the sheet, as ffmpeg finds it.
    int brightness(int x, int y) const {
        const std::string pixel =
            RunProgram(folder_, "ffmpeg -v error -i '" + (folder_.Path() / "sheet.png").string() +
                                    "' -vf crop=240:134:" + std::to_string(x) + ":" + std::to_string(y) +
                                    ",scale=1:1:flags=area,format=gray -f rawvideo -")
                .output;
        return pixel.size() == 1 ? static_cast<unsigned char>(pixel[0]) : -1;
    }

    TempDir folder_;
};

INSTANTIATE_TEST_SUITE_P(Kinds, DrawingsTest, testing::Values("normal", "fragment"),
                         [](const auto& instance) { return std::string(instance.param); });

TEST_P(DrawingsTest, APlotHasACurveForEachQuestion) {
    // An IDR picture each 16, chunks of 8 pictures: 267 ms.
    record(test_stream::MakePlainStream(40));
    const std::string svg = plot();
    std::size_t lines = 0;
    for (std::size_t at = 0; (at = svg.find("<polyline", at)) != std::string::npos; ++at) {
        ++lines;
    }
    EXPECT_EQ(lines, 5U);
    EXPECT_NE(svg.find("a&lt;&amp;&gt;.MP4"), std::string::npos);
    EXPECT_NE(svg.find(">16</text>"), std::string::npos) << "pictures in a group";
    EXPECT_NE(svg.find(">10.7 s</text>"), std::string::npos) << "320 pictures";
    EXPECT_TRUE(svg.ends_with("</svg>\n"));
}

TEST_P(DrawingsTest, APlotOfALongRecordingStaysSmall) {
    record(test_stream::MakePlainStream(1000));
    EXPECT_LT(plot().size(), 100'000U);
}

TEST_P(DrawingsTest, ThumbnailsAreTheIdrPicturesOfAShortRecording) {
    // 64 pictures, an IDR picture each 16, 320 x 180.
    record(test_stream::MakeCodedStream(8));
    EXPECT_EQ(probe(thumbnails()), "png,960,134\n");
    // None of them is black.
    for (const int x : {0, 240, 480, 720}) {
        EXPECT_GT(brightness(x, 0), 30) << x;
    }
}

TEST_P(DrawingsTest, ThumbnailsOfALongRecordingAreTwentyFour) {
    record(test_stream::MakeCodedStream(80));
    EXPECT_EQ(probe(thumbnails()), "png,1440,536\n");
    EXPECT_GT(brightness(1200, 402), 30) << "the last one";
}

TEST_P(DrawingsTest, AFileOfWhichNothingDecodesIsToldInASentence) {
    record(test_stream::MakePlainStream(33));
    EXPECT_EQ(failure([&] { thumbnails(); }),
              path().string() + " gives no thumbnails: none of its IDR pictures decodes.");
}

TEST_P(DrawingsTest, AFileWithoutAnIndexIsToldInASentence) {
    record(test_stream::MakePlainStream(1), false);
    EXPECT_EQ(failure([&] { plot(); }),
              path().string() + " gives no plot: it has no index yet, which 'recover' makes.");
    EXPECT_EQ(failure([&] { thumbnails(); }),
              path().string() + " gives no thumbnails: it has no index yet, which 'recover' makes.");
}

}  // namespace
}  // namespace clipfile
