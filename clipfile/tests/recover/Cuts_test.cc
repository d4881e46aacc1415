// Recordings that are cut anywhere, recovered, and compared byte for byte with what the recorder makes of the
// same pictures.

#include "recover/RecoveryFixture.h"
#include "support/BoxFinder.h"

namespace clipfile {
namespace {

constexpr unsigned kSeed = 20261121;
constexpr int kCuts = 100;
constexpr std::size_t kMdat = 192;  // where the samples of a normal file begin

class CutsTest : public RecoveryFixture {};

TEST_F(CutsTest, ANormalFileIsRecoveredUpToItsLastWholePicture) {
    const test_stream::Stream stream = test_stream::MakeCodedStream(24);
    const test_stream::Recording plan = {"normal", clipfileModule::RecordRules::kExact, true};
    test_stream::Record(path("like.mp4"), plan, stream);
    test_stream::Record(path("open.mp4"), {plan.type, plan.rules, false}, stream);
    const Data whole = test_stream::ReadAll(path("open.mp4"));
    std::mt19937 random(kSeed);
    for (int i = 0; i < kCuts; ++i) {
        const std::size_t cut = std::uniform_int_distribution<std::size_t>(kMdat, whole.size())(random);
        const std::size_t pictures = picturesBefore(stream, 0, stream.chunks.size(), kMdat, cut);
        expectRecovered(whole, cut, stream, pictures, plan, {path("like.mp4"), {}, false});
    }
}

class FragmentCutsTest : public CutsTest, public testing::WithParamInterface<clipfileModule::RecordRules> {};

INSTANTIATE_TEST_SUITE_P(Rules, FragmentCutsTest,
                         testing::Values(clipfileModule::RecordRules::kKept,
                                         clipfileModule::RecordRules::kExact),
                         [](const auto& instance) {
                             return instance.param == clipfileModule::RecordRules::kKept ? "Kept" : "Exact";
                         });

TEST_P(FragmentCutsTest, AFragmentedFileIsRecoveredUpToItsLastWholePicture) {
    const test_stream::Stream stream = test_stream::MakePlainStream(100);
    const test_stream::Recording plan = {"fragment", GetParam(), true};
    test_stream::Record(path("closed.mp4"), plan, stream);
    const Data whole = test_stream::ReadAll(path("closed.mp4"));
    std::mt19937 random(kSeed);
    for (int i = 0; i < kCuts; ++i) {
        const std::size_t cut = std::uniform_int_distribution<std::size_t>(200, whole.size() - 1)(random);
        std::size_t pictures = 0;
        for (const std::size_t part : {0U, 1U, 2U, 3U}) {
            const auto mdat =
                box_finder::Find(whole, part == 0 ? "mdat" : "mdat:" + std::to_string(part + 1));
            pictures += picturesBefore(stream, 32 * part, 32 * part + 32, mdat.offset + 8, cut);
        }
        expectRecovered(whole, cut, stream, pictures, plan, {});
    }
}

}  // namespace
}  // namespace clipfile
