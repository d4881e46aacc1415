#pragma once

#include <atomic>
#include <chrono>
#include <cstdint>
#include <random>
#include <thread>

#include "common/SchedulePoint.h"

/// Lingers at some of the points where threads may overtake each other, at random but seeded, while it lives.
/// One at a time.
class SeededDelays {
 public:
    explicit SeededDelays(std::uint64_t seed) {
        state().seed = seed;
        state().threads = 0;
        ++state().generation;
        clipfileModule::schedulePointHook = &linger;
    }
    ~SeededDelays() { clipfileModule::schedulePointHook = nullptr; }
    SeededDelays(const SeededDelays&) = delete;
    SeededDelays& operator=(const SeededDelays&) = delete;

 private:
    struct State {
        std::atomic<std::uint64_t> seed = 0;
        std::atomic<std::uint64_t> threads = 0;
        std::atomic<std::uint64_t> generation = 0;
    };
    static State& state() {
        static State one;
        return one;
    }
    static void linger() {
        thread_local std::uint64_t generation = 0;
        thread_local std::minstd_rand random;
        if (generation != state().generation) {
            generation = state().generation;
            random.seed(static_cast<std::uint32_t>(state().seed + 7919 * ++state().threads));
        }
        const std::uint32_t dice = static_cast<std::uint32_t>(random() >> 8);
        if (dice % 64 == 0) {
            std::this_thread::sleep_for(std::chrono::microseconds(dice / 64 % 300));
        } else if (dice % 4 == 0) {
            std::this_thread::yield();
        }
    }
};
