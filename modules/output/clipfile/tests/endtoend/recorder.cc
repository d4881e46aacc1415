// Records until it is killed: recorder MEDIA OUTPUT FILETYPE PROGRESS. A host with the built library, which
// pushes as fast as the module takes the units.

#include <exception>
#include <iostream>

#include "endtoend/CodedStream.h"
#include "endtoend/LoadedModule.h"
#include "endtoend/PacedPush.h"
#include "endtoend/RecorderProgress.h"
#include "support/CodedMedia.h"
#include "support/FakeHost.h"
#include "support/SharedMemory.h"

namespace {

int record(const char* media, const char* output, const char* fileType, const char* progressPath) {
    const CodedStream stream(media);
    const SharedMemory<RecorderProgress> progress(progressPath);
    FakeHost host;
    host.texts = {{"-outputPath", output}, {"-fileType", fileType}};
    host.numbers = {{"-encodedFPS", 25000},
                    {"-encodedWidth", static_cast<int>(kCodedWidth)},
                    {"-encodedHeight", static_cast<int>(kCodedHeight)}};
    LoadedModule library;
    if (!library.Module().Initialize(&host)) {
        return 1;
    }
    library.Notify().NotifyOnlineStatus();
    PacedPush push(library.Stream());
    for (std::uint64_t n = 0; host.GetStatus() != 7; ++n) {
        stream.PushFrame(push, n);
        progress->frames = n + 1;
    }
    return 1;
}

}  // namespace

int main(int argc, char** argv) {
    try {
        return argc == 5 ? record(argv[1], argv[2], argv[3], argv[4]) : 2;
    } catch (const std::exception& error) {
        std::cerr << error.what() << std::endl;
        return 1;
    }
}
