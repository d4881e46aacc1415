// With exact rules a file begins and ends on the commanded frame, with all media in step, however the host
// delivers the stream. Judged from the file alone.

#include <gtest/gtest.h>

#include <cstdint>
#include <cstdlib>
#include <memory>
#include <numeric>
#include <optional>
#include <ostream>
#include <string>
#include <tuple>
#include <vector>

#include "endtoend/LiveHost.h"
#include "endtoend/RecordedFiles.h"

namespace {

using stream_units::FrameRate;

enum class Condition { kIdle, kLoadedCore, kAudioLate, kFast, kRestart };

const char* nameOf(Condition condition) {
    static constexpr const char* kNames[] = {"Idle", "OnOneLoadedCore", "WithLateAudio", "At40Times",
                                             "AfterARestart"};
    return kNames[static_cast<std::size_t>(condition)];
}

void PrintTo(Condition condition, std::ostream* out) {
    *out << nameOf(condition);
}

/// The first and the last picture of a file.
struct Pictures {
    /// Nothing for any IDR picture.
    std::optional<std::uint64_t> first;
    std::uint64_t last;
};

class Alignment : public ::testing::TestWithParam<std::tuple<FrameRate, bool, Condition>> {
 protected:
    /// IDR pictures are multiples of 15. On an IDR picture and off between two; then the other way round.
    static constexpr std::uint64_t kFirstOn = 15;
    static constexpr std::uint64_t kFirstOff = 37;
    static constexpr std::uint64_t kPause = 15;

    FrameRate rate() const { return std::get<0>(GetParam()); }
    Condition condition() const { return std::get<2>(GetParam()); }

    Delivery delivery(int attempt) const {
        Delivery delivery;
        delivery.rate = rate();
        delivery.videoFirst = std::get<1>(GetParam());
        delivery.audioLateMilliSec = condition() == Condition::kAudioLate ? 200 : 0;
        delivery.speed = (condition() == Condition::kFast ? 40 : 3) / static_cast<double>(1 << attempt);
        return delivery;
    }
    static std::uint64_t idrFrom(std::uint64_t frame) {
        while (!NumberedStream::IsIdr(frame)) {
            ++frame;
        }
        return frame;
    }
    /// Two records, and the pictures that their files must hold.
    std::vector<Pictures> record(LiveHost& host) const {
        std::vector<Pictures> expected;
        host.PushUntil(kFirstOn, false);
        host.PushUntil(kFirstOff, true);
        expected.push_back({kFirstOn, kFirstOff - 1});
        if (condition() == Condition::kRestart) {
            // All that has its metadata is written before the record begins again.
            host.StarveOfMetadata();
            host.PushUntilLine("OP: IDR FRAME RECV.", 2, true);
            host.PushUntil(host.frame + 11, true);
            expected.push_back({std::nullopt, host.frame - 1});
        }
        const std::uint64_t secondOn = idrFrom(host.frame + kPause) + 7;
        host.PushUntil(secondOn, false);
        const std::uint64_t secondOff = idrFrom(secondOn + 20);
        host.PushUntil(secondOff, true);
        expected.push_back({idrFrom(secondOn), secondOff - 1});
        host.PushUntilLine("OP: REMOVE STREAM.", 2, false);
        host.End();
        return expected;
    }
    /// A source that the machine cannot follow says nothing: then the same again at half the speed.
    std::unique_ptr<LiveHost> recordAll(std::vector<Pictures>& expected) const {
        for (int attempt = 0;; ++attempt) {
            auto host = std::make_unique<LiveHost>(delivery(attempt));
            try {
                expected = record(*host);
            } catch (const std::runtime_error&) {
                if (!host->HasLostUnits()) {
                    throw;
                }
            }
            if (!host->HasLostUnits() || attempt == 6) {
                return host;
            }
        }
    }

    static std::uint64_t numberOf(char medium, const RecordedFile& file, const iso::Sample& sample) {
        const std::vector<std::uint8_t> bytes = file.BytesOf(sample);
        return stream_units::NumberIn(medium, bytes.data(), bytes.size()).value();
    }
    static std::uint64_t durationOf(const std::vector<iso::Sample>& samples) {
        return std::accumulate(
            samples.begin(), samples.end(), std::uint64_t{0},
            [](std::uint64_t sum, const iso::Sample& sample) { return sum + sample.duration; });
    }
    /// SMPTE ST 12-1: at 29.97 two numbers of each minute but every tenth are left out.
    static std::uint32_t frameNumber(const stream_units::Timecode& timecode, std::uint32_t perSecond) {
        const std::uint32_t minutes = timecode.hours * 60U + timecode.minutes;
        const std::uint32_t all = (minutes * 60U + timecode.seconds) * perSecond + timecode.frames;
        return timecode.dropFrame ? all - 2 * (minutes - minutes / 10) : all;
    }

