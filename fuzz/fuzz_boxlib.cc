// The box library, driven by a byte stream that is decoded into operations on a session, in any order and
// with any arguments, with memory that runs out and files that end. What comes of it is read with the reader
// of the program `clipfile`, which shares no line with the library: boxes lie in each other without a gap,
// and hold the samples that were added.

#include <fuzzer/FuzzedDataProvider.h>

#include <algorithm>
#include <cstdlib>
#include <functional>
#include <memory>
#include <vector>

#include "Expect.h"
#include "MemoryFile.h"
#include "boxlib/mbx.h"
#include "boxlib/mbx_stdio.h"
#include "reader/Box.h"
#include "reader/Fragment.h"
#include "reader/Movie.h"

namespace {

using Bytes = std::vector<std::uint8_t>;

/// Above it a file ends; below it no input makes the library write for long.
constexpr std::uint64_t kLongestFile = 4 << 20;
constexpr std::size_t kMostOperations = 400;
constexpr std::size_t kMostTracks = 6;

/// A file in memory, in the place of the library's own.
struct Memory {
    Bytes bytes;
    std::uint64_t position = 0;
};

Memory* Of(MbxFile* file) {
    return reinterpret_cast<Memory*>(file);
}

/// The host's memory, which may run out.
struct Host {
    /// Allocations until one is refused; 0 for never.
    std::uint64_t untilRefusal = 0;
};

MbxCallbacks CallbacksOf(Host& host) {
    MbxCallbacks callbacks{};
    MbxStdioCallbacks(&callbacks);
    callbacks.user_data = &host;
    callbacks.alloc = [](void* user, std::uint64_t size) -> void* {
        auto& left = static_cast<Host*>(user)->untilRefusal;
        return left != 0 && --left == 0 ? nullptr : std::malloc(size);
    };
    callbacks.free = [](void*, void* pointer) { std::free(pointer); };
    callbacks.read = [](MbxFile*, void*, std::uint64_t, std::uint64_t*) { return MBX_ERR_IO; };
    callbacks.write = [](MbxFile* file, const void* data, std::uint64_t size, std::uint64_t* count) {
        Memory& memory = *Of(file);
        *count = 0;
        if (size > kLongestFile || memory.position > kLongestFile - size) {
            return MBX_ERR_IO;
        }
        memory.bytes.resize(std::max<std::size_t>(memory.bytes.size(), memory.position + size));
        const auto* const begin = static_cast<const std::uint8_t*>(data);
        std::copy(begin, begin + size, memory.bytes.begin() + static_cast<std::ptrdiff_t>(memory.position));
        memory.position += size;
        *count = size;
        return MBX_OK;
    };
    callbacks.seek = [](MbxFile* file, std::int64_t offset, std::uint32_t origin) {
        Memory& memory = *Of(file);
        const std::uint64_t base = origin == MBX_SEEK_START      ? 0
                                   : origin == MBX_SEEK_POSITION ? memory.position
                                                                 : memory.bytes.size();
        memory.position = base + static_cast<std::uint64_t>(offset);
        return MBX_OK;
    };
    callbacks.tell = [](MbxFile* file, std::uint64_t* position) {
        *position = Of(file)->position;
        return MBX_OK;
    };
    callbacks.size = [](MbxFile* file, std::uint64_t* length) {
        *length = Of(file)->bytes.size();
        return MBX_OK;
    };
    return callbacks;
}

/// Samples that were added to a track: of `moov`, then of each fragment.
struct ModelTrack {
    std::uint32_t handler = 0;
    std::uint32_t timescale = 0;
    std::uint32_t id = 0;
    std::vector<std::vector<clipfile::Sample>> parts{{}};
    /// Where the open chunk goes on.
    bool chunkIsOpen = false;
    std::uint64_t next = 0;
};

/// One life of a session.
class Life {
 public:
    Life(const std::uint8_t* data, std::size_t size) : input_(data, size) {
        host_.untilRefusal = Seldom() ? input_.ConsumeIntegralInRange(1, 2000) : 0;
        const MbxCallbacks callbacks = CallbacksOf(host_);
        if (MbxCreateContext(&callbacks, &context_) != MBX_OK) {
            return;
        }
        MbxSessionConfig config{};
        config.memory_quota = Seldom() ? input_.ConsumeIntegral<std::uint32_t>() : 0;
        for (std::uint32_t* const word : {&config.options.box_size_mode, &config.options.time_version_mode,
                                          &config.options.chunk_offset_mode, &config.options.mehd_mode,
                                          &config.options.base_offset_mode, &config.options.trun_offset_mode,
                                          &config.options.trun_version_mode, &config.options.tfdt_mode}) {
            *word = Small();
        }
        hasExplicitBase_ = config.options.base_offset_mode == MBX_BASE_EXPLICIT;
        if (MbxSessionCreate(context_, &config, &session_) != MBX_OK) {
            session_ = nullptr;
        }
    }
    ~Life() {
        Expect(MbxSessionDestroy(session_) == MBX_OK, "a session can be destroyed at any time");
        Expect(MbxDestroyContext(context_) == MBX_OK, "a context can be destroyed at any time");
    }
    Life(const Life&) = delete;
    Life& operator=(const Life&) = delete;

