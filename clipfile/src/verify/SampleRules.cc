// The rules on the bytes of samples.

#include <algorithm>
#include <functional>

#include "media/Decoders.h"
#include "media/NalUnits.h"
#include "reader/BigEndian.h"
#include "reader/FormatError.h"
#include "reader/RecordingSamples.h"
#include "reader/TimecodeCount.h"
#include "verify/Rules.h"

namespace clipfile {

namespace {

/// Above this a sample is none of a recording.
constexpr std::uint32_t kMaxSample = 256 * 1024 * 1024;

bool HasIdrSlice(Bytes picture) {
    while (picture.size() > kNalLengthSize) {
        const auto head = ReadNalHead(picture.subspan(kNalLengthSize));
        if (head && head->IsIdr()) {
            return true;
        }
        const std::uint64_t size = kNalLengthSize + std::uint64_t{ReadU32(picture.data())};
        picture = picture.subspan(static_cast<std::size_t>(std::min<std::uint64_t>(size, picture.size())));
    }
    return false;
}

/// Tells the same of a sample, at most a few times.
class Teller {
 public:
    Teller(Defects& defects, std::string what) : defects_(defects), what_(std::move(what)) {}
    void Tell(std::uint64_t number, std::uint64_t offset) {
        if (count_++ < kMaxOfAKind) {
            defects_.Add(what_ + " " + std::to_string(number) + ", at " + std::to_string(offset) + ".");
        }
    }

 private:
    Defects& defects_;
    std::string what_;
    int count_ = 0;
};

/// Looks at each sample of a track.
using SampleRule = std::function<void(std::uint64_t number, const Sample& sample, Bytes bytes)>;

SampleRule PictureRule(Defects& defects) {
    return [broken = Teller(defects, "The NAL units do not fill picture"),
            notSync = Teller(defects, "The tables call a sync sample what is no IDR picture: picture"),
            notTold = Teller(defects, "The tables do not know of the IDR picture")](
               std::uint64_t number, const Sample& sample, Bytes bytes) mutable {
        if (!IsWholePicture(bytes)) {
            broken.Tell(number, sample.offset);
        } else if (const bool isIdr = HasIdrSlice(bytes); isIdr != sample.isSync) {
            (isIdr ? notTold : notSync).Tell(number, sample.offset);
        }
    };
}

SampleRule AudioRule(Defects& defects) {
    return [finder = std::make_shared<AudioFrameFinder>(),
            broken = Teller(defects, "Audio does not decode: frame")](
               std::uint64_t number, const Sample& sample, Bytes bytes) mutable {
        if (finder->Find(bytes) != std::vector<std::size_t>{bytes.size()}) {
            broken.Tell(number, sample.offset);
        }
    };
}

SampleRule MetadataRule(Defects& defects, std::uint32_t rate) {
    return [rate, unended = Teller(defects, "The recorder's block does not end unit"),
            jumped = Teller(defects, "The timecode does not go on with unit"),
            last = std::optional<Timecode>()](std::uint64_t number, const Sample& sample,
                                              Bytes bytes) mutable {
        const MetadataUnit unit = ReadMetadataUnit(bytes);
        if (unit.blockEnd != bytes.size()) {
            unended.Tell(number, sample.offset);
        }
        if (last && unit.timecode && rate != 0 &&
            TimecodeOf(FrameNumberOf(*last, rate) + 1, rate, unit.timecode->dropFrame) != *unit.timecode) {
            jumped.Tell(number, sample.offset);
        }
        last = unit.timecode;
    };
}

void VisitSamples(const InputFile& file, const Recording& recording, std::size_t track,
                  const std::function<void()>& onSample, const SampleRule& rule) {
    RecordingSamples samples(file, recording, track);
    std::uint64_t number = 0;
    while (const auto sample = samples.Next()) {
        if (sample->offset > file.Size() ||
            sample->size > std::min<std::uint64_t>(kMaxSample, file.Size() - sample->offset)) {
            return;  // told already, where samples were counted
        }
        if (onSample) {
            onSample();
        }
        rule(++number, *sample, file.Read(sample->offset, sample->size));
    }
}

}  // namespace

void CheckSamples(const InputFile& file, const Inspection& inspection, const std::function<void()>& onSample,
                  Defects& defects) {
    const TrackSummary* const timecode = inspection.Find(FourCc("tmcd"));
    const std::uint32_t rate =
        timecode != nullptr && timecode->track.timecode ? timecode->track.timecode->frameCount : 0;
    for (std::size_t i = 0; i < inspection.tracks.size(); ++i) {
        try {
            switch (inspection.tracks[i].track.handler) {
                case FourCc("vide"):
                    VisitSamples(file, inspection.recording, i, onSample, PictureRule(defects));
                    break;
                case FourCc("soun"):
                    VisitSamples(file, inspection.recording, i, onSample, AudioRule(defects));
                    break;
                case FourCc("meta"):
                    VisitSamples(file, inspection.recording, i, onSample, MetadataRule(defects, rate));
                    break;
                default:
                    break;
            }
        } catch (const FormatError&) {
            continue;  // told already, where samples were counted
        }
    }
}

}  // namespace clipfile
