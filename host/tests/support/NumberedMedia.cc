#include "support/NumberedMedia.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <cstdint>
#include <cstring>
#include <stdexcept>

#include "support/CodedMedia.h"
#include "support/Process.h"

namespace endtoend {
namespace {

constexpr int kDigits = 16;
constexpr double kBurst = 0.05;
/// Of second 0, and how much each further one is higher, in Hz.
constexpr double kPitch = 600;
constexpr double kPitchStep = 200;
constexpr double kSampleRate = 48000;
/// Half an audio frame, and what a burst's edges are blurred by its coding.
constexpr double kInStep = 0.011 + 0.003;

std::string run(const std::vector<std::string>& command) {
    const Outcome outcome = RunProgram(command);
    if (outcome.code != 0) {
        throw std::runtime_error("ffmpeg: " + outcome.errors);
    }
    return outcome.output;
}

std::vector<std::size_t> readNumbers(const std::filesystem::path& recording) {
    const std::string pixels =
        run({"ffmpeg", "-v", "error", "-nostdin", "-i", recording.string(), "-map", "0:v", "-fps_mode",
             "passthrough", "-vf", "scale=" + std::to_string(kDigits) + ":1:flags=area,format=gray", "-f",
             "rawvideo", "-"});
    std::vector<std::size_t> numbers;
    for (std::size_t at = 0; at + kDigits <= pixels.size(); at += kDigits) {
        std::size_t number = 0;
        for (int digit = 0; digit < kDigits; ++digit) {
            const bool lit = static_cast<unsigned char>(pixels[at + static_cast<std::size_t>(digit)]) > 120;
            number |= lit ? std::size_t{1} << digit : 0;
        }
        numbers.push_back(number);
    }
    return numbers;
}

std::vector<double> readSamples(const std::filesystem::path& recording) {
    const std::string bytes = run({"ffmpeg", "-v", "error", "-nostdin", "-i", recording.string(), "-map",
                                   "0:a", "-ac", "1", "-f", "s16le", "-"});
    std::vector<double> samples(bytes.size() / 2);
    for (std::size_t at = 0; at < samples.size(); ++at) {
        std::int16_t sample = 0;
        std::memcpy(&sample, bytes.data() + 2 * at, sizeof sample);
        samples[at] = sample / 32768.0;
    }
    return samples;
}

/// Bursts by their place among samples.
std::vector<Burst> findBursts(const std::vector<double>& samples) {
    constexpr double kLoud = 0.1;
    constexpr auto kQuiet = static_cast<std::size_t>(0.02 * kSampleRate);
    std::vector<Burst> bursts;
    for (std::size_t at = 0; at < samples.size(); ++at) {
        if (std::abs(samples[at]) < kLoud) {
            continue;
        }
        const std::size_t begin = at;
        std::size_t last = at;
        // From well below zero to well above it.
        bool below = false;
        std::size_t crossings = 0;
        std::size_t firstCrossing = at;
        std::size_t lastCrossing = at;
        for (; at < samples.size() && at - last < kQuiet; ++at) {
            last = std::abs(samples[at]) >= kLoud ? at : last;
            if (below && samples[at] >= kLoud) {
                firstCrossing = crossings == 0 ? at : firstCrossing;
                lastCrossing = at;
                ++crossings;
            }
            below = samples[at] <= -kLoud || (below && samples[at] < kLoud);
        }
        const double length = static_cast<double>(last - begin) / kSampleRate;
        if (std::abs(length - kBurst) > 0.01 || crossings < 2) {
            // Cut off by the edge of the file.
            continue;
        }
        const double pitch = static_cast<double>(crossings - 1) * kSampleRate /
                             static_cast<double>(lastCrossing - firstCrossing);
        bursts.push_back({static_cast<double>(begin + last) / 2 / kSampleRate,
                          static_cast<int>(std::lround((pitch - kPitch) / kPitchStep))});
    }
    return bursts;
}

}  // namespace

double NumberedPart::TimeOf(std::size_t picture) const {
    return start + (static_cast<double>(picture) - static_cast<double>(number)) / rate;
}

std::size_t NumberedRecording::CountOf(const NumberedPart& part) const {
    const std::size_t end = part.number + static_cast<std::size_t>(part.seconds * part.rate);
    const auto foreign = std::find_if(numbers.begin(), numbers.end(), [&part, end](std::size_t number) {
        return number < part.number || number >= end;
    });
    return static_cast<std::size_t>(foreign - numbers.begin());
}

void WriteNumbered(const NumberedPart& part, const std::filesystem::path& target) {
    const std::string length = std::to_string(part.seconds);
    const std::string picture = "color=size=" + part.size + ":rate=" + std::to_string(part.rate) +
                                ":duration=" + length + ",format=yuv420p,geq=lum='if(mod(floor((N+" +
                                std::to_string(part.number) + ")/pow(2,floor(X*" + std::to_string(kDigits) +
                                "/W))),2),200,40)':cb=128:cr=128";
    const std::string sound = "aevalsrc='0.5*sin(2*PI*(" + std::to_string(kPitch) + "+" +
                              std::to_string(kPitchStep) + "*floor(t+" + std::to_string(part.start) +
                              "))*t)*lt(mod(t,1)," + std::to_string(kBurst) + ")':s=48000:d=" + length;
    std::vector<std::string> command{"ffmpeg", "-v", "error", "-nostdin", "-y", "-f", "lavfi", "-i", picture};
    const auto add = [&command](const std::vector<std::string>& more) {
        command.insert(command.end(), more.begin(), more.end());
    };
    if (!part.audio.empty()) {
        add({"-f", "lavfi", "-i", sound});
    }
    add(part.video);
    add({"-threads", "1"});
    add(part.audio);
    // The sound begins with the encoder's priming, before the picture. At a constant rate, so that what is
    // sent evenly comes when its stamps say.
    add({"-output_ts_offset", std::to_string(10 + part.start), "-muxrate", "1M", "-mpegts_flags",
         "+initial_discontinuity", target.string()});
    run(command);
}

NumberedRecording ReadNumbered(const std::filesystem::path& recording) {
    const CodedMedia media = ReadCodedMedia(recording);
    NumberedRecording found{readNumbers(recording), media.videoTimes, {}};
    // They are read in the order of decoding.
    std::sort(found.times.begin(), found.times.end());
    const std::vector<double> samples = readSamples(recording);
    if (media.audioTimes.empty()) {
        return found;
    }
    // A decoder leaves out samples at the beginning at times, never at the end.
    const double left = static_cast<double>(media.audio.size() * 1024) - static_cast<double>(samples.size());
    found.bursts = findBursts(samples);
    for (Burst& burst : found.bursts) {
        burst.time += media.audioTimes.front() + left / kSampleRate;
    }
    return found;
}

void ExpectInStep(const NumberedRecording& recording, const NumberedPart& part) {
    ASSERT_FALSE(recording.numbers.empty());
    ASSERT_EQ(recording.numbers.size(), recording.times.size());
    const std::size_t first = recording.numbers.front();
    ASSERT_GE(first, part.number);
    for (std::size_t at = 0; at < recording.numbers.size(); ++at) {
        ASSERT_EQ(recording.numbers[at], first + at);
        EXPECT_NEAR(recording.times[at] - recording.times.front(), static_cast<double>(at) / part.rate,
                    0.0005);
    }
    const double begin = part.TimeOf(first);
    const double end = part.TimeOf(recording.numbers.back() + 1);
    EXPECT_LE(end, part.start + part.seconds + 0.001);
    std::size_t heard = 0;
    // An edge has an audio frame that belongs to both sides, and one that a decoder needs to begin with.
    constexpr double kEdge = 0.05;
    for (int second = part.start; second < part.start + part.seconds; ++second) {
        if (part.audio.empty() || second < begin + kEdge || second + kBurst > end - kEdge) {
            continue;
        }
        bool found = false;
        for (const Burst& burst : recording.bursts) {
            if (burst.second == second) {
                EXPECT_FALSE(found) << "second " << second << " comes twice";
                found = true;
                ++heard;
                EXPECT_NEAR(burst.time - recording.times.front(), second + kBurst / 2 - begin, kInStep)
                    << "of second " << second;
            }
        }
        EXPECT_TRUE(found) << "second " << second << " is not heard";
    }
    EXPECT_LE(recording.bursts.size(), heard + 2);
}

}  // namespace endtoend
