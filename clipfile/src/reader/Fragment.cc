#include "reader/Fragment.h"

#include <algorithm>
#include <string>

#include "reader/BigEndian.h"
#include "reader/FormatError.h"

namespace clipfile {

namespace {

/// Above these a file is none of ours, whose fragments have 32 runs of each of three tracks.
constexpr std::size_t kMaxTrackFragments = 64;
constexpr std::size_t kMaxRuns = 65536;

// Flags of `tfhd` (8.8.7) and of `trun` (8.8.8).
constexpr std::uint32_t kBaseDataOffset = 0x000001;
constexpr std::uint32_t kDescriptionIndex = 0x000002;
constexpr std::uint32_t kDefaultDuration = 0x000008;
constexpr std::uint32_t kDefaultSize = 0x000010;
constexpr std::uint32_t kDefaultFlags = 0x000020;
constexpr std::uint32_t kDataOffset = 0x000001;
constexpr std::uint32_t kFirstFlags = 0x000004;
constexpr std::uint32_t kDuration = 0x000100;
constexpr std::uint32_t kSize = 0x000200;
constexpr std::uint32_t kFlags = 0x000400;
constexpr std::uint32_t kCompositionOffset = 0x000800;

/// `sample_is_non_sync_sample` (8.8.3.1).
constexpr std::uint32_t kNonSync = 0x00010000;

FormatError TooShort(const Box& box) {
    return {box.offset, "'" + FourCcText(box.type) + "' at " + std::to_string(box.offset) + " is too short."};
}

/// Numbers at the front of a box.
class Head {
 public:
    Head(const InputFile& file, const Box& box)
        : box_(box),
          bytes_(file.Read(box.Payload(),
                           static_cast<std::size_t>(std::min<std::uint64_t>(box.PayloadSize(), 64)))) {}
    std::uint64_t Take(std::size_t width) {
        if (width > bytes_.size() - at_) {
            throw TooShort(box_);
        }
        at_ += width;
        return ReadBigEndian(&bytes_[at_ - width], width);
    }
    std::uint32_t U32() { return static_cast<std::uint32_t>(Take(4)); }
    std::size_t Taken() const { return at_; }

