#include "output/OutputFolder.h"

namespace receiver {

std::unique_ptr<OutputFolder> OpenOutputFolder(const OutputPlace& place) {
    return place.onShare ? OpenShareFolder(place) : OpenLocalFolder(place.folder);
}

ReceiverError Unusable(const std::string& sentence) {
    return {ExitCode::kOutput, sentence};
}

std::string FullSentence(const std::string& folder, std::uint64_t freeBytes) {
    return "the disk of the output folder '" + folder + "' is full: " + FormatBytes(freeBytes) +
           " are free, and recording needs " + FormatBytes(kMinFreeBytes) + "; make room.";
}

std::string UnusableSentence(const std::string& folder, const std::string& reason) {
    return "the folder '" + folder + "' " + reason +
           "; change its rights (--group-write gives them to a group from the start), or name another output "
           "folder.";
}

}  // namespace receiver
