#include "journal/UnfinishedFiles.h"

#include <algorithm>
#include <exception>
#include <system_error>

#include "reader/Recording.h"

namespace receiver {
namespace {

namespace fs = std::filesystem;

/// A regular file below the folder, also when links on the way lead elsewhere, that the recorder has not
/// closed. What cannot be read is told by who tries to recover it.
bool IsUnfinished(const fs::path& folder, const fs::path& path) {
    std::error_code error;
    const fs::path below = fs::canonical(path, error).lexically_relative(fs::canonical(folder, error));
    if (error || below.empty() || *below.begin() == ".." ||
        !fs::is_regular_file(fs::symlink_status(path, error))) {
        return false;
    }
    try {
        return clipfile::ReadRecording(clipfile::InputFile(path)).completion != clipfile::Completion::kClosed;
    } catch (const std::exception&) {
        return true;
    }
}

}  // namespace

std::vector<fs::path> UnfinishedFiles::Paths() const {
    std::vector<fs::path> paths;
    for (const std::string& file : journal_.files) {
        paths.push_back(file_.Path().parent_path() / file);
    }
    return paths;
}

void UnfinishedFiles::Forget(const fs::path& path) {
    std::erase_if(journal_.files,
                  [&](const std::string& file) { return file_.Path().parent_path() / file == path; });
    try {
        if (journal_.files.empty()) {
            file_.Remove();
        } else {
            file_.Write(journal_);
        }
    } catch (const std::system_error&) {
        return;
    }
}

std::vector<UnfinishedFiles> FindUnfinishedFiles(const fs::path& folder) {
    std::vector<UnfinishedFiles> found;
    for (const fs::path& path : clipfile::JournalsIn(folder)) {
        auto file = clipfile::JournalFile::Claim(path);
        auto journal = file ? clipfile::ReadJournal(path) : std::nullopt;
        if (!journal) {
            continue;
        }
        UnfinishedFiles files(std::move(*file), std::move(*journal));
        for (const fs::path& one : files.Paths()) {
            if (!IsUnfinished(folder, one)) {
                files.Forget(one);
            }
        }
        if (!files.Paths().empty()) {
            found.push_back(std::move(files));
        }
    }
    return found;
}

}  // namespace receiver
