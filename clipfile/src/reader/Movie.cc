#include "reader/Movie.h"

#include <algorithm>
#include <array>
#include <string>

#include "reader/BigEndian.h"
#include "reader/FormatError.h"

namespace clipfile {

namespace {

constexpr std::size_t kMaxTracks = 64;
/// The longest decoder configuration that is read: an `avcC` may have 31 sets of 65535 bytes.
constexpr std::uint64_t kMaxConfiguration = 4 * 1024 * 1024;

/// The fields at the front of a box, from `skipped` on. Reading past them throws `FormatError`.
class Fields {
 public:
    Fields(const InputFile& file, const Box& box, std::uint64_t limit = 256)
        : box_(box),
          bytes_(file.Read(box.Payload(), static_cast<std::size_t>(std::min(box.PayloadSize(), limit)))) {}

    std::uint64_t Take(std::size_t width) {
        const std::size_t at = at_;
        Skip(width);
        return ReadBigEndian(&bytes_[at], width);
    }
    std::uint32_t U32() { return static_cast<std::uint32_t>(Take(4)); }
    void Skip(std::size_t count) { static_cast<void>(TakeBytes(count)); }
    Bytes TakeBytes(std::size_t count) {
        if (count > bytes_.size() - at_) {
            throw FormatError(box_.offset, "'" + FourCcText(box_.type) + "' at " +
                                               std::to_string(box_.offset) + " is too short.");
        }
        at_ += count;
        return Bytes(bytes_).subspan(at_ - count, count);
    }
    Bytes Rest() const { return Bytes(bytes_).subspan(at_); }

