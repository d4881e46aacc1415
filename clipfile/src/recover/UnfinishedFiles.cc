#include "recover/UnfinishedFiles.h"

#include <exception>

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

FolderListing UnfinishedIn(const std::filesystem::path& folder) {
    FolderListing listing = FilesIn(folder);
    std::erase_if(listing.files, [](const std::string& path) { return IsClosed(path); });
    return listing;
}

}  // namespace clipfile
