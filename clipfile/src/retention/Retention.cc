#include "retention/Retention.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <charconv>
#include <cstdio>
#include <initializer_list>
#include <limits>
#include <system_error>
#include <tuple>
#include <utility>

#include "common/ToolError.h"
#include "reader/Folder.h"
#include "recover/OriginalFile.h"
#include "verify/Verification.h"

namespace clipfile {
namespace {

namespace fs = std::filesystem;

struct File {
    fs::path path;
    std::uint64_t bytes = 0;
    /// What the disk gets back without it.
    std::uint64_t room = 0;
    fs::file_time_type changed;
};

/// Bytes that a file holds on the disk, as far as they go with its name.
std::uint64_t RoomOf(const fs::path& path) {
    // stat(2): blocks of 512 bytes, whatever the disk has.
    constexpr std::uint64_t kBlock = 512;
    struct stat status {};
    const bool frees = lstat(path.c_str(), &status) == 0 && status.st_nlink == 1;
    return frees ? static_cast<std::uint64_t>(status.st_blocks) * kBlock : 0;
}

/// The recordings below a folder, from the oldest on. What has gone meanwhile, and links, are left out.
std::vector<File> OldestFirst(const std::vector<std::string>& paths) {
    std::vector<File> files;
    for (const std::string& path : paths) {
        std::error_code error;
        const bool regular = fs::symlink_status(path, error).type() == fs::file_type::regular;
        File file{path, 0, RoomOf(path), {}};
        file.bytes = error ? 0 : fs::file_size(path, error);
        file.changed = error ? fs::file_time_type() : fs::last_write_time(path, error);
        if (regular && !error) {
            files.push_back(file);
        }
    }
    std::sort(files.begin(), files.end(), [](const File& one, const File& other) {
        return std::tie(one.changed, one.path) < std::tie(other.changed, other.path);
    });
    return files;
}

/// Removes a file that may go, or would. Gives why it may not; empty when it has gone.
std::string Remove(const fs::path& path, bool dryRun) {
    try {
        // Held until it is gone: nobody begins to recover it.
        const OriginalFile held(path);
        if (!held.LockFault().empty()) {
            return "nobody can tell whether it is still recorded: " + held.LockFault();
        }
        const std::vector<std::string> defects = VerifyFile(path).defects;
        if (!defects.empty()) {
            return defects.front();
        }
        held.CheckUnchanged();
        std::error_code error;
        if (!dryRun && !fs::remove(path, error)) {
            return "it cannot be removed: " + error.message();
        }
    } catch (const ToolError& error) {
        return error.what();
    }
    return {};
}

std::string Gigabytes(std::uint64_t bytes) {
    std::array<char, 32> text{};
    std::snprintf(text.data(), text.size(), "%.1f GB", static_cast<double>(bytes) / 1e9);
    return text.data();
}

/// The room on the disk of a folder, by what was free at first and what removed files held: what the disk
/// says may be late, and others may fill it meanwhile.
class Room {
 public:
    Room(const RetentionOptions& options, const RetentionSystem& system)
        : options_(options), system_(system), free_(options.keepFree ? Look() : 0), seen_(free_) {}

    /// Files have to go for it.
    bool Lacks() const { return options_.keepFree && free_ < *options_.keepFree && standstill_.empty(); }
    std::uint64_t Free() const { return free_; }
    bool Holds(const fs::path& path) const {
        return system_.fileSystem(path) == system_.fileSystem(options_.folder);
    }
    const std::string& Standstill() const { return standstill_; }

    /// A file of this disk is gone, or would be.
    void Count(const File& file) {
        free_ += file.room;
        if (options_.dryRun || file.room == 0) {
            return;
        }
        const std::uint64_t before = std::exchange(seen_, Look());
        if (seen_ <= before) {
            system_.settle(options_.folder);
            seen_ = Look();
        }
        if (seen_ <= before) {
            standstill_ =
                "removing " + file.path.string() +
                " freed nothing: a snapshot or a program may hold it, or the disk fills as quickly. "
                "Nothing more is removed for room.";
        }
    }
    /// At the end.
    bool Suffices() const {
        return !options_.keepFree || (options_.dryRun ? free_ : Look()) >= *options_.keepFree;
    }

