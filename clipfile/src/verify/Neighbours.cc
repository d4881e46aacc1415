// The rules on files that follow on each other.

#include <algorithm>
#include <map>

#include "reader/BigEndian.h"
#include "reader/TimecodeCount.h"
#include "verify/Verification.h"

namespace clipfile {

namespace {

/// A file with the place of its pictures in the day.
struct Piece {
    Verification* file;
    std::int64_t first;  // frame numbers
    std::int64_t end;    // behind the last picture
    std::uint32_t rate;  // frames a timecode second
};

std::optional<Piece> PieceOf(Verification& file) {
    const Inspection& inspection = file.inspection;
    const TrackSummary* const video = inspection.Find(FourCc("vide"));
    const TrackSummary* const timecode = inspection.Find(FourCc("tmcd"));
    // Where the stream has no timecode, the sample says 0, and says nothing.
    if (inspection.recording.completion != Completion::kClosed || video == nullptr || timecode == nullptr ||
        !timecode->track.timecode || !inspection.start || !inspection.firstUnit ||
        !inspection.firstUnit->timecode) {
        return std::nullopt;
    }
    const std::uint32_t rate = timecode->track.timecode->frameCount;
    if (rate == 0) {
        return std::nullopt;
    }
    const std::int64_t first = FrameNumberOf(*inspection.start, rate);
    return Piece{&file, first, first + static_cast<std::int64_t>(video->samples), rate};
}

/// Whether pictures and audio of a file end at the same instant. Only there may a recorder go over to the
/// next.
bool EndsInStep(const Inspection& inspection) {
    const TrackSummary* const video = inspection.Find(FourCc("vide"));
    const TrackSummary* const audio = inspection.Find(FourCc("soun"));
    if (inspection.recording.completion != Completion::kClosed || video == nullptr || audio == nullptr) {
        return false;
    }
    // Both lengths as parts of both time scales. Numbers that wrap belong to no recording.
    return video->duration * audio->track.timescale == audio->duration * video->track.timescale;
}

void Compare(const Piece& piece, const Piece& next) {
    const std::string name = next.file->path.filename().string();
    const std::int64_t distance = next.first - piece.end;
    if (distance == 0) {
        if (!EndsInStep(piece.file->inspection)) {
            piece.file->defects.push_back("Sound and picture do not end together, and " + name +
                                          " goes on with them.");
        }
    } else if (distance < 0) {
        piece.file->defects.push_back("Its last " + std::to_string(-distance) +
                                      " pictures have timecodes of " + name + ".");
    } else if (distance <= std::int64_t{piece.rate}) {
        piece.file->defects.push_back(std::to_string(distance) + " pictures are missing between it and " +
                                      name + ".");
    }
}

}  // namespace

void VerifyNeighbours(std::vector<Verification>& files) {
    std::map<std::filesystem::path, std::vector<Piece>> folders;
    for (Verification& file : files) {
        if (const auto piece = PieceOf(file)) {
            folders[file.path.parent_path()].push_back(*piece);
        }
    }
    for (auto& [folder, pieces] : folders) {
        std::sort(pieces.begin(), pieces.end(),
                  [](const Piece& a, const Piece& b) { return a.first < b.first; });
        for (std::size_t i = 0; i + 1 < pieces.size(); ++i) {
            Compare(pieces[i], pieces[i + 1]);
        }
    }
}

}  // namespace clipfile
