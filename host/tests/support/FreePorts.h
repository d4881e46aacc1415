#pragma once

#include <cstdint>
#include <vector>

namespace endtoend {

/// Ports of this machine that are free for UDP: the first one even and its successor free too, as RTP and
/// RTCP want a pair (RFC 3550 11). They are kept for this object: another test that asks meanwhile gets
/// others.
class FreePorts {
 public:
    FreePorts();
    ~FreePorts();
    FreePorts(const FreePorts&) = delete;
    FreePorts& operator=(const FreePorts&) = delete;

    std::uint16_t First() const { return first_; }

 private:
    std::uint16_t first_ = 0;
    int lock_ = -1;
};

}  // namespace endtoend
