#include <utility>

#include "StreamAnalyzer.h"

namespace nal_access {

SampleData::SampleData(std::vector<unsigned char> bytes, std::uint64_t rtpTimestamp, std::uint64_t timestamp,
                       bool sync)
    : bytes_(std::move(bytes)), rtpTimestamp_(rtpTimestamp), timestamp_(timestamp), sync_(sync) {}

unsigned char* SampleData::GetData() {
    return bytes_.data();
}
std::uint64_t SampleData::GetDataSize() const {
    return bytes_.size();
}
std::uint64_t SampleData::GetRtpTimestamp() const {
    return rtpTimestamp_;
}
std::uint64_t SampleData::GetTimestamp() const {
    return timestamp_;
}
std::uint64_t SampleData::GetDuration() const {
    return duration_;
}
void SampleData::SetDuration(std::uint64_t duration) {
    duration_ = duration;
}
bool SampleData::GetSync() const {
    return sync_;
}

}  // namespace nal_access
