#include "buffer/PresentationOrder.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <cstdint>
#include <set>
#include <vector>

namespace clipfileModule {
namespace {

using ::testing::ElementsAre;

struct TimedPicture {
    std::uint64_t shown;
    bool isIdr = false;
};

/// Places all, each with so many of the following ones known, up to the next IDR frame.
std::vector<std::int32_t> placeAll(PresentationOrder& order, const std::vector<TimedPicture>& pictures,
                                   std::size_t known = 100) {
    std::vector<std::uint64_t> times;
    for (const TimedPicture& picture : pictures) {
        times.push_back(picture.shown);
    }
    std::vector<std::int32_t> later;
    for (std::size_t i = 0; i < pictures.size(); ++i) {
        std::size_t end = i + 1;
        while (end < pictures.size() && end <= i + known && !pictures[end].isIdr) {
            ++end;
        }
        later.push_back(order.Place(times.data() + i, end - i, pictures[i].isIdr));
    }
    return later;
}
/// Where each is shown, counted from the first.
std::vector<std::int64_t> placesOf(const std::vector<std::int32_t>& later, std::int64_t delay) {
    std::vector<std::int64_t> places;
    for (std::size_t i = 0; i < later.size(); ++i) {
        places.push_back(static_cast<std::int64_t>(i) + later[i] - delay);
    }
    return places;
}

class PresentationOrderTest : public ::testing::Test {
 protected:
    PresentationOrder order;
};

TEST_F(PresentationOrderTest, PicturesThatAreShownAsTheyAreDecodedAreNotMoved) {
    order.Begin(0);
    EXPECT_THAT(placeAll(order, {{100, true}, {103}, {106}, {109}}), ElementsAre(0, 0, 0, 0));
}

TEST_F(PresentationOrderTest, APyramidOfThreeIsShownInTheOrderOfItsTimes) {
    order.Begin(2);
    // I0 P4 B2 b1 b3, P8 B6 b5 b7: each waits for two others at the most.
    EXPECT_THAT(placeAll(order, {{0, true}, {40}, {20}, {10}, {30}, {80}, {60}, {50}, {70}}),
                ElementsAre(2, 5, 2, 0, 1, 5, 2, 0, 1));
}

TEST_F(PresentationOrderTest, TimesThatJitterByLessThanHalfAPictureChangeNothing) {
    order.Begin(2);
    EXPECT_THAT(placeAll(order, {{3, true}, {36}, {24}, {6}, {34}, {77}, {64}, {46}, {74}}),
                ElementsAre(2, 5, 2, 0, 1, 5, 2, 0, 1));
}

TEST_F(PresentationOrderTest, TheGapOfALostPictureCloses) {
    order.Begin(2);
    // Without B2, on which nothing rests.
    EXPECT_THAT(placesOf(placeAll(order, {{0, true}, {40}, {10}, {30}, {80}, {60}, {50}, {70}}), 2),
                ElementsAre(0, 3, 1, 2, 7, 5, 4, 6));
}

TEST_F(PresentationOrderTest, AnIdrFrameBeginsAnewWhateverItsTimeIs) {
    order.Begin(1);
    // The clock of the source begins again.
    EXPECT_THAT(placeAll(order, {{900, true}, {920}, {910}, {0, true}, {20}, {10}}, 2),
                ElementsAre(1, 2, 0, 1, 2, 0));
}

TEST_F(PresentationOrderTest, NoPlaceIsTakenTwiceWhateverTheTimesAre) {
    std::uint32_t random = 1;
    const auto next = [&] { return random = random * 1664525 + 1013904223; };
    for (int record = 0; record < 50; ++record) {
        constexpr std::int64_t kDelay = 1000;  // none is shown at once
        order.Begin(kDelay);
        std::vector<TimedPicture> pictures;
        for (int i = 0; i < 200; ++i) {
            pictures.push_back({(next() >> 8) % 500, i == 0});
        }
        const auto places = placesOf(placeAll(order, pictures, next() >> 29), kDelay);
        EXPECT_EQ(std::set<std::int64_t>(places.begin(), places.end()).size(), places.size());
        EXPECT_GE(*std::min_element(places.begin(), places.end()), 0);
    }
}

TEST_F(PresentationOrderTest, APictureWhosePlaceHasGoneByComesAtTheNextFreeOneAndMovesAllThatFollow) {
    order.Begin(0);
    // I0 P2 b1, P4 b3, and the same behind an IDR frame.
    EXPECT_THAT(placeAll(order, {{0, true}, {20}, {10}, {40}, {30}, {50, true}, {70}, {60}}),
                ElementsAre(0, 1, 1, 2, 0, 1, 2, 0));
    EXPECT_TRUE(order.IsClosed());
}

TEST_F(PresentationOrderTest, NoPictureIsShownBeforeItsDecodingNorTwoAtATimeWhateverTheTimesAre) {
    std::uint32_t random = 1;
    const auto next = [&] { return random = random * 1664525 + 1013904223; };
    for (int record = 0; record < 50; ++record) {
        order.Begin(record % 4);
        std::vector<TimedPicture> pictures;
        for (int i = 0; i < 200; ++i) {
            pictures.push_back({(next() >> 8) % 500, i % 37 == 0});
        }
        const auto later = placeAll(order, pictures, next() >> 29);
        EXPECT_GE(*std::min_element(later.begin(), later.end()), 0);
        const auto places = placesOf(later, 0);
        EXPECT_EQ(std::set<std::int64_t>(places.begin(), places.end()).size(), places.size());
    }
}

TEST_F(PresentationOrderTest, TheDelayIsThatOfThePictureThatWaitsForMostOthers) {
    EXPECT_EQ(PresentationOrder::FindDelay({}), 0);
    EXPECT_EQ(PresentationOrder::FindDelay({0, 10, 20}), 0);
    EXPECT_EQ(PresentationOrder::FindDelay({0, 40, 20, 10, 30}), 2);
    EXPECT_EQ(PresentationOrder::FindDelay({0, 40, 10, 20, 30}), 1);
    EXPECT_EQ(PresentationOrder::FindDelay({0, 10, 20, 60, 50, 40, 30}), 3);
}

TEST_F(PresentationOrderTest, TheOrderIsClosedWhenAllSoFarAreShownBeforeTheOthers) {
    order.Begin(2);
    const std::uint64_t times[] = {0, 40, 20, 10, 30, 80};
    for (std::size_t i = 0; i < 5; ++i) {
        order.Place(times + i, 6 - i, i == 0);
        EXPECT_EQ(order.IsClosed(), i == 0 || i == 4) << i;
    }
}

TEST_F(PresentationOrderTest, AnIdrFrameForgetsTheTimesBeforeIt) {
    order.Begin(0);
    placeAll(order, {{900, true}, {910}, {0, true}, {10}});
    EXPECT_THAT(order.Latest(), ElementsAre(0u, 10u));
    EXPECT_EQ(order.CountFrom(10), 1u);
}

TEST_F(PresentationOrderTest, CountsWhatIsShownAtAnInstantOrBehindIt) {
    order.Begin(2);
    placeAll(order, {{0, true}, {40}, {20}, {10}, {30}});
    EXPECT_EQ(order.CountFrom(41), 0u);
    EXPECT_EQ(order.CountFrom(40), 1u);
    EXPECT_EQ(order.CountFrom(25), 2u);
    order.Begin(2);
    EXPECT_EQ(order.CountFrom(0), 0u);
}

}  // namespace
}  // namespace clipfileModule
