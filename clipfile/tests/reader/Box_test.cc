#include "reader/Box.h"

#include <gtest/gtest.h>

#include "reader/BigEndian.h"
#include "reader/FormatError.h"
#include "support/ByteFile.h"

namespace clipfile {
namespace {

using byte_file::ByteFile;
using byte_file::Data;
using byte_file::Join;
using byte_file::MakeBox;
using byte_file::Number;
using byte_file::Text;
using byte_file::Words;

/// "type@offset+size" of all boxes of a tree, or the fault.
std::vector<std::string> TreeOf(const InputFile& file) {
    std::vector<std::string> lines;
    WalkTree(file, [&](const TreeItem& item) {
        lines.push_back(std::string(static_cast<std::size_t>(item.depth), ' ') +
                        (item.fault.empty()
                             ? FourCcText(item.box.type) + "@" + std::to_string(item.box.offset) + "+" +
                                   std::to_string(item.box.size)
                             : item.fault));
        return true;
    });
    return lines;
}

TEST(BoxCursor, ReadsSmallAndLargeHeaders) {
    const ByteFile bytes(Join({MakeBox("ftyp", {Words({1, 2})}),  //
                               Number(1, 4), Text("mdat"), Number(20, 8), Words({7})}));
    const InputFile file(bytes.Path());
    BoxCursor cursor(file, 0, file.Size());
    const auto small = cursor.Next();
    ASSERT_TRUE(small);
    EXPECT_EQ(small->type, FourCc("ftyp"));
    EXPECT_EQ(small->Payload(), 8U);
    EXPECT_EQ(small->PayloadSize(), 8U);
    const auto large = cursor.Next();
    ASSERT_TRUE(large);
    EXPECT_EQ(large->offset, 16U);
    EXPECT_EQ(large->Payload(), 32U);
    EXPECT_EQ(large->PayloadSize(), 4U);
    EXPECT_FALSE(large->IsTorn());
    EXPECT_FALSE(cursor.Next());
    EXPECT_EQ(cursor.Fault(), "");
}

TEST(BoxCursor, ASizeOfZeroReachesToTheEnd) {
    const ByteFile bytes(Join({Number(0, 4), Text("mdat"), Words({1, 2, 3})}));
    const InputFile file(bytes.Path());
    const auto box = BoxCursor(file, 0, file.Size()).Next();
    ASSERT_TRUE(box);
    EXPECT_EQ(box->size, 20U);
    EXPECT_FALSE(box->IsTorn());
}

TEST(BoxCursor, ABoxThatIsTooLongIsTornAndEndsWithWhatHoldsIt) {
    const ByteFile bytes(Join({Number(1000, 4), Text("mdat"), Words({1})}));
    const InputFile file(bytes.Path());
    BoxCursor cursor(file, 0, file.Size());
    const auto box = cursor.Next();
    ASSERT_TRUE(box);
    EXPECT_TRUE(box->IsTorn());
    EXPECT_EQ(box->end, 12U);
    EXPECT_FALSE(cursor.Next());
}

TEST(BoxCursor, ASizeBelowTheHeaderStopsTheWalk) {
    for (const Data& head : {Words({7, 0}), Join({Number(1, 4), Text("mdat"), Number(15, 8)})}) {
        const ByteFile bytes(head);
        const InputFile file(bytes.Path());
        BoxCursor cursor(file, 0, file.Size());
        EXPECT_FALSE(cursor.Next());
        EXPECT_NE(cursor.Fault(), "");
        EXPECT_FALSE(cursor.Next());
    }
}

TEST(BoxCursor, ALargeSizeThatWrapsIsTorn) {
    const ByteFile bytes(Join({Words({0}), Number(1, 4), Text("mdat"), Number(UINT64_MAX, 8)}));
    const InputFile file(bytes.Path());
    const auto box = BoxCursor(file, 4, file.Size()).Next();
    ASSERT_TRUE(box);
    EXPECT_TRUE(box->IsTorn());
    EXPECT_EQ(box->end, file.Size());
}

TEST(BoxCursor, BytesThatAreTooFewForABoxAreAFault) {
    const ByteFile bytes({0, 0, 0, 8, 'f', 'r', 'e'});
    const InputFile file(bytes.Path());
    BoxCursor cursor(file, 0, file.Size());
    EXPECT_FALSE(cursor.Next());
    EXPECT_EQ(cursor.Fault(), "Too few bytes for a box at 0.");
}

TEST(WalkTree, EntersContainersAndSampleEntries) {
    const Data entry = MakeBox("avc1", {Data(78, 0), MakeBox("avcC", {Words({0})})});
    const ByteFile bytes(MakeBox("moov", {MakeBox("stsd", {Words({0, 1}), entry})}));
    const InputFile file(bytes.Path());
    EXPECT_EQ(TreeOf(file),
              (std::vector<std::string>{"moov@0+122", " stsd@8+114", "  avc1@24+98", "   avcC@110+12"}));
}

TEST(WalkTree, GoesOnBehindAContainerWithBrokenContents) {
    const ByteFile bytes(Join({MakeBox("moov", {Words({3, 0})}), MakeBox("free", {})}));
    const InputFile file(bytes.Path());
    EXPECT_EQ(TreeOf(file), (std::vector<std::string>{
                                "moov@0+16", " No box: its size would be 3 bytes, at 8.", "free@16+8"}));
}

TEST(WalkTree, DoesNotFollowContainersWithoutEnd) {
    Data nested;
    for (int i = 0; i < 10000; ++i) {
        nested = MakeBox("moov", {nested});
        if (i % 100 == 0 && nested.size() > 50000) {
            break;
        }
    }
    const ByteFile bytes(nested);
    const InputFile file(bytes.Path());
    EXPECT_EQ(TreeOf(file).size(), static_cast<std::size_t>(kMaxDepth));
}

TEST(InputFile, APlaceBeyondTheEndIsAFormatError) {
    const ByteFile bytes(Words({1, 2}));
    const InputFile file(bytes.Path());
    EXPECT_EQ(file.Read(4, 4), Words({2}));
    EXPECT_THROW(file.Read(5, 4), FormatError);
    EXPECT_THROW(file.Read(UINT64_MAX, 1), FormatError);
}

}  // namespace
}  // namespace clipfile
