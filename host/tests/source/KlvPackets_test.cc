#include "source/KlvPackets.h"

#include <gtest/gtest.h>

namespace receiver {
namespace {

const std::string kLabel("\x06\x0E\x2B\x34\x02\x0B\x01\x01\x0E\x01\x03\x01\x01\x00\x00\x00", 16);

std::string Short(char value) {
    return kLabel + std::string("\x02", 1) + std::string(2, value);
}
std::string Long(std::size_t size, char value) {
    return kLabel + "\x82" + static_cast<char>(size >> 8) + static_cast<char>(size & 0xFF) +
           std::string(size, value);
}
/// `fragment`: 3 whole, 2 first, 0 middle, 1 last.
std::string Cell(unsigned int fragment, const std::string& data) {
    return std::string("\x00\x07", 2) + static_cast<char>(fragment << 6 | 0x0F) +
           static_cast<char>(data.size() >> 8) + static_cast<char>(data.size() & 0xFF) + data;
}

class KlvPacketsTest : public testing::Test {
 protected:
    std::vector<std::string> Take(const std::string& payload) {
        return packets_.Take({reinterpret_cast<const unsigned char*>(payload.data()), payload.size()});
    }
    using List = std::vector<std::string>;

    KlvPackets packets_;
};

TEST_F(KlvPacketsTest, OnePacketPasses) {
    EXPECT_EQ(Take(Short('a')), List{Short('a')});
    EXPECT_EQ(Take(Long(300, 'b')), List{Long(300, 'b')});
    EXPECT_EQ(packets_.Damaged(), 0u);
}

TEST_F(KlvPacketsTest, SeveralPacketsAreTakenApart) {
    EXPECT_EQ(Take(Short('a') + Long(200, 'b') + Short('c')), (List{Short('a'), Long(200, 'b'), Short('c')}));
}

TEST_F(KlvPacketsTest, APacketThatIsCutShortIsDamaged) {
    EXPECT_EQ(Take(Short('a') + Long(200, 'b').substr(0, 100)), List{Short('a')});
    EXPECT_EQ(packets_.Damaged(), 1u);
}

TEST_F(KlvPacketsTest, LengthsThatCannotBeAreDamaged) {
    // Indefinite, more than eight digits, and longer than can be counted.
    EXPECT_EQ(Take(kLabel + "\x80" + "ab"), List{});
    EXPECT_EQ(Take(kLabel + "\x89" + std::string(9, '\x01')), List{});
    EXPECT_EQ(Take(kLabel + "\x88" + std::string(8, '\xFF') + "ab"), List{});
    EXPECT_EQ(packets_.Damaged(), 3u);
}

TEST_F(KlvPacketsTest, BytesThatAreNoKlvAreDamaged) {
    EXPECT_EQ(Take("abc"), List{});
    EXPECT_EQ(Take(std::string(100, 'x')), List{});
    EXPECT_EQ(packets_.Damaged(), 2u);
}

TEST_F(KlvPacketsTest, AccessUnitCellsAreUnpacked) {
    EXPECT_EQ(Take(Cell(3, Short('a'))), List{Short('a')});
    EXPECT_EQ(Take(Cell(3, Short('a')) + Cell(3, Long(200, 'b'))), (List{Short('a'), Long(200, 'b')}));
    EXPECT_EQ(packets_.Damaged(), 0u);
}

TEST_F(KlvPacketsTest, APacketInSeveralCellsIsPutTogether) {
    const std::string packet = Long(300, 'b');
    EXPECT_EQ(Take(Cell(2, packet.substr(0, 100))), List{});
    EXPECT_EQ(Take(Cell(0, packet.substr(100, 100))), List{});
    EXPECT_EQ(Take(Cell(1, packet.substr(200))), List{packet});
    EXPECT_EQ(packets_.Damaged(), 0u);
}

TEST_F(KlvPacketsTest, AnUnfinishedPacketEndsWithTheNextBeginning) {
    EXPECT_EQ(Take(Cell(2, Long(300, 'b').substr(0, 100))), List{});
    EXPECT_EQ(Take(Cell(3, Short('a'))), List{Short('a')});
    EXPECT_EQ(packets_.Damaged(), 1u);
}

}  // namespace
}  // namespace receiver
