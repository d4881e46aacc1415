// A host may unload the module while a thread that was given up still hangs in it.

#include <dlfcn.h>
#include <gtest/gtest.h>
#include <unistd.h>

#include "platform/give_up_probe.h"

namespace {

class GiveUpTest : public testing::Test {
 protected:
    void SetUp() override {
        ASSERT_EQ(pipe(to_), 0);
        ASSERT_EQ(pipe(from_), 0);
        library_ = dlopen(GIVE_UP_PROBE, RTLD_NOW | RTLD_LOCAL);
        ASSERT_NE(library_, nullptr) << dlerror();
    }
    void TearDown() override {
        for (const int end : {to_[0], to_[1], from_[0], from_[1]}) {
            close(end);
        }
    }
    template <typename Function>
    Function* Find(const char* name) {
        return reinterpret_cast<Function*>(dlsym(library_, name));
    }
    void Start() { Find<decltype(ProbeStart)>("ProbeStart")(to_[0], from_[1]); }
    void LetThreadGo() { ASSERT_EQ(write(to_[1], "x", 1), 1); }
    void WaitForThread() {
        char byte = 0;
        ASSERT_EQ(read(from_[0], &byte, 1), 1);
        EXPECT_EQ(byte, 'x');
    }
    static bool IsLoaded() {
        void* const handle = dlopen(GIVE_UP_PROBE, RTLD_NOW | RTLD_NOLOAD);
        if (handle != nullptr) {
            dlclose(handle);
        }
        return handle != nullptr;
    }

    int to_[2] = {};
    int from_[2] = {};
    void* library_ = nullptr;
};

TEST_F(GiveUpTest, ALibraryWithoutSuchAThreadIsUnloaded) {
    Start();
    LetThreadGo();
    Find<decltype(ProbeJoin)>("ProbeJoin")();
    dlclose(library_);
    EXPECT_FALSE(IsLoaded());
}

TEST_F(GiveUpTest, AThreadThatWasGivenUpFindsItsCodeAfterTheLibraryWasClosed) {
    Start();
    Find<decltype(ProbeGiveUp)>("ProbeGiveUp")();
    dlclose(library_);
    EXPECT_TRUE(IsLoaded());
    LetThreadGo();
    WaitForThread();
}

}  // namespace
