// A live source of reordered pictures: a file begins and ends on the commanded pictures as they are shown,
// with all media in step. Judged from the file alone.

#include <gtest/gtest.h>

#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <memory>
#include <stdexcept>
#include <string>
#include <tuple>
#include <vector>

#include "endtoend/LiveHost.h"
#include "endtoend/RecordedFiles.h"
#include "support/ShownPictures.h"

namespace {

using reordered_stream::Pattern;
using stream_units::FrameRate;

/// Metadata units with the record flag, between IDR frames.
constexpr std::uint64_t kOn = 37;
constexpr std::uint64_t kOff = 98;

class ReorderedCommands : public ::testing::TestWithParam<std::tuple<FrameRate, Pattern>> {
 protected:
    /// A source that the machine cannot follow says nothing: then the same again at half the speed.
    std::unique_ptr<LiveHost> record() const {
        for (int attempt = 0;; ++attempt) {
            Delivery delivery;
            std::tie(delivery.rate, delivery.pattern) = GetParam();
            delivery.speed = 3 / static_cast<double>(1 << attempt);
            auto host = std::make_unique<LiveHost>(delivery);
            try {
                host->PushUntil(kOn, false);
                host->PushUntil(kOff, true);
                host->PushUntilLine("OP: REMOVE STREAM.", 1, false);
                host->End();
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
};

TEST_P(ReorderedCommands, BeginAndEndAFileOnThePicturesThatAreShown) {
    const auto& [rate, pattern] = GetParam();
    const auto host = record();
    const std::uint64_t delay = reordered_stream::DelayOf(pattern);
    // The first IDR frame that is shown with the flag on; they are multiples of 15.
    const std::uint64_t first = (kOn - delay + 14) / 15 * 15;
    const std::uint64_t count = kOff - delay - first;

    const std::vector<std::string> names = RecordedNames(host->log);
    ASSERT_EQ(names.size(), 1U);
    EXPECT_EQ(names[0], host->stream.FileName(first + delay));
    const RecordedFile file(FindRecording(host->directory.Path(), names[0]));
    const auto duration = static_cast<std::uint32_t>(rate.duration);
    const std::vector<std::size_t> shown = ShownSamples(file.Movie(), duration);
    ASSERT_EQ(shown.size(), count);
    const auto numberOf = [&](char medium, const iso::Sample& sample) {
        const auto bytes = file.BytesOf(sample);
        return stream_units::NumberIn(medium, bytes.data(), bytes.size()).value();
    };
    for (std::uint64_t i = 0; i < count; ++i) {
        const std::uint64_t decoded = numberOf('V', file.Samples(kRecordedVideo).at(shown[i]));
        EXPECT_EQ(host->pictures.at(decoded).shown, first + i);
        EXPECT_EQ(numberOf('M', file.Samples(kRecordedMeta).at(i)), first + delay + i);
    }
    ExpectOthersAsLong(file.Movie(), count, duration, rate.timescale, 10.7);
    const auto sound = static_cast<std::int64_t>(
        host->stream.clock.AudioRtp(numberOf('A', file.Samples(kRecordedAudio).at(0))) * 15 / 8);
    EXPECT_LE(std::abs(sound - static_cast<std::int64_t>(host->stream.clock.VideoRtp(first + delay))), 961)
        << "half an audio frame";
}

INSTANTIATE_TEST_SUITE_P(
    Streams, ReorderedCommands,
    ::testing::Combine(::testing::Values(stream_units::kRate25, stream_units::kFrameRates[6]),
                       ::testing::Values(reordered_stream::kOneB, reordered_stream::kPyramid)),
    [](const auto& tested) {
        return std::to_string(std::get<0>(tested.param).key) + "Groups" +
               std::to_string(std::get<1>(tested.param).size());
    });

}  // namespace
