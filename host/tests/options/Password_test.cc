#include "options/Password.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <stdlib.h>
#include <sys/stat.h>
#include <unistd.h>

#include <filesystem>
#include <fstream>

#include "common/ReceiverError.h"
#include "options/Options.h"

namespace receiver {
namespace {

using ::testing::AllOf;
using ::testing::HasSubstr;
using ::testing::StartsWith;

class PasswordTest : public ::testing::Test {
 protected:
    PasswordTest() : folder_(::testing::TempDir() + "receiver_password_XXXXXX") {
        EXPECT_NE(mkdtemp(folder_.data()), nullptr);
        unsetenv("CREDENTIALS_DIRECTORY");
        unsetenv("RECEIVER_PASSWORD");
    }
    ~PasswordTest() override { std::filesystem::remove_all(folder_); }

    std::string Write(const std::string& name, const std::string& text, mode_t mode = 0600) const {
        const std::string file = folder_ + "/" + name;
        std::ofstream(file) << text;
        EXPECT_EQ(chmod(file.c_str(), mode), 0);
        return file;
    }
    static std::string Refusal(const std::string& file) {
        try {
            ReadPasswordFile("--password-file", file);
        } catch (const ReceiverError& error) {
            EXPECT_EQ(error.Code(), ExitCode::kUsage);
            return error.what();
        }
        ADD_FAILURE() << "was taken";
        return {};
    }
    static std::optional<std::string> Parsed(std::vector<const char*> arguments) {
        arguments.insert(arguments.begin(), "receiver");
        std::string text;
        return ParseOptions(static_cast<int>(arguments.size()), arguments.data(), text)->password;
    }

    std::string folder_;
};

TEST_F(PasswordTest, OfAFileIsItsFirstLine) {
    EXPECT_EQ(ReadPasswordFile("", Write("a", "top secret \r\nnot this\n")), "top secret ");
    EXPECT_EQ(ReadPasswordFile("", Write("b", "no end")), "no end");
    const std::string long_line(2000, 'x');
    EXPECT_EQ(ReadPasswordFile("", Write("c", long_line + "\n")), long_line);
}

TEST_F(PasswordTest, MayComeThroughAPipe) {
    int ends[2] = {};
    ASSERT_EQ(pipe(ends), 0);
    ASSERT_EQ(write(ends[1], "piped\n", 6), 6);
    EXPECT_EQ(ReadPasswordFile("", "/dev/fd/" + std::to_string(ends[0])), "piped");
    close(ends[0]);
    close(ends[1]);
}

TEST_F(PasswordTest, OfAFileForEverybodyIsRefused) {
    const std::string file = Write("a", "secret\n", 0644);
    EXPECT_THAT(Refusal(file), AllOf(StartsWith("--password-file " + file + " can be read by everybody"),
                                     HasSubstr("chmod 600")));
    EXPECT_EQ(ReadPasswordFile("", Write("b", "secret\n", 0640)), "secret")
        << "a group is chosen by somebody";
}

TEST_F(PasswordTest, ThatIsNotThereIsRefused) {
    EXPECT_THAT(Refusal(folder_ + "/none"), HasSubstr("none cannot be read: No such file or directory."));
    EXPECT_THAT(Refusal(folder_), HasSubstr("cannot be read: Is a directory."));
    EXPECT_THAT(Refusal(Write("empty", "")), HasSubstr("has no password"));
    EXPECT_THAT(Refusal(Write("line", "\n")), HasSubstr("has no password"));
}

TEST_F(PasswordTest, ComesFromTheOptionsThenTheCredentialThenTheEnvironment) {
    EXPECT_EQ(Parsed({}), std::nullopt);
    setenv("RECEIVER_PASSWORD", "", 1);
    EXPECT_EQ(Parsed({}), std::nullopt);
    setenv("RECEIVER_PASSWORD", "of the environment", 1);
    EXPECT_EQ(Parsed({}), "of the environment");
    setenv("CREDENTIALS_DIRECTORY", folder_.c_str(), 1);
    EXPECT_EQ(Parsed({}), "of the environment");
    Write("receiver.password", "of the credential\n", 0400);
    EXPECT_EQ(Parsed({}), "of the credential");
    const std::string file = Write("a", "of the file\n");
    EXPECT_EQ(Parsed({"--password-file", file.c_str()}), "of the file");
    EXPECT_EQ(Parsed({"--password", "of the line"}), "of the line");
}

TEST_F(PasswordTest, OfTheEnvironmentIsOverwrittenThere) {
    char variable[] = "RECEIVER_PASSWORD=secret";
    ASSERT_EQ(putenv(variable), 0);
    HideCredentials(0, nullptr);
    EXPECT_STREQ(variable, "RECEIVER_PASSWORD=xxxxxx");
    EXPECT_EQ(getenv("RECEIVER_PASSWORD"), nullptr);
}

}  // namespace
}  // namespace receiver
