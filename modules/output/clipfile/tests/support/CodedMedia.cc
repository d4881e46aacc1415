#include "support/CodedMedia.h"

#include <gtest/gtest.h>
#include <sys/wait.h>

#include <cstdlib>
#include <cstring>
#include <fstream>
#include <iterator>

#include "support/ElementaryStreams.h"

namespace {

std::string textOf(const std::filesystem::path& path) {
    std::ifstream in(path, std::ios::binary);
    return {std::istreambuf_iterator<char>(in), std::istreambuf_iterator<char>()};
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
    auto videoUnits = elementary_streams::ReadAccessUnits(video);
    auto audioUnits = elementary_streams::ReadAudioFrames(audio);
    EXPECT_TRUE(!videoUnits.empty() && analyzer.IsAccessUnitStart(videoUnits.front(), media.sps, media.pps));
    analyzer.ConvertVideo(videoUnits, media.video);
    analyzer.ConvertAudio(audioUnits, media.audio);
    EXPECT_EQ(media.video.size(), pictures);
    EXPECT_GE(media.audio.size(), audioFrames);
    return media;
}
