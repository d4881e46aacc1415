#include "journal/UnfinishedFiles.h"

#include <exception>
#include <system_error>

#include "reader/Recording.h"

namespace receiver {
namespace {

namespace fs = std::filesystem;

/// What has become of a file that a journal names.
struct Finding {
    /// No file has its name any more.
    bool isGone = false;
    /// Why it cannot be worked on, behind "is not recovered: "; or empty.
    std::string obstacle;
};

/// Follows a link on the way to a file. Why it leads nowhere that is ours, or empty.
std::string Follow(const fs::path& folder, fs::path& link) {
    std::error_code error;
    const fs::path home = fs::canonical(folder, error);
    const fs::path target = error ? fs::path() : fs::canonical(link, error);
    if (error) {
        return link.string() + " is a link that cannot be followed: " + error.message();
    }
    const fs::path below = target.lexically_relative(home);
    if (below.empty() || *below.begin() == "..") {
        return link.string() + " is a link to another place; clipfile recover makes a whole file of it";
    }
    link = target;
    return "";
}

/// Looks for `name`, a path below `folder`. Only what is known to be gone is called so: a disk that fails, a
/// right that is missing or a link to what is not mounted says nothing of the file.
Finding Find(const fs::path& folder, const fs::path& name) {
    fs::path path = folder;
    fs::file_type type = fs::file_type::directory;
    for (const fs::path& part : name) {
        path /= part;
        std::error_code error;
        type = fs::symlink_status(path, error).type();
        if (type == fs::file_type::not_found) {
            return {true, ""};
        }
        if (type == fs::file_type::none) {
            return {false, error.message()};
        }
        if (type == fs::file_type::symlink) {
            const std::string obstacle = Follow(folder, path);
            if (!obstacle.empty()) {
                return {false, obstacle};
            }
            type = fs::status(path, error).type();
        }
    }
    return {type != fs::file_type::regular, ""};
}

/// What cannot be read is told by who tries to recover it.
bool IsClosed(const fs::path& path) {
    try {
        return clipfile::ReadRecording(clipfile::InputFile(path)).completion == clipfile::Completion::kClosed;
    } catch (const std::exception&) {
        return false;
    }
}

}  // namespace

std::optional<UnfinishedFiles> UnfinishedFiles::Take(const fs::path& journal) {
    auto file = clipfile::JournalFile::Claim(journal);
    auto content = file ? clipfile::ReadJournal(journal) : std::nullopt;
    if (!content) {
        return std::nullopt;
    }
    UnfinishedFiles files(std::move(*file), std::move(*content));
    files.Sort();
    return files.journal_.files.empty() ? std::nullopt : std::optional(std::move(files));
}

void UnfinishedFiles::Sort() {
    const fs::path folder = file_.Path().parent_path();
    for (const std::string& name : std::vector(journal_.files)) {
        const fs::path path = folder / name;
        const Finding finding = Find(folder, name);
        if (!finding.obstacle.empty()) {
            obstacles_.push_back(path.string() + " is not recovered: " + finding.obstacle);
        } else if (finding.isGone || IsClosed(path)) {
            Forget(path);
        } else {
            paths_.push_back(path);
        }
    }
}

void UnfinishedFiles::Forget(const fs::path& path) {
    std::erase_if(journal_.files,
                  [&](const std::string& file) { return file_.Path().parent_path() / file == path; });
    std::erase(paths_, fs::path(path));
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

}  // namespace receiver
