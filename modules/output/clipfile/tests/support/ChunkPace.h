#pragma once

#include <atomic>
#include <chrono>
#include <cstddef>
#include <cstdint>
#include <memory>
#include <string>
#include <string_view>
#include <thread>

#include "LogSink.h"

/// Keeps whoever pushes a stream as fast as it goes from being further ahead of the chunk thread and the
/// writer than a recording allows, which ends it. Follows the one recording of the process by its log while
/// it lives.
class ChunkPace {
 public:
    ChunkPace() { LogSinks::Add(counts_, LOG_PRIORITY_DETAIL); }
    ~ChunkPace() { LogSinks::Remove(counts_.get()); }
    ChunkPace(const ChunkPace&) = delete;
    ChunkPace& operator=(const ChunkPace&) = delete;

    /// Waits until few enough of `pushed` pictures are left in the caches, and of their chunks before the
    /// writer. False when that takes too long.
    [[nodiscard]] bool WaitForRoom(std::size_t pushed) const {
        return waitUntil([&] {
            return counts_->chunks <= kMostChunks &&
                   static_cast<std::int64_t>(pushed) - counts_->pictures <= kMostPictures;
        });
    }
    /// Waits until next to no chunk waits for the writer, which is given up when it takes long at the end.
    [[nodiscard]] bool WaitForWriter() const {
        return waitUntil([&] { return counts_->chunks <= 1; });
    }

 private:
    static constexpr std::int64_t kMostChunks = 16;
    static constexpr std::int64_t kMostPictures = 200;

    struct Counts : LogSinkInterface {
        void OnLine(const LogLine& line) override {
            static constexpr std::string_view kCut = "ST: [C]\t";
            if (line.text.starts_with(kCut)) {
                pictures += std::stol(std::string(line.text.substr(kCut.size())));
                ++chunks;
            } else if (line.text.starts_with("write chunk. ")) {
                --chunks;
            }
        }
        std::atomic<std::int64_t> pictures = 0;
        std::atomic<std::int64_t> chunks = 0;
    };

    template <typename Done>
    static bool waitUntil(Done done) {
        const auto deadline = std::chrono::steady_clock::now() + std::chrono::seconds(60);
        while (!done()) {
            if (std::chrono::steady_clock::now() > deadline) {
                return false;
            }
            std::this_thread::sleep_for(std::chrono::milliseconds(1));
        }
        return true;
    }

    const std::shared_ptr<Counts> counts_ = std::make_shared<Counts>();
};
