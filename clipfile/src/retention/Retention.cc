#include "retention/Retention.h"

#include <sys/stat.h>

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
    /// What of the disk is free when it has gone: nothing where it has another name.
    std::uint64_t freed = 0;
    dev_t device = 0;
    fs::file_time_type changed;
};

/// The recordings below a folder, from the oldest on. What has gone meanwhile, and links, are left out.
std::vector<File> OldestFirst(const std::vector<std::string>& paths) {
    constexpr std::uint64_t kBlock = 512;  // of st_blocks, everywhere
    std::vector<File> files;
    for (const std::string& path : paths) {
        struct stat status {};
        std::error_code error;
        const fs::file_time_type changed = fs::last_write_time(path, error);
        if (!error && lstat(path.c_str(), &status) == 0 && S_ISREG(status.st_mode)) {
            const auto blocks = static_cast<std::uint64_t>(status.st_blocks);
            files.push_back({path, static_cast<std::uint64_t>(status.st_size),
                             status.st_nlink == 1 ? blocks * kBlock : 0, status.st_dev, changed});
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
    return {freeBytes, fs::file_time_type::clock::now};
}

RetentionResult Retain(const RetentionOptions& options, const RetentionSystem& system,
                       const std::function<void(const RetentionStep&)>& tell) {
    const FolderListing listing = FilesIn(options.folder);
    struct stat folder {};
    stat(options.folder.c_str(), &folder);
    // Counted, not asked for again: a disk that frees late, or that others fill, would cost all recordings.
    std::uint64_t free = options.keepFree ? system.freeBytes(options.folder) : 0;
    const auto isFull = [&] { return options.keepFree && free < *options.keepFree; };
    for (const File& file : OldestFirst(listing.files)) {
        const bool isOld = options.olderThan && system.now() - file.changed > *options.olderThan;
        if (!isOld && !isFull()) {
            break;
        }
        if (!isOld && (file.freed == 0 || file.device != folder.st_dev)) {
            continue;
        }
        const std::string why = isOld ? "it is older than the limit" : Gigabytes(free) + " are free";
        const std::string obstacle = Remove(file.path, options.dryRun);
        tell({file.path.string(), file.bytes, obstacle.empty(), obstacle.empty() ? why : obstacle});
        if (obstacle.empty() && file.device == folder.st_dev) {
            free += file.freed;
        }
    }
    return {listing.faults, !isFull()};
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
