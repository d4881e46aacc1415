// Properties that every box of the registry proves, and the proof that every box is in it.
#include "boxlib/support/registry.h"

#include <filesystem>
#include <fstream>
#include <regex>
#include <set>

namespace {

class EveryBox : public BoxTest, public testing::WithParamInterface<size_t> {
 protected:
    const BoxRow& row() const { return BoxRows()[GetParam()]; }

    // A built sample, or null after a failure. Ownership passes to the caller.
    MbxStatus build(void** box) {
        *box = nullptr;
        void* record = MbxAlloc(context, MBX_MEMORY_CLASS, row().recordSize);
        if (record == nullptr) return MBX_ERR_NO_MEMORY;
        const MbxStatus status = row().build(context, &options, record);
        if (status != MBX_OK) {
            EXPECT_EQ(row().free(context, record), MBX_OK);
            return status;
        }
        *box = record;
        return MBX_OK;
    }

    uint64_t sizeOf(const void* box) const { return *static_cast<const uint64_t*>(box); }
};

TEST_P(EveryBox, HasTheGoldenBytes) {
    void* box = nullptr;
    ASSERT_EQ(build(&box), MBX_OK);
    uint64_t written = 0;
    EXPECT_EQ(row().write(context, &options, &file, 0, box, &written, nullptr), MBX_OK);
    ASSERT_FALSE(row().golden.empty());
    EXPECT_BYTES(file.bytes, row().golden);
    EXPECT_EQ(row().free(context, box), MBX_OK);
}

TEST_P(EveryBox, MeasuresWhatItWritesInEverySizeMode) {
    for (uint32_t mode = 0; mode <= 2; mode++) {
        SCOPED_TRACE(mode);
        options.box_size_mode = mode;
        void* box = nullptr;
        ASSERT_EQ(build(&box), MBX_OK);
        uint64_t measured = 0;
        EXPECT_EQ(row().write(context, &options, nullptr, 0, box, &measured, nullptr), MBX_OK);
        MemoryFile target;
        uint64_t written = 0;
        EXPECT_EQ(row().write(context, &options, &target, 0, box, &written, nullptr), MBX_OK);
        EXPECT_EQ(measured, sizeOf(box));
        EXPECT_EQ(written, sizeOf(box));
        EXPECT_EQ(target.bytes.size(), sizeOf(box));
        EXPECT_EQ(row().free(context, box), MBX_OK);

        const Bytes code(row().code.begin(), row().code.end());
        ASSERT_GE(target.bytes.size(), 8U);
        EXPECT_EQ(Bytes(target.bytes.begin() + 4, target.bytes.begin() + 8), code);
        if (mode == 2) {
            EXPECT_EQ(Bytes(target.bytes.begin(), target.bytes.begin() + 4), Hex("00000001"));
        }
    }
}

TEST_P(EveryBox, StandsAtThePositionGivenAndAddsToTheCounter) {
    void* box = nullptr;
    ASSERT_EQ(build(&box), MBX_OK);
    uint64_t accumulated = 1000;
    EXPECT_EQ(row().write(context, &options, &file, 333, box, nullptr, &accumulated), MBX_OK);
    EXPECT_EQ(accumulated, 1000 + sizeOf(box));
    EXPECT_BYTES(file.bytes, Repeat(0, 333) + row().golden);
    EXPECT_EQ(row().free(context, box), MBX_OK);
}

TEST_P(EveryBox, TreatsANullRecordAsItsKindSays) {
    uint64_t written = 77;
    uint64_t accumulated = 88;
    const MbxStatus status = row().write(context, &options, &file, 0, nullptr, &written, &accumulated);
    if (row().presence == Presence::kOptional) {
        EXPECT_EQ(status, MBX_OK);
        EXPECT_EQ(written, 0U);
    } else {
        EXPECT_EQ(status, MBX_ERR_INVALID_ARG);
        EXPECT_EQ(written, 77U);
    }
    EXPECT_EQ(accumulated, 88U);
    EXPECT_TRUE(file.bytes.empty());
}

TEST_P(EveryBox, FreesNullAndRefusesANullContext) {
    EXPECT_EQ(row().free(context, nullptr), MBX_OK);
    EXPECT_EQ(row().free(nullptr, nullptr), MBX_ERR_INVALID_ARG);
}

TEST_P(EveryBox, RefusesAnUnknownSizeMode) {
    options.box_size_mode = 3;
    void* box = nullptr;
    EXPECT_EQ(build(&box), MBX_ERR_INVALID_ARG);
}

TEST_P(EveryBox, ReportsAndSurvivesEveryRefusedAllocation) {
    for (uint64_t n = 1;; n++) {
        SCOPED_TRACE(n);
        ASSERT_LT(n, 10000U);
        const size_t before = host.live.size();
        host.allocations = 0;
        host.failAllocation = n;
        void* box = nullptr;
        MbxStatus status = build(&box);
        if (status == MBX_OK) status = row().write(context, &options, &file, 0, box, nullptr, nullptr);
        host.failAllocation = 0;
        EXPECT_EQ(row().free(context, box), MBX_OK);
        EXPECT_EQ(host.live.size(), before);
        if (host.allocations < n) {
            EXPECT_EQ(status, MBX_OK);
            break;
        }
        EXPECT_EQ(status, MBX_ERR_NO_MEMORY);
    }
}

TEST_P(EveryBox, ReportsEveryFailedAndShortWriteAndFailedSeek) {
    void* box = nullptr;
    ASSERT_EQ(build(&box), MBX_OK);
    ASSERT_EQ(row().write(context, &options, &file, 0, box, nullptr, nullptr), MBX_OK);
    const size_t live = host.live.size();
    for (uint64_t n = 1; n <= file.writes; n++) {
        MemoryFile failing;
        failing.failWrite = n;
        EXPECT_EQ(row().write(context, &options, &failing, 0, box, nullptr, nullptr), MBX_ERR_IO) << n;
        MemoryFile shortened;
        shortened.shortWrite = n;
        EXPECT_EQ(row().write(context, &options, &shortened, 0, box, nullptr, nullptr), MBX_ERR_IO) << n;
    }
    for (uint64_t n = 1; n <= file.seeks; n++) {
        MemoryFile failing;
        failing.failSeek = n;
        uint64_t written = 77;
        EXPECT_EQ(row().write(context, &options, &failing, 0, box, &written, nullptr), MBX_ERR_IO) << n;
        EXPECT_EQ(written, 77U);
    }
    EXPECT_EQ(host.live.size(), live);
    EXPECT_EQ(row().free(context, box), MBX_OK);
}

std::vector<size_t> allRows() {
    std::vector<size_t> indexes(BoxRows().size());
    for (size_t i = 0; i < indexes.size(); i++) indexes[i] = i;
    return indexes;
}

INSTANTIATE_TEST_SUITE_P(Registry, EveryBox, testing::ValuesIn(allRows()),
                         [](const auto& box) { return BoxRows()[box.param].name; });
GTEST_ALLOW_UNINSTANTIATED_PARAMETERIZED_TEST(EveryBox);

// Names of the functions that the headers of the box families declare with the given pattern.
std::set<std::string> declaredNames(const std::string& pattern) {
    static const std::set<std::string> kShared = {"box.h", "stream.h"};  // their helpers are named alike
    const std::regex expression("MbxStatus " + pattern + "\\(.*");
    std::set<std::string> names;
    for (const auto& entry : std::filesystem::recursive_directory_iterator(BOXLIB_SOURCE_DIR)) {
        if (entry.path().extension() != ".h" || kShared.contains(entry.path().filename())) continue;
        std::ifstream header(entry.path());
        for (std::string line; std::getline(header, line);) {
            std::smatch match;
            if (line.starts_with("MbxStatus ") && std::regex_match(line, match, expression)) {
                names.insert(match[1]);
            }
        }
    }
    return names;
}

TEST(Registry, HoldsEveryBoxThatTheLibraryBuilds) {
    std::set<std::string> registered;
    for (const BoxRow& row : BoxRows()) {
        EXPECT_TRUE(registered.insert(row.name).second) << row.name << " is registered twice";
    }
    EXPECT_EQ(declaredNames("MbxBuild(\\w+)"), registered);
}

TEST(Registry, FindsTheFourFunctionsOfEveryBox) {
    const std::set<std::string> built = declaredNames("MbxBuild(\\w+)");
    EXPECT_EQ(declaredNames("MbxWrite(\\w+)Box"), built);
    EXPECT_EQ(declaredNames("MbxWrite([A-Z0-9]\\w*)Payload"), built);
    for (const std::string& name : built) EXPECT_TRUE(declaredNames("MbxFree(\\w+)").contains(name)) << name;
}

TEST(Registry, HasACompleteRowForEveryBox) {
    for (const BoxRow& row : BoxRows()) {
        SCOPED_TRACE(row.name);
        EXPECT_EQ(row.code.size(), 4U);
        EXPECT_FALSE(row.parents.empty());
        EXPECT_FALSE(row.clause.empty());
        EXPECT_FALSE(row.golden.empty());
        EXPECT_TRUE(row.build && row.write && row.free);
    }
}

}  // namespace
