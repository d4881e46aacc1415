#pragma once

#include <cstddef>
#include <cstdint>
#include <filesystem>
#include <unordered_map>
#include <vector>

namespace endtoend {

/// Maps recordings back to what was sent, by the bytes of pictures and of audio frames, whatever was lost on
/// the way. Holds no media, so that hours of it fit in memory.
class FrameJudge {
 public:
    /// A file that holds what was sent, in the order in which that went out. Throws std::runtime_error when
    /// it cannot be read.
    void AddSent(const std::filesystem::path& file);

    /// What recordings are like.
    struct Verdict {
        std::size_t pictures = 0;
        std::size_t sounds = 0;
        /// Not found in what was sent, behind what was found before.
        std::size_t unknownPictures = 0;
        std::size_t unknownSounds = 0;
        /// Pictures and audio frames that were sent between the first and the last one of a file, and that it
        /// does not hold.
        std::size_t missingPictures = 0;
        std::size_t missingSounds = 0;
        /// The largest distance of an audio frame from its pictures, in seconds, beyond that with which they
        /// were sent.
        double outOfStep = 0;

        Verdict& operator+=(const Verdict& other);
    };
    /// Throws std::runtime_error when the file cannot be read. Recordings come in their order.
    Verdict Judge(const std::filesystem::path& recording);

    std::size_t SentPictures() const { return pictures_.times.size(); }
    std::size_t SentSounds() const { return sounds_.times.size(); }

 private:
    struct Medium {
        void Add(std::uint64_t hash, double time);
        /// The number of the unit that is meant, the first one with that hash from `next` on.
        bool Find(std::uint64_t hash, std::size_t& number);

        std::unordered_map<std::uint64_t, std::vector<std::size_t>> numbers;
        std::vector<double> times;
        std::size_t next = 0;
    };

    Medium pictures_;
    Medium sounds_;
};

}  // namespace endtoend
