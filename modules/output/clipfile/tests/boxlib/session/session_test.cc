#include "boxlib/model/session_model.h"

#include "boxlib/support/fixture.h"

namespace {

class SessionLifeTest : public SessionTest {};

TEST_F(SessionLifeTest, CreateCopiesTheConfigurationAndMakesTheScratch) {
    config.options = {1, 2, 3, 4, 5, 6, 7, 8, 9};
    CreateSession();
    EXPECT_EQ(session->context, context);
    EXPECT_EQ(session->config.box_size_mode, 1U);
    EXPECT_EQ(session->config.time_version_mode, 2U);
    EXPECT_EQ(session->config.chunk_offset_mode, 3U);
    EXPECT_EQ(session->config.mehd_mode, 4U);
    EXPECT_EQ(session->config.base_offset_mode, 5U);
    EXPECT_EQ(session->config.trun_offset_mode, 6U);
    EXPECT_EQ(session->config.trun_version_mode, 7U);
    EXPECT_EQ(session->config.tfdt_mode, 8U);
    EXPECT_EQ(session->config.reserved, 9U);
    EXPECT_EQ(session->scratch.size, 8192U);
    EXPECT_NE(session->scratch.data, nullptr);
    EXPECT_EQ(session->ftyp, nullptr);
    EXPECT_EQ(session->profile, nullptr);
    EXPECT_EQ(session->movie, nullptr);
}

TEST_F(SessionLifeTest, CreateRefusesNullArguments) {
    EXPECT_EQ(MbxSessionCreate(nullptr, &config, &session), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxSessionCreate(context, nullptr, &session), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxSessionCreate(context, &config, nullptr), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(session, nullptr);
}

TEST_F(SessionLifeTest, CreateFreesWhatItMadeWhenAnAllocationIsRefused) {
    for (uint64_t n = 1; n <= 2; n++) {
        host.failAllocation = host.allocations + n;
        EXPECT_EQ(MbxSessionCreate(context, &config, &session), MBX_ERR_NO_MEMORY);
        EXPECT_EQ(session, nullptr);
        EXPECT_EQ(host.live.size(), 1U);
    }
}

TEST_F(SessionLifeTest, QuotaMustHoldTheSessionRecord) {
    config.memory_quota = sizeof(MbxSession) - 1;
    EXPECT_EQ(MbxSessionCreate(context, &config, &session), MBX_ERR_INVALID_ARG);
    config.memory_quota = sizeof(MbxSession);  // without its header
    EXPECT_EQ(MbxSessionCreate(context, &config, &session), MBX_ERR_NO_MEMORY);
    const uint64_t needed = sizeof(MbxSession) + 8 + 8192 + 8;
    config.memory_quota = needed - 1;
    EXPECT_EQ(MbxSessionCreate(context, &config, &session), MBX_ERR_NO_MEMORY);
    EXPECT_EQ(context->class1_used, 0U);
    config.memory_quota = needed;
    EXPECT_EQ(MbxSessionCreate(context, &config, &session), MBX_OK);
    EXPECT_EQ(context->class1_used, needed);
}

TEST_F(SessionLifeTest, DestroyOfNullIsOk) {
    EXPECT_EQ(MbxSessionDestroy(nullptr), MBX_OK);
}

}  // namespace
