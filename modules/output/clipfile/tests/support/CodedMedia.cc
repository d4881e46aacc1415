#include "support/CodedMedia.h"

#include <gtest/gtest.h>
#include <sys/wait.h>

#include <cstdlib>
#include <cstring>
#include <fstream>
#include <iterator>

#include "support/StreamUnits.h"

namespace {

using stream_units::Bytes;

std::string textOf(const std::filesystem::path& path) {
    std::ifstream in(path, std::ios::binary);
    return {std::istreambuf_iterator<char>(in), std::istreambuf_iterator<char>()};
}

Bytes bytesOf(const std::filesystem::path& path) {
    const std::string text = textOf(path);
    return Bytes(text.begin(), text.end());
}

/// Access units of a byte stream in which each begins with a delimiter behind a 4-byte start code.
std::vector<std::shared_ptr<StreamData>> splitVideo(const Bytes& bytes) {
    static constexpr unsigned char kDelimiter[] = {0, 0, 0, 1, 9};
    std::vector<std::shared_ptr<StreamData>> units;
    auto begin = bytes.begin();
    while (begin != bytes.end()) {
        const auto end = std::search(begin + 5, bytes.end(), std::begin(kDelimiter), std::end(kDelimiter));
        units.push_back(stream_units::MakeUnit(Bytes(begin, end), 0, 0));
        begin = end;
    }
    return units;
}

/// Frames with their ADTS headers (ISO/IEC 14496-3 1.A.2.2.1).
std::vector<std::shared_ptr<StreamData>> splitAudio(const Bytes& bytes) {
    std::vector<std::shared_ptr<StreamData>> units;
    for (std::size_t at = 0; at + 7 <= bytes.size();) {
        const std::size_t length = static_cast<std::size_t>(bytes[at + 3] & 3) << 11 |
                                   static_cast<std::size_t>(bytes[at + 4]) << 3 | bytes[at + 5] >> 5;
        const auto begin = bytes.begin() + static_cast<std::ptrdiff_t>(at);
        units.push_back(
            stream_units::MakeUnit(Bytes(begin, begin + static_cast<std::ptrdiff_t>(length)), 0, 0));
        at += length;
    }
    return units;
}

}  // namespace

ProgramResult RunProgram(const TempDir& directory, const std::string& command) {
    const std::filesystem::path output = directory.Path() / "stdout.txt";
    const std::filesystem::path errors = directory.Path() / "stderr.txt";
    const std::string line = command + " >'" + output.string() + "' 2>'" + errors.string() + "' </dev/null";
    const int status = std::system(line.c_str());
    return {WIFEXITED(status) ? WEXITSTATUS(status) : -1, textOf(output), textOf(errors)};
}

CodedMedia MakeCodedMedia(const TempDir& directory, std::uint32_t timescale, std::uint32_t duration,
                          std::size_t pictures, std::size_t audioFrames) {
    const std::string video = (directory.Path() / "coded.h264").string();
    const std::string audio = (directory.Path() / "coded.aac").string();
    const ProgramResult coded = RunProgram(
        directory, "ffmpeg -v error -f lavfi -i testsrc2=size=" + std::to_string(kCodedWidth) + "x" +
                       std::to_string(kCodedHeight) + ":rate=" + std::to_string(timescale) + "/" +
                       std::to_string(duration) + " -f lavfi -i sine=sample_rate=48000 -map 0:v -frames:v " +
                       std::to_string(pictures) +
                       " -c:v libx264 -threads 1 -preset ultrafast -pix_fmt yuv420p -bf 0 -g 16"
                       " -x264-params aud=1:scenecut=0:repeat-headers=1 -f h264 '" +
                       video + "' -map 1:a -ac 2 -frames:a " + std::to_string(audioFrames) +
                       " -c:a aac -f adts '" + audio + "'");
    EXPECT_EQ(coded.exitCode, 0) << coded.errors;

    CodedMedia media;
    nal_access::StreamAnalyzer analyzer;
    auto videoUnits = splitVideo(bytesOf(video));
    auto audioUnits = splitAudio(bytesOf(audio));
    EXPECT_TRUE(!videoUnits.empty() && analyzer.IsAccessUnitStart(videoUnits.front(), media.sps, media.pps));
    analyzer.ConvertVideo(videoUnits, media.video);
    analyzer.ConvertAudio(audioUnits, media.audio);
    EXPECT_EQ(media.video.size(), pictures);
    EXPECT_GE(media.audio.size(), audioFrames);
    return media;
}