    void judge(const NumberedStream& stream, const RecordedFile& file, const std::string& name,
               const Pictures& expected) const {
        const auto& video = file.Samples(kRecordedVideo);
        const auto& audio = file.Samples(kRecordedAudio);
        const auto& meta = file.Samples(kRecordedMeta);
        ASSERT_FALSE(video.empty());
        ASSERT_FALSE(audio.empty());
        const std::uint64_t first = numberOf('V', file, video.front());
        EXPECT_TRUE(NumberedStream::IsIdr(first));
        EXPECT_EQ(first, expected.first.value_or(first));
        EXPECT_EQ(first + video.size() - 1, expected.last);
        EXPECT_EQ(name, stream.FileName(first));

        EXPECT_EQ(meta.size(), video.size());
        for (std::uint64_t i = 0; i < video.size() && i < meta.size(); ++i) {
            ASSERT_EQ(file.BytesOf(video[i]), stream.VideoSample(first + i));
            ASSERT_EQ(file.BytesOf(meta[i]), stream.MetaSample(first + i, true));
        }
        const std::uint64_t firstAudio = numberOf('A', file, audio.front());
        for (std::uint64_t i = 0; i < audio.size(); ++i) {
            ASSERT_EQ(file.BytesOf(audio[i]), stream.AudioSample(firstAudio + i));
        }
        const double lead = static_cast<double>(stream.clock.AudioRtp(firstAudio)) / 48 -
                            static_cast<double>(stream.clock.VideoRtp(first)) / 90;
        EXPECT_LE(std::abs(lead), 10.7) << "milliseconds";
        const double tail =
            static_cast<double>(durationOf(audio)) / 48 -
            1000.0 * static_cast<double>(durationOf(video)) / static_cast<double>(rate().timescale);
        EXPECT_LE(std::abs(tail), 10.7) << "milliseconds";

        ASSERT_EQ(file.Samples(kRecordedTimecode).size(), 1U);
        const iso::Sample& sample = file.Samples(kRecordedTimecode)[0];
        EXPECT_EQ(sample.duration, durationOf(video));
        const std::vector<std::uint8_t> bytes = file.BytesOf(sample);
        ASSERT_EQ(bytes.size(), 4U);
        const std::uint32_t value =
            std::uint32_t{bytes[0]} << 24 | std::uint32_t{bytes[1]} << 16 | bytes[2] << 8 | bytes[3];
        EXPECT_EQ(value, frameNumber(stream.TimecodeOf(first),
                                     static_cast<std::uint32_t>((rate().timescale + 999) / 1000)));
    }
};

TEST_P(Alignment, EveryFileBeginsAndEndsOnItsFrameWithAllMediaInStep) {
    std::unique_ptr<LoadedCore> load;
    if (condition() == Condition::kLoadedCore) {
        load = std::make_unique<LoadedCore>();
    }
    std::vector<Pictures> expected;
    const std::unique_ptr<LiveHost> host = recordAll(expected);
    const std::vector<std::string> names = RecordedNames(host->log);
    ASSERT_EQ(names.size(), expected.size());
    for (std::size_t i = 0; i < names.size(); ++i) {
        SCOPED_TRACE("file " + std::to_string(i) + ", " + names[i]);
        judge(host->stream, RecordedFile(FindRecording(host->directory.Path(), names[i])), names[i],
              expected[i]);
    }
}

INSTANTIATE_TEST_SUITE_P(
    Deliveries, Alignment,
    ::testing::Combine(::testing::Values(stream_units::kRate25, stream_units::kRate2997,
                                         stream_units::kFrameRates[5], stream_units::kFrameRates[6]),
                       ::testing::Bool(),
                       ::testing::Values(Condition::kIdle, Condition::kLoadedCore, Condition::kAudioLate,
                                         Condition::kFast, Condition::kRestart)),
    [](const auto& tested) {
        return "At" + std::to_string(std::get<0>(tested.param).key) +
               (std::get<1>(tested.param) ? "VideoFirst" : "MetadataFirst") +
               nameOf(std::get<2>(tested.param));
    });

}  // namespace
