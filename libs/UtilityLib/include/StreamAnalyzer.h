#pragma once

#include <cstdint>
#include <memory>
#include <vector>

#include "StreamData.h"

namespace nal_access {

/// One parameter set: a NAL unit with its header byte and without start code. `size` 0 means absent.
struct NalUnit {
    std::uint64_t reserved = 0;
    /// Bytes.
    std::uint64_t size = 0;
    std::shared_ptr<unsigned char> data;
};

/// A converted sample: the bytes that go into the file, with its timestamps, its duration and its sync flag.
class [[gnu::visibility("default")]] SampleData {
 public:
    /// `rtpTimestamp` in ticks of the medium's RTP clock, `timestamp` in milliseconds, as in `StreamData`.
    SampleData(std::vector<unsigned char> bytes, std::uint64_t rtpTimestamp, std::uint64_t timestamp,
               bool sync);

    /// The bytes, owned by the sample.
    unsigned char* GetData();
    std::uint64_t GetDataSize() const;
    std::uint64_t GetRtpTimestamp() const;
    std::uint64_t GetTimestamp() const;
    /// Duration in ticks of the track; 0 until it was set.
    std::uint64_t GetDuration() const;
    void SetDuration(std::uint64_t duration);
    /// True for a sync sample.
    bool GetSync() const;

 private:
    std::vector<unsigned char> bytes_;
    std::uint64_t rtpTimestamp_;
    std::uint64_t timestamp_;
    std::uint64_t duration_ = 0;
    bool sync_;
};

/// Reads and converts stream units. Payloads come from a network: any bytes are accepted, nothing is read
/// outside them, and the work is linear in their size. An object serves one thread at a time; only
/// `ConvertVideo` remembers anything from call to call.
///
/// A null unit, and one with a null `payload`, counts as one of no bytes. The converters give exactly one
/// sample a unit and leave durations to the caller.
class [[gnu::visibility("default")]] StreamAnalyzer {
 public:
    StreamAnalyzer();
    StreamAnalyzer(const StreamAnalyzer&) = delete;
    StreamAnalyzer& operator=(const StreamAnalyzer&) = delete;
    virtual ~StreamAnalyzer();

    /// True when the H.264 access unit, a byte stream of ISO/IEC 14496-10 Annex B, holds an IDR slice with
    /// first_mb_in_slice 0. `sps` and `pps` become those of the unit that this slice refers to by its
    /// identifiers, of size 0 where the unit has none, and both of size 0 when the result is false. Without
    /// the picture parameter set, `sps` is the last one in front of the slice.
    bool IsAccessUnitStart(const std::shared_ptr<StreamData>& unit, NalUnit& sps, NalUnit& pps);

    /// Appends one sample for each access unit: its NAL units, each behind a 4-byte big-endian length; sync
    /// when there is an IDR slice. Left out are access unit delimiters, end of sequence, end of stream,
    /// filler, and parameter sets equal to those of the first IDR picture that this analyser met, which the
    /// sample entry of a file carries. From the moment when a different set takes over one of their
    /// identifiers every set stays in the samples, so that no picture becomes undecodable. When nothing is
    /// left, the sample is empty and the log says "no nal unit. rtp_timestamp = %llu, size = %llu." at
    /// priority 5; so it is for a unit of more than 2^32 - 1 bytes.
    void ConvertVideo(std::vector<std::shared_ptr<StreamData>> & units,
                      std::vector<std::shared_ptr<SampleData>> & samples);

    /// Appends one sync sample for each unit: the AAC frame, without ADTS header (ISO/IEC 14496-3 1.A.2)
    /// where it has one.
    void ConvertAudio(std::vector<std::shared_ptr<StreamData>> & units,
                      std::vector<std::shared_ptr<SampleData>> & samples);

    /// Appends one sync sample for each metadata unit: its payload, followed by `block`, a local set in one
    /// packet, unless the payload already has a local set with the identifier that `block` carries.
    void ConvertMeta(std::vector<std::shared_ptr<StreamData>> & units,
                     std::vector<std::shared_ptr<SampleData>> & samples, std::vector<unsigned char> & block);

    /// Reads the timecode of a metadata unit into a sample of four bytes, hours, minutes, seconds, frames,
    /// and its drop-frame flag. `frames` is the nominal rate in frames a second: `offset` frames, also
    /// negative, are added at that rate, with the drop-frame rule at 30 and 60 when the flag is set, and the
    /// sum wraps at 24 hours. With `frames` 0 the address comes as it stands and its frame number is not
    /// checked against a rate. A unit without a valid timecode leaves `sample` and `dropFrame` alone.
    void ConvertTmcd(const std::shared_ptr<StreamData>& unit, std::shared_ptr<SampleData>& sample,
                     bool& dropFrame, unsigned int frames, int offset);

    /// Rescales `value` from the rate `from` to the rate `to`, to the nearest, halves up. Exact wherever the
    /// result fits 64 bits; one that does not gives 2^64 - 1. `from` 0 gives 0.
    std::uint64_t ConvertTimestamp(std::uint64_t value, unsigned int from, unsigned int to);

    /// The record flag in a metadata payload; false when there is none. `data` may be null.
    bool GetRecFlg(const unsigned char* data, std::uint64_t size);

 private:
    struct Memory;

    std::unique_ptr<Memory> memory_;
};

}  // namespace nal_access
