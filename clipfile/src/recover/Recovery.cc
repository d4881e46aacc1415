#include "recover/Recovery.h"

#include <algorithm>
#include <memory>
#include <system_error>
#include <vector>

#include "common/ToolError.h"
#include "media/NalUnits.h"
#include "reader/BigEndian.h"
#include "reader/RecordingSamples.h"
#include "recover/DataChunks.h"
#include "recover/NewFile.h"
#include "recover/OriginalFile.h"
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
/// So much is written from one look at the free space to the next.
constexpr std::uint64_t kBytesBetweenChecks = 8'000'000;

ToolError CannotRecover(const fs::path& path, const std::string& why) {
    return {ExitCode::kDefects, path.string() + " cannot be recovered: " + why + "."};
}

fs::path TargetOf(const fs::path& path, const RecoveryOptions& options) {
    if (options.inPlace) {
        return fs::absolute(path);
    }
    if (!options.output.empty()) {
        const fs::path name =
            options.searched.empty() ? path.filename() : path.lexically_relative(options.searched);
        return fs::absolute(options.output / name);
    }
    return fs::absolute(path.parent_path() /
                        (path.stem().string() + ".recovered" + path.extension().string()));
}

/// Only the tables of a closed file tell the order in which pictures are shown that need later ones.
void RefuseReordered(const InputFile& file, bool reordered) {
    if (reordered) {
        throw CannotRecover(file.Path(),
                            "its pictures are reordered (B frames), and nothing tells in which order "
                            "they are shown");
    }
}

/// The chunks of a file without tables, as long as they have no B pictures.
class ChunksInOrder final : public ChunkSource {
 public:
    ChunksInOrder(const InputFile& file, std::unique_ptr<ChunkSource> chunks)
        : file_(file), chunks_(std::move(chunks)) {}

    Chunk Next() override {
        Chunk chunk = chunks_->Next();
        RefuseReordered(file_,
                        chunk != nullptr && std::any_of(chunk->video.begin(), chunk->video.end(), HasB));
        return chunk;
    }
    std::uint64_t Position() const override { return chunks_->Position(); }

 private:
    static bool HasB(const std::shared_ptr<nal_access::SampleData>& picture) {
        return HasBPicture(Bytes(picture->GetData(), static_cast<std::size_t>(picture->GetDataSize())));
    }

    const InputFile& file_;
    const std::unique_ptr<ChunkSource> chunks_;
};

