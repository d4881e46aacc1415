#include "output/OutputPlace.h"

#include <algorithm>

#include "QxRegistry.h"
#include "common/NativePath.h"
#include "common/ReceiverError.h"
#include "platform/SharePath.h"

namespace receiver {
namespace {

constexpr const char* kSection = "Qx/Other/MP4FileOut";
constexpr const char* kDefaultOutput = "recordings";
constexpr const char* kDefaultPrefix = "Unknown-Model";
/// What the module takes for an output path that is not set.
constexpr const char* kFromStore = "none";

std::string Stored(const char* key) {
    std::string value;
    return QxRegistry::GetInstance()->getValue(kSection, key, value) ? value : std::string();
}

}  // namespace

std::int64_t FileMinutes() {
    constexpr unsigned int kUsual = 120;
    unsigned int minutes = 0;
    return QxRegistry::GetInstance()->getValue(kSection, "MP4MaxFileSize", minutes) ? minutes : kUsual;
}

std::string ModulePath(std::string path) {
    std::replace(path.begin(), path.end(), '/', '\\');
    return path;
}

OutputPlace PlaceOf(const Options& options) {
    OutputPlace place;
    std::string path = options.output ? *options.output : Stored("MP4OutputPath");
    const bool stored = !options.output && !path.empty();
    if (path.empty() && !options.output) {
        path = kDefaultOutput;
    }
    // To the module the slashes of a start parameter are backslashes, and those of the store are slashes.
    place.onShare = clipfileModule::IsSharePath(stored ? path : ModulePath(path));
    place.folder = NativePath(path);
    while (place.folder.size() > 1 && place.folder.ends_with('/')) {
        place.folder.pop_back();
    }
    clipfileModule::SharePath share;
    if (place.onShare && !clipfileModule::SharePath::Parse(ModulePath(place.folder), share)) {
        throw ReceiverError(ExitCode::kUsage,
                            (stored ? "MP4OutputPath of the settings store, " : "--output ") + path +
                                ", names no share: write //server/share/folder.");
    }
    if (!stored && place.folder == kFromStore) {
        place.folder = "./" + place.folder;
    }
    place.parameter = stored ? kFromStore : place.onShare ? ModulePath(place.folder) : place.folder;
    place.prefix = options.prefix.value_or(kDefaultPrefix);
    place.user = options.user ? *options.user : Stored("MP4AuthUserName");
    place.password = options.password ? *options.password : Stored("MP4AuthPassword");
    return place;
}

}  // namespace receiver
