#include "reader/Recording.h"

#include "common/ToolError.h"
#include "reader/BigEndian.h"
#include "reader/FormatError.h"

namespace clipfile {

namespace {

NoRecordingError NotOurs(const InputFile& file, const std::string& what) {
    return NoRecordingError(file.Path().string() + " " + what + ".");
}

std::optional<Profile> ProfileOf(const InputFile& file, const Box& uuid) {
    try {
        return ReadProfile(file, uuid);
    } catch (const FormatError& error) {
        throw NoRecordingError(file.Path().string() + " has a broken profile: " + error.what());
    }
}

/// Reads what stands in front of the samples and returns where it ends.
std::uint64_t ReadHead(const InputFile& file, Recording& recording) {
    BoxCursor cursor(file, 0, file.Size());
    const auto ftyp = cursor.Next();
    if (!ftyp || ftyp->type != FourCc("ftyp")) {
        throw NotOurs(file, "is no MP4 file");
    }
    const auto uuid = cursor.Next();
    if (ftyp->IsTorn() || !uuid || uuid->IsTorn()) {
        throw NotOurs(file, "ends before its first sample: nothing was recorded in it");
    }
    const auto profile = ProfileOf(file, *uuid);
    if (!profile || (profile->format != kNormalProfile && profile->format != kFragmentedProfile)) {
        throw NotOurs(file, "is an MP4 file, but none of this recorder: it lacks its profile");
    }
    recording.profile = *profile;
    recording.kind = profile->format == kNormalProfile ? FileKind::kNormal : FileKind::kFragmented;
    return cursor.Position();
}

void Complete(Recording& recording, const std::string& missing) {
    recording.reason = missing;
    recording.completion = missing.empty() ? Completion::kClosed : Completion::kUnfinished;
}

/// Reads `moov`. One that contradicts itself counts as none: what had not reached the disk when the power
/// went reads as zeros in many file systems.
void TakeMovie(const InputFile& file, const Box& moov, Recording& recording) {
    recording.moov = moov;
    try {
        recording.movie = ReadMovie(file, moov);
    } catch (const FormatError& error) {
        Complete(recording, std::string("Its 'moov' is broken. ") + error.what());
    }
}

void ReadNormal(const InputFile& file, std::uint64_t position, Recording& recording) {
    BoxCursor cursor(file, position, file.Size());
    const auto mdat = cursor.Next();
    if (!mdat || mdat->type != FourCc("mdat")) {
        recording.dataBegin = recording.dataEnd = position;
        Complete(recording, "It ends before its samples.");
        return;
    }
    recording.dataBegin = mdat->Payload();
    recording.dataEnd = mdat->end;
    if (mdat->PayloadSize() == 0 && mdat->end < file.Size()) {
        // The header is patched on closing. Until then all that follows are samples.
        recording.dataEnd = file.Size();
        Complete(recording, "The length of its samples and 'moov' were never written.");
        return;
    }
    const auto moov = cursor.Next();
    if (mdat->IsTorn() || !moov || moov->type != FourCc("moov") || moov->IsTorn()) {
        Complete(recording, mdat->IsTorn() ? "It ends inside of its samples." : "It has no whole 'moov'.");
        return;
    }
    const bool followed = cursor.Next().has_value() || !cursor.Fault().empty();
    Complete(recording, followed ? "Other bytes follow its 'moov'." : "");
    TakeMovie(file, *moov, recording);
}

/// Goes through the fragments. Returns what is missing, or nothing.
std::string ReadFragments(const InputFile& file, std::uint64_t position, Recording& recording) {
    BoxCursor cursor(file, position, file.Size());
    bool isDataNext = false;  // the samples of the fragment before
    while (const auto box = cursor.Next()) {
        const std::string number = std::to_string(recording.fragmentCount + (isDataNext ? 0 : 1));
        if (box->type == FourCc("moof") && !isDataNext) {
            if (box->IsTorn()) {
                return "It ends inside of the index of fragment " + number + ".";
            }
            ++recording.fragmentCount;
            isDataNext = true;
        } else if (box->type == FourCc("mdat") && isDataNext) {
            if (box->IsTorn()) {
                return "It ends inside of the samples of fragment " + number + ".";
            }
            isDataNext = false;
        } else if (box->type == FourCc("mfra") && !isDataNext && !recording.fragmentIndex) {
            recording.fragmentIndex = box->IsTorn() ? std::nullopt : box;
        } else {
            return "What stands at " + std::to_string(box->offset) + " is no part of a recording.";
        }
    }
    if (!cursor.Fault().empty()) {
        return cursor.Fault();
    }
    return recording.fragmentIndex ? "" : "It has no whole 'mfra'.";
}

void ReadFragmented(const InputFile& file, std::uint64_t position, Recording& recording) {
    BoxCursor cursor(file, position, file.Size());
    recording.dataBegin = recording.dataEnd = position;
    const auto moov = cursor.Next();
    if (!moov || moov->type != FourCc("moov") || moov->IsTorn()) {
        Complete(recording, "It ends before its first fragment was written.");
        return;
    }
    TakeMovie(file, *moov, recording);
    if (!recording.movie) {
        return;
    }
    const auto mdat = cursor.Next();
    if (!mdat || mdat->type != FourCc("mdat")) {
        recording.dataBegin = recording.dataEnd = moov->end;
        Complete(recording, "It ends before the samples of its 'moov'.");
        return;
    }
    recording.dataBegin = mdat->Payload();
    recording.dataEnd = mdat->end;
    if (mdat->IsTorn()) {
        Complete(recording, "It ends inside of the samples of its 'moov'.");
        return;
    }
    Complete(recording, ReadFragments(file, mdat->end, recording));
}

}  // namespace

Recording ReadRecording(const InputFile& file) {
    Recording recording;
    const std::uint64_t position = ReadHead(file, recording);
    if (recording.kind == FileKind::kNormal) {
        ReadNormal(file, position, recording);
    } else {
        ReadFragmented(file, position, recording);
    }
    return recording;
}

std::optional<Box> FragmentCursor::Next() {
    while (const auto box = cursor_.Next()) {
        if (box->type == FourCc("moof")) {
            return box->IsTorn() ? std::nullopt : box;
        }
        if (box->type != FourCc("mdat")) {
            return std::nullopt;
        }
    }
    return std::nullopt;
}

}  // namespace clipfile
