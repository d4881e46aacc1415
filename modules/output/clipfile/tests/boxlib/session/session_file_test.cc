#include "boxlib/model/session_model.h"

#include "boxlib/support/fixture.h"

namespace {

class SessionFileTest : public SessionTest {
 protected:
    void SetUp() override {
        SessionTest::SetUp();
        CreateSession();
    }

    uint64_t size = 7;
};

TEST_F(SessionFileTest, FileTypeIsWrittenWithItsBrands) {
    ASSERT_EQ(MbxCreateFileType(session, MbxCode("ZQVC"), 0x01001FFF), MBX_OK);
    ASSERT_EQ(MbxAddCompatibleBrand(session, MbxCode("ZQVC")), MBX_OK);
    ASSERT_EQ(MbxAddCompatibleBrand(session, MbxCode("mp42")), MBX_OK);
    EXPECT_EQ(MbxWriteFileType(session, nullptr, 0, &size), MBX_OK);
    EXPECT_EQ(size, 24U);
    EXPECT_EQ(MbxWriteFileType(session, &file, 2, &size), MBX_OK);
    EXPECT_EQ(size, 24U);
    EXPECT_BYTES(file.bytes, Hex("0000 00000018 'ftyp' 'ZQVC' 01001FFF 'ZQVC' 'mp42'"));
}

TEST_F(SessionFileTest, SecondFileTypeOverwritesTheTwoWordsAndKeepsTheBrands) {
    ASSERT_EQ(MbxCreateFileType(session, MbxCode("aaaa"), 1), MBX_OK);
    ASSERT_EQ(MbxAddCompatibleBrand(session, MbxCode("bbbb")), MBX_OK);
    ASSERT_EQ(MbxCreateFileType(session, MbxCode("cccc"), 2), MBX_OK);
    EXPECT_EQ(MbxWriteFileType(session, &file, 0, &size), MBX_OK);
    EXPECT_BYTES(file.bytes, Hex("00000014 'ftyp' 'cccc' 00000002 'bbbb'"));
}

TEST_F(SessionFileTest, FileTypeIsNeededFirst) {
    EXPECT_EQ(MbxAddCompatibleBrand(session, MbxCode("mp42")), MBX_ERR_BAD_STATE);
    EXPECT_EQ(MbxWriteFileType(session, &file, 0, &size), MBX_ERR_BAD_STATE);
    EXPECT_EQ(size, 7U);
}

TEST_F(SessionFileTest, ProfileIsWrittenWithItsEntries) {
    const MbxAudioProfile audio = {{2, MbxCode("mp4a"), 553, 0, 125, 128, 48000, 2}};
    const MbxVideoProfile video = {{1, MbxCode("avc1"), 0x00640029, 0x00030000, 5000, 8000},
                                   {{29, 97}, {30, 0}, {1920, 1080}, {1, 1}}};
    ASSERT_EQ(MbxCreateProfile(session, 0x30000000), MBX_OK);
    ASSERT_EQ(MbxCreateProfile(session, 0x20000000), MBX_OK);  // overwrites
    ASSERT_EQ(MbxAddAudioProfile(session, &audio), MBX_OK);
    ASSERT_EQ(MbxAddVideoProfile(session, &video), MBX_OK);
    EXPECT_EQ(MbxWriteProfile(session, nullptr, 0, &size), MBX_OK);
    EXPECT_EQ(size, 0x94U);
    EXPECT_EQ(MbxWriteProfile(session, &file, 0, &size), MBX_OK);
    EXPECT_EQ(size, 0x94U);
    EXPECT_BYTES(file.bytes, Hex("00000094 'uuid' 50524F46 21D24FCE BB88695C FAC9C740"
                                 "00000000 00000003"
                                 "00000014 'FPRF' 00000000 20000000 00000000"
                                 "0000002C 'APRF' 00000000"
                                 "00000002 'mp4a' 00000229 00000000 0000007D 00000080 0000BB80 00000002"
                                 "00000034 'VPRF' 00000000"
                                 "00000001 'avc1' 00640029 00030000 00001388 00001F40"
                                 "001D0061"     // 29, 97
                                 "001E0000"     // 30, 0
                                 "07800438"     // 1920, 1080
                                 "00010001"));  // 1, 1
}

TEST_F(SessionFileTest, ProfileWithoutARecordIsWrittenEmpty) {
    EXPECT_EQ(MbxWriteProfile(session, &file, 0, &size), MBX_OK);
    EXPECT_BYTES(file.bytes, Hex("00000020 'uuid' 50524F46 21D24FCE BB88695C FAC9C740 00000000 00000000"));
}

TEST_F(SessionFileTest, ProfileIsNeededBeforeItsEntries) {
    const MbxAudioProfile audio = {};
    const MbxVideoProfile video = {};
    EXPECT_EQ(MbxAddAudioProfile(session, &audio), MBX_ERR_BAD_STATE);
    EXPECT_EQ(MbxAddVideoProfile(session, &video), MBX_ERR_BAD_STATE);
}

TEST_F(SessionFileTest, NullSessionOrResultIsAnInvalidArgument) {
    const MbxAudioProfile audio = {};
    const MbxVideoProfile video = {};
    EXPECT_EQ(MbxCreateFileType(nullptr, 1, 1), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxAddCompatibleBrand(nullptr, 1), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxWriteFileType(nullptr, &file, 0, &size), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxWriteFileType(session, &file, 0, nullptr), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxCreateProfile(nullptr, 1), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxAddAudioProfile(nullptr, &audio), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxAddAudioProfile(session, nullptr), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxAddVideoProfile(nullptr, &video), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxAddVideoProfile(session, nullptr), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxWriteProfile(nullptr, &file, 0, &size), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxWriteProfile(session, &file, 0, nullptr), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxWriteMdatHeader(nullptr, &file, 0, MbxCode("mdat"), 0, &size), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxWriteMdatHeader(session, &file, 0, MbxCode("mdat"), 0, nullptr), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxWriteWideMdatHeader(nullptr, 1, &file, 0, MbxCode("mdat"), 0, &size), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxWriteWideMdatHeader(session, 1, &file, 0, MbxCode("mdat"), 0, nullptr), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(size, 7U);
    EXPECT_TRUE(file.bytes.empty());
}

TEST_F(SessionFileTest, TemporaryRecordsAreFreedWhenAWriteFails) {
    ASSERT_EQ(MbxCreateFileType(session, 1, 1), MBX_OK);
    ASSERT_EQ(MbxCreateProfile(session, 1), MBX_OK);
    const size_t live = host.live.size();
    for (uint64_t n = 1; n <= 2; n++) {
        MemoryFile failing;
        failing.failWrite = n;
        EXPECT_EQ(MbxWriteFileType(session, &failing, 0, &size), MBX_ERR_IO);
        MemoryFile other;
        other.failWrite = n;
        EXPECT_EQ(MbxWriteProfile(session, &other, 0, &size), MBX_ERR_IO);
        EXPECT_EQ(host.live.size(), live);
    }
    EXPECT_EQ(size, 7U);
}

TEST_F(SessionFileTest, EmptyMdatMeasuresEightBytesInMode0AndSixteenInTheWideForm) {
    EXPECT_EQ(MbxWriteMdatHeader(session, nullptr, 0, MbxCode("mdat"), 0, &size), MBX_OK);
    EXPECT_EQ(size, 8U);
    EXPECT_EQ(MbxWriteWideMdatHeader(session, 1, nullptr, 0, MbxCode("mdat"), 0, &size), MBX_OK);
    EXPECT_EQ(size, 16U);
}

TEST_F(SessionFileTest, MdatHeaderFollowsTheSessionsMode) {
    const struct {
        uint32_t mode;
        uint64_t payload;
        MbxStatus status;
        const char* bytes;
    } kCases[] = {
        {0, 1000, MBX_OK, "000003F0 'mdat'"},
        {0, 0xFFFFFFF7, MBX_OK, "FFFFFFFF 'mdat'"},
        {0, 0xFFFFFFF8, MBX_ERR_BAD_STATE, ""},
        {1, 0xFFFFFFF8, MBX_OK, "00000001 'mdat' 0000000100000008"},
        {2, 0, MBX_OK, "00000001 'mdat' 0000000000000010"},
        {2, 0xFFFFFFFFFFFFFFEF, MBX_OK, "00000001 'mdat' FFFFFFFFFFFFFFFF"},
        {2, 0xFFFFFFFFFFFFFFF0, MBX_ERR_INVALID_ARG, ""},
    };
    for (const auto& c : kCases) {
        SCOPED_TRACE(testing::Message() << "mode " << c.mode << ", payload " << c.payload);
        session->config.box_size_mode = c.mode;
        MemoryFile target;
        size = 7;
        EXPECT_EQ(MbxWriteMdatHeader(session, &target, 0, MbxCode("mdat"), c.payload, &size), c.status);
        EXPECT_BYTES(target.bytes, Hex(c.bytes));
        EXPECT_EQ(size, c.status == MBX_OK ? target.bytes.size() : 7U);
    }
}

TEST_F(SessionFileTest, MdatHeaderTakesOtherTypes) {
    EXPECT_EQ(MbxWriteMdatHeader(session, &file, 0, MbxCode("free"), 4, &size), MBX_OK);
    EXPECT_BYTES(file.bytes, Hex("0000000C 'free'"));
}

TEST_F(SessionFileTest, WideMdatHeaderHasItsOwnForms) {
    session->config.box_size_mode = 1;  // is not asked
    const struct {
        uint32_t form;
        MbxStatus status;
        const char* bytes;
    } kCases[] = {
        {0, MBX_OK, "00000010 'mdat'"},
        {1, MBX_OK, "00000001 'mdat' 0000000000000018"},
        {2, MBX_OK, "00000010 'mdat'"},
        {3, MBX_ERR_INTERNAL, ""},
    };
    for (const auto& c : kCases) {
        SCOPED_TRACE(c.form);
        MemoryFile target;
        EXPECT_EQ(MbxWriteWideMdatHeader(session, c.form, &target, 0, MbxCode("mdat"), 8, &size), c.status);
        EXPECT_BYTES(target.bytes, Hex(c.bytes));
    }
    EXPECT_EQ(MbxWriteWideMdatHeader(session, 1, &file, 0, MbxCode("free"), 8, &size), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(MbxWriteWideMdatHeader(session, 1, &file, 0, MbxCode("mdat"), 0xFFFFFFFFFFFFFFF0, &size),
              MBX_ERR_INVALID_ARG);
}

TEST_F(SessionFileTest, WideMdatHeaderCanBePatchedInPlace) {
    EXPECT_EQ(MbxWriteWideMdatHeader(session, 1, &file, 4, MbxCode("mdat"), 0, &size), MBX_OK);
    EXPECT_EQ(MbxWriteWideMdatHeader(session, 1, &file, 4, MbxCode("mdat"), 5ULL << 32, &size), MBX_OK);
    EXPECT_BYTES(file.bytes, Hex("00000000 00000001 'mdat' 0000000500000010"));
}

}  // namespace
