#include "reader/Folder.h"

#include <algorithm>

namespace clipfile {

namespace {

namespace fs = std::filesystem;

bool IsFolder(const fs::directory_entry& entry) {
    std::error_code ignored;
    return entry.symlink_status(ignored).type() == fs::file_type::directory;
}

/// What cannot be examined counts: whoever opens it tells why.
bool MayBeRecording(const fs::directory_entry& entry) {
    std::error_code error;
    return entry.path().extension() == ".MP4" && (entry.is_regular_file(error) || error);
}

void Search(const fs::path& folder, FolderListing& listing) {
    std::vector<fs::path> below;
    std::error_code error;
    for (auto entry = fs::directory_iterator(folder, error); !error && entry != fs::directory_iterator();
         entry.increment(error)) {
        if (IsFolder(*entry)) {
            below.push_back(entry->path());
        } else if (MayBeRecording(*entry)) {
            listing.files.push_back(entry->path().string());
        }
    }
    if (error) {
        listing.faults.push_back(folder.string() + " cannot be read: " + error.message() + ".");
    }
    for (const fs::path& path : below) {
        Search(path, listing);
    }
}

}  // namespace

FolderListing FilesIn(const fs::path& folder) {
    FolderListing listing;
    Search(folder, listing);
    std::sort(listing.files.begin(), listing.files.end());
    return listing;
}

}  // namespace clipfile
