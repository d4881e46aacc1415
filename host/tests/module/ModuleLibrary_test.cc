#include "module/ModuleLibrary.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <stdlib.h>

#include "common/ReceiverError.h"

namespace receiver {
namespace {

using ::testing::AllOf;
using ::testing::HasSubstr;

/// The sentence with which loading `file` fails.
std::string Failure(const std::string& file) {
    try {
        const ModuleLibrary library(file);
    } catch (const ReceiverError& error) {
        EXPECT_EQ(error.Code(), ExitCode::kModule);
        return error.what();
    }
    ADD_FAILURE() << file << " was loaded";
    return {};
}

TEST(ModuleLibrary, LoadsTheRealModule) {
    const ModuleLibrary library(CLIPFILE_MODULE);
    unsigned int interval = 0;
    EXPECT_TRUE(library.Module().GetModuleInterval(&interval));
    EXPECT_EQ(interval, 10000u);
}

TEST(ModuleLibrary, AFileThatIsNotThereIsNamed) {
    EXPECT_THAT(Failure("/no/such/module.so"),
                AllOf(HasSubstr("'/no/such/module.so'"), HasSubstr("No such file"), HasSubstr("--module")));
}

TEST(ModuleLibrary, AFileThatIsNoLibraryIsRefused) {
    EXPECT_THAT(Failure("/proc/self/cmdline"), HasSubstr("cannot be used"));
}

TEST(ModuleLibrary, ALibraryWithoutTheEntryIsNoModule) {
    EXPECT_THAT(Failure(NO_MODULE), HasSubstr("does not export GetQxModuleInterface"));
}

TEST(ModuleLibrary, AModuleThatGivesNoObjectIsRefused) {
    setenv("FAKE_MODULE", "none", 1);
    EXPECT_THAT(Failure(FAKE_MODULE), HasSubstr("gives no module object"));
    unsetenv("FAKE_MODULE");
}

TEST(ModuleLibrary, TheDefaultIsAFileOrTheBareName) {
    // This program lies beside no module.
    EXPECT_EQ(ModuleLibrary::DefaultFile(), "libclipfile.so");
}

}  // namespace
}  // namespace receiver
