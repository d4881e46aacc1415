#include "SettingsStore.h"

#include <gtest/gtest.h>
#include <stdlib.h>
#include <unistd.h>

#include <optional>
#include <ostream>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "TempDir.h"

namespace {

using qx_settings::ParseNumber;
using qx_settings::SettingsError;
using qx_settings::SettingsStore;

const std::string kSection = "Qx/Other/MP4FileOut";

struct FileCase {
    const char* name;
    std::string_view bytes;
    const char* section;
    const char* key;
    /// Nothing for a key that is missing.
    std::optional<std::string> expected;

    friend void PrintTo(const FileCase& file, std::ostream* out) { *out << file.name; }
};

class SettingsStoreReads : public ::testing::TestWithParam<FileCase> {};

TEST_P(SettingsStoreReads, Key) {
    const TempDir dir;
    SettingsStore store;
    SettingsError error;
    ASSERT_TRUE(store.Load(dir.Write(GetParam().bytes), error)) << error.line << ": " << error.reason;
    const std::string* const value = store.Find(GetParam().section, GetParam().key);
    ASSERT_EQ(value != nullptr, GetParam().expected.has_value());
    if (value != nullptr) {
        EXPECT_EQ(*value, *GetParam().expected);
    }
}

using namespace std::string_view_literals;

INSTANTIATE_TEST_SUITE_P(
    , SettingsStoreReads,
    ::testing::Values(
        FileCase{"SectionWithSlashes", "[Qx/Other/MP4FileOut]\nMP4OutputPath=/srv/rec\n",
                 "Qx/Other/MP4FileOut", "MP4OutputPath", "/srv/rec"},
        FileCase{"SectionWithDots", "[a.b.c]\nk=v\n", "a.b.c", "k", "v"},
        FileCase{"KeyWithDotsAndSlashes", "[s]\na.b/c=v\n", "s", "a.b/c", "v"},
        FileCase{"SectionNameIsNotAPath", "[a]\nb=v\n", "a.b", "", std::nullopt},
        FileCase{"SecondSectionIsApart", "[s]\nk=1\n[t]\nk=2\n", "t", "k", "2"},
        FileCase{"KeyOfAnotherSection", "[s]\nk=1\n[t]\n", "t", "k", std::nullopt},
        FileCase{"KeyBeforeAnySection", "k=v\n[s]\nl=w\n", "", "k", std::nullopt},
        FileCase{"EmptyFile", "", "s", "k", std::nullopt},
        FileCase{"OnlyBlankLines", "\n  \n\t\n", "s", "k", std::nullopt},
        FileCase{"NamesAreCaseSensitive", "[s]\nkey=v\n", "s", "Key", std::nullopt},
        FileCase{"SectionsAreCaseSensitive", "[s]\nkey=v\n", "S", "key", std::nullopt},
        FileCase{"LastLineWithoutLineFeed", "[s]\nk=v", "s", "k", "v"},
        FileCase{"CarriageReturnLineFeed", "[s]\r\nk=v\r\n", "s", "k", "v"},
        FileCase{"ByteOrderMarkBeforeTheSection", "\xEF\xBB\xBF[s]\nk=v\n", "s", "k", "v"},
        FileCase{"BlanksAroundNamesAndValues", "  [ s ]  \n\t k \t=  v  \n", "s", "k", "v"},
        FileCase{"BlanksInsideAValueStay", "[s]\nk=a  b\tc\n", "s", "k", "a  b\tc"},
        FileCase{"BlanksInsideAKeyStay", "[s]\na b=v\n", "s", "a b", "v"},
        FileCase{"EmptyValueIsAKey", "[s]\nk=\n", "s", "k", ""},
        FileCase{"ValueOfBlanksIsEmpty", "[s]\nk=   \n", "s", "k", ""},
        FileCase{"FurtherEqualSignsBelongToTheValue", "[s]\nk=a=b==\n", "s", "k", "a=b=="},
        FileCase{"SemicolonCommentLine", "; [s]\n[s]\n;k=1\nk=2\n", "s", "k", "2"},
        FileCase{"HashCommentLine", "#[s]\n[s]\n  # k=1\nk=2\n", "s", "k", "2"},
        FileCase{"SemicolonAndHashInAValueStay", "[s]\nk=a;b#c ; d\n", "s", "k", "a;b#c ; d"},
        FileCase{"QuotationMarksStay", "[s]\nk=\"v\"\n", "s", "k", "\"v\""},
        FileCase{"BackslashesStay", "[s]\nk=\\\\server\\share\\n\n", "s", "k", "\\\\server\\share\\n"},
        FileCase{"PercentSignsStay", "[s]\nk=100%s%n\n", "s", "k", "100%s%n"},
        FileCase{"Utf8InNamesAndValues",
                 "[Stra\xC3\x9F"
                 "e]\nKl\xC3\xBC=\xE6\x98\xA0\xE5\x83\x8F\n",
                 "Stra\xC3\x9F"
                 "e",
                 "Kl\xC3\xBC", "\xE6\x98\xA0\xE5\x83\x8F"},
        FileCase{"NoBreakSpaceIsNotABlank", "[s]\nk=\xC2\xA0v\xC2\xA0\n", "s", "k", "\xC2\xA0v\xC2\xA0"},
        FileCase{"BytesThatAreNoUtf8Stay", "[s]\nk=\xFF\x80\n", "s", "k", "\xFF\x80"}),
    [](const auto& tested) { return tested.param.name; });

struct FaultCase {
    const char* name;
    std::string_view bytes;
    unsigned long line;

