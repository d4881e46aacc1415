#include "damaged/Intact.h"

#include <gtest/gtest.h>

#include "damaged/Damage.h"
#include "damaged/DamagedFixture.h"

namespace endtoend {
namespace {

const DamagedMaterial& Material() {
    return DamagedMaterial::Get();
}

/// The first packet behind that share of the stream in which a unit of the PID begins, or goes on.
std::size_t FindPacket(int pid, bool begins) {
    const Pieces& pieces = Material().pieces;
    std::size_t at = pieces.size() / 2;
    while (PidOf(pieces[at]) != pid || BeginsUnit(pieces[at]) != begins) {
        ++at;
    }
    return at;
}

Intact WithChange(std::size_t at, const std::function<void(Pieces&, std::size_t)>& change) {
    Pieces pieces = Material().pieces;
    change(pieces, at);
    return IntactOf(Material().pieces, pieces);
}

void Erase(Pieces& pieces, std::size_t at) {
    pieces.erase(pieces.begin() + static_cast<std::ptrdiff_t>(at));
}

// Eight seconds, and the frame of sound with which an encoder begins.
constexpr std::size_t kPictures = 200;
constexpr std::size_t kSounds = 376;

TEST(IntactTest, EverythingComesThroughWhereNothingIsChanged) {
    const Intact intact = IntactOf(Material().pieces, Material().pieces);
    EXPECT_EQ(intact.pictures.size(), kPictures);
    EXPECT_EQ(intact.sounds.size(), Material().media.audio.size());
    EXPECT_NEAR(static_cast<double>(intact.sounds.size()), static_cast<double>(kSounds), 1);
}

TEST(IntactTest, APacketThatIsMissingOrChangedCostsItsOwnUnit) {
    const std::size_t at = FindPacket(kVideoPid, false);
    const Intact without = WithChange(at, Erase);
    EXPECT_EQ(without.pictures.size(), kPictures - 1);
    EXPECT_EQ(without.sounds.size(), Material().media.audio.size());
    const Intact flipped =
        WithChange(at, [](Pieces& pieces, std::size_t place) { pieces[place].back() ^= 0xFF; });
    EXPECT_EQ(flipped.pictures, without.pictures);
    const Intact erroneous =
        WithChange(at, [](Pieces& pieces, std::size_t place) { pieces[place][1] |= 0x80; });
    EXPECT_EQ(erroneous.pictures, without.pictures);
}

TEST(IntactTest, APacketOfSoundCostsAllFramesOfItsUnit) {
    const Intact without = WithChange(FindPacket(kAudioPid, false), Erase);
    EXPECT_EQ(without.pictures.size(), kPictures);
    const std::size_t lost = Material().media.audio.size() - without.sounds.size();
    EXPECT_GE(lost, 5U);
    EXPECT_LE(lost, 12U);
}

TEST(OwedTest, ALostPictureTakesItsSoundAlong) {
    Intact intact = IntactOf(Material().pieces, Material().pieces);
    const Owed all = OwedOf(intact, Material().media);
    EXPECT_EQ(all.pictures, kPictures);
    // 8 seconds are 375 frames.
    EXPECT_NEAR(static_cast<double>(all.sounds), 373, 1);
    intact.pictures.erase(100);
    const Owed owed = OwedOf(intact, Material().media);
    EXPECT_EQ(owed.pictures, kPictures - 1);
    // 40 ms are two frames, and two at each edge.
    EXPECT_NEAR(static_cast<double>(all.sounds - owed.sounds), 5, 1);
}

TEST(OwedTest, BehindMoreThanHalfASecondTheNextIdrFrameBegins) {
    Intact intact = IntactOf(Material().pieces, Material().pieces);
    for (std::size_t number = 95; number < 95 + 12; ++number) {
        intact.pictures.erase(number);
    }
    EXPECT_EQ(OwedOf(intact, Material().media).pictures, kPictures - 12);
    // From 108 to 109 there is nothing to begin with.
    intact.pictures.erase(107);
    EXPECT_EQ(OwedOf(intact, Material().media).pictures, kPictures - 13 - 2);
}

TEST(OwedTest, ARecordingBeginsWithAnIdrFrame) {
    Intact intact = IntactOf(Material().pieces, Material().pieces);
    intact.pictures.erase(0);
    EXPECT_EQ(OwedOf(intact, Material().media).pictures, kPictures - 10);
}

}  // namespace
}  // namespace endtoend
