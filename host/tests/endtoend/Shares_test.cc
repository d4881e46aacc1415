// Recordings to network shares, of the program as its users start it.

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sched.h>
#include <signal.h>
#include <sys/mount.h>
#include <sys/stat.h>

#include <algorithm>
#include <fstream>
#include <nlohmann/json.hpp>
#include <sstream>

#include "endtoend/ReceiverFixture.h"
#include "support/Judges.h"
#include "support/SambaServer.h"

namespace endtoend {
namespace {

using ::testing::AllOf;
using ::testing::EndsWith;
using ::testing::HasSubstr;
using ::testing::IsEmpty;
using ::testing::Not;
using ::testing::SizeIs;
using ::testing::StartsWith;

constexpr int kRecordingFailed = 7;

std::string TextOf(const std::filesystem::path& file) {
    std::ifstream in(file, std::ios::binary);
    std::ostringstream text;
    text << in.rdbuf();
    return text.str();
}

class SharesTest : public ReceiverFixture {
 protected:
    SharesTest() : passwordFile_(WritePassword(SambaServer::kPassword)) {}

    std::string WritePassword(const std::string& password) const {
        const auto file = folder.Path() / "password";
        std::ofstream(file) << password << "\n";
        EXPECT_EQ(chmod(file.c_str(), 0600), 0);
        return file.string();
    }
    static std::string Slashed(std::string path) {
        std::replace(path.begin(), path.end(), '\\', '/');
        return path;
    }
    /// The test picture, of three seconds, to `output`.
    static std::vector<std::string> To(const std::string& output, std::vector<std::string> more) {
        std::vector<std::string> options = {"--output", output, "--size", "320x180", "--seconds", "3"};
        options.insert(options.end(), more.begin(), more.end());
        return options;
    }
    std::vector<std::string> AsUser(const std::string& output) const {
        return To(output, {"--user", SambaServer::kUser, "--password-file", passwordFile_});
    }
    /// The objects of one kind that the program has said with --json.
    static std::vector<nlohmann::json> Events(const std::string& output, const std::string& kind) {
        std::vector<nlohmann::json> found;
        std::istringstream lines(output);
        for (std::string line; std::getline(lines, line);) {
            const auto object = nlohmann::json::parse(line);
            if (object["event"] == kind) {
                found.push_back(object);
            }
        }
        return found;
    }
    static void ExpectPlays(const std::filesystem::path& file, std::size_t frames) {
        const Decoded decoded = DecodeVideo(file);
        EXPECT_THAT(decoded.checksums, SizeIs(frames));
        EXPECT_EQ(decoded.messages, "");
    }
    /// A run that is refused with one sentence before anything is made.
    void ExpectRefused(const std::vector<std::string>& options, const std::string& sentence) {
        const Outcome outcome = RunReceiver(options);
        EXPECT_EQ(outcome.code, kOutput);
        EXPECT_THAT(outcome.errors, AllOf(StartsWith("receiver: "), HasSubstr(sentence), EndsWith(".\n")));
        EXPECT_EQ(std::count(outcome.errors.begin(), outcome.errors.end(), '\n'), 1) << outcome.errors;
    }

