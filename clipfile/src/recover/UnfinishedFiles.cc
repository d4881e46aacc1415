#include "recover/UnfinishedFiles.h"

#include <exception>

#include "reader/Folder.h"
#include "reader/Recording.h"

namespace clipfile {

namespace {

bool IsUnfinished(const std::filesystem::path& path) {
    try {
        return ReadRecording(InputFile(path)).completion == Completion::kUnfinished;
    } catch (const std::exception&) {
        return false;
    }
}

}  // namespace

std::vector<std::string> UnfinishedIn(const std::filesystem::path& folder) {
    std::vector<std::string> files = FilesIn(folder);
    std::erase_if(files, [](const std::string& path) { return !IsUnfinished(path); });
    return files;
}

}  // namespace clipfile
