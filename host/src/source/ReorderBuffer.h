#pragma once

#include <cstdint>
#include <deque>
#include <optional>
#include <set>

#include "source/Input.h"

namespace receiver {

/// Finds the turn of pictures that come in the order of decoding, which is not that in which they are shown:
/// the n-th one has the turn of the n-th one shown, so that turns follow each other as times do, whatever is
/// missing. It is known when as many pictures as may be decoded ahead have come behind it; until then packets
/// of all media wait, in their order. What comes behind an IDR picture is shown behind all that came before
/// it (ITU-T H.264 C.4.4). Not for several threads.
class ReorderBuffer {
 public:
    /// `depth`: pictures that may be decoded in front of one that is shown before all of them
    /// (`max_num_reorder_frames`, E.2.1). `period` of a picture in the time base of `video`, which must
    /// outlive this.
    ReorderBuffer(const AVStream& video, std::uint32_t depth, std::int64_t period);

    /// Takes the next packet of any stream; `idr`: an IDR picture.
    void Put(libav::Owner<AVPacket> packet, bool idr);
    /// No packet follows for now: what waits has waited long enough.
    void End() { ended_ = true; }

    /// A packet, as it came.
    struct Next {
        libav::Owner<AVPacket> packet;
        /// Of a picture, unwrapped, in the time base of the video: when it is shown, and its turn. Nothing
        /// where it has no stamp, or a damaged one.
        std::optional<std::int64_t> shown = {};
        std::optional<std::int64_t> turn = {};
        /// It should have been shown before the turns of pictures that came in front of it: more of them than
        /// `depth` were decoded ahead.
        bool late = false;
    };
    /// The next one that need not wait.
    std::optional<Next> Take();
    /// All that wait, as they came.
    Packets TakeRest();

 private:
    /// Pictures that are shown behind all those of the group before.
    struct Group {
        /// Of pictures whose turn is not given.
        std::multiset<std::int64_t> shown;
        std::size_t pictures = 0;
        std::optional<std::int64_t> lastTurn;
    };
    struct Waiting {
        libav::Owner<AVPacket> packet;
        bool picture = false;
        std::optional<std::int64_t> shown;
    };

    void Enter(Waiting& waiting, bool idr);
    /// The turn of the first picture of the first group.
    bool IsKnown() const;
    void GiveTurn(const Waiting& waiting, Next& next);

    const AVStream& video_;
    const std::size_t depth_;
    const std::int64_t period_;
    std::deque<Waiting> waiting_;
    std::deque<Group> groups_;
    std::optional<std::int64_t> last_;
    bool ended_ = false;
};

}  // namespace receiver
