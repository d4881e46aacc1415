#include "mp4/Mp4MuxerFactory.h"

#include <gtest/gtest.h>

#include <string>

#include "mp4/Mp4FragmentMuxer.h"
#include "mp4/Mp4NormalMuxer.h"

namespace clipfileModule {
namespace {

TEST(Mp4MuxerFactory, NormalMakesANormalMuxer) {
    std::shared_ptr<Mp4Muxer> muxer;
    EXPECT_TRUE(Mp4MuxerFactory().Create("normal", muxer));
    EXPECT_NE(dynamic_cast<Mp4NormalMuxer*>(muxer.get()), nullptr);
}

TEST(Mp4MuxerFactory, FragmentMakesAFragmentMuxer) {
    std::shared_ptr<Mp4Muxer> muxer;
    EXPECT_TRUE(Mp4MuxerFactory().Create("fragment", muxer));
    EXPECT_NE(dynamic_cast<Mp4FragmentMuxer*>(muxer.get()), nullptr);
}

TEST(Mp4MuxerFactory, EachCallMakesAMuxerOfItsOwn) {
    std::shared_ptr<Mp4Muxer> first;
    std::shared_ptr<Mp4Muxer> second;
    EXPECT_TRUE(Mp4MuxerFactory().Create("normal", first));
    EXPECT_TRUE(Mp4MuxerFactory().Create("normal", second));
    EXPECT_NE(first, second);
}

TEST(Mp4MuxerFactory, AnyOtherTypeIsRefusedAndLeavesTheOutputAsItWas) {
    std::shared_ptr<Mp4Muxer> muxer;
    ASSERT_TRUE(Mp4MuxerFactory().Create("normal", muxer));
    const auto before = muxer;
    for (const std::string type : {"", "Normal", "fragmented", "mp4"}) {
        EXPECT_FALSE(Mp4MuxerFactory().Create(type, muxer)) << type;
        EXPECT_EQ(muxer, before) << type;
    }
}

}  // namespace
}  // namespace clipfileModule
