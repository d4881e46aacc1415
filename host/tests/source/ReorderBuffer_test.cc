#include "source/ReorderBuffer.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <string>
#include <vector>

namespace receiver {
namespace {

using testing::ElementsAre;

constexpr std::int64_t kPictureTicks = 3600;
constexpr int kVideoStream = 0;
constexpr int kSoundStream = 1;

class ReorderBufferTest : public testing::Test {
 protected:
    ReorderBufferTest() : format_(avformat_alloc_context()) {
        video_ = avformat_new_stream(format_, nullptr);
        video_->time_base = {1, 90000};
        video_->pts_wrap_bits = 33;
        Make(2);
    }
    ~ReorderBufferTest() override { avformat_free_context(format_); }

    void Make(std::uint32_t depth) { buffer_.emplace(*video_, depth, kPictureTicks); }
    static libav::Owner<AVPacket> PacketAt(std::int64_t pts, int stream) {
        auto packet = libav::NewPacket();
        packet->pts = pts;
        packet->stream_index = stream;
        return packet;
    }
    /// A picture that is shown as the `place`-th one.
    void Put(std::int64_t place, bool idr = false) {
        buffer_->Put(PacketAt(place * kPictureTicks, kVideoStream), idr);
    }
    void PutIdr(std::int64_t place) { Put(place, true); }
    /// What need not wait: "4@1" is the picture shown as number 4 whose turn is number 1, "a" is sound.
    std::vector<std::string> Taken() {
        std::vector<std::string> taken;
        while (const auto next = buffer_->Take()) {
            if (next->packet->stream_index != kVideoStream) {
                taken.emplace_back("a");
            } else if (!next->turn) {
                taken.emplace_back(next->late ? "late" : "-");
            } else {
                taken.push_back(std::to_string(*next->shown / kPictureTicks) + "@" +
                                std::to_string(*next->turn / kPictureTicks));
            }
        }
        return taken;
    }

    AVFormatContext* format_;
    AVStream* video_ = nullptr;
    std::optional<ReorderBuffer> buffer_;
};

TEST_F(ReorderBufferTest, TurnsAreKnownWhenAsManyPicturesHaveComeAsMayBeDecodedAhead) {
    // I0 P4 B2 b1 b3: I0 is shown first, b1 when P4 and B2 have been decoded.
    PutIdr(0);
    Put(4);
    EXPECT_THAT(Taken(), ElementsAre());
    Put(2);
    EXPECT_THAT(Taken(), ElementsAre("0@0"));
    Put(1);
    EXPECT_THAT(Taken(), ElementsAre("4@1"));
    Put(3);
    EXPECT_THAT(Taken(), ElementsAre("2@2"));
    buffer_->End();
    EXPECT_THAT(Taken(), ElementsAre("1@3", "3@4"));
}

TEST_F(ReorderBufferTest, WhatComesBesideThePicturesKeepsItsPlace) {
    PutIdr(0);
    buffer_->Put(PacketAt(77, kSoundStream), false);
    Put(2);
    EXPECT_THAT(Taken(), ElementsAre());
    Put(1);
    EXPECT_THAT(Taken(), ElementsAre("0@0", "a"));
}

TEST_F(ReorderBufferTest, AMissingPictureLeavesItsOwnTurnFree) {
    // B2 of I0 P4 B2 b1 b3, P8 B6 b5 b7 is missing.
    PutIdr(0);
    for (const std::int64_t place : {4, 1, 3, 8, 6, 5, 7}) {
        Put(place);
    }
    buffer_->End();
    EXPECT_THAT(Taken(), ElementsAre("0@0", "4@1", "1@3", "3@4", "8@5", "6@6", "5@7", "7@8"));
}

TEST_F(ReorderBufferTest, BehindAnIdrPictureNothingIsShownInFrontOfIt) {
    PutIdr(0);
    Put(2);
    Put(1);
    // The clock goes back by an hour.
    PutIdr(-90000);
    EXPECT_THAT(Taken(), ElementsAre("0@0", "2@1", "1@2"));
    Put(-89998);
    Put(-89999);
    buffer_->End();
    EXPECT_THAT(Taken(), ElementsAre("-90000@-90000", "-89998@-89999", "-89999@-89998"));
}

TEST_F(ReorderBufferTest, AStepThatNoReorderingTakesIsOneOfTheClock) {
    PutIdr(0);
    for (const std::int64_t place : {2, 1, -1000, -998, -999}) {
        Put(place);
    }
    buffer_->End();
    EXPECT_THAT(Taken(), ElementsAre("0@0", "2@1", "1@2", "-1000@-1000", "-998@-999", "-999@-998"));
}

TEST_F(ReorderBufferTest, StampsThatWrapGoOn) {
    constexpr std::int64_t kSpan = std::int64_t{1} << 33;
    buffer_->Put(PacketAt(kSpan - 2 * kPictureTicks, kVideoStream), true);
    for (const std::int64_t stamp : {kPictureTicks, kSpan - kPictureTicks, std::int64_t{0}}) {
        buffer_->Put(PacketAt(stamp, kVideoStream), false);
    }
    buffer_->End();
    std::vector<std::int64_t> turns;
    while (const auto next = buffer_->Take()) {
        turns.push_back((*next->turn - kSpan) / kPictureTicks);
    }
    EXPECT_THAT(turns, ElementsAre(-2, -1, 0, 1));
}

TEST_F(ReorderBufferTest, APictureBehindItsTurnIsLate) {
    Make(1);
    PutIdr(0);
    Put(4);
    Put(2);
    EXPECT_THAT(Taken(), ElementsAre("0@0", "4@2"));
    Put(1);
    EXPECT_THAT(Taken(), ElementsAre("late"));
    Put(3);
    buffer_->End();
    EXPECT_THAT(Taken(), ElementsAre("1@3", "3@4"));
}

TEST_F(ReorderBufferTest, DamagedPicturesAndSuchWithoutAStampTakeNoTurn) {
    PutIdr(0);
    auto damaged = PacketAt(99 * kPictureTicks, kVideoStream);
    damaged->flags |= AV_PKT_FLAG_CORRUPT;
    buffer_->Put(std::move(damaged), false);
    buffer_->Put(PacketAt(AV_NOPTS_VALUE, kVideoStream), false);
    Put(1);
    buffer_->End();
    EXPECT_THAT(Taken(), ElementsAre("0@0", "-", "-", "1@1"));
}

TEST_F(ReorderBufferTest, WhatWaitsIsGivenBackAsItCame) {
    PutIdr(0);
    buffer_->Put(PacketAt(77, kSoundStream), false);
    std::vector<std::int64_t> stamps;
    for (const auto& packet : buffer_->TakeRest()) {
        stamps.push_back(packet->pts);
    }
    EXPECT_THAT(stamps, ElementsAre(0, 77));
    buffer_->End();
    EXPECT_THAT(Taken(), ElementsAre());
}

}  // namespace
}  // namespace receiver
