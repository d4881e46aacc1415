#include "recover/UnfinishedFiles.h"

#include <exception>
#include <optional>
#include <system_error>

#include "common/ToolError.h"
#include "reader/Recording.h"

namespace clipfile {

namespace {

bool IsClosed(const std::filesystem::path& path) {
    try {
        return ReadRecording(InputFile(path)).completion == Completion::kClosed;
    } catch (const std::exception&) {
        return false;
    }
}

}  // namespace

bool HoldsNothing(const std::filesystem::path& path) {
    std::error_code error;
    if (std::filesystem::is_empty(path, error)) {
        return true;
    }
    std::optional<InputFile> file;
    try {
        file.emplace(path);
    } catch (const ToolError&) {
        return false;
    }
    try {
        ReadRecording(*file);
    } catch (const ToolError&) {
        return true;
    }
    return false;
}

FolderListing UnfinishedIn(const std::filesystem::path& folder) {
    FolderListing listing = FilesIn(folder);
    std::erase_if(listing.files, [](const std::string& path) { return IsClosed(path); });
    return listing;
}

}  // namespace clipfile
