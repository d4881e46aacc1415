#include "platform/SharePath.h"

#include <gtest/gtest.h>

#include <string>

namespace clipfileModule {
namespace {

TEST(SharePath, BeginsWithTwoBackslashes) {
    EXPECT_TRUE(IsSharePath("\\\\server\\share"));
    EXPECT_TRUE(IsSharePath("\\\\"));
    for (const char* path : {"", "\\", "\\server", "//server/share", "\\/server", "Z:\\rec", "a\\\\b"}) {
        EXPECT_FALSE(IsSharePath(path)) << path;
    }
}

TEST(SharePath, IsTakenApartIntoServerShareAndTheRest) {
    SharePath path;
    ASSERT_TRUE(SharePath::Parse("\\\\nas-1.studio\\rec\\a\\b.MP4", path));
    EXPECT_EQ(path.Server(), "nas-1.studio");
    EXPECT_EQ(path.Port(), "445");
    EXPECT_EQ(path.ShareUrl(), "smb://nas-1.studio:445/rec");
    EXPECT_EQ(path.Url(), "smb://nas-1.studio:445/rec/a/b.MP4");
}

TEST(SharePath, TakesAPortBehindTheServer) {
    SharePath path;
    ASSERT_TRUE(SharePath::Parse("\\\\127.0.0.1:4450\\rec", path));
    EXPECT_EQ(path.Server(), "127.0.0.1");
    EXPECT_EQ(path.Port(), "4450");
    EXPECT_EQ(path.Url(), "smb://127.0.0.1:4450/rec");
}

TEST(SharePath, TakesAnIpv6AddressInBracketsOrAsAName) {
    SharePath path;
    for (const char* text : {"\\\\[2001:db8::1]\\rec", "\\\\2001-db8--1.ipv6-literal.net\\rec"}) {
        ASSERT_TRUE(SharePath::Parse(text, path)) << text;
        EXPECT_EQ(path.Server(), "2001:db8::1");
        EXPECT_EQ(path.Port(), "445");
        EXPECT_EQ(path.Url(), "smb://2001-db8--1.ipv6-literal.net:445/rec");
    }
    ASSERT_TRUE(SharePath::Parse("\\\\[fe80::a%eth0]:4450\\rec", path));
    EXPECT_EQ(path.Server(), "fe80::a%eth0");
    EXPECT_EQ(path.Port(), "4450");
    EXPECT_EQ(path.Url(), "smb://fe80--aseth0.ipv6-literal.net:4450/rec");
    ASSERT_TRUE(SharePath::Parse("\\\\fe80--aseth0.ipv6-literal.net\\rec", path));
    EXPECT_EQ(path.Server(), "fe80::a%eth0");
    for (const char* text :
         {"\\\\[]\\rec", "\\\\[::1\\rec", "\\\\[::1]x\\rec", "\\\\[::1]:\\rec", "\\\\[nas]\\rec",
          "\\\\[::1%]\\rec", "\\\\::1\\rec", "\\\\nas.ipv6-literal.net\\rec"}) {
        EXPECT_FALSE(SharePath::Parse(text, path)) << text;
    }
}

TEST(SharePath, CountsNoEmptyParts) {
    SharePath path;
    for (const char* text :
         {"\\\\nas\\rec\\a\\", "\\\\nas\\rec\\\\a", "\\\\nas/rec/a//", "\\\\nas\\\\rec\\a\\\\"}) {
        ASSERT_TRUE(SharePath::Parse(text, path)) << text;
        EXPECT_EQ(path.Url(), "smb://nas:445/rec/a") << text;
    }
    ASSERT_TRUE(SharePath::Parse("\\\\nas\\rec\\", path));
    EXPECT_EQ(path.Url(), path.ShareUrl());
}

TEST(SharePath, EncodesWhatAUrlCannotHold) {
    SharePath path;
    ASSERT_TRUE(SharePath::Parse("\\\\nas\\Studio 1\\K\xC3\xB6ln %41?#\\01_02_03_04(2).MP4", path));
    EXPECT_EQ(path.Url(), "smb://nas:445/Studio%201/K%C3%B6ln%20%2541%3F%23/01_02_03_04%282%29.MP4");
}

TEST(SharePath, NeedsAServerAndAShare) {
    for (const char* text :
         {"", "/nas/rec", "\\nas\\rec", "\\\\", "\\\\nas", "\\\\nas\\", "\\\\?\\C:\\rec", "\\\\user@nas\\rec",
          "\\\\:445\\rec", "\\\\nas:\\rec", "\\\\nas:x\\rec", "\\\\nas:1:2\\rec"}) {
        SharePath path;
        EXPECT_FALSE(SharePath::Parse(text, path)) << text;
        EXPECT_EQ(path.Url(), "") << text;
    }
}

}  // namespace
}  // namespace clipfileModule
