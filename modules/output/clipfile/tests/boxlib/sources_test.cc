// Rules that the library's sources keep, read from the sources themselves.
#include <algorithm>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <regex>
#include <set>

#include "boxlib/support/fixture.h"

namespace {

namespace fs = std::filesystem;

// All but those of `platform/`, which are there to call the system.
std::vector<fs::path> sources() {
    std::vector<fs::path> paths;
    for (fs::recursive_directory_iterator i(BOXLIB_SOURCE_DIR), end; i != end; ++i) {
        if (i->path().filename() == "platform") i.disable_recursion_pending();
        if (i->path().extension() == ".cc" || i->path().extension() == ".h") paths.push_back(i->path());
    }
    return paths;
}

// The host's routines, which are the C library's by definition.
bool isStdio(const fs::path& path) {
    return path.stem() == "mbx_stdio";
}

std::string readCode(const fs::path& path) {
    std::ifstream stream(path);
    std::string code;
    for (std::string line; std::getline(stream, line);) code += line.substr(0, line.find("//")) + '\n';
    return code;
}

// Every match of the expression in the code of the library, as "file: match".
std::vector<std::string> findings(const std::string& code, const std::string& name,
                                  const std::regex& expression) {
    std::vector<std::string> found;
    for (std::sregex_iterator i(code.begin(), code.end(), expression), end; i != end; ++i) {
        found.push_back(name + ": " + i->str());
    }
    return found;
}

// A call of a function of the C library, unless it is one of a callback table (`host.memset(`, `->memset(`).
const std::regex kDirectCall(
    R"((^|[^\w.>])((std::)?(malloc|calloc|realloc|free|memcpy|memmove|memset|memcmp|strlen|strnlen|strcpy|strncpy|)"
    R"(strcmp|strncmp|strcat|bzero|bcopy|fopen|fclose|fread|fwrite|fseek|fseeko|ftell|ftello|fflush|fputs|fprintf|)"
    R"(printf|puts|open|close|read|write|lseek|mmap|time|abort|exit|assert|__builtin_mem\w+|__builtin_str\w+))\s*\()");

const std::regex kAllocation(
    R"(\bnew\b|\bdelete\b|\bthrow\b|\bcatch\b|std::(string|vector|map|list|deque|unique_ptr|)"
    R"(shared_ptr|function|copy|copy_n|fill|fill_n|equal|mutex|atomic|thread)\b)");

const std::regex kGlobalState(R"(\bstatic (?!constexpr|_assert|_cast)\w|\bthread_local\b)");

TEST(SourcesTest, ScannerSeesDirectCallsAndPassesTheTable) {
    const auto hits = [](const std::string& code) { return findings(code, "x", kDirectCall).size(); };
    EXPECT_EQ(hits("  memset(a, 0, 1);"), 1U);
    EXPECT_EQ(hits("x = std::malloc (4);"), 1U);
    EXPECT_EQ(hits("if (!strlen(a)) fwrite(a, 1, 1, f);"), 2U);
    EXPECT_EQ(hits("__builtin_memcpy(a, b, 4);"), 1U);
    EXPECT_EQ(hits("host.memset(host.user_data, a, 0, 1); c->callbacks.free(p); t->write(f);"), 0U);
    EXPECT_EQ(hits("MbxFree(context, a); release(b); rewrite(c);"), 0U);
    EXPECT_EQ(findings("auto* a = new A;", "x", kAllocation).size(), 1U);
    EXPECT_EQ(findings("static int count;", "x", kGlobalState).size(), 1U);
    EXPECT_EQ(findings("static constexpr int kA = 1; static_assert(true);", "x", kGlobalState).size(), 0U);
}

TEST(SourcesTest, MemoryAndFilesAreReachedThroughTheCallbacksAlone) {
    size_t scanned = 0;
    for (const fs::path& path : sources()) {
        if (isStdio(path)) continue;
        scanned++;
        EXPECT_EQ(findings(readCode(path), path.filename(), kDirectCall), std::vector<std::string>());
    }
    EXPECT_GE(scanned, 90U);
}

TEST(SourcesTest, NothingAllocatesThrowsOrLocksByItself) {
    for (const fs::path& path : sources()) {
        EXPECT_EQ(findings(readCode(path), path.filename(), kAllocation), std::vector<std::string>());
    }
}

TEST(SourcesTest, ThereIsNoGlobalState) {
    for (const fs::path& path : sources()) {
        if (isStdio(path)) continue;
        EXPECT_EQ(findings(readCode(path), path.filename(), kGlobalState), std::vector<std::string>());
    }
}

TEST(SourcesTest, NothingIsIncludedFromAboveTheLibrary) {
    const std::regex include(R"re(#include ["<]([^">]+)[">])re");
    const std::set<std::string> kStandard = {"bit", "cstddef", "cstdint", "type_traits"};
    const std::set<std::string> kStdio = {"cstdio", "cstdlib", "cstring"};
    for (const fs::path& path : sources()) {
        const std::string code = readCode(path);
        for (std::sregex_iterator i(code.begin(), code.end(), include), end; i != end; ++i) {
            const std::string name = (*i)[1];
            if (name.starts_with("boxlib/")) {
                EXPECT_TRUE(fs::exists(fs::path(BOXLIB_SOURCE_DIR).parent_path() / name)) << name;
            } else {
                EXPECT_TRUE(kStandard.contains(name) || (isStdio(path) && kStdio.contains(name)))
                    << path.filename() << " includes " << name;
            }
        }
    }
}

TEST(SourcesTest, AnInnerFunctionHasANameOfItsOwn) {
    const std::regex declaration(R"(\nMbxStatus (Mbx\w+)\()");
    const auto declared = [&](const fs::path& path) {
        const std::string code = readCode(path);
        std::set<std::string> names;
        for (std::sregex_iterator i(code.begin(), code.end(), declaration), end; i != end; ++i)
            names.insert((*i)[1]);
        return names;
    };
    const fs::path face = fs::path(BOXLIB_SOURCE_DIR) / "mbx.h";
    const std::set<std::string> operations = declared(face);
    EXPECT_GE(operations.size(), 50U);
    std::set<std::string> shared;
    for (const fs::path& path : sources()) {
        if (path.extension() != ".h" || path == face) continue;
        const std::set<std::string> inner = declared(path);
        std::set_intersection(inner.begin(), inner.end(), operations.begin(), operations.end(),
                              std::inserter(shared, shared.end()));
    }
    EXPECT_EQ(shared, (std::set<std::string>{"MbxAddSample", "MbxAddTrackReference", "MbxEndChunk",
                                             "MbxSetMovieTimes"}));
}

TEST(SourcesTest, FilesStayShort) {
    for (const fs::path& path : sources()) {
        std::ifstream stream(path);
        const auto lines = std::count(std::istreambuf_iterator<char>(stream), {}, '\n');
        EXPECT_LE(lines, 400) << path.filename();
    }
}

}  // namespace
