#pragma once

#include <cstddef>
#include <cstdint>
#include <memory>
#include <vector>

#include "StreamData.h"

namespace nal_access {

/// One parameter set: a NAL unit with its header byte and without start code. `size` 0 means absent.
struct NalUnit {
    std::uint64_t reserved = 0;
    std::uint64_t size = 0;
    std::shared_ptr<unsigned char> data;
};

/// A converted sample: the bytes that go into the file, with its timestamps, its duration and its sync flag.
class [[gnu::visibility("default")]] SampleData {
 public:
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

/// Reads and converts stream units. An object serves one thread at a time.
class [[gnu::visibility("default")]] StreamAnalyzer {
 public:
    StreamAnalyzer();
    virtual ~StreamAnalyzer();

    /// True when the unit starts an access unit of an IDR picture; fills the parameter sets found in the
    /// unit.
    bool IsAccessUnitStart(const std::shared_ptr<StreamData>& unit, NalUnit& sps, NalUnit& pps);
    /// Each appends one sample a unit, in order.
    void ConvertVideo(std::vector<std::shared_ptr<StreamData>> & units,
                      std::vector<std::shared_ptr<SampleData>> & samples);
    void ConvertAudio(std::vector<std::shared_ptr<StreamData>> & units,
                      std::vector<std::shared_ptr<SampleData>> & samples);
    void ConvertMeta(std::vector<std::shared_ptr<StreamData>> & units,
                     std::vector<std::shared_ptr<SampleData>> & samples, std::vector<unsigned char> & block);
    /// Reads the timecode of a metadata unit; `sample` stays null when there is none.
    void ConvertTmcd(const std::shared_ptr<StreamData>& unit, std::shared_ptr<SampleData>& sample,
                     bool& dropFrame, unsigned int frames, int offset);
    /// Rescales `value` from the rate `from` to the rate `to`, to the nearest, halves up.
    std::uint64_t ConvertTimestamp(std::uint64_t value, unsigned int from, unsigned int to);
    /// The record flag in a metadata payload.
    bool GetRecFlg(const unsigned char* data, std::uint64_t size);
};

}  // namespace nal_access
