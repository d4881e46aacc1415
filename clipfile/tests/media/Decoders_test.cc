#include "media/Decoders.h"

#include <gtest/gtest.h>

#include "support/CodedMedia.h"
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

}  // namespace
}  // namespace clipfile
