#pragma once

#include <cstdint>
#include <deque>
#include <mutex>
#include <vector>

#include "source/SourceInterface.h"

namespace receiver {

/// Keeps what a preview is made of: the newest IDR picture, and the last second of sound. Nothing is copied:
/// nobody changes a unit. Fed on one thread, asked on any.
class Preview {
 public:
    struct Material {
        /// Null before the first one.
        std::shared_ptr<const unsigned char> picture;
        std::size_t pictureSize = 0;
        /// Which one it is, from 1.
        std::uint64_t number = 0;
        struct AudioFrame {
            std::shared_ptr<const unsigned char> data;
            std::size_t size = 0;
        };
        /// In their order. A decoder needs the first one for the second one.
        std::vector<AudioFrame> audio;
    };

    void LookAt(const SourceUnit& unit);
    Material Take() const;

 private:
    mutable std::mutex mutex_;
    // Guarded by mutex_:
    std::shared_ptr<const unsigned char> picture_;
    std::size_t pictureSize_ = 0;
    std::uint64_t number_ = 0;
    std::deque<Material::AudioFrame> audio_;
};

}  // namespace receiver
