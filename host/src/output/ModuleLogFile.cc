#include "output/ModuleLogFile.h"

#include <fcntl.h>
#include <stdlib.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>
#include <string>

#include "common/ReceiverError.h"
#include "output/Links.h"

namespace receiver {
namespace {

constexpr const char* kVariable = "QX_LOG";

std::string ValueOf(const char* variable) {
    const char* const set = getenv(variable);
    return set != nullptr ? set : "";
}

std::string DefaultFolder(const OutputPlace& place) {
    if (!place.onShare) {
        return place.folder + "/";
    }
    // Of several, the first one (systemd.exec(5)).
    const std::string folders = ValueOf("LOGS_DIRECTORY");
    return folders.empty() ? "" : folders.substr(0, folders.find(':')) + "/";
}

/// A new one is made readable for its owner alone. Whether everybody can read it.
bool ExpectWritable(const std::string& file) {
    const int descriptor =
        open(file.c_str(), O_WRONLY | O_APPEND | O_CREAT | O_CLOEXEC | O_NOCTTY | O_NONBLOCK, 0600);
    if (descriptor < 0) {
        throw ReceiverError(ExitCode::kOutput, "the log '" + file + "' cannot be written: " +
                                                   std::strerror(errno) + "; --log names another one.");
    }
    struct stat status = {};
    const bool readable =
        fstat(descriptor, &status) == 0 && S_ISREG(status.st_mode) && (status.st_mode & S_IROTH) != 0;
    close(descriptor);
    return readable;
}

}  // namespace

std::optional<std::string> SetUpLog(const Options& options, const OutputPlace& place) {
    if (options.log) {
        setenv(kVariable, *options.log == "-" ? "" : options.log->c_str(), 1);
    } else if (ValueOf(kVariable).empty()) {
        const std::string file = DefaultFolder(place) + "receiver.log";
        // Whoever may write to the folder could have put it there.
        if (!place.onShare && LeadsOutOf(place.folder, file)) {
            throw ReceiverError(
                ExitCode::kOutput,
                "the log '" + file +
                    "' is a link that leads out of the output folder; remove it, or name the log "
                    "with --log.");
        }
        setenv(kVariable, file.c_str(), 1);
    }
    if (options.logPriority) {
        setenv("QX_LOG_PRIORITY", std::to_string(*options.logPriority).c_str(), 1);
    }
    const std::string file = ValueOf(kVariable);
    if (place.onShare && !place.password.empty() && !file.empty()) {
        if (ExpectWritable(file)) {
            return "everybody on this machine can read the log '" + file +
                   "', and a refused logon puts the password there; chmod o-r closes it";
        }
    }
    return std::nullopt;
}

}  // namespace receiver
