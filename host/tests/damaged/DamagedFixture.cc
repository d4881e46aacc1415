#include "damaged/DamagedFixture.h"

#include <gmock/gmock.h>

#include <algorithm>
#include <array>
#include <cmath>
#include <sstream>

#include "support/FrameJudge.h"
#include "support/Judges.h"
#include "support/Material.h"

namespace endtoend {
namespace {

/// A run takes a second or two. What takes longer hangs, also with a sanitizer on a busy machine.
constexpr std::chrono::seconds kDeadline{60};

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

/// Lines of a run in which nothing happened that was not asked for.
bool isOrdinary(const std::string& line) {
    constexpr std::array kBeginnings{"source: H.264",     "recorded: video 1 ",
                                     "module: buffering", "recording at ",
                                     "not recording at ", "recording begins with the next IDR frame",
                                     "writing ",          "closed  "};
    return std::any_of(kBeginnings.begin(), kBeginnings.end(),
                       [&line](const char* begin) { return line.starts_with(begin); });
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
    media = ReadCodedMedia(file);
}

const DamagedMaterial& DamagedMaterial::Get() {
    static const DamagedMaterial material;
    return material;
}

std::vector<std::string> DamagedFixture::FastOptions(const std::filesystem::path& input) {
    return {"--input", input.string(), "--speed", "1000", "--timecode", "10:00:00:00"};
}

void DamagedFixture::ExpectTold(const std::string& lines, int code, const Expectation& expected) {
    std::vector<std::string> told;
    std::istringstream in(lines);
    for (std::string line; std::getline(in, line);) {
        if (!isOrdinary(line)) {
            told.push_back(line);
        }
    }
    const std::string sentence = code == expected.code ? expected.sentence : "";
    if (code != kEverything) {
        EXPECT_NE(sentence, "");
        EXPECT_THAT(lines, ::testing::HasSubstr(sentence));
    } else if (sentence.empty()) {
        EXPECT_THAT(told, ::testing::IsEmpty());
    } else {
        EXPECT_THAT(told, ::testing::Not(::testing::IsEmpty()));
        EXPECT_THAT(told, ::testing::Each(::testing::HasSubstr(sentence)));
    }
}

void DamagedFixture::ExpectEnd(Process& receiver, const Expectation& expected, const Intact& intact) const {
    const DamagedMaterial& material = DamagedMaterial::Get();
    const auto code = receiver.Wait(kDeadline);
    ASSERT_TRUE(code) << "it hangs: " << receiver.AllText();
    EXPECT_THAT(*code, ::testing::AnyOf(expected.code, expected.maybeUnharmed ? kEverything : expected.code));
    ExpectTold(receiver.Errors(), *code, expected);
    FrameJudge judge;
    judge.AddSent(material.file);
    FrameJudge::Verdict all;
    for (const auto& recording : Recordings()) {
        SCOPED_TRACE(recording);
        const FrameJudge::Verdict one = judge.Judge(recording);
        expectWholeFile(recording, one);
        all += one;
    }
    const Owed owed =
        expected.refused
            ? Owed()
            : OwedOf(expected.unharmed ? IntactOf(material.pieces, material.pieces) : intact, material.media);
    EXPECT_GE(all.pictures - all.unknownPictures + expected.besides.pictures, owed.pictures);
    EXPECT_GE(all.sounds - all.unknownSounds + expected.besides.sounds, owed.sounds);
    EXPECT_LE(all.unknownPictures, expected.damaged);
    EXPECT_LE(all.outOfStep, expected.outOfStep);
    if (::testing::Test::HasFailure()) {
        ADD_FAILURE() << receiver.Errors() << "owed " << owed.pictures << " pictures, " << owed.sounds
                      << " sounds; pictures " << all.pictures << ", damaged " << all.unknownPictures
                      << ", missing " << all.missingPictures << "; sounds " << all.sounds << ", silence "
                      << all.unknownSounds << ", missing " << all.missingSounds;
    }
}

}  // namespace endtoend
