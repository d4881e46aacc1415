#include <elf.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <stdexcept>
#include <string>
#include <vector>

#include "ElfImage.h"

namespace {

using ::testing::Contains;
using ::testing::ElementsAre;
using ::testing::IsEmpty;
using ::testing::StartsWith;
using ::testing::UnorderedElementsAre;

std::vector<std::string> NamesOf(const std::vector<ElfImage::Symbol>& symbols) {
    std::vector<std::string> names;
    for (const ElfImage::Symbol& symbol : symbols) {
        names.push_back(symbol.name);
    }
    return names;
}

bool StartsWithAny(const std::string& text, const std::vector<std::string>& beginnings) {
    return std::any_of(beginnings.begin(), beginnings.end(),
                       [&](const std::string& beginning) { return text.starts_with(beginning); });
}

bool IsRuntime(const std::string& library) {
    // Compiler and C library; of the sanitizers only where the build asks for them.
    std::vector<std::string> runtimes = {"libstdc++.so.",  "libgcc_s.so.", "libc.so.",           "libm.so.",
                                         "libpthread.so.", "librt.so.",    "ld-linux-x86-64.so."};
    const std::string sanitizer = SANITIZER;
    if (sanitizer == "address") {
        runtimes.insert(runtimes.end(), {"libasan.so.", "libubsan.so."});
    } else if (sanitizer == "thread") {
        runtimes.insert(runtimes.end(), {"libtsan.so."});
    }
    return StartsWithAny(library, runtimes);
}

TEST(Exports, OneUndecoratedFunctionIsAll) {
    const ElfImage module(CLIPFILE_MODULE);
    ASSERT_THAT(NamesOf(module.Exports()), ElementsAre("GetQxModuleInterface"));
    EXPECT_EQ(module.Exports()[0].type, STT_FUNC);
    EXPECT_EQ(module.Exports()[0].binding, STB_GLOBAL);
}

TEST(Exports, OfTheSettingsStoreAreTheOperationsOfItsHeader) {
    const ElfImage store(QX_SETTINGS_LIBRARY);
    EXPECT_THAT(NamesOf(store.Exports()),
                UnorderedElementsAre(
                    "_ZN10QxRegistry11GetInstanceEv",
                    "_ZN10QxRegistry8getValueERKNSt7__cxx1112basic_stringIcSt11char_traitsIcESaIcEEES7_RS5_",
                    "_ZN10QxRegistry8getValueERKNSt7__cxx1112basic_stringIcSt11char_traitsIcESaIcEEES7_Rj"));
}

TEST(NeededLibraries, AreBoostAndTheTwoOfTheHostSystem) {
    std::vector<std::string> libraries = ElfImage(CLIPFILE_MODULE).Needed();
    EXPECT_THAT(libraries, Contains("libQxSettings.so"));
    EXPECT_THAT(libraries, Contains("libUtilityLib.so"));
    EXPECT_THAT(libraries, Contains(StartsWith("libboost_thread.so.")));
    EXPECT_THAT(libraries, Contains(StartsWith("libboost_filesystem.so.")));
    // Boost.System has no code of its own any more, so that a linker may leave it out; it may name
    // Boost.Atomic, which Boost.Filesystem needs.
    const std::vector<std::string> allowed = {"libQxSettings.so",    "libUtilityLib.so",
                                              "libboost_thread.so.", "libboost_filesystem.so.",
                                              "libboost_system.so.", "libboost_atomic.so."};
    std::erase_if(libraries, [&](const std::string& library) {
        return IsRuntime(library) || StartsWithAny(library, allowed);
    });
    EXPECT_THAT(libraries, IsEmpty());
}

TEST(ElfImage, FileThatIsNoLibraryIsRefused) {
    EXPECT_THROW(ElfImage("/dev/null"), std::runtime_error);
    EXPECT_THROW(ElfImage("/etc/passwd"), std::runtime_error);
}

}  // namespace
