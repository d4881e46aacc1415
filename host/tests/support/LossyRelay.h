#pragma once

#include <atomic>
#include <cstdint>
#include <random>
#include <thread>

namespace endtoend {

/// A bad network: takes UDP packets at one port of this machine, passes them on to another, and the answers
/// back to whoever sent last, but for the packets that it drops. The same seed drops the same ones of each
/// direction.
class LossyRelay {
 public:
    /// Drops `loss` (0 to 1) of the packets of each direction. Throws std::system_error when `from` is taken.
    LossyRelay(std::uint16_t from, std::uint16_t to, double loss, std::uint32_t seed);
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
        Road(double loss, std::uint32_t seed) : dice_(seed), loss_(loss) {}
        /// Of the relay's thread: whether the next packet gets through.
        bool Passes();
        Counts Read() const { return {passed_, dropped_}; }

     private:
        std::mt19937 dice_;
        std::bernoulli_distribution loss_;
        std::atomic<std::uint64_t> passed_ = 0;
        std::atomic<std::uint64_t> dropped_ = 0;
    };

    void run();

    Road forth_;
    Road back_;
    int sender_ = -1;
    int receiver_ = -1;
    std::atomic<bool> closing_ = false;
    std::thread thread_;
};

}  // namespace endtoend
