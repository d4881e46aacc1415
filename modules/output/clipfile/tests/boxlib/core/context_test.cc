#include "boxlib/core/context.h"

#include "boxlib/support/fixture.h"

namespace {

class ContextTest : public BoxTest {};

uint8_t* headerOf(void* block) {
    return static_cast<uint8_t*>(block) - 8;
}

TEST_F(ContextTest, CreateRefusesNullArguments) {
    const MbxCallbacks callbacks = host.callbacks();
    MbxContext* other = nullptr;
    EXPECT_EQ(MbxCreateContext(nullptr, &other), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxCreateContext(&callbacks, nullptr), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(other, nullptr);
}

TEST_F(ContextTest, CreateRefusesATableWithAnyEntryMissing) {
    const auto refused = [this](auto MbxCallbacks::*entry) {
        MbxCallbacks callbacks = host.callbacks();
        callbacks.*entry = nullptr;
        MbxContext* other = nullptr;
        return MbxCreateContext(&callbacks, &other) == MBX_ERR_INVALID_ARG && other == nullptr;
    };
    EXPECT_TRUE(refused(&MbxCallbacks::read));
    EXPECT_TRUE(refused(&MbxCallbacks::write));
    EXPECT_TRUE(refused(&MbxCallbacks::seek));
    EXPECT_TRUE(refused(&MbxCallbacks::tell));
    EXPECT_TRUE(refused(&MbxCallbacks::size));
    EXPECT_TRUE(refused(&MbxCallbacks::alloc));
    EXPECT_TRUE(refused(&MbxCallbacks::free));
    EXPECT_TRUE(refused(&MbxCallbacks::strncmp));
    EXPECT_TRUE(refused(&MbxCallbacks::strncpy));
    EXPECT_TRUE(refused(&MbxCallbacks::memcmp));
    EXPECT_TRUE(refused(&MbxCallbacks::memcpy));
    EXPECT_TRUE(refused(&MbxCallbacks::memmove));
    EXPECT_TRUE(refused(&MbxCallbacks::memset));
}

TEST_F(ContextTest, CreateReportsARefusedAllocation) {
    MemoryHost poor;
    poor.failAllocation = 1;
    const MbxCallbacks callbacks = poor.callbacks();
    MbxContext* other = nullptr;
    EXPECT_EQ(MbxCreateContext(&callbacks, &other), MBX_ERR_NO_MEMORY);
    EXPECT_EQ(other, nullptr);
}

TEST_F(ContextTest, CreateClearsTheContextAndCopiesTheTable) {
    EXPECT_EQ(context->callbacks.user_data, &host);
    EXPECT_EQ(context->quota_on, 0U);
    EXPECT_EQ(context->class1_limit + context->class2_limit + context->class1_used + context->class2_used,
              0U);
    ASSERT_EQ(host.live.size(), 1U);
    EXPECT_EQ(host.live.begin()->second, sizeof(MbxContext));
}

TEST_F(ContextTest, TableHasFourteenPointerSizedEntries) {
    EXPECT_EQ(sizeof(MbxCallbacks), 14 * sizeof(void*));
    EXPECT_EQ(offsetof(MbxCallbacks, user_data), 0U);
    EXPECT_EQ(offsetof(MbxCallbacks, alloc), 6 * sizeof(void*));
    EXPECT_EQ(offsetof(MbxCallbacks, memset), 13 * sizeof(void*));
}

TEST_F(ContextTest, DestroyAllowsNull) {
    EXPECT_EQ(MbxDestroyContext(nullptr), MBX_OK);
}

TEST_F(ContextTest, AllocGivesAZeroedBlockBehindItsHeader) {
    auto* block = static_cast<uint8_t*>(MbxAlloc(context, 1, 300));
    ASSERT_NE(block, nullptr);
    EXPECT_BYTES(Bytes(headerOf(block), block), Hex("'FF4' 01 00000134"));  // class 1, 300 + 8 bytes
    EXPECT_EQ(Bytes(block, block + 300), Repeat(0, 300));
    EXPECT_EQ(reinterpret_cast<uintptr_t>(block) % 8, 0U);
    MbxFree(context, block);

    block = static_cast<uint8_t*>(MbxAlloc(context, 2, 0));
    ASSERT_NE(block, nullptr);
    EXPECT_BYTES(Bytes(headerOf(block), block), Hex("'FF4' 02 00000008"));
    MbxFree(context, block);
}

TEST_F(ContextTest, AllocRefusesWhatItsHeaderCannotTell) {
    const uint64_t before = host.allocations;
    EXPECT_EQ(MbxAlloc(nullptr, 1, 16), nullptr);
    EXPECT_EQ(MbxAlloc(context, 0, 16), nullptr);
    EXPECT_EQ(MbxAlloc(context, 3, 16), nullptr);
    EXPECT_EQ(MbxAlloc(context, 1, UINT32_MAX - 7ULL), nullptr);
    EXPECT_EQ(MbxAlloc(context, 1, UINT64_MAX), nullptr);
    EXPECT_EQ(host.allocations, before);
}

TEST_F(ContextTest, AllocPassesTheLargestSizeOnToTheHost) {
    host.failAllocation = host.allocations + 1;
    EXPECT_EQ(MbxAlloc(context, 1, UINT32_MAX - 8ULL), nullptr);
    EXPECT_EQ(host.allocations, host.failAllocation);
}

TEST_F(ContextTest, FreeOfNullIsANoOp) {
    MbxFree(context, nullptr);
    MbxFree(nullptr, context);
    EXPECT_EQ(host.frees, 0U);
}

TEST_F(ContextTest, FreeLeavesABlockWithADamagedHeaderAlone) {
    const struct {
        int byte;
        uint8_t value;
    } kDamages[] = {{0, 'E'}, {1, 'G'}, {2, '5'}, {3, 0}, {3, 3}, {7, 7}};
    for (const auto& damage : kDamages) {
        auto* block = static_cast<uint8_t*>(MbxAlloc(context, 1, 16));  // header ...00000018
        ASSERT_NE(block, nullptr);
        const uint8_t sound = headerOf(block)[damage.byte];
        headerOf(block)[damage.byte] = damage.value;
        const Bytes damaged(headerOf(block), block);
        const uint64_t frees = host.frees;
        MbxFree(context, block);
        EXPECT_EQ(host.frees, frees);
        EXPECT_EQ(Bytes(headerOf(block), block), damaged);
        headerOf(block)[damage.byte] = sound;
        MbxFree(context, block);
        EXPECT_EQ(host.frees, frees + 1);
    }
}

TEST_F(ContextTest, QuotaOfZeroLimitsNothing) {
    ASSERT_EQ(MbxSetQuota(context, 0, 0, 0, 1000), MBX_OK);
    void* block = MbxAlloc(context, 1, 100000);
    EXPECT_NE(block, nullptr);
    EXPECT_EQ(context->quota_on, 0U);
    EXPECT_EQ(context->class1_used, 0U);
    MbxFree(context, block);
}

TEST_F(ContextTest, QuotaIsSharedOutByPercent) {
    ASSERT_EQ(MbxSetQuota(context, 0, 1001, 25, 751), MBX_OK);
    EXPECT_EQ(context->class2_limit, 250U);  // 250.25, truncated
    EXPECT_EQ(context->class1_limit, 751U);
    EXPECT_EQ(MbxSetQuota(context, 0, 1001, 25, 752), MBX_ERR_INVALID_ARG);
    ASSERT_EQ(MbxSetQuota(context, 0, UINT64_MAX, 100, 0), MBX_OK);
    EXPECT_EQ(context->class2_limit, UINT64_MAX);
    EXPECT_EQ(context->class1_limit, 0U);
}

TEST_F(ContextTest, QuotaRefusesBadArguments) {
    EXPECT_EQ(MbxSetQuota(nullptr, 0, 100, 0, 0), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxSetQuota(context, 1, 100, 0, 0), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxSetQuota(context, 0, 100, 101, 0), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(context->quota_on, 0U);
}

TEST_F(ContextTest, QuotaCountsBlocksWithTheirHeaders) {
    ASSERT_EQ(MbxSetQuota(context, 0, 100, 0, 0), MBX_OK);
    void* first = MbxAlloc(context, 1, 42);
    ASSERT_NE(first, nullptr);
    EXPECT_EQ(context->class1_used, 50U);
    EXPECT_EQ(MbxAlloc(context, 1, 43), nullptr);  // 51 bytes where 50 are left
    EXPECT_EQ(context->class1_used, 50U);
    void* second = MbxAlloc(context, 1, 42);
    EXPECT_NE(second, nullptr);
    EXPECT_EQ(context->class1_used, 100U);
    EXPECT_EQ(MbxAlloc(context, 2, 0), nullptr);  // class 2 got nothing
    MbxFree(context, first);
    EXPECT_EQ(context->class1_used, 50U);
    MbxFree(context, second);
    EXPECT_EQ(context->class1_used, 0U);
}

TEST_F(ContextTest, QuotaKeepsTheClassesApart) {
    ASSERT_EQ(MbxSetQuota(context, 0, 200, 50, 0), MBX_OK);
    void* one = MbxAlloc(context, 1, 92);
    void* two = MbxAlloc(context, 2, 92);
    EXPECT_NE(one, nullptr);
    EXPECT_NE(two, nullptr);
    EXPECT_EQ(context->class1_used, 100U);
    EXPECT_EQ(context->class2_used, 100U);
    MbxFree(context, two);
    EXPECT_EQ(context->class1_used, 100U);
    EXPECT_EQ(context->class2_used, 0U);
    MbxFree(context, one);
}

TEST_F(ContextTest, QuotaIsNotCreditedWithBlocksFromBeforeIt) {
    void* old = MbxAlloc(context, 1, 500);
    ASSERT_EQ(MbxSetQuota(context, 0, 100, 0, 0), MBX_OK);
    MbxFree(context, old);
    EXPECT_EQ(context->class1_used, 0U);
    EXPECT_EQ(MbxAlloc(context, 1, 93), nullptr);
}

TEST_F(ContextTest, RefusedAllocationIsNotCounted) {
    ASSERT_EQ(MbxSetQuota(context, 0, 100, 0, 0), MBX_OK);
    host.failAllocation = host.allocations + 1;
    EXPECT_EQ(MbxAlloc(context, 1, 10), nullptr);
    EXPECT_EQ(context->class1_used, 0U);
}

TEST_F(ContextTest, ScratchIsAllocatedAndReleased) {
    MbxScratch scratch = {};
    ASSERT_EQ(MbxScratchInit(context, 1, 8192, &scratch), MBX_OK);
    EXPECT_EQ(scratch.size, 8192U);
    ASSERT_NE(scratch.data, nullptr);
    MbxScratchRelease(context, &scratch);
    EXPECT_EQ(scratch.data, nullptr);
    MbxScratchRelease(context, &scratch);
    MbxScratchRelease(context, nullptr);
}

TEST_F(ContextTest, ScratchReportsFailures) {
    MbxScratch scratch = {};
    EXPECT_EQ(MbxScratchInit(nullptr, 1, 8192, &scratch), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxScratchInit(context, 1, 8192, nullptr), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxScratchInit(context, 3, 8192, &scratch), MBX_ERR_NO_MEMORY);
    host.failAllocation = host.allocations + 1;
    EXPECT_EQ(MbxScratchInit(context, 1, 8192, &scratch), MBX_ERR_NO_MEMORY);
    EXPECT_EQ(scratch.data, nullptr);
}

TEST_F(ContextTest, RefusedCopyIsABrokenInvariant) {
    uint8_t bytes[2] = {};
    EXPECT_EQ(MbxCopy(context, bytes, 1, "ab", 2), MBX_ERR_INTERNAL);
    EXPECT_EQ(MbxCopy(context, bytes, 2, "ab", 2), MBX_OK);
    EXPECT_EQ(bytes[1], 'b');
}

TEST_F(ContextTest, ArrayTooLargeForABlockIsRefused) {
    uint64_t* array = nullptr;
    EXPECT_EQ(MbxNewArray(context, UINT64_MAX / 8 + 2, &array), MBX_ERR_NO_MEMORY);
    EXPECT_EQ(array, nullptr);
}

}  // namespace
