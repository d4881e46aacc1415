#include "module/ModuleSession.h"

#include <dlfcn.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <stdlib.h>

#include "common/ReceiverError.h"
#include "module/ModuleLibrary.h"

namespace receiver {
namespace {

using ::testing::ElementsAre;
using ::testing::HasSubstr;

class ModuleSessionTest : public ::testing::Test {
 protected:
    ~ModuleSessionTest() override { unsetenv("FAKE_MODULE"); }

    static std::string Calls() {
        void* const library = dlopen(FAKE_MODULE, RTLD_NOW | RTLD_NOLOAD);
        EXPECT_NE(library, nullptr);
        const auto calls = reinterpret_cast<const char* (*)()>(dlsym(library, "FakeModuleCalls"));
        const std::string text = calls();
        dlclose(library);
        return text;
    }

    const ModuleLibrary library_{FAKE_MODULE};
    Host host_{{{{"-outputMode", "sync"}}, {{"-encodedFPS", 59940}}}};
};

TEST_F(ModuleSessionTest, CallsComeInTheOrderOfTheContract) {
    {
        ModuleSession session(library_.Module(), host_);
        session.GoOnline();
        session.GoOnline();
        session.Stream().PushVideo(std::make_shared<StreamData>());
        session.End();
        session.End();
    }
    EXPECT_EQ(
        Calls(),
        "Initialize(sync,59940) GetStreamInterface GetNotifyInterface Execute Online Offline Uninitialize");
    EXPECT_THAT(host_.TakeStatuses(),
                ElementsAre(ModuleStatus{4, 0}, ModuleStatus{6, 26}, ModuleStatus{3, 0}));
}

TEST_F(ModuleSessionTest, AHostThatWasNeverOnlineDoesNotGoOffline) {
    { const ModuleSession session(library_.Module(), host_); }
    EXPECT_EQ(Calls(), "Initialize(sync,59940) GetStreamInterface GetNotifyInterface Execute Uninitialize");
}

// The connect notification would halve 59.94.
TEST_F(ModuleSessionTest, TheRateIsToldByTheStartParameterAlone) {
    {
        ModuleSession session(library_.Module(), host_);
        session.GoOnline();
    }
    EXPECT_THAT(Calls(), ::testing::Not(HasSubstr("Connect")));
}

TEST_F(ModuleSessionTest, AfterARefusalNothingIsCalled) {
    setenv("FAKE_MODULE", "refuse", 1);
    try {
        const ModuleSession session(library_.Module(), host_);
        ADD_FAILURE() << "the module did not refuse";
    } catch (const ReceiverError& error) {
        EXPECT_EQ(error.Code(), ExitCode::kModule);
        EXPECT_THAT(error.what(), HasSubstr("status 7, cause 2"));
    }
    EXPECT_EQ(Calls(), "Initialize(sync,59940)");
}

}  // namespace
}  // namespace receiver
