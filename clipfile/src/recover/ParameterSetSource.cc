#include "recover/ParameterSetSource.h"

#include <algorithm>
#include <exception>

#include "common/ToolError.h"
#include "journal/JournalFile.h"
#include "reader/BigEndian.h"
#include "reader/Recording.h"

namespace clipfile {

namespace {

constexpr std::size_t kSpsHead = 4;  // NAL header, profile, compatibility, level
/// From a file up to the output folder of its receiver: prefix, date.
constexpr int kFoldersAbove = 3;

std::optional<ParameterSets> ReadSets(const InputFile& file) {
    const Recording recording = ReadRecording(file);
    const Track* const video = recording.movie ? recording.movie->Find(FourCc("vide")) : nullptr;
    if (video == nullptr || !video->avc || video->avc->sps.empty() || video->avc->pps.empty()) {
        return std::nullopt;
    }
    return ParameterSets{video->avc->sps.front(), video->avc->pps.front()};
}

}  // namespace

JournalSets::JournalSets(const std::filesystem::path& file) {
    const std::filesystem::path absolute = std::filesystem::absolute(file).lexically_normal();
    std::filesystem::path folder = absolute;
    for (int i = 0; i < kFoldersAbove && folder.has_relative_path() && sets_.empty(); ++i) {
        folder = folder.parent_path();
        const std::string name = absolute.lexically_relative(folder).string();
        for (const std::filesystem::path& path : JournalsIn(folder)) {
            const auto journal = ReadJournal(path);
            if (journal &&
                std::find(journal->files.begin(), journal->files.end(), name) != journal->files.end()) {
                journal_ = path;
                sets_.assign(journal->sets.rbegin(), journal->sets.rend());
            }
        }
    }
}

std::optional<ParameterSets> JournalSets::Next(const Profile&) {
    if (sets_.empty()) {
        return std::nullopt;
    }
    ParameterSets sets = std::move(sets_.back());
    sets_.pop_back();
    return sets;
}

std::optional<ParameterSets> LikeFile::Next(const Profile&) {
    if (isTaken_) {
        return std::nullopt;
    }
    isTaken_ = true;
    auto sets = ReadSets(InputFile(path_));
    if (!sets) {
        throw ToolError(ExitCode::kUnreadable,
                        path_.string() + " has no parameter sets: name a recording that was closed.");
    }
    return sets;
}

FolderFiles::FolderFiles(std::filesystem::path folder, const std::filesystem::path& except)
    : folder_(std::move(folder)) {
    std::vector<std::pair<std::filesystem::file_time_type, std::filesystem::path>> found;
    std::error_code error;
    for (const auto& entry : std::filesystem::directory_iterator(folder_, error)) {
        if (entry.path().extension() == ".MP4" && entry.is_regular_file(error) &&
            entry.path().filename() != except.filename()) {
            found.emplace_back(entry.last_write_time(error), entry.path());
        }
    }
    std::sort(found.begin(), found.end());
    for (auto& [time, path] : found) {
        files_.push_back(std::move(path));
    }
}

std::optional<ParameterSets> FolderFiles::Next(const Profile& profile) {
    while (!files_.empty()) {
        const std::filesystem::path path = std::move(files_.back());
        files_.pop_back();
        try {
            auto sets = ReadSets(InputFile(path));
            if (sets && FitsProfile(*sets, profile)) {
                return sets;
            }
        } catch (const std::exception&) {
            // Another file of the folder that cannot be read is no fault of this one.
            continue;
        }
    }
    return std::nullopt;
}

bool FitsProfile(const ParameterSets& sets, const Profile& profile) {
    if (sets.sps.size() < kSpsHead || !profile.video) {
        return false;
    }
    const auto head = static_cast<std::uint32_t>(ReadBigEndian(&sets.sps[1], 3));
    return head == (profile.video->codecInformation & 0xFFFFFF);
}

}  // namespace clipfile
