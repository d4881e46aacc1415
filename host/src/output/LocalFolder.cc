#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>
#include <filesystem>

#include "common/ReceiverError.h"
#include "output/Links.h"
#include "output/OutputFolder.h"

namespace receiver {
namespace {

class LocalFolder final : public OutputFolder {
 public:
    explicit LocalFolder(std::string folder) : folder_(std::move(folder)) {}

    bool Prepare() override;
    std::optional<std::uint64_t> FreeBytes() override;
    std::string Obstacle(const std::string& date, const std::string& prefix) override;
    bool Exists(const std::string& path) override;
    RecordedFile ReadBackFile(const std::string& path) override { return ReadBack(path); }

 private:
    const std::string folder_;
};

bool LocalFolder::Prepare() {
    std::error_code error;
    const std::filesystem::file_status status = std::filesystem::status(folder_, error);
    bool made = false;
    if (status.type() == std::filesystem::file_type::not_found) {
        made = std::filesystem::create_directory(folder_, error);
        if (!made) {
            throw ReceiverError(ExitCode::kOutput,
                                "the output folder '" + folder_ + "' does not exist and cannot be made: " +
                                    error.message() + "; make it, or see that its disk is mounted.");
        }
    } else if (status.type() != std::filesystem::file_type::directory) {
        throw ReceiverError(ExitCode::kOutput, "the output folder '" + folder_ + "' is no folder" +
                                                   (error ? ": " + error.message() : std::string()) +
                                                   "; --output names another one.");
    }
    if (access(folder_.c_str(), W_OK | X_OK) != 0) {
        throw ReceiverError(ExitCode::kOutput, "the output folder '" + folder_ +
                                                   "' is not writable: " + std::strerror(errno) +
                                                   "; change its rights, or name another one with --output.");
    }
    const std::optional<std::uint64_t> free = FreeBytes();
    if (free && *free < kMinFreeBytes) {
        throw ReceiverError(ExitCode::kOutput, FullSentence(folder_, *free));
    }
    return made;
}

std::optional<std::uint64_t> LocalFolder::FreeBytes() {
    std::error_code error;
    const std::filesystem::space_info space = std::filesystem::space(folder_, error);
    return error ? std::nullopt : std::optional<std::uint64_t>(space.available);
}

std::string LocalFolder::Obstacle(const std::string& date, const std::string& prefix) {
    // From the last folder up to the first one that is there: in it the module makes the rest, or the file.
    const std::string dated = folder_ + "/" + date;
    for (const std::string& path : {prefix.empty() ? dated : dated + "/" + prefix, dated}) {
        struct stat status = {};
        if (stat(path.c_str(), &status) != 0) {
            if (errno == ENOENT || errno == ENOTDIR) {
                continue;
            }
            // What is in the way of looking is the folder above.
            return UnusableSentence(path == dated ? folder_ : dated,
                                    std::string("cannot be entered: ") + std::strerror(errno));
        }
        if (!S_ISDIR(status.st_mode)) {
            return UnusableSentence(path, "is no folder");
        }
        if (LeadsOutOf(folder_, path)) {
            return "the folder '" + path +
                   "' is a link, or behind one, that leads out of the output folder; put a folder in its "
                   "place, or "
                   "name another output folder.";
        }
        if (access(path.c_str(), W_OK | X_OK) != 0) {
            return UnusableSentence(path, std::string("cannot be written: ") + std::strerror(errno));
        }
        return {};
    }
    struct stat status = {};
    if (stat(folder_.c_str(), &status) == 0 && !S_ISDIR(status.st_mode)) {
        return UnusableSentence(folder_, "is no folder");
    }
    return {};
}

bool LocalFolder::Exists(const std::string& path) {
    std::error_code error;
    return std::filesystem::exists(path, error);
}

}  // namespace

std::unique_ptr<OutputFolder> OpenLocalFolder(const std::string& folder) {
    return std::make_unique<LocalFolder>(folder);
}

}  // namespace receiver
