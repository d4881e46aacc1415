#include "recover/Recovery.h"

#include <fcntl.h>
#include <sys/file.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <memory>
#include <system_error>
#include <vector>

#include "common/ToolError.h"
#include "reader/BigEndian.h"
#include "recover/DataChunks.h"
#include "recover/ParameterSetSource.h"
#include "recover/RecordingWriter.h"
#include "recover/TableChunks.h"

namespace clipfile {

namespace {

namespace fs = std::filesystem;

/// Pictures that parameter sets are tried on: one may be damaged.
constexpr std::size_t kTriedPictures = 3;
/// Chunks that are searched for them: more than two seconds.
constexpr std::size_t kTriedChunks = 16;

ToolError CannotRecover(const fs::path& path, const std::string& why) {
    return {ExitCode::kDefects, path.string() + " cannot be recovered: " + why + "."};
}

ToolError Unwritable(const fs::path& path, int error) {
    return {ExitCode::kUnreadable,
            path.string() + " cannot be written: " + std::generic_category().message(error) + "."};
}

/// Keeps recorders off a file, which lock what they write.
class FileLock {
 public:
    explicit FileLock(const fs::path& path) : descriptor_(open(path.c_str(), O_RDONLY | O_CLOEXEC)) {
        if (descriptor_ >= 0 && flock(descriptor_, LOCK_SH | LOCK_NB) != 0 && errno == EWOULDBLOCK) {
            close(descriptor_);
            throw ToolError(ExitCode::kUnreadable, path.string() + " is still being recorded.");
        }
    }
    ~FileLock() {
        if (descriptor_ >= 0) {
            close(descriptor_);
        }
    }
    FileLock(const FileLock&) = delete;
    FileLock& operator=(const FileLock&) = delete;

 private:
    int descriptor_;
};

/// A file under a name of its own until it is complete. Removed when it never is.
class NewFile {
 public:
    explicit NewFile(const fs::path& target)
        : target_(target),
          path_(target.parent_path() / ("." + target.filename().string() + "." + std::to_string(getpid()))) {}
    ~NewFile() {
        std::error_code ignored;
        fs::remove(path_, ignored);
    }
    NewFile(const NewFile&) = delete;
    NewFile& operator=(const NewFile&) = delete;

    const fs::path& Path() const { return path_; }
    /// Gives it its name once it is on the disk. Another file of that name is replaced only if `replaces`.
    void Keep(bool replaces) const {
        Synchronize(path_);
        const int result =
            replaces ? rename(path_.c_str(), target_.c_str())
                     : renameat2(AT_FDCWD, path_.c_str(), AT_FDCWD, target_.c_str(), RENAME_NOREPLACE);
        if (result != 0) {
            throw Unwritable(target_, errno);
        }
        Synchronize(target_.parent_path());
    }

 private:
    static void Synchronize(const fs::path& path) {
        const int descriptor = open(path.c_str(), O_RDONLY | O_CLOEXEC);
        const int result = descriptor < 0 ? -1 : fsync(descriptor);
        const int error = errno;
        if (descriptor >= 0) {
            close(descriptor);
        }
        if (result != 0) {
            throw Unwritable(path, error);
        }
    }

