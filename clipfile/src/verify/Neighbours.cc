// The rules on files that follow on each other.

#include <algorithm>
#include <chrono>
#include <cstdio>
#include <map>

#include "reader/BigEndian.h"
#include "reader/TimecodeCount.h"
#include "verify/Verification.h"

namespace clipfile {

namespace {

/// A file with the place of its pictures in the day.
struct Piece {
    Verification* file;
    std::int64_t first;    // frame numbers
    std::int64_t end;      // behind the last picture
    std::uint32_t rate;    // frames a timecode second
    std::int64_t day;      // of the folder, 0 without
    std::uint64_t opened;  // seconds, by the recorder's clock

    std::int64_t FramesInDay() const {
        return FrameNumberOf({24, 0, 0, 0, file->inspection.start->dropFrame}, rate);
    }
};

/// The days since 1970 that a folder's name "YYYYMMDD" stands for.
std::optional<std::int64_t> DayOf(const std::string& name) {
    int year = 0;
    unsigned month = 0;
    unsigned day = 0;
    if (name.size() != 8 || name.find_first_not_of("0123456789") != std::string::npos ||
        std::sscanf(name.c_str(), "%4d%2u%2u", &year, &month, &day) != 3) {
        return std::nullopt;
    }
    const std::chrono::year_month_day date{std::chrono::year(year), std::chrono::month(month),
                                           std::chrono::day(day)};
    return date.ok() ? std::optional(std::chrono::sys_days(date).time_since_epoch().count()) : std::nullopt;
}

/// A folder without the part of its path that is a date, and that date: a recorder goes on in that of the
/// next day.
std::pair<std::filesystem::path, std::int64_t> WithoutDay(const std::filesystem::path& folder) {
    std::filesystem::path rest;
    std::int64_t day = 0;
    for (const std::filesystem::path& part : folder) {
        if (const auto found = DayOf(part.string())) {
            day = *found;
        } else {
            rest /= part;
        }
    }
    return {rest, day};
}

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
    return Piece{&file,
                 first,
                 first + static_cast<std::int64_t>(video->shown),
                 rate,
                 WithoutDay(file.path.parent_path()).second,
                 inspection.recording.movie->creationTime};
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

/// Whether timecodes of the next day's folder go on with this one's. They need not be those of the clock: one
/// that comes round in the middle of the day has its next file in the same folder.
bool GoesOnNextDay(const Piece& piece, const Piece& next) {
    constexpr std::uint64_t kHalfDay = 12 * 60 * 60;
    return next.day == piece.day + 1 && next.opened >= piece.opened && next.opened - piece.opened < kHalfDay;
}

void Compare(const Piece& piece, const Piece& next) {
    if (next.day != piece.day && !GoesOnNextDay(piece, next)) {
        return;
    }
    const std::string name = next.file->path.filename().string();
    const std::int64_t distance = next.first + (next.day == piece.day ? 0 : piece.FramesInDay()) - piece.end;
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
            folders[WithoutDay(file.path.parent_path()).first].push_back(*piece);
        }
    }
    for (auto& [folder, pieces] : folders) {
        std::sort(pieces.begin(), pieces.end(), [](const Piece& a, const Piece& b) {
            return std::pair(a.day, a.first) < std::pair(b.day, b.first);
        });
        for (std::size_t i = 0; i + 1 < pieces.size(); ++i) {
            Compare(pieces[i], pieces[i + 1]);
        }
    }
}

}  // namespace clipfile
