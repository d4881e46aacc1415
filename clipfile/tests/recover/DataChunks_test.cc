#include "recover/DataChunks.h"

#include <gtest/gtest.h>

#include <random>

#include "support/ByteFile.h"
#include "support/SystemCalls.h"
#include "support/TestStream.h"

namespace clipfile {
namespace {

using byte_file::ByteFile;
using byte_file::Join;
using byte_file::Number;
using test_stream::Data;

/// A NAL unit of eight bytes behind its length.
Data Unit(unsigned char header, bool startsPicture) {
    const auto slice = static_cast<unsigned char>(startsPicture ? 0x88 : 0x48);
    return Join({Number(8, 4), {header, slice, 0x91, 0x92, 0x93, 0x94, 0x95, 0x96}});
}
const Data kIdr = Unit(0x65, true);
const Data kPicture = Unit(0x41, true);
const Data kNextSlice = Unit(0x41, false);
const Data kMessage = Unit(0x06, true);

Data Units(std::size_t count) {
    Data units;
    for (std::size_t i = 0; i < count; ++i) {
        units = Join({units, test_stream::MakeUnit(true, {1, 2, 3, static_cast<unsigned char>(i), false})});
    }
    return units;
}

/// Sizes of metadata units, audio frames and pictures, by chunk, as "2/0/12 12".
std::vector<std::string> ChunksOf(const Data& data) {
    const ByteFile bytes(data);
    const InputFile file(bytes.Path());
    DataChunks chunks(file, 0, file.Size(), SampleClock(25000, 1000));
    std::vector<std::string> found;
    while (const Chunk chunk = chunks.Next()) {
        std::string text =
            std::to_string(chunk->meta.size()) + "/" + std::to_string(chunk->audio.size()) + "/";
        for (const auto& picture : chunk->video) {
            text += " " + std::to_string(picture->GetDataSize()) + (picture->GetSync() ? "i" : "");
        }
        found.push_back(text);
    }
    return found;
}

TEST(DataChunks, AreMetadataAndPicturesInTurn) {
    EXPECT_EQ(ChunksOf(Join({Units(2), kIdr, kPicture, Units(3), kPicture, kPicture, kPicture})),
              (std::vector<std::string>{"2/0/ 12i 12", "3/0/ 12 12 12"}));
}

TEST(DataChunks, SlicesAndMessagesBelongToTheirPicture) {
    EXPECT_EQ(ChunksOf(Join({Units(2), kMessage, kIdr, kNextSlice, kMessage, kPicture, kNextSlice, Units(1),
                             kPicture, kNextSlice})),
              (std::vector<std::string>{"2/0/ 36i 36", "1/0/ 24"}));
}

TEST(DataChunks, PicturesOfTwoFieldsAreOneSample) {
    EXPECT_EQ(ChunksOf(Join(
                  {Units(2), kIdr, kPicture, kPicture, kPicture, Units(2), kPicture, kPicture, kPicture})),
              (std::vector<std::string>{"2/0/ 24i 24", "1/0/ 24"}));
}

TEST(DataChunks, TheTimecodeAtTheEndIsNoPicture) {
    EXPECT_EQ(ChunksOf(Join({Units(1), kIdr, Number(111582, 4)})), (std::vector<std::string>{"1/0/ 12i"}));
}

TEST(DataChunks, APictureThatLacksItsLastSliceIsLeftOut) {
    const Data first = Join({Units(2), kIdr, kNextSlice, kPicture, kNextSlice});
    const std::string whole = "2/0/ 24i 24";
    EXPECT_EQ(ChunksOf(Join({first, Units(3), kPicture, kNextSlice, kPicture})),
              (std::vector<std::string>{whole, "1/0/ 24"}));
    // Inside of the slice.
    Data cut = Join({first, Units(3), kPicture, kNextSlice, kPicture, kNextSlice});
    cut.resize(cut.size() - 3);
    EXPECT_EQ(ChunksOf(cut), (std::vector<std::string>{whole, "1/0/ 24"}));
}

TEST(DataChunks, AChunkThatEndsWithTheFileIsWhole) {
    // The last picture has fewer slices than the one before it.
    EXPECT_EQ(ChunksOf(Join({Units(2), kIdr, kNextSlice, kPicture})),
              (std::vector<std::string>{"2/0/ 24i 12"}));
}

TEST(DataChunks, MetadataMayHoldMoreThanPackets) {
    Data unit = Units(1);
    const Data other = {0x55, 0x66, 0x77};
    unit.insert(unit.begin() + 52, other.begin(), other.end());
    EXPECT_EQ(ChunksOf(Join({unit, Units(1), kIdr, kPicture})), (std::vector<std::string>{"2/0/ 12i 12"}));
}

TEST(DataChunks, WhatIsNoPacketIsNotReadAgainForEachUnit) {
    const SystemCallGuard guard;
    Data unit = Units(1);
    const Data other = {0x55, 0x66, 0x77};
    unit.insert(unit.begin() + 52, other.begin(), other.end());
    Data bytes;
    constexpr std::size_t kUnits = 64;
    for (std::size_t i = 0; i < kUnits; ++i) {
        bytes = Join({bytes, unit});
    }
    // Pictures of 256 KiB, so that the file is longer than what is read at a time.
    Data picture = kIdr;
    picture.resize(256 * 1024, 0x91);
    const Data length = Number(picture.size() - 4, 4);
    std::copy(length.begin(), length.end(), picture.begin());
    for (std::size_t i = 0; i < kUnits; ++i) {
        bytes.insert(bytes.end(), picture.begin(), picture.end());
    }
    EXPECT_EQ(ChunksOf(bytes).size(), 1U);
    // To find the samples, to read them, and what windows share.
    EXPECT_LT(SystemCalls().bytesRead, 4 * bytes.size());
}

TEST(DataChunks, EndWhereOtherBytesFollow) {
    const Data chunk = Join({Units(2), kIdr, kPicture});
    EXPECT_EQ(ChunksOf(Join({chunk, Data(5000, 0)})), (std::vector<std::string>{"2/0/ 12i 12"}));
    EXPECT_EQ(ChunksOf(Join({chunk, Data(5000, 0xFF)})), (std::vector<std::string>{"2/0/ 12i 12"}));
    EXPECT_TRUE(ChunksOf(Data(5000, 0)).empty());
    EXPECT_TRUE(ChunksOf(Units(3)).empty());
    EXPECT_TRUE(ChunksOf({1}).empty());
}

TEST(DataChunks, AnyBytesAreBorne) {
    std::mt19937 random(7);
    const Data chunk = Join({Units(2), kMessage, kIdr, kNextSlice, kPicture, kNextSlice});
    const Data good = Join({chunk, chunk, chunk});
    for (int i = 0; i < 300; ++i) {
        Data bytes = good;
        for (int faults = 0; faults < 3; ++faults) {
            bytes[random() % bytes.size()] = static_cast<unsigned char>(random());
        }
        EXPECT_LE(ChunksOf(bytes).size(), 3U);
    }
}

}  // namespace
}  // namespace clipfile
