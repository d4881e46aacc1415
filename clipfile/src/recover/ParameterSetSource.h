#pragma once

#include <filesystem>
#include <optional>
#include <string>
#include <vector>

#include "media/ParameterSets.h"
#include "reader/Profile.h"

namespace clipfile {

/// A place where the parameter sets of an unfinished file may be found.
class ParameterSetSource {
 public:
    virtual ~ParameterSetSource() = default;
    /// The next candidate for a file with this profile, or nothing when there are no more.
    virtual std::optional<ParameterSets> Next(const Profile& profile) = 0;
    /// The place, in the middle of a sentence.
    virtual std::string Name() const = 0;
};

/// The sets that a receiver has noted about a file while it recorded it, in a journal in one of the folders
/// above.
class JournalSets : public ParameterSetSource {
 public:
    explicit JournalSets(const std::filesystem::path& file);
    std::optional<ParameterSets> Next(const Profile& profile) override;
    std::string Name() const override { return "the journal " + journal_.string(); }
    bool IsEmpty() const { return sets_.empty(); }

 private:
    std::filesystem::path journal_;
    std::vector<ParameterSets> sets_;  // the next at the back
};

/// The sets of one file, which a person has named.
class LikeFile : public ParameterSetSource {
 public:
    explicit LikeFile(std::filesystem::path path) : path_(std::move(path)) {}
    /// Throws `ToolError` for a file that cannot be read, or has no parameter sets.
    std::optional<ParameterSets> Next(const Profile& profile) override;
    std::string Name() const override { return path_.string(); }

 private:
    std::filesystem::path path_;
    bool isTaken_ = false;
};

/// The sets of the other files in a folder that have some, the newest first.
class FolderFiles : public ParameterSetSource {
 public:
    /// `except` is the file that is recovered.
    FolderFiles(std::filesystem::path folder, const std::filesystem::path& except);
    std::optional<ParameterSets> Next(const Profile& profile) override;
    std::string Name() const override { return "the folder " + folder_.string(); }

 private:
    std::filesystem::path folder_;
    std::vector<std::filesystem::path> files_;  // the next at the back
};

/// Whether the sets can belong to a file with this profile, whose head of `avcC` comes from its sets.
bool FitsProfile(const ParameterSets& sets, const Profile& profile);

}  // namespace clipfile
