#pragma once

#include <cstdint>
#include <span>
#include <string>
#include <vector>

namespace receiver {

/// Takes KLV packets (SMPTE ST 336) out of what a KLV stream carries: bare packets, one behind the other, as
/// asynchronous streams have them, or access unit cells (ISO/IEC 13818-1 2.12.4), as synchronous ones do.
class KlvPackets {
 public:
    /// The packets that are complete with `payload`, each from its universal label to its end.
    std::vector<std::string> Take(std::span<const unsigned char> payload);
    /// How many packets were cut short or were none at all.
    std::uint64_t Damaged() const { return damaged_; }

 private:
    void Split(std::span<const unsigned char> bytes, std::vector<std::string>& packets);

    /// The cells of a packet whose last one has not come.
    std::string partial_;
    std::uint64_t damaged_ = 0;
};

}  // namespace receiver