    void Run() {
        if (!Seldom()) {
            hasMovie_ = Succeeded(MbxCreateMovie(session_, 25000));
            for (std::uint32_t i = Small() + 1; i != 0; --i) {
                AddTrack();
            }
        }
        for (std::size_t i = 0; i < kMostOperations && input_.remaining_bytes() != 0; ++i) {
            Step();
        }
        ReadBack();
    }

 private:
    using Writing = std::function<MbxStatus(MbxFile* file, std::uint64_t position, std::uint64_t* size)>;

    void Step();
    void StepOfFile();
    void StepOfTrack();
    void StepOfEntry();
    void StepOfSample();
    void StepOfFragment();

    void AddTrack();
    void AddEntry(std::uint32_t track, std::uint32_t handler);
    void AddSample();
    void EndChunk(std::uint32_t number);
    /// So that a fragment can be sealed, and `moov` written.
    void EndChunks();
    void SetCodec(std::uint32_t track, std::uint32_t entry);
    /// Follows what a call has come to: behind memory that has run out nobody knows how far it came.
    bool Succeeded(MbxStatus status) {
        isKnown_ = isKnown_ && status != MBX_ERR_NO_MEMORY;
        return status == MBX_OK;
    }

    /// Measures and writes at the end of `memory`: both say the same, and so much is written.
    bool Write(Memory& memory, const Writing& writing);
    void ReadBack();
    void CompareMovie(const clipfile::InputFile& file, const clipfile::Movie& movie);
    void CompareFragment(const clipfile::InputFile& file, const clipfile::Fragment& fragment,
                         std::size_t number, const clipfile::Movie& movie);
    void CompareSamples(clipfile::SampleSource& source, const ModelTrack& track, std::size_t part);

    std::uint32_t AnyTrack() {
        return input_.ConsumeIntegralInRange<std::uint32_t>(0,
                                                            static_cast<std::uint32_t>(tracks_.size() + 1));
    }
    /// Not so often that it hides what comes behind it.
    bool Seldom() { return input_.ConsumeIntegralInRange(0, 7) == 7; }
    std::uint32_t Small() { return input_.ConsumeIntegralInRange<std::uint32_t>(0, 3); }
    /// A text or bytes of some length, in memory of its own: a read beyond its end is seen.
    Bytes Some() {
        return input_.ConsumeBytes<std::uint8_t>(input_.ConsumeIntegralInRange<std::size_t>(0, 70));
    }