 private:
    std::uint64_t Look() const { return system_.freeBytes(options_.folder); }

    const RetentionOptions& options_;
    const RetentionSystem& system_;
    std::uint64_t free_;
    /// What the disk said last.
    std::uint64_t seen_;
    std::string standstill_;
};

/// A number with one of some units behind it.
template <typename Number>
std::optional<Number> ParseWithUnit(std::string_view text,
                                    std::initializer_list<std::pair<char, Number>> units) {
    Number number = 0;
    const char* const end = text.data() + text.size();
    const auto [stop, error] = std::from_chars(text.data(), end, number);
    for (const auto& [letter, factor] : units) {
        if (error == std::errc() && stop + 1 == end && *stop == letter && number > 0 &&
            number <= std::numeric_limits<Number>::max() / factor) {
            return number * factor;
        }
    }
    return std::nullopt;
}

}  // namespace

RetentionSystem ThisSystem() {
    const auto freeBytes = [](const fs::path& folder) -> std::uint64_t {
        std::error_code error;
        const fs::space_info space = fs::space(folder, error);
        if (error) {
            throw ToolError(ExitCode::kUnreadable, "the free space of " + folder.string() +
                                                       " cannot be read: " + error.message() + ".");
        }
        return space.available;
    };
    const auto settle = [](const fs::path& folder) {
        // Where it can't, the room does not show, and nothing more goes.
        if (const int descriptor = open(folder.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC);
            descriptor >= 0) {
            syncfs(descriptor);
            close(descriptor);
        }
    };
    const auto fileSystem = [](const fs::path& path) -> std::uint64_t {
        struct stat status {};
        return stat(path.c_str(), &status) == 0 ? status.st_dev : 0;
    };
    return {freeBytes, settle, fileSystem, fs::file_time_type::clock::now};
}

RetentionResult Retain(const RetentionOptions& options, const RetentionSystem& system,
                       const std::function<void(const RetentionStep&)>& tell) {
    const FolderListing listing = FilesIn(options.folder);
    Room room(options, system);
    for (const File& file : OldestFirst(listing.files)) {
        const bool isOld = options.olderThan && system.now() - file.changed > *options.olderThan;
        if (!isOld && !room.Lacks()) {
            break;
        }
        const bool isHere = options.keepFree && room.Holds(file.path);
        if (!isOld && !isHere) {
            continue;
        }
        const std::string why = isOld ? "it is older than the limit" : Gigabytes(room.Free()) + " are free";
        const std::string obstacle =
            !isOld && file.room == 0 ? "without it no more would be free" : Remove(file.path, options.dryRun);
        tell({file.path.string(), file.bytes, obstacle.empty(), obstacle.empty() ? why : obstacle});
        if (obstacle.empty() && isHere) {
            room.Count(file);
        }
    }
    return {listing.faults, room.Suffices(), room.Standstill()};
}

std::optional<std::chrono::seconds> ParseAge(std::string_view text) {
    // Ten thousand days and more are a slip, and overflow the clock of files in the end.
    constexpr std::int64_t kLongest = 10'000 * 86'400LL;
    const auto seconds = ParseWithUnit<std::int64_t>(text, {{'d', 86'400}, {'h', 3'600}});
    return seconds && *seconds <= kLongest ? std::optional(std::chrono::seconds(*seconds)) : std::nullopt;
}

std::optional<std::uint64_t> ParseBytes(std::string_view text) {
    return ParseWithUnit<std::uint64_t>(text,
                                        {{'M', 1'000'000}, {'G', 1'000'000'000}, {'T', 1'000'000'000'000}});
}

}  // namespace clipfile
