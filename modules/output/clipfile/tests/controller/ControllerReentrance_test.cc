// A host that goes offline from inside the status that a writer reports, with the real file output.

#include <gtest/gtest.h>

#include <atomic>
#include <cstdint>
#include <string>
#include <system_error>

#include "LogCapture.h"
#include "controller/Controller.h"
#include "message_handler/QxMessageHandler.h"
#include "support/ControllerPeer.h"
#include "support/FakeHost.h"
#include "support/FakeRegistry.h"
#include "support/StreamUnits.h"
#include "support/WaitUntil.h"

namespace clipfileModule {
namespace {

/// Goes offline when the module has failed, and catches what that throws.
class GivingUpHost : public FakeHost {
 public:
    QxMessageHandler* handler = nullptr;
    std::atomic<bool> thrown = false;
    std::atomic<bool> returned = false;

    void SetStatus(int status, int cause) override {
        FakeHost::SetStatus(status, cause);
        if (status != 7) {
            return;
        }
        try {
            handler->NotifyOfflineStatus();
        } catch (const std::system_error& error) {
            thrown = error.code() == std::errc::resource_deadlock_would_occur;
        }
        returned = true;
    }
};

class ControllerReentranceTest : public testing::TestWithParam<const char*> {
 protected:
    /// Pushes frames, no faster than one after the other, until `condition` holds.
    template <typename Condition>
    [[nodiscard]] bool PushUntil(Condition condition) {
        return waitUntil([&] {
            controller_.PushMeta(clock_.Meta(frame_));
            for (; audio_ < clock_.AudioBefore(frame_ + 1); ++audio_) {
                controller_.PushAudio(clock_.Audio(audio_));
            }
            controller_.PushVideo(
                clock_.Video(frame_, frame_ % 10 == 0 ? stream_units::kIdr : stream_units::kPicture));
            ++frame_;
            return waitUntil([&] { return peer_.Queue(0).Size() + peer_.Queue(1).Size() == 0; }) &&
                   condition();
        });
    }

    const stream_units::StreamClock clock_{};
    std::uint64_t frame_ = 0;
    std::uint64_t audio_ = 0;
    LogCapture log_;
    FakeRegistry registry_;
    GivingUpHost host_;
    Controller controller_;
    ControllerPeer peer_{controller_};
    QxMessageHandler handler_{&controller_};
};

TEST_P(ControllerReentranceTest, AHostMayGoOfflineFromInsideTheFailureOfAWriter) {
    // No folder can be made there.
    registry_.Set("MP4OutputPath", "/proc/no/such/folder");
    host_.texts["-recordRules"] = GetParam();
    host_.numbers["-encodedFPS"] = 25000;
    host_.handler = &handler_;
    for (int life = 0; life < 2; ++life) {
        host_.ForceStatus(0);
        host_.thrown = false;
        host_.returned = false;
        ASSERT_TRUE(controller_.Initialize(&host_));
        handler_.NotifyOnlineStatus();
        ASSERT_TRUE(PushUntil([&] { return host_.returned.load(); }));
        EXPECT_TRUE(host_.thrown);
        const std::size_t statuses = host_.Statuses().size();
        EXPECT_EQ(host_.Statuses().back().first, 7);
        // Nothing is left running that the next life would not find.
        handler_.NotifyOnlineStatus();
        handler_.NotifyOfflineStatus();
        controller_.Uninitialize();
        EXPECT_EQ(host_.Statuses().size(), statuses);
    }
}

INSTANTIATE_TEST_SUITE_P(Rules, ControllerReentranceTest, testing::Values("kept", "exact"),
                         [](const auto& param) { return std::string(param.param); });

}  // namespace
}  // namespace clipfileModule
