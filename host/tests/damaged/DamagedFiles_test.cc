// Files of other containers that a disk or a transfer has damaged.

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <fstream>
#include <iterator>

#include "damaged/Damage.h"
#include "damaged/DamagedFixture.h"

namespace endtoend {
namespace {

/// What happens to the bytes of a file.
using FileDamage = std::function<void(Bytes&, Random&)>;

struct FileCase {
    const char* name;
    /// The extension chooses the container.
    const char* file;
    FileDamage damage;
    Expectation expected;
    /// Options of ffmpeg that makes the file.
    std::vector<std::string> options = {};
};

std::ostream& operator<<(std::ostream& out, const FileCase& parameters) {
    return out << parameters.name;
}

/// The file ends at that share of it.
FileDamage Cut(double share) {
    return [share](Bytes& bytes, Random&) {
        bytes.resize(static_cast<std::size_t>(share * static_cast<double>(bytes.size())));
    };
}

/// So many bytes become others, from that share of the file on.
FileDamage FlipBytes(std::size_t count, double begin) {
    return [count, begin](Bytes& bytes, Random& random) {
        const auto from = static_cast<std::size_t>(begin * static_cast<double>(bytes.size()));
        for (std::size_t hit = 0; hit < count; ++hit) {
            bytes[from + random() % (bytes.size() - from)] ^= 0xFF;
        }
    };
}

/// A stretch was never written: a disk leaves zeros.
FileDamage Hole(double begin, std::size_t size) {
    return [begin, size](Bytes& bytes, Random&) {
        const auto from =
            bytes.begin() + static_cast<std::ptrdiff_t>(begin * static_cast<double>(bytes.size()));
        std::fill_n(from, size, static_cast<unsigned char>(0));
    };
}

class DamagedFileTest : public DamagedFixture, public ::testing::WithParamInterface<FileCase> {};

TEST_P(DamagedFileTest, IsRecordedInStepOrRefusedWithASentence) {
    const DamagedMaterial& material = DamagedMaterial::Get();
    const auto file = folder.Path() / GetParam().file;
    std::vector<std::string> command{"ffmpeg", "-v", "error", "-i", material.file.string(), "-c", "copy"};
    command.insert(command.end(), GetParam().options.begin(), GetParam().options.end());
    command.push_back(file.string());
    const Outcome made = RunProgram(command);
    ASSERT_EQ(made.code, 0) << made.errors;
    std::ifstream in(file, std::ios::binary);
    const Bytes bytes{std::istreambuf_iterator<char>(in), {}};
    in.close();
    Bytes damaged = bytes;
    Random random(1);
    GetParam().damage(damaged, random);
    const Intact intact = IntactOf(file, bytes, damaged);
    WritePieces({damaged}, file);
    const auto receiver = Start(FastOptions(file));
    ExpectEnd(*receiver, GetParam().expected, intact);
}

const std::vector<std::string> kIndexFirst{"-movflags", "faststart"};
const std::vector<std::string> kFragments{"-bsf:a", "aac_adtstoasc", "-movflags", "frag_keyframe+delay_moov"};
const Expectation kCut{.code = kUnavailable, .sentence = "before the length that it announces"};
/// Media have no checksum: what was flipped in a picture is recorded, and what was flipped around it may be
/// lost.
const Expectation kFlipped{.maybeUnharmed = true, .sentence = "the source has gaps", .damaged = 20};
/// Of the pictures at its edges a part is left.
const Expectation kHole{.sentence = "the source has gaps", .damaged = 2};
/// Where a Matroska cluster goes on behind a hole, nobody knows before the next block that is found.
const Expectation kClusterHole{.sentence = "the source has gaps", .besides = {10, 19}, .damaged = 2};

INSTANTIATE_TEST_SUITE_P(
    All, DamagedFileTest,
    ::testing::Values(
        FileCase{"Mp4Whole", "a.mp4", Cut(1), {.code = kEverything}},
        FileCase{"Mp4WithoutItsIndex",
                 "a.mp4",
                 Cut(0.6),
                 {.code = kUnavailable, .sentence = "carries nothing that is known", .refused = true}},
        FileCase{"Mp4Cut", "a.mp4", Cut(0.6), kCut, kIndexFirst},
        FileCase{"Mp4Flipped", "a.mp4", FlipBytes(20, 0.1), kFlipped, kIndexFirst},
        FileCase{"Mp4Hole", "a.mp4", Hole(0.5, 5000), kHole, kIndexFirst},
        // No header tells how long a file is that grows.
        FileCase{"FragmentsCut",
                 "a.mp4",
                 Cut(0.6),
                 {.maybeUnharmed = true, .sentence = "lost: 1 unit"},
                 kFragments},
        FileCase{"FragmentsHole", "a.mp4", Hole(0.5, 5000), kHole, kFragments},
        FileCase{"MkvCut", "a.mkv", Cut(0.6), kCut},
        FileCase{"MkvFlipped", "a.mkv", FlipBytes(20, 0.1), kFlipped},
        FileCase{"MkvHole", "a.mkv", Hole(0.5, 5000), kClusterHole},
        FileCase{"FlvCut", "a.flv", Cut(0.6), kCut},
        FileCase{"FlvFlipped", "a.flv", FlipBytes(20, 0.1), kFlipped},
        FileCase{"FlvHole", "a.flv", Hole(0.5, 5000), kHole}),
    ::testing::PrintToStringParamName());

}  // namespace
}  // namespace endtoend
