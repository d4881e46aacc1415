#pragma once

#include <gtest/gtest.h>

#include <algorithm>
#include <cstdint>
#include <memory>
#include <string>
#include <utility>
#include <vector>

#include "LogCapture.h"
#include "buffer/StreamBuffer.h"
#include "controller/Controller.h"
#include "support/ControllerPeer.h"
#include "support/FakeHost.h"
#include "support/FakeRegistry.h"
#include "support/FileOutputRecorder.h"
#include "support/SettleEventLoop.h"
#include "support/StreamUnits.h"
#include "support/WaitUntil.h"

namespace clipfileModule {

/// A controller that runs in the mode and by the rules of the test, with file outputs that only record what
/// they are given.
class RunningController : public testing::Test {
 protected:
    /// Start and stop timestamp of a recording.
    using Ranges = std::vector<std::pair<std::int64_t, std::int64_t>>;
    using Texts = std::vector<std::string>;

    RunningController() { registry_.Set("MP4OutputPath", "a"); }
    void TearDown() override {
        if (running_) {
            controller_.Uninitialize();
        }
    }

    void Run(const std::string& rules, const std::string& outputMode = "sync") {
        host_.texts["-outputMode"] = outputMode;
        host_.texts["-recordRules"] = rules;
        host_.numbers["-encodedFPS"] = 25000;
        log_.Clear();
        ASSERT_TRUE(controller_.Initialize(&host_));
        running_ = true;
        ASSERT_TRUE(settleEventLoop(controller_, host_, log_));
        log_.Clear();
    }
    /// Waits until all events that were posted so far have run.
    void WaitForEvents() {
        const FakeHost::StatusMap behind = {{"behind", std::to_string(++events_)}};
        controller_.PostEvent(std::make_shared<TransferStatusNotifyEvent>(behind));
        ASSERT_TRUE(waitUntil([&] {
            const auto sent = host_.Transmissions();
            return std::find(sent.begin(), sent.end(), behind) != sent.end();
        }));
    }
    void RunEvent(std::shared_ptr<Event> event) {
        controller_.PostEvent(std::move(event));
        WaitForEvents();
    }
    /// Pushes a metadata unit of the instant, and waits until the recordings have it.
    void PushFlag(bool on, std::uint64_t milliSec) {
        const auto unit = stream_units::MetaUnit(milliSec, milliSec * 90, milliSec, {on, std::nullopt});
        controller_.PushMeta(unit);
        WaitUntilHanded(2, milliSec);
    }
    /// Commands a record, and brings all recordings behind their wait: one that waits is cancelled by the
    /// first unit behind its stop.
    void StartRecord(std::uint64_t milliSec) {
        PushFlag(true, milliSec);
        controller_.PushVideo(stream_units::VideoUnit(milliSec, milliSec * 90, milliSec, stream_units::kIdr));
        WaitUntilHanded(0, milliSec);
    }
    /// Waits until a queue thread, 0 video, 1 audio, 2 metadata, has handed everything to the recordings.
    void WaitUntilHanded(std::size_t queue, std::uint64_t milliSec) {
        // A unit without payload is let go unseen, behind all that was pushed before it.
        const auto mark = std::make_shared<StreamData>();
        ASSERT_TRUE(peer_.Queue(queue).Push(mark)) << milliSec;
        ASSERT_TRUE(waitUntil([&] { return mark.use_count() == 1; })) << milliSec;
    }
    Ranges Recordings() {
        Ranges result;
        for (const auto& buffer : peer_.StreamBuffers()) {
            result.emplace_back(buffer->GetStartTimestamp(), buffer->GetStopTimestamp());
        }
        return result;
    }
    std::vector<std::int64_t> Ends() {
        std::vector<std::int64_t> ends;
        for (const auto& buffer : peer_.StreamBuffers()) {
            ends.push_back(buffer->GetEndTimestamp());
        }
        return ends;
    }
    /// Texts of the lines that begin with one of these.
    Texts LinesWith(const Texts& starts) const {
        Texts texts;
        for (const CapturedLine& line : log_.Lines()) {
            if (std::any_of(starts.begin(), starts.end(),
                            [&](const std::string& start) { return line.text.rfind(start, 0) == 0; })) {
                texts.push_back(line.text);
            }
        }
        return texts;
    }
    /// Holds the event thread in front of the next event that is posted.
    [[nodiscard]] LogCapture::Gate HoldEvents() {
        LogCapture::Gate gate = log_.BlockAt([](const CapturedLine& line) {
            return line.function == "clipfileModule::Controller::OnTransferStatusNotify";
        });
        controller_.PostEvent(std::make_shared<TransferStatusNotifyEvent>(FakeHost::StatusMap{}));
        EXPECT_TRUE(gate.WaitReached());
        return gate;
    }

    LogCapture log_;
    FakeRegistry registry_;
    FileOutputRecorder outputs_;
    FakeHost host_;
    Controller controller_;
    ControllerPeer peer_{controller_};
    bool running_ = false;
    int events_ = 0;
};

}  // namespace clipfileModule
