#pragma once

// A file output with fakes around it: controller, buffer, system. Files are real.

#include <gtest/gtest.h>

#include <algorithm>
#include <cstdint>
#include <functional>
#include <memory>
#include <mutex>
#include <string>
#include <utility>
#include <vector>

#include "LogCapture.h"
#include "buffer/chunk/ChunkData.h"
#include "common/Event.h"
#include "common/StreamBufferInterface.h"
#include "fileout/FileOutput.h"
#include "support/ControllerRecorder.h"
#include "support/FakePlatform.h"
#include "support/TempDir.h"

/// A buffer that answers for the timecode of a file as a test says.
class TimecodeBuffer : public clipfileModule::StreamBufferInterface {
 public:
    void SetVideoSequenceHeader(const nal_access::NalUnit& /*sps*/, const nal_access::NalUnit& /*pps*/,
                                const std::shared_ptr<StreamData>& /*unit*/) override {
        add("SetVideoSequenceHeader");
    }
    bool MakeFileTimecode(const std::shared_ptr<clipfileModule::ChunkData>& chunk) override {
        add("MakeFileTimecode " + std::to_string(chunk->firstVideo->rtp_timestamp));
        const std::lock_guard lock(mutex_);
        frames_ = static_cast<unsigned char>(chunk->firstVideo->rtp_timestamp);
        return makeResult_;
    }
    bool GetFileTimecode(unsigned char* timecode, bool* dropFrame) override {
        add("GetFileTimecode with flag");
        const std::lock_guard lock(mutex_);
        *dropFrame = dropFrame_;
        return fill(timecode);
    }
    bool GetFileTimecode(unsigned char* timecode) override {
        add("GetFileTimecode");
        const std::lock_guard lock(mutex_);
        return fill(timecode);
    }
    std::int64_t GetStartTimestamp() const override { return 0; }
    std::int64_t GetStopTimestamp() const override { return -1; }
    std::int64_t GetEndTimestamp() const override { return -1; }
    void NotifyEndSync() override { add("NotifyEndSync"); }

    /// What the calls return. Timecodes are 01:02:03 with the chunk's number as frames.
    void SetResults(bool make, bool get, bool dropFrame) {
        const std::lock_guard lock(mutex_);
        makeResult_ = make;
        getResult_ = get;
        dropFrame_ = dropFrame;
    }
    std::vector<std::string> Calls() const {
        const std::lock_guard lock(mutex_);
        return calls_;
    }

 private:
    void add(std::string call) {
        const std::lock_guard lock(mutex_);
        calls_.push_back(std::move(call));
    }
    bool fill(unsigned char* timecode) const {
        if (getResult_) {
            const unsigned char value[4] = {1, 2, 3, frames_};
            std::copy(std::begin(value), std::end(value), timecode);
        }
        return getResult_;
    }

    mutable std::mutex mutex_;
    std::vector<std::string> calls_;
    bool makeResult_ = true;
    bool getResult_ = true;
    bool dropFrame_ = false;
    unsigned char frames_ = 0;
};

/// 150 MiB: what must be free for a file to be opened, and beside its closing boxes for a chunk to be
/// written.
inline constexpr std::uint64_t kMinFreeSpace = 157286400;

/// Members are ordered: whatever a thread that hangs may still use goes last.
class FileOutputFixture : public testing::Test {
 protected:
    /// The log is captured up to `highest`.
    explicit FileOutputFixture(_LogPriority highest = LOG_PRIORITY_SAMPLE) : log(highest) {
        platform.SetAvailableSpace(1000 * kMinFreeSpace);
        platform.SetLocalTime({2026, 11, 20, 10, 20, 30});
        settings.outputPath = dir.ModulePath();
        settings.filePrefix = "Cam";
        settings.fileType = "normal";
        settings.maxFileSize = 120;
    }
    ~FileOutputFixture() override { EndOutput(); }
    /// For destructors of tests whose members the thread uses.
    void EndOutput() {
        if (output != nullptr) {
            Finish();
        }
    }

    bool Initialize(const std::string& type = "normal") {
        output = std::make_unique<clipfileModule::FileOutput>();
        return output->Initialize(&controller, &buffer, type);
    }
    void Start() {
        if (output == nullptr) {
            ASSERT_TRUE(Initialize(settings.fileType));
        }
        output->Start(settings);
    }
    /// Waits until the thread has told that it ended.
    void WaitForEnd() { ASSERT_TRUE(log.WaitFor(HasLine("outputThread", "end."))); }
    /// Ends the thread in order and releases everything.
    void Finish() {
        output->Stop();
        output->Uninitialize();
        output.reset();
    }

    /// Texts of the lines that a function of `FileOutput` logged, in order.
    std::vector<std::string> TextsOf(const std::string& function) const {
        std::vector<std::string> texts;
        for (const CapturedLine& line : log.Lines()) {
            if (line.function == kClass + function) {
                texts.push_back(line.text);
            }
        }
        return texts;
    }
    bool Logged(_LogPriority priority, const std::string& function, const std::string& text) const {
        return log.Contains(priority, (kClass + function).c_str(), text);
    }
    /// All errors logged, in order.
    std::vector<std::string> Errors() const {
        std::vector<std::string> texts;
        for (const CapturedLine& line : log.Lines()) {
            if (line.priority == LOG_PRIORITY_ERROR) {
                texts.push_back(line.text);
            }
        }
        return texts;
    }
    /// The statuses that were set, as "7 26".
    std::vector<std::string> Statuses() const {
        std::vector<std::string> statuses;
        for (const std::string& call : controller.Calls()) {
            if (call.rfind("status ", 0) == 0) {
                statuses.push_back(call.substr(7));
            }
        }
        return statuses;
    }
    /// The values of "file_output_status" that were posted.
    std::vector<std::string> TransferStatuses() const {
        std::vector<std::string> values;
        for (const auto& event : controller.Events()) {
            const auto* notify = dynamic_cast<const clipfileModule::TransferStatusNotifyEvent*>(event.get());
            EXPECT_NE(notify, nullptr);
            EXPECT_EQ(notify->status.size(), 1u);
            values.push_back(notify->status.at("file_output_status"));
        }
        return values;
    }
    static std::function<bool(const std::vector<CapturedLine>&)> HasLine(const std::string& function,
                                                                         const std::string& text) {
        return [=](const std::vector<CapturedLine>& lines) {
            return std::any_of(lines.begin(), lines.end(), [&](const CapturedLine& line) {
                return line.function == kClass + function && line.text == text;
            });
        };
    }
    static inline const std::string kClass = "clipfileModule::FileOutput::";
    static inline const std::string kToday = "20261120/Cam/";

    TempDir dir;
    FakePlatform platform;
    LogCapture log;
    TimecodeBuffer buffer;
    ControllerRecorder controller;
    clipfileModule::OutputSettings settings;
    std::unique_ptr<clipfileModule::FileOutput> output;
};
