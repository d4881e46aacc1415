#pragma once

#include <gtest/gtest.h>
#include <chrono>

#include <cstdint>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <memory>
#include <stdexcept>
#include <string>
#include <thread>
#include <vector>

#include "LogCapture.h"
#include "endtoend/LoadedModule.h"
#include "endtoend/NumberedStream.h"
#include "endtoend/PacedPush.h"
#include "endtoend/RecordedFiles.h"
#include "support/FakeHost.h"
#include "support/LogLines.h"
#include "support/SambaServer.h"
#include "support/TempDir.h"
#include "support/WaitUntil.h"

/// The built library records a numbered stream at 25 frames a second to shares of a Samba server.
class ShareRecording : public ::testing::Test {
 protected:
    /// One life of the module.
    class Life {
     public:
        /// Online from the start.
        Life(ShareRecording& test, FakeHost& host) : stream_(test.stream_) {
            host.numbers["-encodedFPS"] = 25000;
            if (!library_.Module().Initialize(&host)) {
                throw std::runtime_error("the module cannot be initialised");
            }
            // A library that stayed in memory knows whether it was online.
            library_.Notify().NotifyOfflineStatus();
            library_.Notify().NotifyOnlineStatus();
        }
        /// The next frames of all media, each with its picture last. Without anyone who waits, few enough for
        /// the module's queues.
        void Push(std::uint64_t frames) {
            Unpaced push{library_.Stream()};
            Push(push, frames);
        }
        template <typename Pushed>
        void Push(Pushed& push, std::uint64_t frames) {
            for (const std::uint64_t end = next_ + frames; next_ < end; ++next_) {
                const stream_units::StreamClock& clock = stream_.clock;
                for (std::uint64_t k = clock.AudioBefore(next_); k < clock.AudioBefore(next_ + 1); ++k) {
                    push.Audio(*stream_.Audio(k));
                }
                push.Meta(*stream_.Meta(next_, true));
                push.Video(*stream_.Video(next_));
            }
        }
        /// Pushes the next frames, 50 a second, until `done`: the chunk thread takes note of a unit that
        /// comes while it works with the next one only. False when it never comes.
        template <typename Done>
        [[nodiscard]] bool RunUntil(Done done) {
            return waitUntil([&] {
                if (done()) {
                    return true;
                }
                std::this_thread::sleep_for(std::chrono::milliseconds(20));
                Push(1);
                return false;
            });
        }
        void End() { library_.Module().Uninitialize(); }
        LoadedModule& Library() { return library_; }

     private:
        struct Unpaced {
            QxModuleStreamInterface& stream;
            void Video(const StreamData& unit) { stream.PushVideo(std::make_shared<StreamData>(unit)); }
            void Audio(const StreamData& unit) { stream.PushAudio(std::make_shared<StreamData>(unit)); }
            void Meta(const StreamData& unit) { stream.PushMeta(std::make_shared<StreamData>(unit)); }
        };

        LoadedModule library_;
        const NumberedStream& stream_;
        std::uint64_t next_ = 0;
    };

    void SetUp() override { SetMinutesPerFile(60); }

    /// 0 for a new file at each point where sound and picture are in step.
    void SetMinutesPerFile(unsigned minutes) {
        const std::string settings = (directory_.Path() / "settings.ini").string();
        std::ofstream(settings) << "[Qx/Other/MP4FileOut]\nMP4MaxFileSize=" << minutes << "\n";
        setenv("QX_SETTINGS", settings.c_str(), 1);
    }
    /// A host that records to `path` as the server's user.
    static void setUp(FakeHost& host, const std::string& path,
                      const std::string& userName = SambaServer::kUser,
                      const std::string& password = SambaServer::kPassword) {
        host.texts = {
            {"-outputPath", path}, {"-userName", userName}, {"-password", password}, {"-fileType", "normal"}};
    }
    /// A short recording to `path`, from the first frame to a stop.
    void Record(FakeHost& host) {
        Life life(*this, host);
        life.Push(kFrames);
        EXPECT_TRUE(life.RunUntil([&] { return hasEnded(host); }));
        life.End();
    }
    /// What the host heard of faults. The commands at the start of a life have statuses of their own.
    static std::vector<FakeHost::Status> failures(const FakeHost& host) {
        std::vector<FakeHost::Status> found = host.Statuses();
        std::erase_if(found, [](const FakeHost::Status& status) { return status.first != 7; });
        return found;
    }
    /// Lines of priority 4.
    std::vector<std::string> errorLines() const {
        std::vector<std::string> found = log_.Texts(LOG_PRIORITY_ERROR);
        std::erase_if(found, [](const std::string& line) { return line.rfind("OP: ", 0) == 0; });
        return found;
    }
    /// Waits until a file is open or a fault has been reported.
    bool waitForEnd(FakeHost& host) const {
        return waitUntil([&] { return hasEnded(host); });
    }
    bool hasEnded(FakeHost& host) const {
        return host.GetStatus() == 7 || countPrefix(log_, "OP: FILE CREATE. ") > 0;
    }
    /// The file of `Record`, as it stands at the server, holds what was pushed.
    void ExpectRecorded(const std::filesystem::path& root) const {
        const RecordedFile file(FindRecording(root, stream_.FileName(0)));
        ASSERT_GE(file.Samples(kRecordedVideo).size(), 8U);
        for (std::uint64_t n = 0; n < file.Samples(kRecordedVideo).size(); ++n) {
            EXPECT_EQ(file.BytesOf(file.Samples(kRecordedVideo)[n]), stream_.VideoSample(n)) << n;
        }
    }

    static constexpr std::uint64_t kFrames = 24;

    LogCapture log_{LOG_PRIORITY_TRACE};
    TempDir directory_;
    const NumberedStream stream_{stream_units::kRate25};
};