std::unique_ptr<ChunkSource> MakeSource(const InputFile& file, const Recording& recording,
                                        const SampleClock& clock) {
    if (recording.movie) {
        const Track* const video = recording.movie->Find(FourCc("vide"));
        RefuseReordered(file, video != nullptr && video->tables.hasComposition);
        return std::make_unique<TableChunks>(file, recording, clock);
    }
    return std::make_unique<ChunksInOrder>(
        file, std::make_unique<DataChunks>(file, recording.dataBegin, recording.dataEnd, clock));
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

/// Where parameter sets may be found, in the order in which they are tried.
std::vector<std::unique_ptr<ParameterSetSource>> SetSources(const fs::path& path,
                                                            const RecoveryOptions& options) {
    std::vector<std::unique_ptr<ParameterSetSource>> sources;
    // What a person has named goes before what this program finds.
    if (!options.like.empty()) {
        sources.push_back(std::make_unique<LikeFile>(options.like));
    }
    if (auto journal = std::make_unique<JournalSets>(path); !journal->IsEmpty()) {
        sources.push_back(std::move(journal));
    }
    if (options.like.empty()) {
        sources.push_back(std::make_unique<FolderFiles>(fs::absolute(path).parent_path(), path));
    }
    return sources;
}

/// Parameter sets that the pictures decode with, and where they were found.
std::pair<ParameterSets, std::string> FindSets(const InputFile& file, const Recording& recording,
                                               ChunkSource& source, const RecoveryOptions& options) {
    const auto pictures = FirstPictures(source);
    if (pictures.empty()) {
        throw CannotRecover(file.Path(), "it has no picture that can be decoded by itself");
    }
    const auto fits = [&](const ParameterSets& candidate) {
        return FitsProfile(candidate, recording.profile) &&
               std::any_of(pictures.begin(), pictures.end(), [&](const auto& picture) {
                   return DecodesWith(
                       candidate, Bytes(picture->GetData(), static_cast<std::size_t>(picture->GetDataSize())),
                       recording.profile.video->width, recording.profile.video->height);
               });
    };
    std::string tried;
    for (const auto& sets : SetSources(file.Path(), options)) {
        while (auto candidate = sets->Next(recording.profile)) {
            if (fits(*candidate)) {
                return {std::move(*candidate), sets->Name()};
            }
        }
        tried += (tried.empty() ? "" : " and of ") + sets->Name();
    }
    throw CannotRecover(file.Path(), "the parameter sets of " + tried +
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

void ExpectRoom(const RecoveryOptions& options) {
    if (options.checkRoom) {
        options.checkRoom();
    }
}

/// Returns the bytes of the longest chunk.
std::uint64_t CopyChunks(Chunk first, ChunkSource& source, RecordingWriter& writer,
                         const RecoveryOptions& options, RecoveryResult& result) {
    std::uint64_t longest = 0;
    std::uint64_t unchecked = 0;
    for (Chunk chunk = std::move(first); chunk != nullptr; chunk = source.Next()) {
        writer.Write(chunk);
        result.pictures += chunk->video.size();
        result.audioFrames += chunk->audio.size();
        result.metadataUnits += chunk->meta.size();
        std::uint64_t bytes = 0;
        for (const auto* const samples : {&chunk->meta, &chunk->audio, &chunk->video}) {
            for (const auto& sample : *samples) {
                bytes += sample->GetDataSize();
            }
        }
        longest = std::max(longest, bytes);
        unchecked += bytes;
        if (unchecked >= kBytesBetweenChecks) {
            unchecked = 0;
            ExpectRoom(options);
        }
    }
    writer.Close();
    ExpectRoom(options);
    return longest;
}

std::uint64_t CountSamples(const InputFile& file, const Recording& recording, std::uint32_t handler) {
    const std::vector<Track>& tracks = recording.movie->tracks;
    std::uint64_t count = 0;
    for (std::size_t i = 0; i < tracks.size(); ++i) {
        if (tracks[i].handler == handler) {
            RecordingSamples samples(file, recording, i);
            while (samples.Next()) {
                ++count;
            }
        }
    }
    return count;
}

/// Reads the new file as any other, before it gets its name.
void CheckWritten(const fs::path& path, const RecoveryResult& result) {
    const InputFile file(path);
    const Recording recording = ReadRecording(file);
    if (recording.completion != Completion::kClosed || !recording.movie || result.pictures == 0 ||
        CountSamples(file, recording, FourCc("vide")) != result.pictures ||
        CountSamples(file, recording, FourCc("soun")) != result.audioFrames ||
        CountSamples(file, recording, FourCc("meta")) != result.metadataUnits) {
        throw CannotRecover(path, "what was written is not whole");
    }
}

/// Bytes behind the last whole picture which replacing the original would lose, where they are more than a
/// tear leaves: less than a chunk. Else 0.
std::uint64_t BytesAtRisk(const InputFile& file, const Recording& recording, std::uint64_t position,
                          std::uint64_t longestChunk) {
    // Behind the samples of a normal file there is nothing but its index, which is made again.
    const std::uint64_t end =
        recording.kind == FileKind::kNormal ? std::min(recording.dataEnd, file.Size()) : file.Size();
    const std::uint64_t left = end - std::min(end, position);
    return left > longestChunk ? left : 0;
}

/// Whether the new file may take the place of its original: nothing is wrong with it, and nothing lost. It is
/// looked at under the name that it has in work, so that one that was not looked at to the end has no other.
bool MayReplace(const NewFile& written, const fs::path& target, std::uint64_t bytesAtRisk,
                const RecoveryOptions& options, RecoveryResult& result) {
    result.defects = options.verify(written.Path(), target);
    const bool mayReplace = result.defects.empty() && bytesAtRisk == 0;
    if (!mayReplace) {
        ExpectRoom(options);  // it will go on taking its own
    }
    return mayReplace;
}

/// Fragments cannot be read without the tracks of `moov`.
bool HasBrokenMovie(const Recording& recording) {
    return recording.kind == FileKind::kFragmented && recording.moov &&
           (!recording.movie || recording.movie->Find(FourCc("vide")) == nullptr);
}

/// The folders below the output's that a file goes to.
void MakeFolders(const fs::path& target) {
    std::error_code error;
    fs::create_directories(target.parent_path(), error);
    if (error) {
        throw ToolError(ExitCode::kUnreadable,
                        target.parent_path().string() + " cannot be made: " + error.message() + ".");
    }
}

}  // namespace

std::optional<fs::path> RecoveredBefore(const fs::path& path, const RecoveryOptions& options) {
    fs::path target = TargetOf(path, options);
    return !options.inPlace && fs::exists(target) ? std::optional(std::move(target)) : std::nullopt;
}

RecoveryResult RecoverFile(const fs::path& path, const RecoveryOptions& options) {
    // What the recorder writes until it lets go of the file belongs to it: its size is asked for behind that.
    const OriginalFile original(path);
    const InputFile file(path);
    const Recording recording = ReadRecording(file);
    RecoveryResult result;
    if (recording.completion == Completion::kClosed) {
        return result;
    }
    const fs::path target = TargetOf(path, options);
    if (RecoveredBefore(path, options)) {
        throw ToolError(ExitCode::kUnreadable, target.string() + " is there already.");
    }
    if (HasBrokenMovie(recording)) {
        throw CannotRecover(path, "its 'moov' is broken");
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
    if (!options.searched.empty()) {
        MakeFolders(target);
    }
    NewFile written(target);
    std::uint64_t longestChunk = 0;
    {
        RecordingWriter writer(written.Path(), setup, *sets);
        longestChunk = CopyChunks(first, *source, writer, options, result);
    }
    CheckWritten(written.Path(), result);
    const std::uint64_t bytesAtRisk = BytesAtRisk(file, recording, source->Position(), longestChunk);
    if (options.inPlace && bytesAtRisk != 0) {
        throw CannotRecover(path, "in place it would lose the " + std::to_string(bytesAtRisk) +
                                      " bytes behind its last whole picture, which are more than a chunk; "
                                      "recover it without --in-place");
    }
    original.CopyAccess(written.Path());
    written.Synchronize();
    const bool replaces =
        options.verify ? MayReplace(written, target, bytesAtRisk, options, result) : options.inPlace;
    original.CheckUnchanged();
    result.written = replaces ? fs::absolute(path) : target;
    written.Keep(result.written, replaces);
    result.isRecovered = true;
    result.bytesLeft = file.Size() - std::min(file.Size(), source->Position());
    result.lockFault = original.LockFault();
    return result;
}

}  // namespace clipfile