    const std::string passwordFile_;
};

TEST_F(SharesTest, AShareIsRecordedToLikeADisk) {
    const SambaServer server;
    const std::string output = Slashed(server.Path()) + "/new folder";
    for (const char* const type : {"normal", "fragment"}) {
        auto options = AsUser(output + "/");
        options.insert(options.end(), {"--json", "--file-type", type, "--prefix", type});
        const Outcome outcome = RunReceiver(options);
        ASSERT_EQ(outcome.code, 0) << outcome.output << outcome.errors;
        const auto summary = Events(outcome.output, "summary");
        ASSERT_THAT(summary, SizeIs(1));
        const auto& files = summary[0]["files"];
        ASSERT_THAT(files, SizeIs(1));
        const std::string path = files[0]["path"];
        EXPECT_THAT(path, StartsWith(output + "/2"));
        EXPECT_EQ(files[0]["frames"], 75);
        EXPECT_EQ(files[0]["problem"], nullptr);
        const auto atServer = server.Folder() / path.substr(Slashed(server.Path()).size() + 1);
        EXPECT_EQ(files[0]["bytes"], std::filesystem::file_size(atServer));
        ExpectPlays(atServer, 75);
        const auto progress = Events(outcome.output, "progress");
        ASSERT_THAT(progress, Not(IsEmpty()));
        EXPECT_GT(progress.back()["free_bytes"], 157286400);
    }
    EXPECT_THAT(RecordingsIn(server.Folder()), SizeIs(2));
    EXPECT_THAT(std::filesystem::directory_iterator(server.Folder()),
                Not(std::filesystem::directory_iterator()));
    // The check of rights has left nothing behind.
    for (const auto& entry : std::filesystem::recursive_directory_iterator(server.Folder())) {
        EXPECT_TRUE(entry.is_directory() || entry.path().extension() == ".MP4") << entry.path();
    }
}

TEST_F(SharesTest, AShareWithBackslashesTooAndWithAGuest) {
    const SambaServer server(SambaServer::Shares{{"rec", {"guest ok = yes"}}}, {"map to guest = Bad User"});
    const Outcome outcome = RunReceiver(To(server.Path() + "\\", {}));
    EXPECT_EQ(outcome.code, 0) << outcome.errors;
    EXPECT_THAT(RecordingsIn(server.Folder()), SizeIs(1));
}

TEST_F(SharesTest, AShareOfTheSettingsStoreWithItsCredentials) {
    const SambaServer server;
    std::ofstream(folder.Path() / "settings.ini")
        << "[Qx/Other/MP4FileOut]\nMP4OutputPath = " << server.Path()
        << "\nMP4AuthUserName = " << SambaServer::kUser << "\nMP4AuthPassword = " << SambaServer::kPassword
        << "\n";
    const Outcome outcome = RunProgram(
        {RECEIVER_PROGRAM, "--module", CLIPFILE_MODULE, "--size", "320x180", "--seconds", "1", "--json"},
        environment);
    EXPECT_EQ(outcome.code, 0) << outcome.output;
    EXPECT_THAT(RecordingsIn(server.Folder()), SizeIs(1));
    EXPECT_THAT(outcome.output, HasSubstr("\"problem\":null"));
}

/// Where the password stands: PASSWORD in an option or a variable, or one of the files.
struct PasswordPlace {
    const char* name;
    std::vector<std::string> options;
    std::map<std::string, std::string> variables;
};

std::ostream& operator<<(std::ostream& out, const PasswordPlace& place) {
    return out << place.name;
}

class PasswordPlaceTest : public SharesTest, public ::testing::WithParamInterface<PasswordPlace> {
 protected:
    PasswordPlaceTest() {
        // A credential as the service manager leaves it.
        std::ofstream(folder.Path() / "receiver.password") << SambaServer::kPassword << "\n";
        EXPECT_EQ(chmod((folder.Path() / "receiver.password").c_str(), 0400), 0);
    }
    std::string Filled(std::string text) const {
        for (const auto& [word, meaning] :
             std::map<std::string, std::string>{{"PASSWORD", SambaServer::kPassword},
                                                {"FILE", passwordFile_},
                                                {"FOLDER", folder.Path().string()}}) {
            if (const std::size_t at = text.find(word); at != std::string::npos) {
                text.replace(at, word.size(), meaning);
            }
        }
        return text;
    }
};

TEST_P(PasswordPlaceTest, IsTakenAndShownNowhere) {
    const SambaServer server;
    for (const auto& [name, value] : GetParam().variables) {
        environment[name] = Filled(value);
    }
    const std::string password = SambaServer::kPassword;
    for (const char* const display : {"--no-drop-frame", "--json"}) {
        auto options =
            To(Slashed(server.Path()), {"--user", SambaServer::kUser, "--log-priority", "13", display});
        for (const std::string& option : GetParam().options) {
            options.push_back(Filled(option));
        }
        const auto receiver = Start(options);
        ASSERT_TRUE(receiver->WaitForText(".MP4")) << receiver->AllText();
        const std::filesystem::path process = "/proc/" + std::to_string(receiver->Id());
        for (const char* const file : {"cmdline", "environ"}) {
            EXPECT_THAT(TextOf(process / file), AllOf(Not(IsEmpty()), Not(HasSubstr(password)))) << file;
        }
        EXPECT_EQ(receiver->Wait(), 0) << receiver->AllText();
        EXPECT_THAT(receiver->AllText(), Not(HasSubstr(password)));
        EXPECT_THAT(Log(), AllOf(Not(IsEmpty()), Not(HasSubstr(password))));
    }
    EXPECT_THAT(RecordingsIn(server.Folder()), SizeIs(2));
}

INSTANTIATE_TEST_SUITE_P(Passwords, PasswordPlaceTest,
                         ::testing::Values(PasswordPlace{"File", {"--password-file", "FILE"}, {}},
                                           PasswordPlace{"Option", {"--password", "PASSWORD"}, {}},
                                           PasswordPlace{"OptionInOneWord", {"--password=PASSWORD"}, {}},
                                           PasswordPlace{"Variable", {}, {{"RECEIVER_PASSWORD", "PASSWORD"}}},
                                           PasswordPlace{
                                               "Credential", {}, {{"CREDENTIALS_DIRECTORY", "FOLDER"}}}),
                         ::testing::PrintToStringParamName());

TEST_F(SharesTest, ARefusedPasswordIsSaidBeforeAnythingIsMade) {
    const SambaServer server;
    WritePassword("open, sesame");
    for (const char* const display : {"--no-drop-frame", "--json"}) {
        auto options = AsUser(Slashed(server.Path()));
        options.emplace_back(display);
        const Outcome outcome = RunReceiver(options);
        EXPECT_EQ(outcome.code, kOutput);
        const std::string said = outcome.output + outcome.errors;
        EXPECT_THAT(said, HasSubstr("refuses the user name or the password; --user and --password-file"));
        EXPECT_THAT(said, AllOf(Not(HasSubstr("sesame")), Not(HasSubstr(SambaServer::kUser))));
        EXPECT_THAT(Log(), Not(HasSubstr("sesame")));
    }
    EXPECT_TRUE(std::filesystem::is_empty(server.Folder()));
    ExpectRefused(To(Slashed(server.Path()), {}), "refuses who has no name; --user gives one");
}

TEST_F(SharesTest, WhatCannotBeRecordedToIsSaidInASentence) {
    SambaServer server(SambaServer::Shares{{"rec", {}}, {"closed", {"read only = yes"}}});
    std::ofstream(server.Folder() / "file") << "x";
    const auto refused = [&](const std::string& share, const std::string& below,
                             const std::string& sentence) {
        ExpectRefused(AsUser(Slashed(server.Path(share)) + below), sentence);
    };
    refused("none", "", "' does not exist; --output names another one");
    refused("closed", "", "/closed' is not writable: Permission denied");
    refused("closed", "/new", "/closed/new' does not exist and cannot be made: Permission denied");
    refused("rec", "/not/mounted",
            "/not/mounted' does not exist and cannot be made: No such file or directory");
    refused("rec", "/file", "/file' is no folder");
    server.Kill();
    refused("rec", "", "cannot be reached: Connection refused");
}

TEST_F(SharesTest, AFullShareIsSaidBeforeAnythingIsMade) {
    const SambaServer server(SambaServer::Shares{{"rec", {}}}, {}, [](const std::filesystem::path& served) {
        ASSERT_EQ(unshare(CLONE_NEWNS), 0);
        ASSERT_EQ(mount("none", "/", nullptr, MS_REC | MS_PRIVATE, nullptr), 0);
        ASSERT_EQ(mount("tmpfs", served.c_str(), "tmpfs", 0, "size=100m"), 0);
    });
    ExpectRefused(AsUser(Slashed(server.Path())), "is full: 104.9 MB are free");
    umount2(server.Folder().c_str(), MNT_DETACH);
}

// In the recording's turn its server is gone, so that its own logon fails: the line of that holds the
// password.
TEST_F(SharesTest, ALogonThatFailsInTheRunShowsThePasswordInTheLogAlone) {
    for (const char* const display : {"--no-drop-frame", "--json"}) {
        SambaServer server;
        auto options = AsUser(Slashed(server.Path()));
        options.insert(options.end(), {"--record", "2-", display});
        const auto receiver = Start(options);
        ASSERT_TRUE(receiver->WaitForText("source: ")) << receiver->AllText();
        server.Kill();
        EXPECT_EQ(receiver->Wait(), kRecordingFailed) << receiver->AllText();
        const std::string said = receiver->AllText();
        EXPECT_THAT(said, HasSubstr("LogonUser call failed. 0, 6f, "));
        EXPECT_THAT(said, AllOf(Not(HasSubstr(SambaServer::kPassword)), Not(HasSubstr(SambaServer::kUser))));
    }
    EXPECT_THAT(Log(), HasSubstr(std::string(", recorder, ") + SambaServer::kPassword));
}

TEST_F(SharesTest, AServerThatFreezesInTheRunHoldsUpNeitherItsEndNorTheStream) {
    SambaServer server;
    auto options = AsUser(Slashed(server.Path()));
    options.emplace_back("--json");
    options[5] = "600";
    const auto receiver = Start(options);
    ASSERT_TRUE(receiver->WaitForText("file_opened")) << receiver->AllText();
    server.Freeze();
    EXPECT_EQ(receiver->Wait(), kRecordingFailed) << receiver->AllText();
    // The time line went on while the server was silent.
    EXPECT_THAT(Events(receiver->Output(), "summary"), SizeIs(1));
    EXPECT_EQ(Events(receiver->Output(), "summary")[0]["lost"], 0);
    server.Thaw();
}

}  // namespace
}  // namespace endtoend
