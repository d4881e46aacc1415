#pragma once

#include <cstdint>
#include <map>
#include <string>
#include <vector>

#include "source/SourceInterface.h"

namespace receiver {

/// Half an audio frame of 1024 samples at 48 kHz, in ticks of 90000.
inline constexpr std::int64_t kHalfAudioFrame = 960;

/// What was sent, so that units of a source can be mapped back to it by their bytes.
class SentMedia {
 public:
    /// Of a transport stream, as another program reads it. No two pictures and no two audio frames may be
    /// alike.
    explicit SentMedia(const std::string& file);

    std::size_t Pictures() const { return pictures_; }
    std::size_t Sounds() const { return sounds_; }

    /// A unit that came, by the number of what was sent and with its time less that of what was sent, in
    /// ticks of 90000.
    struct Arrival {
        std::size_t number = 0;
        std::int64_t offset = 0;
    };
    /// The units of a medium that were sent; others (silence) are left out.
    std::vector<Arrival> Find(Medium medium, const std::vector<SourceUnit>& units) const;

 private:
    struct Item {
        Medium medium;
        std::size_t number;
        std::int64_t time;
    };

    std::map<std::string, Item> items_;
    std::size_t pictures_ = 0;
    std::size_t sounds_ = 0;
};

/// Expects that all pictures from `first` on came, without a loss, and that audio is in step with them within
/// `tolerance` from the first one that begins with or behind them, without a gap either.
void ExpectInStep(const SentMedia& sent, const std::vector<SourceUnit>& units, std::size_t first,
                  std::int64_t tolerance = kHalfAudioFrame);

}  // namespace receiver
