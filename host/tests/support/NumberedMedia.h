#pragma once

#include <cstddef>
#include <filesystem>
#include <string>
#include <vector>

namespace endtoend {

/// A part of a stream whose pictures have their numbers in them, and whose sound has a burst at the beginning
/// of each second whose pitch tells the second: what is recorded of it can be mapped back to what was sent,
/// also when it was coded anew on the way.
struct NumberedPart {
    /// When it begins in the stream, and how long it is, in whole seconds.
    int start = 0;
    int seconds = 2;
    int rate = 25;
    /// Of the first picture, up to 65535.
    std::size_t number = 0;
    /// The width is a multiple of 32.
    std::string size = "160x96";
    /// How ffmpeg codes it. No audio at all without arguments.
    std::vector<std::string> video = {"-c:v", "libx264", "-preset", "ultrafast",    "-bf",
                                      "0",    "-g",      "10",      "-x264-params", "scenecut=0:open-gop=0"};
    std::vector<std::string> audio = {"-c:a", "aac", "-ac", "2", "-ar", "48000"};

    /// When that picture begins in the stream, in seconds.
    double TimeOf(std::size_t picture) const;
};

/// Has ffmpeg write a part as a transport stream. Parts one behind the other, in one file or sent one after
/// the other, are one stream. Throws std::runtime_error with ffmpeg's words when that fails.
void WriteNumbered(const NumberedPart& part, const std::filesystem::path& target);

/// A burst that was heard whole.
struct Burst {
    /// Of its middle, in seconds of the file.
    double time = 0;
    /// That its pitch tells.
    int second = 0;
};

/// What a recording holds.
struct NumberedRecording {
    std::vector<std::size_t> numbers;
    /// Of the pictures, in seconds.
    std::vector<double> times;
    std::vector<Burst> bursts;

    /// Of how many pictures, from the first one on, the part has the numbers.
    std::size_t CountOf(const NumberedPart& part) const;
};

/// Has ffmpeg decode a recording. Throws std::runtime_error when that fails.
NumberedRecording ReadNumbered(const std::filesystem::path& recording);

/// Expects that it holds pictures of `part` alone, without a gap, at the part's rate, and that the bursts
/// that belong to them are there, each in step with them.
void ExpectInStep(const NumberedRecording& recording, const NumberedPart& part);

}  // namespace endtoend
