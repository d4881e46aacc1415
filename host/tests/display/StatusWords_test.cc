#include "display/StatusWords.h"

#include <gtest/gtest.h>

#include <set>

namespace receiver {
namespace {

TEST(StatusWords, EachDocumentedPairHasItsOwnWords) {
    const std::pair<int, int> pairs[] = {{0, 0},  {3, 0},  {4, 0},  {6, 22}, {6, 23}, {6, 24},
                                         {6, 25}, {6, 26}, {7, 2},  {7, 21}, {7, 22}, {7, 23},
                                         {7, 24}, {7, 25}, {7, 26}, {7, 27}};
    std::set<std::string> words;
    for (const auto& [status, cause] : pairs) {
        const std::string text = StatusWords({status, cause});
        EXPECT_EQ(text.find("cause"), std::string::npos) << text;
        EXPECT_TRUE(words.insert(text).second) << text;
    }
    EXPECT_EQ(StatusWords({6, 22}), "the disk is too slow: more than 48 chunks wait for it");
    EXPECT_EQ(StatusWords({7, 23}), "the disk is full: less than 150 MiB are free");
}

TEST(StatusWords, AnUnknownPairGivesItsNumbers) {
    EXPECT_EQ(StatusWords({6, 99}), "status 6, cause 99");
}

}  // namespace
}  // namespace receiver