 private:
    Box box_;
    std::vector<unsigned char> bytes_;
    std::size_t at_ = 0;
};

std::size_t PlaceOf(const Movie& movie, std::uint32_t id, const Box& tfhd) {
    for (std::size_t i = 0; i < movie.tracks.size(); ++i) {
        if (movie.tracks[i].id == id) {
            return i;
        }
    }
    throw FormatError(tfhd.offset, "The fragment at " + std::to_string(tfhd.offset) + " names track " +
                                       std::to_string(id) + ", which 'moov' lacks.");
}

TrackFragment ReadHeader(const InputFile& file, const Box& tfhd, const Movie& movie,
                         std::uint64_t moofOffset) {
    Head head(file, tfhd);
    const std::uint32_t flags = head.U32();
    TrackFragment fragment;
    fragment.track = PlaceOf(movie, head.U32(), tfhd);
    fragment.defaults = movie.tracks[fragment.track].defaults;
    fragment.baseOffset = (flags & kBaseDataOffset) != 0 ? head.Take(8) : moofOffset;
    if ((flags & kDescriptionIndex) != 0) {
        head.Take(4);
    }
    if ((flags & kDefaultDuration) != 0) {
        fragment.defaults.duration = head.U32();
    }
    if ((flags & kDefaultSize) != 0) {
        fragment.defaults.size = head.U32();
    }
    if ((flags & kDefaultFlags) != 0) {
        fragment.defaults.flags = head.U32();
    }
    return fragment;
}

TrackRun ReadRun(const InputFile& file, const Box& trun, std::uint64_t baseOffset) {
    Head head(file, trun);
    TrackRun run;
    run.flags = head.U32();
    run.sampleCount = head.U32();
    if ((run.flags & kDataOffset) != 0) {
        run.hasOffset = true;
        run.offset =
            baseOffset + static_cast<std::uint64_t>(std::int64_t{static_cast<std::int32_t>(head.U32())});
    }
    if ((run.flags & kFirstFlags) != 0) {
        run.firstSampleFlags = head.U32();
    }
    std::uint32_t rowSize = 0;
    for (const std::uint32_t field : {kDuration, kSize, kFlags, kCompositionOffset}) {
        rowSize += (run.flags & field) != 0 ? 4 : 0;
    }
    if (rowSize != 0) {
        run.rows = MakeTable(trun, head.Taken(), run.sampleCount, rowSize);
    } else if (run.sampleCount > RunReader::kMaxSamples) {
        throw FormatError(trun.offset, "'trun' at " + std::to_string(trun.offset) + " counts " +
                                           std::to_string(run.sampleCount) + " samples and describes none.");
    }
    return run;
}

TrackFragment ReadTrackFragment(const InputFile& file, const Box& traf, const Movie& movie,
                                std::uint64_t moofOffset) {
    const auto tfhd = FindChild(file, traf, FourCc("tfhd"));
    if (!tfhd) {
        throw FormatError(traf.offset, "'traf' at " + std::to_string(traf.offset) + " lacks 'tfhd'.");
    }
    TrackFragment fragment = ReadHeader(file, *tfhd, movie, moofOffset);
    BoxCursor cursor = Children(file, traf);
    while (const auto box = cursor.Next()) {
        if (box->type != FourCc("trun")) {
            continue;
        }
        if (fragment.runs.size() == kMaxRuns) {
            throw FormatError(box->offset,
                              "The fragment at " + std::to_string(moofOffset) + " has too many runs.");
        }
        fragment.runs.push_back(ReadRun(file, *box, fragment.baseOffset));
    }
    return fragment;
}

}  // namespace

Fragment ReadFragment(const InputFile& file, const Box& moof, const Movie& movie) {
    if (moof.IsTorn()) {
        throw FormatError(moof.offset,
                          "The file ends inside of 'moof' at " + std::to_string(moof.offset) + ".");
    }
    Fragment fragment;
    fragment.box = moof;
    if (const auto mfhd = FindChild(file, moof, FourCc("mfhd"))) {
        Head head(file, *mfhd);
        head.U32();
        fragment.sequenceNumber = head.U32();
    }
    BoxCursor cursor = Children(file, moof);
    while (const auto box = cursor.Next()) {
        if (box->type != FourCc("traf")) {
            continue;
        }
        if (fragment.tracks.size() == kMaxTrackFragments) {
            throw FormatError(box->offset,
                              "The fragment at " + std::to_string(moof.offset) + " has too many tracks.");
        }
        fragment.tracks.push_back(ReadTrackFragment(file, *box, movie, moof.offset));
    }
    return fragment;
}

FragmentSamples::FragmentSamples(const InputFile& file, const TrackFragment& fragment)
    : fragment_(fragment), offset_(fragment.baseOffset), rows_(file, Table{}) {}

std::optional<Sample> FragmentSamples::Next() {
    while (run_ < fragment_.runs.size() && sample_ == fragment_.runs[run_].sampleCount) {
        ++run_;
        sample_ = 0;
    }
    if (run_ == fragment_.runs.size()) {
        return std::nullopt;
    }
    const TrackRun& run = fragment_.runs[run_];
    if (sample_ == 0) {
        rows_.Reset(run.rows);
        offset_ = run.hasOffset ? run.offset : offset_;
    }
    Sample sample;
    sample.duration = fragment_.defaults.duration;
    sample.size = fragment_.defaults.size;
    std::uint32_t flags = fragment_.defaults.flags;
    if (sample_ == 0 && (run.flags & kFirstFlags) != 0) {
        flags = run.firstSampleFlags;
    }
    if (run.rows.rowSize != 0) {
        const unsigned char* row = rows_.Row(sample_);
        const auto take = [&](std::uint32_t field, std::uint32_t& value) {
            if ((run.flags & field) != 0) {
                value = ReadU32(row);
                row += 4;
            }
        };
        take(kDuration, sample.duration);
        take(kSize, sample.size);
        take(kFlags, flags);
    }
    sample.offset = offset_;
    sample.time = time_;
    sample.isSync = (flags & kNonSync) == 0;
    sample.run = run_;
    offset_ += sample.size;
    time_ += sample.duration;
    ++sample_;
    return sample;
}

}  // namespace clipfile
