#include "source/FormatWatch.h"

#include <algorithm>
#include <array>
#include <cstdlib>
#include <string>
#include <vector>

#include "source/AnnexB.h"
#include "source/CodedUnits.h"

namespace receiver {
namespace {

/// Distances in a row that make another rate. Every second picture may be lost for a while.
constexpr int kFasterSteps = 12;
constexpr int kSlowerSteps = 25;
/// Steps back, with no more pictures between them, that a clock which is set does not take.
constexpr int kStepsBack = 3;
/// Pictures in a row, shown by more or less behind their decoding than those before, that are more than a
/// damaged stamp.
constexpr int kDelayed = 2;
constexpr int kReorderDepth = kMostReorderFrames;

/// More than there are pictures in front of one that they all need.
constexpr int kStraight = 2 * kReorderDepth;

constexpr const char* kReordered = "the video begins to send its pictures reordered (B frames)";

/// First bytes of the parameter sets of HEVC (ITU-T H.265 7.3.1.2, types 32, 33 and 34). In H.264 they would
/// be an unspecified type and data partitions.
constexpr std::array<unsigned char, 3> kHevcSets{0x40, 0x42, 0x44};

/// The codec of which a byte stream holds both or all kinds of parameter sets.
AVCodecID CodecOf(std::span<const unsigned char> picture) {
    const auto units = NalUnits(picture);
    const bool hevc = std::all_of(kHevcSets.begin(), kHevcSets.end(), [&units](unsigned char header) {
        return std::any_of(units.begin(), units.end(), [header](const NalUnit& unit) {
            // nuh_layer_id 0, nuh_temporal_id_plus1 1
            return unit.bytes.size() > 2 && unit.bytes[0] == header && unit.bytes[1] == 0x01;
        });
    });
    if (hevc) {
        return AV_CODEC_ID_HEVC;
    }
    const bool h264 = Contains(units, kNalSequenceParameterSet) && Contains(units, kNalPictureParameterSet) &&
                      Contains(units, kNalIdr);
    return h264 ? AV_CODEC_ID_H264 : AV_CODEC_ID_NONE;
}

}  // namespace

FormatWatch::FormatWatch(AVCodecID codec, const FrameRate& rate, bool untouched, bool reordered)
    : codec_(codec),
      untouched_(untouched),
      reordered_(reordered),
      period_(std::int64_t{90000} * rate.denominator / std::max<std::int64_t>(1, rate.numerator)) {}

void FormatWatch::Look(std::span<const unsigned char> picture, std::optional<std::int64_t> stamp,
                       std::optional<std::int64_t> delay) {
    if (codec_ == AV_CODEC_ID_H264 || codec_ == AV_CODEC_ID_HEVC) {
        const AVCodecID now = CodecOf(picture);
        if (now != AV_CODEC_ID_NONE && now != codec_) {
            throw FormatChanged(std::string("the video changed from ") + avcodec_get_name(codec_) + " to " +
                                avcodec_get_name(now));
        }
    }
    if (!untouched_ || !stamp) {
        return;
    }
    if (delay && !reordered_) {
        LookAtDelay(*delay);
    }
    if (stamp_) {
        if (!reordered_) {
            LookAtOrder(*stamp - *stamp_);
        }
        LookAtRate(*stamp - *stamp_);
    }
    stamp_ = stamp;
}

void FormatWatch::LookAtDelay(std::int64_t delay) {
    if (delay_ && std::abs(delay - *delay_) > period_ / 2) {
        if (++delayed_ >= kDelayed) {
            throw FormatChanged(kReordered);
        }
        return;
    }
    delayed_ = 0;
    delay_ = delay;
}

void FormatWatch::LookAtReordering(std::optional<std::int64_t> delay, bool late) {
    if (late) {
        // A single one has a damaged stamp.
        if (sinceLate_ && *sinceLate_ < kReorderDepth) {
            throw FormatChanged(kReorderedOtherwise);
        }
        sinceLate_ = 0;
    } else if (sinceLate_) {
        ++*sinceLate_;
    }
    if (delay) {
        straight_ = std::abs(*delay) <= period_ / 2 ? straight_ + 1 : 0;
    }
    if (straight_ >= kStraight) {
        throw FormatChanged(kReorderedNoMore);
    }
}

void FormatWatch::LookAtOrder(std::int64_t step) {
    if (step < 0 && step > -period_ * kReorderDepth) {
        backward_ = forward_ <= kReorderDepth ? backward_ + 1 : 1;
        forward_ = 0;
    } else {
        ++forward_;
    }
    if (backward_ >= kStepsBack) {
        throw FormatChanged(kReordered);
    }
}

void FormatWatch::LookAtRate(std::int64_t step) {
    const bool usual = std::abs(step - period_) <= period_ / 4;
    if (usual || step <= 0 || step > 90000) {
        steps_ = 0;
    } else {
        steps_ = std::abs(step - step_) <= period_ / 10 ? steps_ + 1 : 1;
    }
    step_ = step;
    if (steps_ >= (step < period_ ? kFasterSteps : kSlowerSteps)) {
        throw FormatChanged(kRateChanged);
    }
}

}  // namespace receiver
