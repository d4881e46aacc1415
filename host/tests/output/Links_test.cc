#include "output/Links.h"

#include <gtest/gtest.h>

#include <cstdlib>
#include <filesystem>
#include <fstream>

namespace receiver {
namespace {

namespace fs = std::filesystem;

class LinksTest : public ::testing::Test {
 protected:
    LinksTest() {
        std::string name = (fs::temp_directory_path() / "links.XXXXXX").string();
        top_ = mkdtemp(name.data());
        fs::create_directories(top_ / "rec/20261121/CAM1");
        fs::create_directories(top_ / "other/CAM1");
    }
    ~LinksTest() override { fs::remove_all(top_); }

    std::string Path(const std::string& name) const { return top_ / name; }

    fs::path top_;
};

TEST_F(LinksTest, WhatStandsInAFolderDoesNotLeadOutOfIt) {
    EXPECT_FALSE(LeadsOutOf(Path("rec"), Path("rec/20261121/CAM1")));
    EXPECT_FALSE(LeadsOutOf(Path("rec"), Path("rec/20261122")));
    EXPECT_FALSE(LeadsOutOf(Path("rec"), Path("rec/receiver.log")));
}

TEST_F(LinksTest, ALinkToAnotherPlaceLeadsOut) {
    fs::create_symlink(Path("other"), Path("rec/20261122"));
    EXPECT_TRUE(LeadsOutOf(Path("rec"), Path("rec/20261122")));
    EXPECT_TRUE(LeadsOutOf(Path("rec"), Path("rec/20261122/CAM1")));
    EXPECT_TRUE(LeadsOutOf(Path("rec"), Path("rec/20261122/CAM2")));
}

TEST_F(LinksTest, ALinkThatStaysInsideDoesNot) {
    fs::create_symlink("20261121", Path("rec/20261122"));
    EXPECT_FALSE(LeadsOutOf(Path("rec"), Path("rec/20261122/CAM1")));
}

TEST_F(LinksTest, ALinkThatLeadsNowhereCountsAsOneThatLeadsOut) {
    fs::create_symlink(Path("rec/nothing"), Path("rec/receiver.log"));
    EXPECT_TRUE(LeadsOutOf(Path("rec"), Path("rec/receiver.log")));
}

TEST_F(LinksTest, TheFolderItselfMayBeALink) {
    fs::create_symlink(Path("rec"), Path("recordings"));
    EXPECT_FALSE(LeadsOutOf(Path("recordings"), Path("recordings/20261121/CAM1")));
    fs::create_symlink(Path("other"), Path("rec/20261122"));
    EXPECT_TRUE(LeadsOutOf(Path("recordings"), Path("recordings/20261122")));
}

}  // namespace
}  // namespace receiver
