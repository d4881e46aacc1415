// Writes small recordings of all kinds into a folder: closed, never closed, cut.

#include <cstdlib>
#include <filesystem>

#include "support/TestStream.h"

int main(int count, char** arguments) {
    if (count != 2) {
        return EXIT_FAILURE;
    }
    const std::filesystem::path folder = arguments[1];
    std::filesystem::create_directories(folder);
    for (const char* const type : {"normal", "fragment"}) {
        for (const bool close : {true, false}) {
            for (const std::size_t chunks : {1U, 33U}) {
                const std::filesystem::path path =
                    folder / (type + std::to_string(chunks) + (close ? "" : "open"));
                test_stream::Record(path, {type, clipfileModule::RecordRules::kExact, close},
                                    test_stream::MakePlainStream(chunks));
                std::filesystem::copy_file(path, path.string() + "cut",
                                           std::filesystem::copy_options::overwrite_existing);
                std::filesystem::resize_file(path.string() + "cut",
                                             std::filesystem::file_size(path) * 9 / 10);
            }
        }
    }
    return EXIT_SUCCESS;
}
