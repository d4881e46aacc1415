#pragma once

#include <cstdint>
#include <optional>
#include <string>

#include "reader/Movie.h"
#include "reader/Profile.h"

namespace clipfile {

/// The two kinds of file.
enum class FileKind { kNormal, kFragmented };

/// How far the recorder came with a file.
enum class Completion {
    /// All boxes are there and whole.
    kClosed,
    /// The recorder has not closed it: it still records, or was cut off.
    kUnfinished,
};

/// The structure of a recording.
struct Recording {
    FileKind kind = FileKind::kNormal;
    Profile profile;
    Completion completion = Completion::kUnfinished;
    /// Why it is not closed, as a sentence; empty when it is.
    std::string reason;
    /// Nothing when the file has no whole `moov`, or one that contradicts itself.
    std::optional<Movie> movie;
    std::optional<Box> moov;  // whole, but it may contradict itself
    /// Sample bytes of a normal file, or of the part that `moov` of a fragmented one describes.
    std::uint64_t dataBegin = 0;
    std::uint64_t dataEnd = 0;
    /// `moof` boxes that are whole.
    std::uint64_t fragmentCount = 0;
    std::optional<Box> fragmentIndex;  // mfra
};

/// Reads how a file is built, box headers and `moov` alone. Throws `NoRecordingError` with one sentence for a
/// file that is no MP4 file, and for one that is no recording.
Recording ReadRecording(const InputFile& file);

/// Goes through the `moof` boxes behind the first `mdat` that are whole, and stops at the first that is not.
class FragmentCursor {
 public:
    FragmentCursor(const InputFile& file, const Recording& recording)
        : cursor_(file, recording.dataEnd, file.Size()) {}
    std::optional<Box> Next();

 private:
    BoxCursor cursor_;
};

}  // namespace clipfile
