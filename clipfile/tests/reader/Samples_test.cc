#include "reader/Samples.h"

#include <gtest/gtest.h>

#include "reader/BigEndian.h"
#include "reader/FormatError.h"
#include "support/ByteFile.h"

namespace clipfile {
namespace {

using byte_file::ByteFile;
using byte_file::Data;
using byte_file::MakeBox;
using byte_file::Number;
using byte_file::Words;

/// Tables of six samples: two chunks of two at 100 and 200, two of one at 300 and 400.
struct Tables {
    Data stts = MakeBox("stts", {Words({0, 2, 4, 10, 2, 20})});
    Data stsc = MakeBox("stsc", {Words({0, 2, 1, 2, 1, 3, 1, 1})});
    Data stsz = MakeBox("stsz", {Words({0, 0, 6, 1, 2, 3, 4, 5, 6})});
    Data offsets = MakeBox("stco", {Words({0, 4, 100, 200, 300, 400})});
    Data stss = MakeBox("stss", {Words({0, 2, 1, 5})});

    Data Bytes() const { return MakeBox("stbl", {stts, stsc, stsz, offsets, stss}); }
};

class SamplesTest : public testing::Test {
 protected:
    void read(const Tables& tables) {
        bytes_.emplace(tables.Bytes());
        file_.emplace(bytes_->Path());
        tables_ = ReadSampleTables(*file_, *BoxCursor(*file_, 0, file_->Size()).Next());
    }
    std::vector<Sample> samples() {
        TableSamples source(*file_, tables_);
        std::vector<Sample> all;
        while (const auto sample = source.Next()) {
            all.push_back(*sample);
        }
        return all;
    }
    template <typename Value>
    std::vector<Value> each(Value Sample::*member) {
        std::vector<Value> values;
        for (const Sample& sample : samples()) {
            values.push_back(sample.*member);
        }
        return values;
    }

    std::optional<ByteFile> bytes_;
    std::optional<InputFile> file_;
    SampleTables tables_;
};

TEST_F(SamplesTest, TablesBecomeSamples) {
    read(Tables());
    EXPECT_EQ(each(&Sample::offset), (std::vector<std::uint64_t>{100, 101, 200, 203, 300, 400}));
    EXPECT_EQ(each(&Sample::size), (std::vector<std::uint32_t>{1, 2, 3, 4, 5, 6}));
    EXPECT_EQ(each(&Sample::time), (std::vector<std::uint64_t>{0, 10, 20, 30, 40, 60}));
    EXPECT_EQ(each(&Sample::duration), (std::vector<std::uint32_t>{10, 10, 10, 10, 20, 20}));
    EXPECT_EQ(each(&Sample::isSync), (std::vector<bool>{true, false, false, false, true, false}));
    EXPECT_EQ(each(&Sample::run), (std::vector<std::uint64_t>{0, 0, 1, 1, 2, 3}));
}

TEST_F(SamplesTest, WithoutTheirTableAllAreSyncSamples) {
    Tables tables;
    tables.stss.clear();
    read(tables);
    EXPECT_EQ(each(&Sample::isSync), std::vector<bool>(6, true));
}

TEST_F(SamplesTest, OneSizeForAllTakesNoRows) {
    Tables tables;
    tables.stsz = MakeBox("stsz", {Words({0, 50, 6})});
    read(tables);
    EXPECT_EQ(each(&Sample::offset), (std::vector<std::uint64_t>{100, 150, 200, 250, 300, 400}));
}

TEST_F(SamplesTest, WideOffsetsAreRead) {
    Tables tables;
    const std::uint64_t far = 0x123456789A;
    tables.offsets =
        MakeBox("co64", {Words({0, 4}), Number(far, 8), Number(1, 8), Number(2, 8), Number(3, 8)});
    read(tables);
    EXPECT_EQ(samples().front().offset, far);
}

TEST_F(SamplesTest, ATableLongerThanItsBoxIsRefused) {
    Tables tables;
    tables.stsz = MakeBox("stsz", {Words({0, 0, 0xFFFFFFFF, 1})});
    EXPECT_THROW(read(tables), FormatError);
    tables = Tables();
    tables.stsc = MakeBox("stsc", {Words({0, 0x10000000})});
    EXPECT_THROW(read(tables), FormatError);
}

TEST_F(SamplesTest, AMissingTableIsRefused) {
    Tables tables;
    tables.stts.clear();
    EXPECT_THROW(read(tables), FormatError);
}

TEST_F(SamplesTest, TablesThatEndBeforeTheSamplesAreAFault) {
    Tables tables;
    tables.offsets = MakeBox("stco", {Words({0, 3, 100, 200, 300})});
    read(tables);
    EXPECT_THROW(samples(), FormatError);
    tables = Tables();
    tables.stts = MakeBox("stts", {Words({0, 1, 5, 10})});
    read(tables);
    EXPECT_THROW(samples(), FormatError);
}

TEST_F(SamplesTest, ChunksWithoutSamplesArePassedOver) {
    Tables tables;
    tables.stsc = MakeBox("stsc", {Words({0, 3, 1, 2, 1, 2, 0, 1, 3, 4, 1})});
    read(tables);
    EXPECT_EQ(each(&Sample::run), (std::vector<std::uint64_t>{0, 0, 2, 2, 2, 2}));
}

TEST_F(SamplesTest, RunsAreChunks) {
    read(Tables());
    TableSamples source(*file_, tables_);
    RunReader runs(source);
    const auto first = runs.Next();
    ASSERT_TRUE(first);
    EXPECT_EQ(first->offset, 100U);
    EXPECT_EQ(first->samples.size(), 2U);
    EXPECT_EQ(first->End(), 103U);
    EXPECT_EQ(runs.Next()->offset, 200U);
    EXPECT_EQ(runs.Next()->offset, 300U);
    EXPECT_EQ(runs.Next()->offset, 400U);
    EXPECT_FALSE(runs.Next());
}

TEST_F(SamplesTest, ARunThatIsTooLongIsRefused) {
    Tables tables;
    tables.stsz = MakeBox("stsz", {Words({0, 1, 100000})});
    tables.stsc = MakeBox("stsc", {Words({0, 1, 1, 100000, 1})});
    tables.stts = MakeBox("stts", {Words({0, 1, 100000, 1})});
    read(tables);
    TableSamples source(*file_, tables_);
    RunReader runs(source);
    EXPECT_THROW(runs.Next(), FormatError);
}

TEST(TableReader, ReadsRowsInAnyOrder) {
    Data rows;
    for (std::uint32_t i = 0; i < 20000; ++i) {
        const Data row = Number(i, 4);
        rows.insert(rows.end(), row.begin(), row.end());
    }
    const ByteFile bytes(MakeBox("free", {rows}));
    const InputFile file(bytes.Path());
    TableReader reader(file, MakeTable(*BoxCursor(file, 0, file.Size()).Next(), 0, 20000, 4));
    for (const std::uint32_t row : {0U, 19999U, 8191U, 8192U, 1U, 19998U}) {
        EXPECT_EQ(ReadU32(reader.Row(row)), row);
    }
}

}  // namespace
}  // namespace clipfile
