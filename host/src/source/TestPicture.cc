#include "source/TestPicture.h"

#include <string>

#include "source/Summary.h"

namespace receiver {
namespace {

std::string PictureChain(const VideoEncoding& encoding) {
    return "testsrc2=size=" + std::to_string(encoding.width) + "x" + std::to_string(encoding.height) +
           ":rate=" + std::to_string(encoding.frameRate.numerator) + "/" +
           std::to_string(encoding.frameRate.denominator) + ",format=yuv420p";
}

constexpr const char* kToneChain =
    "sine=frequency=440:beep_factor=2:sample_rate=48000:samples_per_frame=1024,"
    "aformat=sample_fmts=fltp:sample_rates=48000:channel_layouts=stereo";

}  // namespace

TestPicture::TestPicture(const SourceOptions& options)
    : encoding_(EncodingOf(options, {FrameRate{25000, 25, 1, 25, false}, 1280, 720, 0, {}})),
      videoEncoder_(encoding_),
      pictures_(PictureChain(encoding_), true),
      tones_(kToneChain, false),
      frame_(libav::NewFrame()) {
    description_ = {encoding_.frameRate, encoding_.width, encoding_.height, encoding_.bitrate, {}};
    description_.summary =
        "test picture and tone, " + VideoSummary("H.264", description_) + ", " + kRecordedAudioSummary;
}

bool TestPicture::Produce(Batch& batch) {
    const std::int64_t pictureTime = av_rescale(pictureCount_, encoding_.frameRate.denominator * kAudioRate,
                                                encoding_.frameRate.numerator);
    // The encoder gives an audio frame out when the next one goes in.
    if (sampleCount_ - kAudioFrame <= pictureTime) {
        if (tones_.Pull(*frame_)) {
            frame_->pts = sampleCount_;
            sampleCount_ += kAudioFrame;
            audioEncoder_.Encode(frame_.get(), [&batch](const CodedAudio& coded) {
                if (coded.time >= 0) {
                    batch.emplace_back(
                        SourceUnit{Medium::kAudio, coded.time, coded.data, coded.size, false, {}});
                }
            });
        }
    } else if (pictures_.Pull(*frame_)) {
        frame_->pts = pictureCount_++;
        frame_->pict_type = AV_PICTURE_TYPE_NONE;
        videoEncoder_.Encode(frame_.get(), [&batch](const CodedPicture& coded) {
            batch.emplace_back(
                SourceUnit{Medium::kVideo, coded.time, coded.data, coded.size, coded.keyFrame, {}});
        });
    }
    av_frame_unref(frame_.get());
    return true;
}

}  // namespace receiver
