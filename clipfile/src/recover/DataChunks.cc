#include "recover/DataChunks.h"

#include <algorithm>
#include <array>

#include "media/NalUnits.h"
#include "reader/BigEndian.h"

namespace clipfile {

namespace {

/// A packet's first byte and the head of every universal label (SMPTE ST 298).
constexpr std::array<unsigned char, 5> kKey = {0x01, 0x06, 0x0E, 0x2B, 0x34};
constexpr std::size_t kWindow = 1024 * 1024;
/// Bytes that nearly every unit of metadata has room in.
constexpr std::size_t kUsualUnit = 4096;
/// Above these the bytes are none of a recording.
constexpr std::size_t kMaxUnit = 8 * 1024 * 1024;
constexpr std::uint32_t kMaxNalUnit = 64 * 1024 * 1024;
constexpr std::size_t kMaxUnits = 4096;
constexpr std::size_t kMaxAudioFrames = 4096;
constexpr std::size_t kMaxPictures = 4096;
/// Audio that is decoded at a time: two chunks at 128 kbit/s.
constexpr std::size_t kAudioBatch = 8 * 1024;
constexpr std::uint64_t kTimecodeSize = 4;

}  // namespace

DataChunks::DataChunks(const InputFile& file, std::uint64_t begin, std::uint64_t end,
                       const SampleClock& clock)
    : file_(file), end_(std::min(end, file.Size())), clock_(clock), position_(begin) {}

Chunk DataChunks::Next() {
    if (isTorn_ || position_ >= end_) {
        return nullptr;
    }
    std::uint64_t offset = position_;
    const std::vector<Extent> meta = FindMetadata(offset);
    std::vector<Extent> audio;
    const auto pictures = meta.empty() ? std::nullopt : FindAudioAndPictures(offset, meta.size(), audio);
    if (!pictures || pictures->whole.empty()) {
        isTorn_ = true;
        return nullptr;
    }
    isTorn_ = pictures->isTorn;
    Chunk chunk = MakeChunk(meta, audio, *pictures);
    if (isTorn_ && chunk->video.size() < meta.size()) {
        chunk = clock_.Cut(chunk, chunk->video.size());
    }
    position_ = pictures->whole.back().offset + pictures->whole.back().size;
    clock_.Count(*chunk);
    return chunk;
}

Bytes DataChunks::At(std::uint64_t offset, std::size_t size) {
    const auto available =
        static_cast<std::size_t>(offset < end_ ? std::min<std::uint64_t>(size, end_ - offset) : 0);
    if (offset < windowOffset_ || offset + available > windowOffset_ + window_.size()) {
        const std::uint64_t wanted =
            std::min<std::uint64_t>(std::max(available, kWindow), end_ - std::min(end_, offset));
        window_ = file_.Read(std::min(end_, offset), static_cast<std::size_t>(wanted));
        windowOffset_ = offset;
    }
    return Bytes(window_).subspan(static_cast<std::size_t>(available == 0 ? 0 : offset - windowOffset_),
                                  available);
}

bool DataChunks::IsKeyAt(std::uint64_t offset) {
    const Bytes bytes = At(offset, kKey.size());
    return std::equal(bytes.begin(), bytes.end(), kKey.begin(), kKey.end());
}

std::vector<DataChunks::Extent> DataChunks::FindMetadata(std::uint64_t& offset) {
    std::vector<Extent> units;
    while (IsKeyAt(offset) && units.size() < kMaxUnits) {
        const auto end = FindUnitEnd(offset);
        if (!end) {
            return {};
        }
        units.push_back({offset, *end - offset, true});
        offset = *end;
    }
    return units;
}

std::optional<std::uint64_t> DataChunks::FindUnitEnd(std::uint64_t offset) {
    const std::uint64_t begin = offset;
    while (offset - begin < kMaxUnit) {
        const auto packet = PacketAt(offset);
        if (!packet) {
            // Payloads may hold more than packets. The recorder's block ends them all the same.
            return FindBlockEnd(offset);
        }
        offset += packet->size;
        if (IsRecorderBlock(*packet)) {
            return offset;
        }
    }
    return std::nullopt;
}

std::optional<KlvPacket> DataChunks::PacketAt(std::uint64_t offset) {
    if (const auto packet = ReadKlvPacket(At(offset, kUsualUnit))) {
        return packet;
    }
    // Bytes of another kind make no packet, however many are read.
    return IsKeyAt(offset) ? ReadKlvPacket(At(offset, kMaxUnit)) : std::nullopt;
}

std::optional<std::uint64_t> DataChunks::FindBlockEnd(std::uint64_t offset) {
    for (const std::size_t size : {kUsualUnit, kWindow}) {
        const Bytes bytes = At(offset, size);
        for (auto at = bytes.begin();; ++at) {
            at = std::search(at, bytes.end(), kKey.begin(), kKey.end());
            if (at == bytes.end()) {
                break;
            }
            const auto packet = ReadKlvPacket(Bytes(at, bytes.end()));
            if (packet && IsRecorderBlock(*packet)) {
                return offset + static_cast<std::uint64_t>(at - bytes.begin()) + packet->size;
            }
        }
    }
    return std::nullopt;
}

std::optional<DataChunks::Pictures> DataChunks::FindAudioAndPictures(std::uint64_t& offset, std::size_t units,
                                                                     std::vector<Extent>& audio) {
    while (audio.size() < kMaxAudioFrames) {
        if (auto pictures = FindPictures(offset, units)) {
            return pictures;
        }
        const std::size_t size = AudioFrameAt(offset);
        if (size == 0) {
            return std::nullopt;
        }
        audio.push_back({offset, size, true});
        offset += size;
    }
    return std::nullopt;
}

std::size_t DataChunks::AudioFrameAt(std::uint64_t offset) {
    if (known_.empty() || knownOffset_ != offset) {
        const std::vector<std::size_t> sizes = audioFrames_.Find(At(offset, kAudioBatch));
        known_.assign(sizes.begin(), sizes.end());
        knownOffset_ = offset;
        if (known_.size() > 1 && offset + kAudioBatch < end_) {
            // The last one may have been cut by the end of the batch.
            known_.pop_back();
        }
    }
    if (known_.empty()) {
        return 0;
    }
    const std::size_t size = known_.front();
    known_.pop_front();
    knownOffset_ += size;
    return size;
}

std::optional<DataChunks::Pictures> DataChunks::FindPictures(std::uint64_t offset, std::size_t units) {
    const std::uint64_t begin = offset;
    Pictures pictures;
    Extent picture = {offset, 0, false};
    std::size_t slices = 0;  // of `picture`
    const auto endPicture = [&](std::uint64_t next) {
        if (slices != 0) {
            picture.size = next - picture.offset;
            pictures.whole.push_back(picture);
            slicesInPicture_ = slices;
        }
        picture = {next, 0, false};
        slices = 0;
    };
    bool isCut = false;      // inside of a NAL unit
    bool endsEarly = false;  // the last picture may lack slices
    while (offset < end_ && !IsKeyAt(offset)) {
        if (pictures.whole.size() == kMaxPictures || offset - begin > kMaxChunk) {
            return std::nullopt;
        }
        const Bytes head = At(offset, kNalLengthSize + kNalHeadSize);
        if (head.size() < kNalLengthSize + kNalHeadSize) {
            // The timecode sample, or the rest of a NAL unit.
            isCut = end_ - offset != kTimecodeSize;
            break;
        }
        const std::uint32_t length = ReadU32(head.data());
        if (std::all_of(head.begin(), head.end(), [](unsigned char byte) { return byte == 0; })) {
            // What a file system gives back for bytes that had not reached the disk.
            endsEarly = true;
            isCut = At(offset - 1, 1)[0] == 0;  // no NAL unit ends with a zero (7.4.1)
            break;
        }
        const auto unit = ReadNalHead(head.subspan(kNalLengthSize));
        if (length == 0 || length > kMaxNalUnit || !unit ||
            (slices == 0 && unit->IsSlice() && !unit->startsPicture)) {
            break;
        }
        if (slices != 0 && (unit->IsInFront() || unit->startsPicture)) {
            endPicture(offset);
        }
        if (length > end_ - offset - kNalLengthSize) {
            isCut = true;
            // What is cut does not belong to the picture before it.
            slices = picture.offset == offset ? 0 : slices;
            break;
        }
        slices += unit->IsSlice() ? 1 : 0;
        picture.isSync = picture.isSync || unit->IsIdr();
        offset += kNalLengthSize + length;
    }
    endsEarly = endsEarly || offset >= end_;
    const bool endsWell = endsEarly || isCut || IsKeyAt(offset) || end_ - offset == kTimecodeSize;
    // A file that ends between two NAL units ends with a chunk, which is one write, or by chance inside of a
    // picture.
    const bool endsChunk = pictures.whole.size() + 1 == units * fieldsInPicture_;
    const bool lacksSlices = endsEarly && !endsChunk && slices < slicesInPicture_;
    if (!isCut && !lacksSlices) {
        endPicture(offset);
    }
    PairFields(pictures, units);
    pictures.isTorn = isCut || lacksSlices || !IsKeyAt(offset);
    if (pictures.whole.empty() || !(endsWell || pictures.whole.size() == units)) {
        return std::nullopt;
    }
    return pictures;
}

void DataChunks::PairFields(Pictures& pictures, std::size_t units) {
    std::vector<Extent>& whole = pictures.whole;
    if (whole.size() == 2 * units) {
        fieldsInPicture_ = 2;
    }
    if (fieldsInPicture_ != 2) {
        return;
    }
    std::vector<Extent> pairs;
    for (std::size_t i = 0; i + 1 < whole.size(); i += 2) {
        pairs.push_back({whole[i].offset, whole[i].size + whole[i + 1].size, whole[i].isSync});
    }
    whole = std::move(pairs);
}

Chunk DataChunks::MakeChunk(const std::vector<Extent>& meta, const std::vector<Extent>& audio,
                            const Pictures& pictures) {
    auto chunk = std::make_shared<clipfileModule::ChunkData>();
    const auto add = [&](const std::vector<Extent>& extents, auto& list) {
        for (const Extent& extent : extents) {
            list.push_back(std::make_shared<nal_access::SampleData>(
                file_.Read(extent.offset, static_cast<std::size_t>(extent.size)), 0, 0, extent.isSync));
        }
    };
    add(meta, chunk->meta);
    add(audio, chunk->audio);
    add(pictures.whole, chunk->video);
    return chunk;
}

}  // namespace clipfile