 private:
    Box box_;
    std::vector<unsigned char> bytes_;
    std::size_t at_ = 0;
};

/// Width of the times in a full box, whose version and flags are taken.
std::size_t TimeWidth(Fields& fields) {
    return fields.U32() >> 24 == 0 ? 4 : 8;
}

AvcConfiguration ReadAvcConfiguration(const InputFile& file, const Box& box) {
    Fields fields(file, box, kMaxConfiguration);
    AvcConfiguration avc;
    avc.head = fields.U32();
    avc.lengthSize = static_cast<std::uint32_t>((fields.Take(1) & 3) + 1);
    const auto units = [&](std::uint64_t count, std::vector<std::vector<unsigned char>>& into) {
        for (std::uint64_t i = 0; i < count; ++i) {
            const Bytes unit = fields.TakeBytes(static_cast<std::size_t>(fields.Take(2)));
            into.emplace_back(unit.begin(), unit.end());
        }
    };
    units(fields.Take(1) & 0x1F, avc.sps);
    units(fields.Take(1), avc.pps);
    return avc;
}

void ReadVideoEntry(const InputFile& file, const Box& entry, Track& track) {
    Fields fields(file, entry);
    fields.Skip(24);
    track.width = static_cast<std::uint32_t>(fields.Take(2));
    track.height = static_cast<std::uint32_t>(fields.Take(2));
    constexpr std::uint64_t kVisualFields = 78;
    BoxCursor children = Children(file, entry, kVisualFields);
    while (const auto child = children.Next()) {
        if (child->type == FourCc("avcC")) {
            track.avc = ReadAvcConfiguration(file, *child);
        }
    }
}

void ReadAudioEntry(const InputFile& file, const Box& entry, Track& track) {
    Fields fields(file, entry);
    fields.Skip(16);
    track.channels = static_cast<std::uint32_t>(fields.Take(2));
    fields.Skip(6);
    track.sampleRate = fields.U32() >> 16;
    constexpr std::uint64_t kAudioFields = 28;
    BoxCursor children = Children(file, entry, kAudioFields);
    while (const auto child = children.Next()) {
        if (child->type == FourCc("esds")) {
            Fields esds(file, *child, 1024);
            esds.Skip(4);
            track.elementaryStream = ParseElementaryStream(esds.Rest());
        }
    }
}

void ReadTimecodeEntry(const InputFile& file, const Box& entry, Track& track) {
    Fields fields(file, entry);
    fields.Skip(12);
    TimecodeEntry timecode;
    timecode.flags = fields.U32();
    timecode.timescale = fields.U32();
    timecode.frameDuration = fields.U32();
    timecode.frameCount = static_cast<std::uint32_t>(fields.Take(1));
    track.timecode = timecode;
}

void ReadEntry(const InputFile& file, const Box& stsd, Track& track) {
    BoxCursor entries = Children(file, stsd, 8);
    const auto entry = entries.Next();
    if (!entry) {
        return;
    }
    track.entry = entry->type;
    switch (track.handler) {
        case FourCc("vide"):
            return ReadVideoEntry(file, *entry, track);
        case FourCc("soun"):
            return ReadAudioEntry(file, *entry, track);
        case FourCc("tmcd"):
            return ReadTimecodeEntry(file, *entry, track);
        default:
            return;
    }
}

void ReadEdit(const InputFile& file, const Box& trak, Track& track) {
    const auto edts = FindChild(file, trak, FourCc("edts"));
    const auto elst = edts ? FindChild(file, *edts, FourCc("elst")) : std::nullopt;
    if (!elst) {
        return;
    }
    Fields fields(file, *elst);
    const std::size_t width = TimeWidth(fields);
    if (fields.U32() == 0) {
        return;
    }
    Edit edit;
    edit.segmentDuration = fields.Take(width);
    const std::uint64_t time = fields.Take(width);
    edit.mediaTime = width == 4 ? static_cast<std::int32_t>(time) : static_cast<std::int64_t>(time);
    track.edit = edit;
}

Track ReadTrack(const InputFile& file, const Box& trak) {
    Track track;
    {
        Fields tkhd(file, RequireChild(file, trak, FourCc("tkhd")));
        tkhd.Skip(2 * TimeWidth(tkhd));
        track.id = tkhd.U32();
    }
    const Box mdia = RequireChild(file, trak, FourCc("mdia"));
    {
        Fields mdhd(file, RequireChild(file, mdia, FourCc("mdhd")));
        const std::size_t width = TimeWidth(mdhd);
        mdhd.Skip(2 * width);
        track.timescale = mdhd.U32();
        track.duration = mdhd.Take(width);
    }
    {
        Fields hdlr(file, RequireChild(file, mdia, FourCc("hdlr")));
        hdlr.Skip(8);
        track.handler = hdlr.U32();
    }
    const Box stbl = RequireChild(file, RequireChild(file, mdia, FourCc("minf")), FourCc("stbl"));
    ReadEntry(file, RequireChild(file, stbl, FourCc("stsd")), track);
    ReadEdit(file, trak, track);
    track.tables = ReadSampleTables(file, stbl);
    return track;
}

void ReadDefaults(const InputFile& file, const Box& trex, Movie& movie) {
    Fields fields(file, trex);
    fields.Skip(4);
    const std::uint32_t id = fields.U32();
    fields.Skip(4);
    SampleDefaults defaults;
    defaults.duration = fields.U32();
    defaults.size = fields.U32();
    defaults.flags = fields.U32();
    for (Track& track : movie.tracks) {
        if (track.id == id) {
            track.defaults = defaults;
        }
    }
}

void ReadExtends(const InputFile& file, const Box& mvex, Movie& movie) {
    movie.isFragmented = true;
    BoxCursor cursor = Children(file, mvex);
    while (const auto box = cursor.Next()) {
        if (box->type == FourCc("mehd")) {
            Fields mehd(file, *box);
            const std::size_t width = TimeWidth(mehd);
            movie.fragmentDuration = mehd.Take(width);
        } else if (box->type == FourCc("trex")) {
            ReadDefaults(file, *box, movie);
        }
    }
}

}  // namespace

const Track* Movie::Find(std::uint32_t handler) const {
    const auto found = std::find_if(tracks.begin(), tracks.end(),
                                    [&](const Track& track) { return track.handler == handler; });
    return found == tracks.end() ? nullptr : &*found;
}

Movie ReadMovie(const InputFile& file, const Box& moov) {
    Movie movie;
    {
        Fields mvhd(file, RequireChild(file, moov, FourCc("mvhd")));
        const std::size_t width = TimeWidth(mvhd);
        movie.creationTime = mvhd.Take(width);
        mvhd.Skip(width);
        movie.timescale = mvhd.U32();
        movie.duration = mvhd.Take(width);
    }
    BoxCursor cursor = Children(file, moov);
    while (const auto box = cursor.Next()) {
        if (box->type == FourCc("trak")) {
            if (movie.tracks.size() == kMaxTracks) {
                throw FormatError(box->offset, "'moov' has more than 64 tracks.");
            }
            movie.tracks.push_back(ReadTrack(file, *box));
        }
    }
    if (const auto mvex = FindChild(file, moov, FourCc("mvex"))) {
        ReadExtends(file, *mvex, movie);
    }
    return movie;
}

}  // namespace clipfile
