#pragma once

#include <atomic>
#include <chrono>
#include <cstdint>
#include <random>
#include <thread>

namespace endtoend {

/// What a bad network does not deliver.
struct PacketLoss {
    /// Of the packets of each direction, 0 to 1.
    double share = 0;
    /// And of those within a burst, which lasts for `burst` at the end of each period of `every`.
    double burstShare = 1;
    std::chrono::milliseconds burst{0};
    std::chrono::milliseconds every{0};
};

/// A bad network: takes UDP packets at one port of this machine, passes them on to another, and the answers
/// back to whoever sent last, but for the packets that it drops. The same seed drops the same ones of each
/// direction, bursts apart.
class LossyRelay {
 public:
    /// The first period begins now. Throws std::system_error when `from` is taken.
    LossyRelay(std::uint16_t from, std::uint16_t to, const PacketLoss& loss, std::uint32_t seed);
    ~LossyRelay();
    LossyRelay(const LossyRelay&) = delete;
    LossyRelay& operator=(const LossyRelay&) = delete;

    struct Counts {
        std::uint64_t passed = 0;
        std::uint64_t dropped = 0;
    };
    /// Towards the receiver, and back. From any thread.
    Counts Forth() const { return forth_.Read(); }
    Counts Back() const { return back_.Read(); }

 private:
    /// One direction of the road.
    class Road {
     public:
        explicit Road(std::uint32_t seed) : dice_(seed) {}
        /// Of the relay's thread: whether the next packet gets through, where `loss` (0 to 1) do not.
        bool Passes(double loss);
        Counts Read() const { return {passed_, dropped_}; }

     private:
        std::mt19937 dice_;
        std::atomic<std::uint64_t> passed_ = 0;
        std::atomic<std::uint64_t> dropped_ = 0;
    };

    void run();
    double lossNow() const;

    const PacketLoss loss_;
    const std::chrono::steady_clock::time_point begin_ = std::chrono::steady_clock::now();
    Road forth_;
    Road back_;
    int sender_ = -1;
    int receiver_ = -1;
    std::atomic<bool> closing_ = false;
    std::thread thread_;
};

}  // namespace endtoend
