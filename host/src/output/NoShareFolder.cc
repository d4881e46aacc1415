// For a build without libsmbclient.

#include "common/ReceiverError.h"
#include "output/OutputFolder.h"

namespace receiver {

std::unique_ptr<OutputFolder> OpenShareFolder(const OutputPlace& place) {
    throw ReceiverError(ExitCode::kOutput, "the output folder '" + place.folder +
                                               "' is on a share, and this receiver was built without "
                                               "libsmbclient; --output names another one.");
}

bool ShareThreadsLeft() {
    return false;
}

}  // namespace receiver
