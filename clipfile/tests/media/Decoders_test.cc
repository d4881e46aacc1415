#include "media/Decoders.h"

#include <gtest/gtest.h>

#include "support/CodedMedia.h"
#include "support/ElementaryStreams.h"
#include "support/TempDir.h"
#include "support/TestStream.h"

namespace clipfile {
namespace {

using test_stream::Data;

Data BytesOf(const std::shared_ptr<nal_access::SampleData>& sample) {
    return {sample->GetData(), sample->GetData() + sample->GetDataSize()};
}

Data BytesOf(const nal_access::NalUnit& unit) {
    return {unit.data.get(), unit.data.get() + unit.size};
}

TEST(AudioFrameFinder, FindsTheEndOfEachFrameAlsoOfTheLast) {
    const test_stream::Stream stream = test_stream::MakeCodedStream(3);
    AudioFrameFinder finder;
    for (const auto& chunk : stream.chunks) {
        Data bytes;
        std::vector<std::size_t> sizes;
        for (const auto& frame : chunk->audio) {
            const Data part = BytesOf(frame);
            bytes.insert(bytes.end(), part.begin(), part.end());
            sizes.push_back(part.size());
        }
        const Data picture = BytesOf(chunk->video.front());
        bytes.insert(bytes.end(), picture.begin(), picture.end());
        std::vector<std::size_t> found = finder.Find(bytes);
        ASSERT_GE(found.size(), sizes.size());
        found.resize(sizes.size());
        EXPECT_EQ(found, sizes);
    }
}

TEST(AudioFrameFinder, FindsNothingInOtherBytes) {
    AudioFrameFinder finder;
    EXPECT_TRUE(finder.Find({}).empty());
    EXPECT_TRUE(finder.Find(Data(2000, 0xFF)).empty());
}

TEST(DecodesWith, OnlyTheSetsOfThePicture) {
    const test_stream::Stream stream = test_stream::MakeCodedStream(1);
    const ParameterSets own = {BytesOf(stream.settings.sps), BytesOf(stream.settings.pps)};
    const Data picture = BytesOf(stream.chunks.front()->video.front());
    EXPECT_TRUE(DecodesWith(own, picture, kCodedWidth, kCodedHeight));
    EXPECT_FALSE(DecodesWith(own, picture, 1920, 1080));
    const test_stream::Stream plain = test_stream::MakePlainStream(1);
    EXPECT_FALSE(DecodesWith({BytesOf(plain.settings.sps), BytesOf(plain.settings.pps)}, picture, kCodedWidth,
                             kCodedHeight));
    EXPECT_FALSE(DecodesWith(own, Bytes(picture).first(picture.size() / 2), kCodedWidth, kCodedHeight));
    EXPECT_FALSE(DecodesWith({}, picture, kCodedWidth, kCodedHeight));
}

TEST(AllowReordering, WhereTheSetsSaySo) {
    const TempDir work;
    for (const bool reordered : {false, true}) {
        const std::string file = (work.Path() / "coded.h264").string();
        const ProgramResult coded = RunProgram(
            work,
            "ffmpeg -v error -y -f lavfi -i testsrc2=size=128x96:rate=25 -frames:v 12 -pix_fmt yuv420p "
            "-c:v libx264 -preset ultrafast -x264-params aud=1:b-adapt=0:bframes=" +
                std::string(reordered ? "2" : "0") + " -f h264 '" + file + "'");
        ASSERT_EQ(coded.exitCode, 0) << coded.errors;
        auto units = elementary_streams::ReadAccessUnits(file);
        nal_access::NalUnit sps;
        nal_access::NalUnit pps;
        nal_access::StreamAnalyzer analyzer;
        ASSERT_TRUE(analyzer.IsAccessUnitStart(units.at(0), sps, pps));
        std::vector<std::shared_ptr<nal_access::SampleData>> samples;
        analyzer.ConvertVideo(units, samples);
        EXPECT_EQ(AllowReordering({BytesOf(sps), BytesOf(pps)}, BytesOf(samples.front())), reordered);
    }
    EXPECT_FALSE(AllowReordering({}, Data(20)));
}

}  // namespace
}  // namespace clipfile
