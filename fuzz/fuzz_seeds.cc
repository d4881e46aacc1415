// Writes what to begin with into a folder: small recordings of all kinds, closed, never closed, cut; and
// bytes without any order, each of which is a long story for who decodes them into calls.

#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <random>

#include "support/TestStream.h"

namespace {

namespace fs = std::filesystem;

void WriteRecordings(const fs::path& folder) {
    fs::create_directories(folder);
    for (const char* const type : {"normal", "fragment"}) {
        for (const bool close : {true, false}) {
            for (const std::size_t chunks : {1U, 33U}) {
                const fs::path path = folder / (type + std::to_string(chunks) + (close ? "" : "open"));
                test_stream::Record(path, {type, clipfileModule::RecordRules::kExact, close},
                                    test_stream::MakePlainStream(chunks));
                fs::copy_file(path, path.string() + "cut", fs::copy_options::overwrite_existing);
                fs::resize_file(path.string() + "cut", fs::file_size(path) * 9 / 10);
            }
        }
    }
}

void WriteStreams(const fs::path& folder) {
    constexpr std::size_t kStreams = 60;
    fs::create_directories(folder);
    // The same each time: a run that finds something can be repeated.
    std::mt19937 random(20);
    for (std::size_t number = 1; number <= kStreams; ++number) {
        std::ofstream file(folder / std::to_string(number), std::ios::binary);
        for (std::size_t i = 0; i < 100 * number; ++i) {
            file.put(static_cast<char>(random() & 0xFFU));
        }
    }
}

}  // namespace

int main(int count, char** arguments) {
    if (count != 2) {
        return EXIT_FAILURE;
    }
    const fs::path folder = arguments[1];
    WriteRecordings(folder / "recordings");
    WriteStreams(folder / "streams");
    return EXIT_SUCCESS;
}