    FuzzedDataProvider input_;
    Host host_;
    MbxContext* context_ = nullptr;
    MbxSession* session_ = nullptr;
    std::vector<ModelTrack> tracks_;
    bool hasMovie_ = false;
    /// Parts that are sealed: what `moov` reports, and fragments.
    std::size_t sealed_ = 0;
    std::vector<bool> released_;
    /// The model holds what the library holds; offsets were not shifted.
    bool isKnown_ = true;
    bool offsetsAreKnown_ = true;
    bool hasExplicitBase_ = true;
};

void Life::Step() {
    switch (input_.ConsumeIntegralInRange(0, 9)) {
        case 0:
            return Seldom() ? StepOfFile() : StepOfEntry();
        case 1:
            return StepOfTrack();
        case 2:
            return StepOfFragment();
        default:
            return StepOfSample();
    }
}

void Life::StepOfFile() {
    Memory memory;
    switch (input_.ConsumeIntegralInRange(0, 9)) {
        case 0:
            Succeeded(MbxCreateFileType(session_, input_.ConsumeIntegral<std::uint32_t>(), Small()));
            return;
        case 1:
            Succeeded(MbxAddCompatibleBrand(session_, input_.ConsumeIntegral<std::uint32_t>()));
            return;
        case 2:
            Write(memory, [this](MbxFile* file, std::uint64_t position, std::uint64_t* size) {
                return MbxWriteFileType(session_, file, position, size);
            });
            return;
        case 3:
            Succeeded(MbxCreateProfile(session_, input_.ConsumeIntegral<std::uint32_t>()));
            return;
        case 4: {
            const MbxAudioProfile profile{{1, 2, 3, 4, 5, 6, 7, input_.ConsumeIntegral<std::uint32_t>()}};
            Succeeded(MbxAddAudioProfile(session_, &profile));
            return;
        }
        case 5: {
            const MbxVideoProfile profile{{1, 2, 3, 4, 5, 6}, {{1, 2}, {3, 4}, {5, 6}, {7, 8}}};
            Succeeded(MbxAddVideoProfile(session_, &profile));
            return;
        }
        case 6:
            Write(memory, [this](MbxFile* file, std::uint64_t position, std::uint64_t* size) {
                return MbxWriteProfile(session_, file, position, size);
            });
            return;
        case 7: {
            const auto payload = input_.ConsumeIntegral<std::uint64_t>();
            std::uint64_t size = 0;
            MbxFile* const file = input_.ConsumeBool() ? reinterpret_cast<MbxFile*>(&memory) : nullptr;
            Succeeded(MbxWriteMdatHeader(session_, file, Small(), MBX_BOX_MDAT, payload, &size));
            Succeeded(MbxWriteWideMdatHeader(session_, Small(), file, Small(), MBX_BOX_MDAT, payload, &size));
            return;
        }
        default:
            hasMovie_ =
                Succeeded(MbxCreateMovie(session_, input_.ConsumeIntegral<std::uint16_t>())) || hasMovie_;
            return;
    }
}

void Life::AddTrack() {
    if (tracks_.size() == kMostTracks) {
        return;
    }
    MbxTrackParams params{};
    params.noUsageEntry = Small();
    params.noEditList = Small();
    params.stsdVersion = Small();
    params.auxEnabled = Small() == 1;
    params.trickEnabled = Small() == 1;
    for (int i = 0; i < 4; ++i) {
        params.fragmentDefaults[i] = Small();
        params.defaultsForced[i] = Small() & 1U;
    }
    for (std::uint32_t& forced : params.perSampleForced) {
        forced = Small() & 1U;
    }
    params.trackId =
        Seldom() ? input_.ConsumeIntegral<std::uint16_t>() : static_cast<std::uint32_t>(tracks_.size() + 1);
    params.width = 320;
    params.timescale = Seldom() ? Small() : 48000;
    params.language = MBX_LANGUAGE_ENGLISH;
    params.enable_mode = Seldom() ? Small() : MBX_ENABLE_ALL;
    const struct {
        std::uint32_t handler;
        MbxStatus (*add)(MbxSession*, const MbxTrackParams*, std::uint32_t*);
    } kinds[] = {{MBX_HANDLER_VIDEO, MbxAddVideoTrack},
                 {MBX_HANDLER_SOUND, MbxAddSoundTrack},
                 {MBX_HANDLER_TIMECODE, MbxAddTimecodeTrack},
                 {MBX_HANDLER_META, MbxAddMetaTrack}};
    const auto& kind = kinds[Small()];
    std::uint32_t number = 0;
    if (!Succeeded(kind.add(session_, &params, &number))) {
        return;
    }
    Expect(number == tracks_.size() + 1, "a track gets the next number");
    ModelTrack track;
    track.handler = kind.handler;
    track.timescale = params.timescale;
    track.id = params.trackId;
    tracks_.push_back(track);
    // What a sample needs.
    if (!Seldom()) {
        AddEntry(number, kind.handler);
    }
}

void Life::AddEntry(std::uint32_t track, std::uint32_t handler) {
    std::uint32_t reference = 0;
    std::uint32_t index = 0;
    if (!Succeeded(MbxAddDataReference(session_, track, nullptr, 0, &reference))) {
        return;
    }
    const MbxVisualEntryParams video{MBX_ENTRY_AVC1, reference, 320, 180, 72, 0, 72, 0};
    const MbxAudioEntryParams sound{reference, 2, 16};
    const MbxTimecodeEntryParams timecode{reference, 0, 25, 1, 25, {}};
    const MbxMetaEntryParams meta{reference};
    const MbxAvcConfigParams avc{1, 66, 0, 30, 3, 0, 0, 0, 0};
    const MbxEsdsParams aac{MBX_ESDS_FIELDS, 0x40, 5, 0, 0, 0, 0, nullptr, 0, nullptr, 0};
    switch (handler) {
        case MBX_HANDLER_VIDEO:
            Succeeded(MbxAddVideoEntry(session_, track, &video, &index));
            Succeeded(MbxSetAvcConfig(session_, track, index, &avc));
            return;
        case MBX_HANDLER_SOUND:
            Succeeded(MbxAddSoundEntry(session_, track, &sound, &index));
            Succeeded(MbxSetEsds(session_, track, index, &aac));
            return;
        case MBX_HANDLER_TIMECODE:
            Succeeded(MbxAddTimecodeEntry(session_, track, &timecode, &index));
            return;
        default:
            Succeeded(MbxAddMetaEntry(session_, track, &meta, &index));
            return;
    }
}

void Life::StepOfTrack() {
    const std::uint32_t track = AnyTrack();
    std::uint32_t result = 0;
    switch (input_.ConsumeIntegralInRange(0, 9)) {
        case 0: {
            const Bytes location = Some();
            Succeeded(MbxAddDataReference(session_, track, reinterpret_cast<const char*>(location.data()),
                                          location.size(), &result));
            return;
        }
        case 1: {
            const MbxTrackReferenceParams params{MBX_REFERENCE_CDSC, input_.ConsumeIntegral<std::uint16_t>()};
            Succeeded(MbxAddTrackReference(session_, track, &params, &result));
            return;
        }
        case 2:
            Succeeded(MbxAddEdit(session_, track, Small()));
            return;
        case 3:
            Succeeded(MbxSetEditDuration(session_, track, input_.ConsumeIntegral<std::uint64_t>()));
            return;
        case 4:
            Succeeded(MbxSetMovieTimes(session_, track, input_.ConsumeIntegral<std::uint32_t>(),
                                       input_.ConsumeIntegral<std::uint64_t>(), Small()));
            return;
        case 5:
            Succeeded(MbxSetSignedOffsets(session_, track, Small()));
            return;
        case 6: {
            const Bytes data = Some();
            const MbxMetadataItemParams item{Small() == 0 ? MBX_USAGE_TYPE : Small(),
                                             static_cast<std::uint8_t>(Small()),
                                             input_.ConsumeIntegral<std::uint16_t>(),
                                             0,
                                             data.data(),
                                             data.size()};
            Succeeded(MbxAddTrackMetadata(session_, track, &item));
            return;
        }
        case 7:
            Succeeded(MbxGetNextTrackId(session_, &result));
            return;
        default:
            AddTrack();
            return;
    }
}

void Life::SetCodec(std::uint32_t track, std::uint32_t entry) {
    const Bytes data = Some();
    switch (input_.ConsumeIntegralInRange(0, 5)) {
        case 0: {
            const auto byte = static_cast<std::uint8_t>(Small());
            const MbxAvcConfigParams params{1, 66, 0, 30, byte, Small(), byte, byte, byte};
            Succeeded(MbxSetAvcConfig(session_, track, entry, &params));
            return;
        }
        case 1:
            Succeeded(MbxAddAvcSps(session_, track, entry, data.data(), data.size()));
            return;
        case 2:
            Succeeded(MbxAddAvcPps(session_, track, entry, data.data(), data.size()));
            return;
        case 3: {
            MbxHvcCValues params{};
            params.general_constraint_indicator_flags = input_.ConsumeIntegral<std::uint64_t>();
            params.lengthSizeMinusOne = static_cast<std::uint8_t>(Small());
            Succeeded(MbxSetHvcConfig(session_, track, entry, &params));
            return;
        }
        case 4:
            Succeeded(MbxAddHvcNalUnit(session_, track, entry, input_.ConsumeIntegral<std::uint8_t>(),
                                       static_cast<std::uint8_t>(Small()), data.data(), data.size()));
            return;
        default: {
            MbxEsdsParams params{};
            params.form = Small();
            params.objectTypeIndication = 0x40;
            params.streamType = static_cast<std::uint8_t>(input_.ConsumeIntegralInRange(0, 64));
            params.decoderSpecificInfo = params.raw = data.data();
            params.decoderSpecificInfoSize = params.rawSize = data.size();
            Succeeded(MbxSetEsds(session_, track, entry, &params));
            return;
        }
    }
}

void Life::StepOfEntry() {
    const std::uint32_t track = AnyTrack();
    const std::uint32_t reference = Small();
    std::uint32_t index = 0;
    switch (input_.ConsumeIntegralInRange(0, 5)) {
        case 0: {
            const MbxVisualEntryParams params{
                input_.ConsumeIntegralInRange<std::uint32_t>(0, 13), reference, 320, 180, 72, 0, 72, 0};
            Succeeded(MbxAddVideoEntry(session_, track, &params, &index));
            return;
        }
        case 1: {
            const MbxAudioEntryParams params{reference, 2, 16};
            Succeeded(MbxAddSoundEntry(session_, track, &params, &index));
            return;
        }
        case 2: {
            const MbxTimecodeEntryParams params{reference, 0, 25, 1, 25, {}};
            Succeeded(MbxAddTimecodeEntry(session_, track, &params, &index));
            return;
        }
        case 3: {
            const MbxMetaEntryParams params{reference};
            Succeeded(MbxAddMetaEntry(session_, track, &params, &index));
            return;
        }
        default:
            SetCodec(track, Small());
            return;
    }
}

void Life::AddSample() {
    const std::uint32_t number = AnyTrack();
    const bool exists = number >= 1 && number <= tracks_.size();
    MbxSampleInfo info{};
    info.size = input_.ConsumeBool() ? Small() : input_.ConsumeIntegral<std::uint32_t>();
    info.offset = exists && tracks_[number - 1].chunkIsOpen ? tracks_[number - 1].next
                  : input_.ConsumeBool()                    ? input_.ConsumeIntegral<std::uint16_t>()
                                                            : input_.ConsumeIntegral<std::uint64_t>();
    info.duration = input_.ConsumeBool() ? Small() : input_.ConsumeIntegral<std::uint32_t>();
    info.isSync = Small() & 1U;
    info.dependency = static_cast<std::uint8_t>(Small());
    info.compositionOffset = Seldom() ? input_.ConsumeIntegral<std::int32_t>() : 0;
    info.descriptionIndex = Seldom() ? Small() : 1;
    const Bytes auxiliary = Seldom() ? Some() : Bytes();
    info.auxData = auxiliary.data();
    info.auxSize = static_cast<std::uint8_t>(auxiliary.size());
    info.pictureType = static_cast<std::uint8_t>(Small());
    const MbxStatus status = MbxAddSample(session_, number, &info, Small());
    if (!Succeeded(status)) {
        // A decode time that leaves 64 bits is found when the chunk is open already.
        isKnown_ = isKnown_ && status != MBX_ERR_OVERFLOW;
        return;
    }
    Expect(exists, "a sample needs a track");
    ModelTrack& track = tracks_[number - 1];
    clipfile::Sample sample;
    sample.offset = info.offset;
    sample.size = info.size;
    sample.duration = info.duration;
    sample.isSync = info.isSync != 0;
    track.parts.back().push_back(sample);
    track.chunkIsOpen = true;
    track.next = info.offset + info.size;
}

void Life::StepOfSample() {
    if (input_.ConsumeIntegralInRange(0, 3) != 0) {
        return AddSample();
    }
    EndChunk(AnyTrack());
}

void Life::EndChunks() {
    for (std::uint32_t number = 1; number <= tracks_.size(); ++number) {
        if (tracks_[number - 1].chunkIsOpen) {
            EndChunk(number);
        }
    }
}

void Life::EndChunk(std::uint32_t number) {
    if (Succeeded(MbxEndChunk(session_, number))) {
        Expect(tracks_.at(number - 1).chunkIsOpen || !isKnown_, "a chunk that is ended was open");
        tracks_[number - 1].chunkIsOpen = false;
    }
}

void Life::StepOfFragment() {
    const std::uint32_t number = Small();
    switch (input_.ConsumeIntegralInRange(0, 9)) {
        case 0: {
            const std::uint32_t forced[4] = {Small(), Small(), Small(), Small()};
            // A word above 1 is refused when the fragment is written.
            Succeeded(MbxForceDefaults(session_, AnyTrack(), forced));
            return;
        }
        case 1:
            if (!Seldom()) {
                return;
            }
            Succeeded(
                MbxShiftChunkOffsets(session_, AnyTrack(), Small(), input_.ConsumeIntegral<std::int64_t>()));
            offsetsAreKnown_ = false;
            return;
        case 2:
            if (!Seldom()) {
                return;
            }
            Succeeded(MbxShiftFragmentOffsets(session_, number, AnyTrack(), Small(),
                                              input_.ConsumeIntegral<std::int64_t>()));
            offsetsAreKnown_ = false;
            return;
        case 3:
            Succeeded(MbxSetFragmentBase(session_, number, input_.ConsumeIntegral<std::uint64_t>()));
            return;
        case 4:
            if (Succeeded(MbxReleaseFragment(session_, number))) {
                for (std::size_t i = 0; i + 1 < released_.size(); ++i) {
                    released_[i] = released_[i] || number == 0 || number == i + 1;
                }
            }
            return;
        default:
            if (!Seldom()) {
                EndChunks();
            }
            if (Succeeded(sealed_ == 0 ? MbxSealFirstFragment(session_) : MbxSealFragment(session_))) {
                ++sealed_;
                released_.push_back(false);
                for (ModelTrack& track : tracks_) {
                    track.parts.emplace_back();
                }
            }
            return;
    }
}

bool Life::Write(Memory& memory, const Writing& writing) {
    const std::uint64_t position = memory.bytes.size();
    std::uint64_t measured = 0;
    if (!Succeeded(writing(nullptr, position, &measured))) {
        return false;
    }
    std::uint64_t written = 0;
    const MbxStatus status = writing(reinterpret_cast<MbxFile*>(&memory), position, &written);
    // A run that its base offset cannot reach is found where the offset is written.
    if (status == MBX_ERR_NO_MEMORY || status == MBX_ERR_OVERFLOW ||
        (status == MBX_ERR_IO && position + measured > kLongestFile)) {
        memory.bytes.resize(position);
        return false;
    }
    Expect(status == MBX_OK, "what can be measured can be written");
    Expect(written == measured, "a box is as long as it was measured");
    Expect(memory.bytes.size() == position + written, "a box is written whole");
    return true;
}

void Life::ReadBack() {
    Memory memory;
    EndChunks();
    if (!hasMovie_ || !Write(memory, [this](MbxFile* file, std::uint64_t position, std::uint64_t* size) {
            return MbxWriteMoov(session_, file, position, size);
        })) {
        return;
    }
    std::vector<std::size_t> fragments;
    for (std::size_t number = 1; number < sealed_; ++number) {
        if (Write(memory, [&](MbxFile* file, std::uint64_t position, std::uint64_t* size) {
                return MbxWriteMoof(session_, file, static_cast<std::uint32_t>(number), position, size);
            })) {
            fragments.push_back(number);
        }
    }
    Write(memory, [this](MbxFile* file, std::uint64_t position, std::uint64_t* size) {
        return MbxWriteMfra(session_, file, position, size);
    });
    const MemoryFile bytes(memory.bytes.data(), memory.bytes.size());
    const clipfile::InputFile file(bytes.Path());
    clipfile::WalkTree(file, [](const clipfile::TreeItem& item) {
        Expect(item.fault.empty() && !item.box.IsTorn(), "boxes lie in each other without a gap");
        return true;
    });
    clipfile::BoxCursor boxes(file, 0, file.Size());
    const clipfile::Movie movie = clipfile::ReadMovie(file, *boxes.Next());
    if (!isKnown_) {
        return;
    }
    CompareMovie(file, movie);
    for (const std::size_t number : fragments) {
        CompareFragment(file, clipfile::ReadFragment(file, *boxes.Next(), movie), number, movie);
    }
}

void Life::CompareMovie(const clipfile::InputFile& file, const clipfile::Movie& movie) {
    Expect(movie.tracks.size() == tracks_.size(), "a movie has its tracks");
    for (std::size_t i = 0; i < tracks_.size(); ++i) {
        const clipfile::Track& read = movie.tracks[i];
        Expect(read.id == tracks_[i].id && read.handler == tracks_[i].handler,
               "a track has its number and handler");
        Expect(read.timescale == tracks_[i].timescale, "a track has its time scale");
        Expect(read.tables.sampleCount == tracks_[i].parts[0].size(), "a track has its samples");
        clipfile::TableSamples samples(file, read.tables);
        CompareSamples(samples, tracks_[i], 0);
    }
}

void Life::CompareFragment(const clipfile::InputFile& file, const clipfile::Fragment& fragment,
                           std::size_t number, const clipfile::Movie& movie) {
    Expect(fragment.sequenceNumber == number, "fragments are counted from 1");
    std::vector<bool> found(movie.tracks.size());
    for (const clipfile::TrackFragment& part : fragment.tracks) {
        Expect(!found[part.track], "a fragment tells of each track once");
        found[part.track] = true;
        clipfile::FragmentSamples samples(file, part);
        CompareSamples(samples, tracks_[part.track], number);
    }
    for (std::size_t i = 0; i < found.size(); ++i) {
        Expect(found[i] || tracks_[i].parts[number].empty() || released_[number - 1],
               "a fragment tells of each track that it has samples of");
    }
}

void Life::CompareSamples(clipfile::SampleSource& source, const ModelTrack& track, std::size_t part) {
    for (const clipfile::Sample& added : track.parts[part]) {
        const auto read = source.Next();
        Expect(read.has_value(), "a sample that was added is there");
        Expect(read->size == added.size && read->duration == added.duration,
               "a sample has its size and duration");
        // Without a base of their own, offsets of a fragment count from its place.
        const bool hasPlace = offsetsAreKnown_ && (part == 0 || hasExplicitBase_);
        Expect(read->offset == added.offset || !hasPlace, "a sample lies where it was put");
        Expect(read->isSync == added.isSync || track.handler != MBX_HANDLER_VIDEO, "a sync sample is one");
    }
    Expect(!source.Next(), "there are no more samples than were added");
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    Life(data, size).Run();
    return 0;
}
