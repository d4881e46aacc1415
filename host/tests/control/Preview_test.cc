#include "control/Preview.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "fakes/FakeSource.h"

namespace receiver {
namespace {

using ::testing::IsEmpty;
using ::testing::SizeIs;

TEST(PreviewTest, KeepsTheNewestIdrPicture) {
    Preview preview;
    EXPECT_EQ(preview.Take().picture, nullptr);
    const SourceUnit first = MakeFrame(0, true, 0);
    const SourceUnit second = MakeFrame(3600 * 25, true, 25);
    preview.LookAt(first);
    preview.LookAt(MakeFrame(3600, false, 1));
    EXPECT_EQ(preview.Take().picture, first.data);
    EXPECT_EQ(preview.Take().number, 1u);
    preview.LookAt(second);
    EXPECT_EQ(preview.Take().picture, second.data);
    EXPECT_EQ(preview.Take().pictureSize, second.size);
    EXPECT_EQ(preview.Take().number, 2u);
}

TEST(PreviewTest, KeepsASecondOfAudioAndAFrameBeforeIt) {
    Preview preview;
    EXPECT_THAT(preview.Take().audio, IsEmpty());
    SourceUnit last;
    for (std::int64_t number = 0; number < 100; ++number) {
        last = MakeAudio(number * 1024);
        preview.LookAt(last);
    }
    // 48000 samples are 46.9 frames.
    ASSERT_THAT(preview.Take().audio, SizeIs(48));
    EXPECT_EQ(preview.Take().audio.back().data, last.data);
}

}  // namespace
}  // namespace receiver
