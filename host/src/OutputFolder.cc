#include "OutputFolder.h"

#include <unistd.h>

#include <cerrno>
#include <cstring>
#include <filesystem>

#include "common/ReceiverError.h"
#include "display/FileReport.h"

namespace receiver {
namespace {

ReceiverError Unusable(const std::string& sentence) {
    return {ExitCode::kOutput, sentence};
}

}  // namespace

std::optional<std::uint64_t> FreeBytes(const std::string& folder) {
    std::error_code error;
    const std::filesystem::space_info space = std::filesystem::space(folder, error);
    return error ? std::nullopt : std::optional<std::uint64_t>(space.available);
}

bool PrepareOutputFolder(const std::string& folder) {
    std::error_code error;
    const std::filesystem::file_status status = std::filesystem::status(folder, error);
    bool made = false;
    if (status.type() == std::filesystem::file_type::not_found) {
        made = std::filesystem::create_directory(folder, error);
        if (!made) {
            throw Unusable("the output folder '" + folder + "' does not exist and cannot be made: " +
                           error.message() + "; make it, or see that its disk is mounted.");
        }
    } else if (status.type() != std::filesystem::file_type::directory) {
        throw Unusable("the output folder '" + folder + "' is no folder" +
                       (error ? ": " + error.message() : std::string()) + "; --output names another one.");
    }
    if (access(folder.c_str(), W_OK | X_OK) != 0) {
        throw Unusable("the output folder '" + folder + "' is not writable: " + std::strerror(errno) +
                       "; change its rights, or name another one with --output.");
    }
    const std::optional<std::uint64_t> free = FreeBytes(folder);
    if (free && *free < kMinFreeBytes) {
        throw Unusable("the disk of the output folder '" + folder + "' is full: " + FormatBytes(*free) +
                       " are free, and recording needs " + FormatBytes(kMinFreeBytes) + "; make room.");
    }
    return made;
}

}  // namespace receiver
