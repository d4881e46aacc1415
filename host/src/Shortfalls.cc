#include "Shortfalls.h"

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <numeric>

#include "display/TextDisplay.h"
#include "source/SourceInterface.h"

namespace receiver {
namespace {

/// "00:00:12.500"
std::string Position(std::int64_t ticks) {
    return FormatSeconds(static_cast<double>(ticks) / static_cast<double>(kVideoClock));
}

std::string DescribeUnreached(const RecordRange& range, std::int64_t length) {
    return "nothing was recorded from " + Position(range.begin) + " of the stream on: it has ended at " +
           Position(length);
}

std::string DescribeUnreadable(const RecordedFile& file) {
    if (file.problem == std::strerror(ENOENT)) {
        return file.path + " is gone: it was deleted or moved while the run went on";
    }
    return file.path + " cannot be read: " + file.problem;
}

}  // namespace

std::vector<std::string> ShortfallsOf(const RunRecord& run) {
    std::vector<std::string> sentences;
    if (!run.anyFrame && (run.earlyPictures || !run.endedByOperator)) {
        sentences.push_back(
            std::string("nothing was recorded: the source has sent no IDR frame; set the encoder to closed "
                        "groups of pictures") +
            (run.transcode ? "" : ", or use --transcode"));
    }
    if (run.everything && run.anyFrame && run.recordedFrames == 0) {
        sentences.emplace_back("nothing was recorded: no IDR frame came");
    }
    if (run.unreached && run.anyFrame && !run.endedByOperator) {
        sentences.push_back(DescribeUnreached(*run.unreached, run.length));
    }
    if (run.silentFrames != 0) {
        sentences.push_back(Counted(run.silentFrames, "audio frame") +
                            " of the source did not come: silence was recorded instead");
    }
    for (const RecordedFile& file : run.files) {
        if (!file.problem.empty()) {
            sentences.push_back(DescribeUnreadable(file));
        }
    }
    const std::uint64_t written =
        std::accumulate(run.files.begin(), run.files.end(), std::uint64_t{0},
                        [](std::uint64_t sum, const RecordedFile& file) { return sum + file.frames; });
    const bool readable = std::all_of(run.files.begin(), run.files.end(),
                                      [](const RecordedFile& file) { return file.problem.empty(); });
    if (readable && written < run.recordedFrames) {
        sentences.push_back(Counted(run.recordedFrames - written, "frame") +
                            " that should have been recorded " +
                            (run.recordedFrames - written == 1 ? "is" : "are") + " in no file");
    }
    return sentences;
}

std::string Describe(const MissedRecording& missed) {
    return "nothing was recorded from " + Position(missed.begin) + " to " + Position(missed.end) +
           " of the stream: no IDR frame came in between";
}

}  // namespace receiver
