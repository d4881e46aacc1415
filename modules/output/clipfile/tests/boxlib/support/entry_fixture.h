// What the tests of sample entries and of the boxes in them share.
#pragma once

#include "boxlib/entry/sample_entry.h"
#include "boxlib/support/registry.h"

// Builds a box by `build(box)`, writes it and proves that it measured what it wrote; empty after a failure.
template <typename Box, typename Build, typename Write, typename Free>
Bytes WriteBuiltBox(MbxContext* context, const MbxOptions* options, Build build, Write write, Free free) {
    Box* box = nullptr;
    EXPECT_EQ(MbxNew(context, &box), MBX_OK);
    MemoryFile file;
    EXPECT_EQ(build(box), MBX_OK);
    EXPECT_EQ(write(context, options, &file, 0, box, nullptr, nullptr), MBX_OK);
    EXPECT_EQ(box->size, file.bytes.size());
    EXPECT_EQ(free(context, box), MBX_OK);
    return file.bytes;
}

// The status of a build. What it made is released.
template <typename Box, typename Build, typename Free>
MbxStatus BuildStatus(MbxContext* context, Build build, Free free) {
    Box* box = nullptr;
    EXPECT_EQ(MbxNew(context, &box), MBX_OK);
    const MbxStatus status = build(box);
    EXPECT_EQ(free(context, box), MBX_OK);
    return status;
}

// A holder of bytes that live as long as the test program.
template <size_t size>
MbxBuffer BufferOf(uint8_t (&bytes)[size]) {
    return {bytes, size};
}

// A list of sample entries, released at the end.
class EntryTest : public BoxTest {
 protected:
    void TearDown() override {
        EXPECT_EQ(MbxReleaseSampleEntries(context, &list), MBX_OK);
        BoxTest::TearDown();
    }

    // A new entry of that kind, with code `code` where the kind has none of its own.
    MbxSampleEntry* add(uint32_t kind) {
        MbxSampleEntryRequest request = {};
        request.kind = kind;
        request.code = MbxCode("code");
        request.dataReferenceIndex = 1;
        return add(request);
    }

    MbxSampleEntry* add(const MbxSampleEntryRequest& request) {
        uint32_t index = 0;
        EXPECT_EQ(MbxAddSampleEntry(context, &list, &request, &index), MBX_OK);
        return list.entries.last;
    }

    // Gives a holder of the model bytes that are released with it.
    void assign(MbxBuffer* buffer, const Bytes& bytes) {
        ASSERT_EQ(MbxBufferAssign(context, 0, buffer, bytes.data(), bytes.size()), MBX_OK);
    }

    // Gives the model a parameter record that is released with it.
    template <typename Params>
    void give(Params** slot, const Params& params) {
        ASSERT_EQ(MbxNew(context, slot), MBX_OK);
        **slot = params;
    }

    MbxSampleEntryList list = {};
};
