#include "recover/UnfinishedFiles.h"

#include <gtest/gtest.h>

#include "support/TempDir.h"
#include "support/TestStream.h"

namespace clipfile {
namespace {

TEST(UnfinishedFiles, AreThoseThatAreNotKnownToBeClosed) {
    const TempDir folder;
    const std::filesystem::path day = folder.Path() / "20261121" / "CAM1";
    std::filesystem::create_directories(day);
    const test_stream::Stream stream = test_stream::MakePlainStream(1);
    constexpr auto kRules = clipfileModule::RecordRules::kExact;
    test_stream::Record(day / "closed.MP4", {"normal", kRules, true}, stream);
    test_stream::Record(day / "b.MP4", {"normal", kRules, false}, stream);
    test_stream::Record(folder.Path() / "a.MP4", {"fragment", kRules, false}, stream);
    test_stream::WriteAll(day / "other.MP4", {1, 2, 3});
    test_stream::WriteAll(day / "empty.MP4", {});
    EXPECT_EQ(UnfinishedIn(folder.Path()).files,
              (std::vector<std::string>{(day / "b.MP4").string(), (day / "empty.MP4").string(),
                                        (day / "other.MP4").string(), (folder.Path() / "a.MP4").string()}));
}

TEST(UnfinishedFiles, HoldNothingWhenTheyEndInFrontOfTheirSamples) {
    const TempDir folder;
    const std::filesystem::path path = folder.Path() / "a.MP4";
    test_stream::Record(path, {"normal", clipfileModule::RecordRules::kExact, false},
                        test_stream::MakePlainStream(1));
    EXPECT_FALSE(HoldsNothing(path));
    const test_stream::Data whole = test_stream::ReadAll(path);
    for (const std::size_t size : {0U, 8U, 100U}) {
        test_stream::WriteAll(path, {whole.begin(), whole.begin() + static_cast<std::ptrdiff_t>(size)});
        EXPECT_TRUE(HoldsNothing(path)) << size;
    }
    std::filesystem::remove(path);
    EXPECT_FALSE(HoldsNothing(path)) << "nobody knows";
}

}  // namespace
}  // namespace clipfile
