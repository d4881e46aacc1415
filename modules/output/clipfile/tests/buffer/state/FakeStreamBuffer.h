#pragma once

#include <cstdint>
#include <memory>
#include <string>
#include <vector>

#include "common/StreamBufferInterface.h"

/// A buffer that keeps what the states ask of it.
class FakeStreamBuffer : public clipfileModule::StreamBufferInterface {
 public:
    void SetVideoSequenceHeader(const nal_access::NalUnit& sps, const nal_access::NalUnit& pps,
                                const std::shared_ptr<StreamData>& unit) override {
        calls.emplace_back("SetVideoSequenceHeader");
        lastSps = sps;
        lastPps = pps;
        lastUnit = unit;
    }
    bool MakeFileTimecode(const std::shared_ptr<clipfileModule::ChunkData>& /*chunk*/) override {
        calls.emplace_back("MakeFileTimecode");
        return false;
    }
    bool GetFileTimecode(unsigned char* /*timecode*/, bool* /*dropFrame*/) override {
        calls.emplace_back("GetFileTimecode");
        return false;
    }
    bool GetFileTimecode(unsigned char* /*timecode*/) override {
        calls.emplace_back("GetFileTimecode");
        return false;
    }
    std::int64_t GetStartTimestamp() const override { return start; }
    std::int64_t GetStopTimestamp() const override { return stop; }
    std::int64_t GetEndTimestamp() const override { return end; }
    void NotifyEndSync() override { calls.emplace_back("NotifyEndSync"); }

    std::int64_t start = 0;
    std::int64_t stop = -1;
    std::int64_t end = -1;
    std::vector<std::string> calls;
    nal_access::NalUnit lastSps;
    nal_access::NalUnit lastPps;
    std::shared_ptr<StreamData> lastUnit;
};
