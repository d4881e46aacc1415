#pragma once

#include <gtest/gtest.h>

#include <chrono>
#include <cstdint>
#include <string>

#include "LogCapture.h"
#include "support/BufferHarness.h"
#include "support/StreamUnits.h"

/// A recording that gets its media one by one, so that no chunk is complete.
class IncompleteChunks : public ::testing::Test {
 protected:
    void SetUp() override { harness.Start(); }
    void pushVideo(std::uint64_t count) {
        harness.buffer->PushVideo(harness.clock.Video(0, stream_units::kIdr));
        for (std::uint64_t n = 1; n < count; ++n) {
            harness.buffer->PushVideo(harness.clock.Video(n));
        }
    }
    void pushAudio(std::uint64_t count) {
        for (std::uint64_t n = 0; n < count; ++n) {
            harness.buffer->PushAudio(harness.clock.Audio(n));
        }
    }
    void pushMeta(std::uint64_t count) {
        for (std::uint64_t n = 0; n < count; ++n) {
            harness.buffer->PushMeta(harness.clock.Meta(n));
        }
    }
    /// A pass after everything is cached: one more video unit, then another, until one meets the thread.
    bool passUntil(const std::string& text) {
        for (int i = 0; i < 200; ++i) {
            if (log.WaitForText(text, 1, std::chrono::milliseconds(20))) {
                return true;
            }
            harness.buffer->PushVideo(harness.clock.Video(1000 + static_cast<std::uint64_t>(i)));
        }
        return false;
    }

    LogCapture log;
    BufferHarness harness;
};
