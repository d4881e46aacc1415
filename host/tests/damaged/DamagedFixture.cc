#include "damaged/DamagedFixture.h"

#include <gmock/gmock.h>

#include <cmath>

#include "support/FrameJudge.h"
#include "support/Judges.h"
#include "support/Material.h"

namespace endtoend {
namespace {

/// A run takes a second or two. What takes longer hangs, also with a sanitizer on a busy machine.
constexpr std::chrono::seconds kDeadline{60};

constexpr double kPicture = 1.0 / 25;
constexpr double kSound = 1024.0 / 48000;

/// The number of packets that ffprobe finds.
std::string packetsOf(const nlohmann::json& answer, const std::string& type) {
    return StreamOf(answer, type).value("nb_read_packets", "");
}

void expectWholeFile(const std::filesystem::path& recording, const FrameJudge::Verdict& verdict) {
    const auto answer = AskFfprobe(recording);
    EXPECT_EQ(packetsOf(answer, "video"), std::to_string(verdict.pictures));
    EXPECT_EQ(packetsOf(answer, "audio"), std::to_string(verdict.sounds));
    // The two end together, each to the nearest audio frame.
    EXPECT_NEAR(static_cast<double>(verdict.sounds) * kSound,
                static_cast<double>(verdict.pictures) * kPicture, kSound / 2 + 0.0005);
}

}  // namespace

DamagedMaterial::DamagedMaterial() {
    MaterialOptions options;
    options.size = "96x64";
    options.seconds = 8;
    options.more = {
        "-filter_complex", "anoisesrc=sample_rate=48000:seed=7:amplitude=0.2[noise]", "-map", "0:v", "-map",
        "[noise]"};
    file = MakeMaterial(folder, options);
    pieces = ReadPieces(file);
}

const DamagedMaterial& DamagedMaterial::Get() {
    static const DamagedMaterial material;
    return material;
}

std::vector<std::string> DamagedFixture::FastOptions(const std::filesystem::path& input) {
    return {"--input", input.string(), "--speed", "1000", "--timecode", "10:00:00:00"};
}

void DamagedFixture::ExpectEnd(Process& receiver, const Expectation& expected,
                               const std::filesystem::path& sent) const {
    const auto code = receiver.Wait(kDeadline);
    ASSERT_TRUE(code) << "it hangs: " << receiver.AllText();
    EXPECT_THAT(*code, ::testing::AnyOf(expected.code, expected.otherCode.value_or(expected.code)));
    EXPECT_THAT(receiver.Errors(), ::testing::HasSubstr(expected.sentence));
    FrameJudge judge;
    judge.AddSent(sent);
    FrameJudge::Verdict all;
    for (const auto& recording : Recordings()) {
        SCOPED_TRACE(recording);
        const FrameJudge::Verdict one = judge.Judge(recording);
        expectWholeFile(recording, one);
        all += one;
    }
    EXPECT_GE(all.pictures - all.unknownPictures, expected.pictures);
    EXPECT_LE(all.unknownPictures, expected.damaged);
    EXPECT_LE(all.outOfStep, expected.outOfStep);
    if (expected.pictures > 0 && expected.audio) {
        EXPECT_GT(all.sounds, all.unknownSounds) << "silence";
    }
    if (::testing::Test::HasFailure()) {
        ADD_FAILURE() << receiver.Errors() << "pictures " << all.pictures << ", damaged "
                      << all.unknownPictures << ", missing " << all.missingPictures << "; sounds "
                      << all.sounds << ", silence " << all.unknownSounds << ", missing " << all.missingSounds;
    }
}

}  // namespace endtoend
