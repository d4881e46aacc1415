#include "source/Input.h"

#include <mutex>
#include <set>
#include <thread>

#include "SourceTesting.h"

namespace receiver {
namespace {

using InputTest = SourceTest;

std::mutex askedMutex;
std::set<std::thread::id> askedOn;

TEST_F(InputTest, WhetherToStopIsAskedOnTheOpeningThreadAlone) {
    Ffmpeg(std::string(kPicture) + kPlainH264 + "a.ts");
    const auto stop = [] {
        const std::lock_guard lock(askedMutex);
        askedOn.insert(std::this_thread::get_id());
        return false;
    };
    // FFmpeg reads such an address on a thread of its own, which asks too.
    Input input("async:" + Path("a.ts"), 5, 5, std::make_shared<Interrupt>(), stop);
    libav::Owner<AVPacket> packet = libav::NewPacket();
    EXPECT_TRUE(input.Read(*packet));
    const std::lock_guard lock(askedMutex);
    EXPECT_EQ(askedOn, std::set{std::this_thread::get_id()});
}

}  // namespace
}  // namespace receiver
