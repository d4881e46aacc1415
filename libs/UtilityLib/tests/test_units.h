#pragma once

#include <cstdint>
#include <cstring>
#include <initializer_list>
#include <memory>
#include <vector>

#include "StreamAnalyzer.h"

/// Bytes and units of the tests.
namespace nal_access::testing {

using ByteVector = std::vector<unsigned char>;

inline ByteVector Join(std::initializer_list<ByteVector> parts) {
    ByteVector joined;
    for (const auto& part : parts) {
        joined.insert(joined.end(), part.begin(), part.end());
    }
    return joined;
}

/// A unit whose payload is a heap block of exactly its size, so that a read outside is seen by the sanitizer.
inline std::shared_ptr<StreamData> MakeUnit(const ByteVector& bytes, std::uint64_t rtpTimestamp = 0,
                                            std::uint64_t timestamp = 0) {
    auto unit = std::make_shared<StreamData>();
    unit->rtp_timestamp = rtpTimestamp;
    unit->timestamp = timestamp;
    unit->data.reset(new unsigned char[bytes.size()], std::default_delete<unsigned char[]>());
    if (!bytes.empty()) {
        std::memcpy(unit->data.get(), bytes.data(), bytes.size());
    }
    unit->size = bytes.size();
    unit->payload = unit->data.get();
    return unit;
}

inline ByteVector BytesOf(SampleData& sample) {
    return {sample.GetData(), sample.GetData() + sample.GetDataSize()};
}
inline ByteVector BytesOf(const NalUnit& unit) {
    return {unit.data.get(), unit.data.get() + unit.size};
}

inline const ByteVector kStart4 = {0, 0, 0, 1};
inline const ByteVector kStart3 = {0, 0, 1};
inline const ByteVector kDelimiter = {0x09, 0x10};
/// profile 66, level 30; the bit string behind begins 1: identifier 0. kSps1: 010, identifier 1.
inline const ByteVector kSps0 = {0x67, 0x42, 0xC0, 0x1E, 0x95, 0xA0};
inline const ByteVector kSps1 = {0x67, 0x42, 0xC0, 0x1E, 0x55, 0xA0};
/// Identifier 0 again, level 31.
inline const ByteVector kSps0Other = {0x67, 0x42, 0xC0, 0x1F, 0x95, 0xA0};
/// Picture and sequence identifier: 1 1 (0, 0), 010 010 (1, 1), 010 1 (1, 0).
inline const ByteVector kPps0 = {0x68, 0xCE, 0x3C, 0x80};
inline const ByteVector kPps1Sps1 = {0x68, 0x4A, 0x3C, 0x80};
inline const ByteVector kPps1Sps0 = {0x68, 0x5E, 0x3C, 0x80};
/// first_mb_in_slice 1 (0), slice_type 0001000 (7), pic_parameter_set_id 1 (0) or 010 (1).
inline const ByteVector kIdrPps0 = {0x65, 0x88, 0x84, 0x21, 0xFF};
inline const ByteVector kIdrPps1 = {0x65, 0x88, 0x44, 0x21, 0xFF};
/// first_mb_in_slice 010 (1), slice_type 0001000, pic_parameter_set_id 1.
inline const ByteVector kIdrSecondSlice = {0x65, 0x42, 0x3F, 0x77};
/// first_mb_in_slice 1 (0), slice_type 00110 (5), pic_parameter_set_id 1 (0).
inline const ByteVector kSlice = {0x41, 0x9A, 0x21, 0x55};

/// A metadata packet with the label of a local set; `value` is at most 127 bytes long.
inline ByteVector LocalSet(const ByteVector& value) {
    return Join({{0x01, 0x06, 0x0E, 0x2B, 0x34, 0x02, 0x53, 0x01, 0x01, 0x0C, 0x02, 0x01, 0x01, 0x7F, 0x01,
                  0x00, 0x00},
                 {static_cast<unsigned char>(value.size())},
                 value});
}
inline const ByteVector kOwnIdentifier = {0xE0, 0x00, 0x00, 0x10, 0x9B, 0x1F, 0x5C, 0x2E, 0x4D, 0x60,
                                          0x4A, 0x17, 0xA6, 0x3B, 0x0E, 0x72, 0xD8, 0x41, 0xC5, 0x93};
inline const ByteVector kOtherIdentifier = {0xE0, 0x00, 0x00, 0x10, 0x10, 0x11, 0x12, 0x13, 0x14, 0x15,
                                            0x16, 0x17, 0x18, 0x19, 0x1A, 0x1B, 0x1C, 0x1D, 0x1E, 0x1F};
inline const ByteVector kFlagOn = {0xE1, 0x01, 0x00, 0x01, 0x01};
inline const ByteVector kFlagOff = {0xE1, 0x01, 0x00, 0x01, 0x00};
inline ByteVector TimecodeItem(unsigned char hours, unsigned char minutes, unsigned char seconds,
                               unsigned char frames, unsigned char flags) {
    return {0xE1, 0x02, 0x00, 0x05, hours, minutes, seconds, frames, flags};
}
/// Another packet of the kind that sources carry: a UAS local set (MISB ST 0601) of four bytes.
inline const ByteVector kForeignPacket = {0x01, 0x06, 0x0E, 0x2B, 0x34, 0x02, 0x0B, 0x01, 0x01, 0x0E, 0x01,
                                          0x03, 0x01, 0x01, 0x00, 0x00, 0x00, 0x04, 0x01, 0x02, 0xAB, 0xCD};
/// The block that the recorder adds to every metadata sample.
inline const ByteVector kBlock = {
    0x01, 0x06, 0x0E, 0x2B, 0x34, 0x02, 0x53, 0x01, 0x01, 0x0C, 0x02, 0x01, 0x01, 0x7F, 0x01, 0x00,
    0x00, 0x83, 0x00, 0x00, 0x2B, 0xE0, 0x00, 0x00, 0x10, 0x85, 0x1D, 0x08, 0x00, 0x46, 0x78, 0x03,
    0x1C, 0xE8, 0x1F, 0x06, 0xF5, 0xA8, 0x84, 0x11, 0xE2, 0x85, 0x00, 0x00, 0x04, 0x02, 0x03, 0x00,
    0x00, 0x85, 0x09, 0x00, 0x01, 0x56, 0x85, 0x12, 0x00, 0x06, 0x57, 0x47, 0x53, 0x2D, 0x38, 0x34};

}  // namespace nal_access::testing
