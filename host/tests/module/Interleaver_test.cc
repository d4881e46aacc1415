#include "module/Interleaver.h"

#include <gtest/gtest.h>

#include <string>

namespace receiver {
namespace {

SourceUnit Unit(Medium medium, std::int64_t time) {
    SourceUnit unit;
    unit.medium = medium;
    unit.time = time;
    return unit;
}

/// What comes out: 'v', 'a', 'k' with the time in milliseconds.
std::string TakeAll(Interleaver& interleaver) {
    std::string text;
    while (const auto unit = interleaver.Take()) {
        const bool audio = unit->medium == Medium::kAudio;
        text += audio ? " a" : unit->medium == Medium::kVideo ? " v" : " k";
        text += std::to_string(unit->time / (audio ? 48 : 90));
    }
    return text;
}

void PutVideo(Interleaver& interleaver, std::int64_t milliseconds) {
    interleaver.Put(Unit(Medium::kVideo, milliseconds * 90));
}
void PutAudio(Interleaver& interleaver, std::int64_t milliseconds) {
    interleaver.Put(Unit(Medium::kAudio, milliseconds * 48));
}
void PutKlv(Interleaver& interleaver, std::int64_t milliseconds) {
    interleaver.Put(Unit(Medium::kKlv, milliseconds * 90));
}

TEST(Interleaver, HoldsAUnitUntilTheOtherMediumHasReachedIt) {
    Interleaver interleaver;
    PutVideo(interleaver, 0);
    PutVideo(interleaver, 40);
    EXPECT_EQ(TakeAll(interleaver), "");
    PutAudio(interleaver, 10);
    EXPECT_EQ(TakeAll(interleaver), " v0 a10");
    PutAudio(interleaver, 50);
    EXPECT_EQ(TakeAll(interleaver), " v40");
}

TEST(Interleaver, AudioThatTheSourceSendsLateComesInItsPlace) {
    Interleaver interleaver;
    for (std::int64_t frame = 0; frame < 20; ++frame) {
        PutVideo(interleaver, frame * 40);
    }
    EXPECT_EQ(TakeAll(interleaver), "");
    PutAudio(interleaver, 30);
    PutAudio(interleaver, 90);
    EXPECT_EQ(TakeAll(interleaver), " v0 a30 v40 v80 a90");
}

TEST(Interleaver, TheRestComesInOrderWhenTheSourceIsLostAndWaitingGoesOnBehindIt) {
    Interleaver interleaver;
    PutVideo(interleaver, 0);
    PutKlv(interleaver, 40);
    PutVideo(interleaver, 40);
    EXPECT_EQ(interleaver.TakeRest()->time, 0);
    EXPECT_EQ(interleaver.TakeRest()->medium, Medium::kKlv);
    EXPECT_EQ(interleaver.TakeRest()->medium, Medium::kVideo);
    EXPECT_FALSE(interleaver.TakeRest());
    PutVideo(interleaver, 5000);
    EXPECT_EQ(TakeAll(interleaver), "");
    PutAudio(interleaver, 5010);
    EXPECT_EQ(TakeAll(interleaver), " v5000");
}

TEST(Interleaver, AtTheSameInstantKlvComesBeforeVideoAndVideoBeforeAudio) {
    Interleaver interleaver;
    PutAudio(interleaver, 40);
    PutVideo(interleaver, 40);
    PutKlv(interleaver, 40);
    EXPECT_EQ(TakeAll(interleaver), " k40 v40 a40");
}

TEST(Interleaver, NobodyWaitsForKlv) {
    Interleaver interleaver;
    PutVideo(interleaver, 0);
    PutAudio(interleaver, 0);
    EXPECT_EQ(TakeAll(interleaver), " v0 a0");
}

TEST(Interleaver, AMediumThatHasFallenSilentHoldsUpTwoSecondsAtTheMost) {
    Interleaver interleaver;
    PutVideo(interleaver, 0);
    PutVideo(interleaver, 2000);
    EXPECT_EQ(TakeAll(interleaver), "");
    PutVideo(interleaver, 2040);
    EXPECT_EQ(TakeAll(interleaver), " v0");
}

TEST(Interleaver, AtTheEndEverythingComesInItsOrder) {
    Interleaver interleaver;
    interleaver.Put(Unit(Medium::kAudio, 48));
    interleaver.Put(Unit(Medium::kVideo, 0));
    interleaver.Put(Unit(Medium::kVideo, 180));
    std::string media;
    while (const auto unit = interleaver.TakeRest()) {
        media += unit->medium == Medium::kVideo ? 'v' : 'a';
    }
    EXPECT_EQ(media, "vav");
}

// 15 ticks of 90000 are 8 of 48000; in milliseconds all three units are at 0.
TEST(Interleaver, ComparesWithoutRounding) {
    Interleaver interleaver;
    interleaver.Put(Unit(Medium::kVideo, 15));
    interleaver.Put(Unit(Medium::kAudio, 7));
    interleaver.Put(Unit(Medium::kAudio, 8));
    std::string media;
    while (const auto unit = interleaver.Take()) {
        media += unit->medium == Medium::kVideo ? 'v' : 'a';
    }
    EXPECT_EQ(media, "ava");
}

}  // namespace
}  // namespace receiver
