#include "SourceTesting.h"

#include <stdlib.h>

#include <algorithm>
#include <array>
#include <cstdio>
#include <fstream>
#include <iterator>

/// libsrt takes locks of its own in orders that the thread sanitizer calls dangerous, and destroys a socket's
/// locks while its receiving thread has just used them. Nothing of ours is in either.
extern "C" const char* __tsan_default_suppressions();
extern "C" const char* __tsan_default_suppressions() {
    return "deadlock:libsrt-gnutls.so\nrace:libsrt-gnutls.so\n";
}

namespace receiver {

std::size_t Notices::CountOf(const std::string& text) const {
    return static_cast<std::size_t>(std::count_if(
        sentences.begin(), sentences.end(),
        [&text](const std::string& sentence) { return sentence.find(text) != std::string::npos; }));
}

SourceTest::SourceTest() {
    std::string name = (std::filesystem::temp_directory_path() / "receiver-source-XXXXXX").string();
    EXPECT_NE(mkdtemp(name.data()), nullptr);
    folder_ = name;
}

SourceTest::~SourceTest() {
    std::error_code ignored;
    std::filesystem::remove_all(folder_, ignored);
}

std::string SourceTest::Shell(const std::string& command) const {
    const std::string whole = "cd '" + folder_.string() + "' && ( " + command + " ) 2>errors.txt";
    std::FILE* const pipe = popen(whole.c_str(), "r");
    EXPECT_NE(pipe, nullptr);
    std::string text;
    std::array<char, 4096> part{};
    for (std::size_t size = 0; (size = std::fread(part.data(), 1, part.size(), pipe)) > 0;) {
        text.append(part.data(), size);
    }
    EXPECT_EQ(pclose(pipe), 0) << command << "\n" << FileBytes(Path("errors.txt"));
    return text;
}

void SourceTest::Ffmpeg(const std::string& arguments) const {
    Shell("ffmpeg -nostdin -loglevel error -y " + arguments);
}

SourceOptions SourceTest::Fast(const std::string& url) const {
    SourceOptions options;
    options.url = url.find(':') == std::string::npos ? Path(url) : url;
    options.speed = 1000;
    return options;
}

std::vector<SourceUnit> SourceTest::ReadAll(SourceInterface& source, std::size_t enough) const {
    std::vector<SourceUnit> units;
    while (enough == 0 || units.size() < enough) {
        SourceUnit unit;
        const auto result = source.Read(unit);
        if (result == SourceInterface::Result::kUnit) {
            units.push_back(unit);
        } else if (result != SourceInterface::Result::kIdle) {
            break;
        }
    }
    return units;
}

std::vector<SourceUnit> SourceTest::ReadFile(const std::string& name) {
    return ReadAll(*OpenSource(Fast(name), notices_, nullptr));
}

ReceiverError SourceTest::Refusal(SourceOptions options) {
    options.reconnect = false;
    try {
        OpenSource(options, notices_, nullptr);
    } catch (const ReceiverError& error) {
        return error;
    }
    ADD_FAILURE() << options.url << " was opened.";
    return {ExitCode::kSuccess, ""};
}

std::vector<SourceUnit> Of(Medium medium, const std::vector<SourceUnit>& units) {
    std::vector<SourceUnit> chosen;
    std::copy_if(units.begin(), units.end(), std::back_inserter(chosen),
                 [medium](const SourceUnit& unit) { return unit.medium == medium; });
    return chosen;
}

std::string BytesOf(const SourceUnit& unit) {
    return {reinterpret_cast<const char*>(unit.data.get()), unit.size};
}

std::string BytesOf(const std::vector<SourceUnit>& units) {
    std::string bytes;
    for (const SourceUnit& unit : units) {
        bytes += BytesOf(unit);
    }
    return bytes;
}

std::string FileBytes(const std::string& path) {
    std::ifstream file(path, std::ios::binary);
    return {std::istreambuf_iterator<char>(file), {}};
}

std::vector<int> NalTypes(const SourceUnit& unit) {
    std::vector<int> types;
    const unsigned char* const data = unit.data.get();
    for (std::size_t at = 0; at + 3 < unit.size; ++at) {
        if (data[at] == 0 && data[at + 1] == 0 && data[at + 2] == 1) {
            types.push_back(data[at + 3] & 0x1F);
        }
    }
    return types;
}

}  // namespace receiver