    fs::path target_;
    fs::path path_;
};

fs::path TargetOf(const fs::path& path, const RecoveryOptions& options) {
    if (options.inPlace) {
        return fs::absolute(path);
    }
    if (!options.output.empty()) {
        return fs::absolute(options.output / path.filename());
    }
    return fs::absolute(path.parent_path() /
                        (path.stem().string() + ".recovered" + path.extension().string()));
}

std::unique_ptr<ChunkSource> MakeSource(const InputFile& file, const Recording& recording,
                                        const SampleClock& clock) {
    if (recording.movie) {
        return std::make_unique<TableChunks>(file, recording, clock);
    }
    return std::make_unique<DataChunks>(file, recording.dataBegin, recording.dataEnd, clock);
}

MetadataUnit UnitOf(const Chunk& chunk) {
    if (chunk->meta.empty()) {
        return {};
    }
    nal_access::SampleData& sample = *chunk->meta.front();
    return ReadMetadataUnit(Bytes(sample.GetData(), static_cast<std::size_t>(sample.GetDataSize())));
}

/// Sync pictures of the first chunks.
std::vector<std::shared_ptr<nal_access::SampleData>> FirstPictures(ChunkSource& source) {
    std::vector<std::shared_ptr<nal_access::SampleData>> pictures;
    for (std::size_t chunks = 0; chunks < kTriedChunks && pictures.size() < kTriedPictures; ++chunks) {
        const Chunk chunk = source.Next();
        if (chunk == nullptr) {
            break;
        }
        std::copy_if(chunk->video.begin(), chunk->video.end(), std::back_inserter(pictures),
                     [](const auto& picture) { return picture->GetSync(); });
    }
    return pictures;
}

/// Parameter sets that the pictures decode with, and where they were found.
std::pair<ParameterSets, std::string> FindSets(const InputFile& file, const Recording& recording,
                                               ChunkSource& source, const RecoveryOptions& options) {
    const auto pictures = FirstPictures(source);
    if (pictures.empty()) {
        throw CannotRecover(file.Path(), "it has no picture that can be decoded by itself");
    }
    std::unique_ptr<ParameterSetSource> sets;
    if (!options.like.empty()) {
        sets = std::make_unique<LikeFile>(options.like);
    } else {
        sets = std::make_unique<FolderFiles>(fs::absolute(file.Path()).parent_path(), file.Path());
    }
    while (auto candidate = sets->Next(recording.profile)) {
        const bool fits =
            FitsProfile(*candidate, recording.profile) &&
            std::any_of(pictures.begin(), pictures.end(), [&](const auto& picture) {
                return DecodesWith(
                    *candidate, Bytes(picture->GetData(), static_cast<std::size_t>(picture->GetDataSize())),
                    recording.profile.video->width, recording.profile.video->height);
            });
        if (fits) {
            return {std::move(*candidate), sets->Name()};
        }
    }
    throw CannotRecover(file.Path(), "the parameter sets of " + sets->Name() +
                                         " fit none of its pictures; name a closed recording of the same "
                                         "stream with --like");
}

/// The sets that a file has itself.
std::optional<ParameterSets> OwnSets(const Recording& recording) {
    const Track* const video = recording.movie ? recording.movie->Find(FourCc("vide")) : nullptr;
    if (video == nullptr || !video->avc || video->avc->sps.empty() || video->avc->pps.empty()) {
        return std::nullopt;
    }
    return ParameterSets{video->avc->sps.front(), video->avc->pps.front()};
}

void CopyChunks(Chunk first, ChunkSource& source, RecordingWriter& writer, RecoveryResult& result) {
    for (Chunk chunk = std::move(first); chunk != nullptr; chunk = source.Next()) {
        writer.Write(chunk);
        result.pictures += chunk->video.size();
        result.audioFrames += chunk->audio.size();
        result.metadataUnits += chunk->meta.size();
    }
    writer.Close();
}

/// Reads the new file as any other, before it gets its name.
void CheckWritten(const fs::path& path, const RecoveryResult& result) {
    const InputFile file(path);
    const Recording recording = ReadRecording(file);
    if (recording.completion != Completion::kClosed || !recording.movie || result.pictures == 0) {
        throw CannotRecover(path, "what was written is not whole");
    }
}

}  // namespace

bool IsRecovered(const fs::path& path, const RecoveryOptions& options) {
    return !options.inPlace && fs::exists(TargetOf(path, options));
}

RecoveryResult RecoverFile(const fs::path& path, const RecoveryOptions& options) {
    const InputFile file(path);
    const FileLock lock(path);
    const Recording recording = ReadRecording(file);
    RecoveryResult result;
    if (recording.completion == Completion::kClosed) {
        return result;
    }
    const fs::path target = TargetOf(path, options);
    if (IsRecovered(path, options)) {
        throw ToolError(ExitCode::kUnreadable, target.string() + " is there already.");
    }

    RecordingSetup setup = ReadSetup(file, recording, {});
    const SampleClock clock(setup.timescale, setup.pictureDuration);
    std::unique_ptr<ChunkSource> source = MakeSource(file, recording, clock);
    const Chunk first = source->Next();
    if (first == nullptr) {
        throw CannotRecover(path, "there is no whole picture in it");
    }
    setup = ReadSetup(file, recording, UnitOf(first));
    std::optional<ParameterSets> sets = OwnSets(recording);
    if (!sets) {
        auto [found, name] = FindSets(file, recording, *MakeSource(file, recording, clock), options);
        sets = std::move(found);
        result.parameterSets = name;
    }

    const NewFile written(target);
    {
        RecordingWriter writer(written.Path(), setup, *sets);
        CopyChunks(first, *source, writer, result);
    }
    CheckWritten(written.Path(), result);
    std::error_code ignored;
    fs::permissions(written.Path(), fs::status(path).permissions(), ignored);
    written.Keep(options.inPlace);
    result.isRecovered = true;
    result.written = target;
    result.bytesLeft = file.Size() - std::min(file.Size(), source->Position());
    return result;
}

}  // namespace clipfile
