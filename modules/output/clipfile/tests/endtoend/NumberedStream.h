#pragma once

#include <cstddef>
#include <cstdint>
#include <cstdio>
#include <memory>
#include <string>
#include <vector>

#include "support/StreamUnits.h"

/// A stream of numbered units of uneven sizes, and what a file must hold for each of them, worked out here
/// and not by the code under test.
class NumberedStream {
 public:
    using Bytes = stream_units::Bytes;

    /// An IDR picture with its parameter sets every so many pictures.
    static constexpr std::uint64_t kGroupOfPictures = 15;

    /// `scale` times the size of small pictures: 400 bytes at the most, and 3000 for an IDR picture.
    explicit NumberedStream(stream_units::FrameRate rate, std::size_t scale = 1)
        : clock{rate}, scale_(scale) {}

    const stream_units::StreamClock clock;

    static bool IsIdr(std::uint64_t n) { return n % kGroupOfPictures == 0; }

    std::shared_ptr<StreamData> Video(std::uint64_t n) const {
        Bytes payload = stream_units::VideoPayload(n, IsIdr(n) ? stream_units::kIdr : stream_units::kPicture);
        stream_units::Append(payload, picture(n));
        return stream_units::MakeUnit(payload, clock.VideoRtp(n), clock.VideoMilliSec(n));
    }
    std::shared_ptr<StreamData> Audio(std::uint64_t n) const {
        return stream_units::MakeUnit(audioPayload(n), clock.AudioRtp(n), clock.AudioMilliSec(n));
    }
    std::shared_ptr<StreamData> Meta(std::uint64_t n, bool recFlag) const {
        return stream_units::MakeUnit(metaPayload(n, recFlag), clock.VideoRtp(n), clock.VideoMilliSec(n));
    }

    /// The slice with its length in front. Delimiter, and the parameter sets that the sample entry has, stay
    /// out (ISO/IEC 14496-15 5.3.2).
    Bytes VideoSample(std::uint64_t n) const {
        Bytes slice = stream_units::Slice(IsIdr(n), n);
        stream_units::Append(slice, picture(n));
        Bytes sample = {
            static_cast<unsigned char>(slice.size() >> 24), static_cast<unsigned char>(slice.size() >> 16),
            static_cast<unsigned char>(slice.size() >> 8), static_cast<unsigned char>(slice.size())};
        stream_units::Append(sample, slice);
        return sample;
    }
    /// The frame as it came.
    Bytes AudioSample(std::uint64_t n) const { return audioPayload(n); }
    /// The unit as it came, with the recorder's own block behind it.
    Bytes MetaSample(std::uint64_t n, bool recFlag) const {
        Bytes sample = metaPayload(n, recFlag);
        stream_units::Append(sample,
                             {0x01,                                            // packet
                              0x06, 0x0E, 0x2B, 0x34, 0x02, 0x53, 0x01, 0x01,  // label
                              0x0C, 0x02, 0x01, 0x01, 0x7F, 0x01, 0x00, 0x00,  //
                              0x83, 0x00, 0x00, 0x2B,                          // length
                              0xE0, 0x00, 0x00, 0x10,                          // identifier
                              0x85, 0x1D, 0x08, 0x00, 0x46, 0x78, 0x03, 0x1C,  //
                              0xE8, 0x1F, 0x06, 0xF5, 0xA8, 0x84, 0x11, 0xE2,  //
                              0x85, 0x00, 0x00, 0x04, 0x02, 0x03, 0x00, 0x00,  // tag 8500
                              0x85, 0x09, 0x00, 0x01, 0x56,                    // tag 8509
                              0x85, 0x12, 0x00, 0x06, 'W',  'G',  'S',  '-',  '8', '4'});
        return sample;
    }

    /// The timecode of frame `n`: 09:59:50:00 at frame 0, counted up by hand, with the numbers that
    /// drop-frame leaves out at 29.97 (SMPTE ST 12-1).
    stream_units::Timecode TimecodeOf(std::uint64_t n) const {
        if (n < counted_) {
            counted_ = 0;
            timecode_ = kFirstTimecode;
        }
        timecode_.dropFrame = clock.rate.key == stream_units::kRate2997.key;
        for (; counted_ < n; ++counted_) {
            countUp();
        }
        return timecode_;
    }
    /// The name of a file that begins with frame `n`.
    std::string FileName(std::uint64_t n) const {
        const stream_units::Timecode timecode = TimecodeOf(n);
        char name[32];
        std::snprintf(name, sizeof name, "%02u_%02u_%02u_%02u.MP4", timecode.hours, timecode.minutes,
                      timecode.seconds, timecode.frames);
        return name;
    }

 private:
    static constexpr stream_units::Timecode kFirstTimecode{9, 59, 50, 0, false};

    void countUp() const {
        const auto perSecond = static_cast<unsigned>((clock.rate.timescale + 999) / 1000);
        if (++timecode_.frames < perSecond) {
            return;
        }
        timecode_.frames = 0;
        if (++timecode_.seconds < 60) {
            return;
        }
        timecode_.seconds = 0;
        if (++timecode_.minutes == 60) {
            timecode_.minutes = 0;
            ++timecode_.hours;
        }
        if (timecode_.dropFrame && timecode_.minutes % 10 != 0) {
            timecode_.frames = 2;
        }
    }
    /// Behind the slice's header: no zeros, so that nothing in it looks like a start code.
    Bytes picture(std::uint64_t n) const { return filler(n, scale_ * (IsIdr(n) ? 3000 : 400)); }
    static Bytes audioPayload(std::uint64_t n) {
        Bytes payload = stream_units::AudioPayload(n);
        stream_units::Append(payload, filler(n + 1, 300));
        return payload;
    }
    Bytes metaPayload(std::uint64_t n, bool recFlag) const {
        return stream_units::MetaPayload(n, {recFlag, TimecodeOf(n)});
    }
    static Bytes filler(std::uint64_t n, std::size_t most) {
        std::uint32_t word = static_cast<std::uint32_t>(n) * 2654435761U + 1;
        Bytes bytes(1 + (word >> 8) % most);
        for (unsigned char& byte : bytes) {
            word = word * 1664525U + 1013904223U;
            byte = static_cast<unsigned char>(1 + (word >> 24) % 255);
        }
        return bytes;
    }

    const std::size_t scale_;
    // How far the timecode is counted.
    mutable std::uint64_t counted_ = 0;
    mutable stream_units::Timecode timecode_ = kFirstTimecode;
};