    friend void PrintTo(const FaultCase& fault, std::ostream* out) { *out << fault.name; }
};

class SettingsStoreRefuses : public ::testing::TestWithParam<FaultCase> {};

TEST_P(SettingsStoreRefuses, AndNamesTheLine) {
    const TempDir dir;
    SettingsStore store;
    SettingsError error;
    EXPECT_FALSE(store.Load(dir.Write(GetParam().bytes), error));
    EXPECT_EQ(error.line, GetParam().line);
    EXPECT_FALSE(error.reason.empty());
    EXPECT_EQ(error.reason.find("s3cret"), std::string::npos) << error.reason;
    EXPECT_EQ(store.Find("s", "k"), nullptr);
}

INSTANTIATE_TEST_SUITE_P(, SettingsStoreRefuses,
                         ::testing::Values(FaultCase{"LineWithoutEqualSign", "[s]\nk=v\ns3cret\n"sv, 3},
                                           FaultCase{"SectionWithoutEnd", "[s]\nk=v\n[s3cret\n"sv, 3},
                                           FaultCase{"ValueWithoutKey", "[s]\nk=v\n\n=s3cret\n"sv, 4},
                                           FaultCase{"KeyTwiceInASection", "[s]\nk=v\nk=s3cret\n"sv, 3},
                                           FaultCase{"SectionTwice", "[s]\nk=v\n[t]\nk=v\n[s]\nl=s3cret\n"sv,
                                                     5},
                                           FaultCase{"ZeroByte", "[s]\nk=v\np=s3cret\0s3cret\n"sv, 3},
                                           FaultCase{"Utf16", "\xFF\xFE[\0s\0]\0"sv, 1}),
                         [](const auto& tested) { return tested.param.name; });

TEST(SettingsStore, FileThatDoesNotExistHasNoKeysAndNoError) {
    const TempDir dir;
    SettingsStore store;
    SettingsError error;
    EXPECT_TRUE(store.Load(dir.Path() + "/missing.ini", error));
    EXPECT_EQ(store.Find(kSection, "MP4OutputPath"), nullptr);
    EXPECT_TRUE(store.Load(dir.Write("[s]\n") + "/below_a_file.ini", error));
    EXPECT_TRUE(error.reason.empty());
}

TEST(SettingsStore, DirectoryIsAnErrorWithoutLine) {
    const TempDir dir;
    SettingsStore store;
    SettingsError error;
    EXPECT_FALSE(store.Load(dir.Path(), error));
    EXPECT_EQ(error.line, 0U);
    EXPECT_EQ(error.reason, "Is a directory");
}

TEST(SettingsStore, PathThatCannotBeOpenedIsAnErrorWithoutLine) {
    const TempDir dir;
    const std::string path = dir.Path() + "/loop.ini";
    ASSERT_EQ(symlink("loop.ini", path.c_str()), 0);
    SettingsStore store;
    SettingsError error;
    EXPECT_FALSE(store.Load(path, error));
    EXPECT_EQ(error.line, 0U);
    EXPECT_EQ(error.reason, "Too many levels of symbolic links");
}

TEST(SettingsStore, OneMebibyteIsReadAndOneByteMoreRefused) {
    const TempDir dir;
    const std::string head = "[s]\nk=v\n;";
    std::string bytes = head + std::string((1 << 20) - head.size(), 'x');
    SettingsStore store;
    SettingsError error;
    EXPECT_TRUE(store.Load(dir.Write(bytes), error));
    EXPECT_NE(store.Find("s", "k"), nullptr);
    bytes += 'x';
    EXPECT_FALSE(store.Load(dir.Write(bytes), error));
    EXPECT_EQ(error.line, 0U);
    EXPECT_EQ(error.reason, "larger than 1048576 bytes");
    EXPECT_EQ(store.Find("s", "k"), nullptr);
}

TEST(SettingsStore, EndlessFileIsRefused) {
    SettingsStore store;
    SettingsError error;
    EXPECT_FALSE(store.Load("/dev/zero", error));
    EXPECT_EQ(error.reason, "larger than 1048576 bytes");
}

TEST(SettingsStore, FailedLoadDropsTheKeysOfTheLoadBefore) {
    const TempDir dir;
    SettingsStore store;
    SettingsError error;
    ASSERT_TRUE(store.Load(dir.Write("[s]\nk=v\n"), error));
    ASSERT_NE(store.Find("s", "k"), nullptr);
    EXPECT_FALSE(store.Load(dir.Write("[s\n"), error));
    EXPECT_EQ(store.Find("s", "k"), nullptr);
}

TEST(SettingsStore, AKeyThatIsSetIsAddedOrReplaced) {
    SettingsStore store;
    store.Set("s", "k", "one");
    store.Set("s", "k", "two");
    ASSERT_NE(store.Find("s", "k"), nullptr);
    EXPECT_EQ(*store.Find("s", "k"), "two");
}

TEST(SettingsStore, TheTextOfAFileHoldsEveryKeyOnceAndIsReadAgainAsTheSame) {
    const TempDir dir;
    SettingsStore store;
    SettingsError error;
    ASSERT_TRUE(store.Load(dir.Write("\xEF\xBB\xBF; note\r\n[ b/c ] ; note\r\n k = [v]; \"=# \r\n"
                                     "x=\n[a]\nk.l = 1 2\n"),
                           error));
    const std::string text = "[a]\nk.l = 1 2\n[b/c]\nk = [v]; \"=#\nx = \n";
    EXPECT_EQ(store.FileText(), text);
    SettingsStore again;
    ASSERT_TRUE(again.Load(dir.Write(text), error));
    EXPECT_EQ(again.FileText(), text);
    EXPECT_EQ(SettingsStore().FileText(), "");
}

TEST(ParseNumber, TakesUnsigned32BitDecimals) {
    const std::vector<std::pair<std::string, unsigned int>> cases = {{"0", 0U},
                                                                     {"7", 7U},
                                                                     {"120", 120U},
                                                                     {"00120", 120U},
                                                                     {"2147483648", 2147483648U},
                                                                     {"4294967295", 4294967295U}};
    for (const auto& [text, expected] : cases) {
        unsigned int number = 99;
        EXPECT_TRUE(ParseNumber(text, number)) << text;
        EXPECT_EQ(number, expected) << text;
    }
}

TEST(ParseNumber, LeavesTheNumberWhenTheTextIsNone) {
    for (const std::string text :
         {"", "-1", "-0", "+1", " 1", "1 ", "1 2", "1_000", "1,000", "1.0", "1e3", "0x10", "0b1", "10h",
          "4294967296", "18446744073709551616", "99999999999999999999999999", "abc", "\xD9\xA1"}) {
        unsigned int number = 99;
        EXPECT_FALSE(ParseNumber(text, number)) << text;
        EXPECT_EQ(number, 99U) << text;
    }
}

TEST(SettingsPath, IsTheFixedOneUnlessTheEnvironmentNamesAnother) {
    unsetenv("QX_SETTINGS");
    EXPECT_EQ(qx_settings::SettingsPath(), "/etc/qx/settings.ini");
    setenv("QX_SETTINGS", "", 1);
    EXPECT_EQ(qx_settings::SettingsPath(), "/etc/qx/settings.ini");
    setenv("QX_SETTINGS", "/tmp/other.ini", 1);
    EXPECT_EQ(qx_settings::SettingsPath(), "/tmp/other.ini");
    unsetenv("QX_SETTINGS");
}

}  // namespace
