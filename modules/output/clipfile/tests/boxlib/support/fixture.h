// The fixture that all tests of the box library share: a counting host, a context, and bytes written as text.
#pragma once

#include <gtest/gtest.h>

#include "boxlib/core/context.h"
#include "boxlib/support/memory_host.h"

using Bytes = std::vector<uint8_t>;

// Bytes from text: pairs of hexadecimal digits, spaces as liked, and characters between single quotes.
// Adjacent literals let each field stand on a line of its own with its name behind it:
//     Hex("0000000C 'mfhd'"  // size, type
//         "00000000"         // version, flags
Bytes Hex(const std::string& text);

// `count` times the same byte.
Bytes Repeat(uint8_t byte, size_t count);

// Big-endian words as bytes, for tables with many equal rows.
Bytes Words(std::initializer_list<uint32_t> words);

// One after the other.
Bytes operator+(Bytes a, const Bytes& b);

// A hexadecimal dump of 16 bytes a line with offsets.
std::string Dump(const Bytes& bytes);

// Compares bytes; a failure shows the first lines of the two dumps that differ.
testing::AssertionResult SameBytes(const char* actualText, const char* expectedText, const Bytes& actual,
                                   const Bytes& expected);
#define EXPECT_BYTES(actual, expected) EXPECT_PRED_FORMAT2(SameBytes, actual, expected)

// A host and a context. What a test leaves allocated fails it.
class BoxTest : public testing::Test {
 protected:
    void SetUp() override {
        const MbxCallbacks callbacks = host.callbacks();
        ASSERT_EQ(MbxCreateContext(&callbacks, &context), MBX_OK);
    }

    void TearDown() override {
        EXPECT_EQ(MbxDestroyContext(context), MBX_OK);
        EXPECT_TRUE(host.live.empty()) << host.live.size() << " blocks leaked";
    }

    MemoryHost host;
    MbxContext* context = nullptr;
    MbxOptions options = {};  // all modes 0
    MemoryFile file;
};

// The same with a session, destroyed at the end. The configuration can be set before CreateSession.
class SessionTest : public BoxTest {
 protected:
    void CreateSession() { ASSERT_EQ(MbxSessionCreate(context, &config, &session), MBX_OK); }

    void TearDown() override {
        EXPECT_EQ(MbxSessionDestroy(session), MBX_OK);
        BoxTest::TearDown();
    }

    MbxSessionConfig config = {};
    MbxSession* session = nullptr;
};
