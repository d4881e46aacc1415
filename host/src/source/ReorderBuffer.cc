#include "source/ReorderBuffer.h"

#include <utility>

#include "source/CodedUnits.h"
#include "timing/Saturating.h"
#include "timing/Timeline.h"

namespace receiver {
namespace {

/// Periods between the stamps of two pictures in a row that no reordering takes: the clock was set, or
/// pictures are missing.
constexpr std::int64_t kLongestStepOfReordered = kMostReorderFrames + 4;
/// Packets that wait for pictures, of a source whose pictures may have ended.
constexpr std::size_t kLongestWaitForTurn = 4000;

}  // namespace

ReorderBuffer::ReorderBuffer(const AVStream& video, std::uint32_t depth, std::int64_t period)
    : video_(video), depth_(depth), period_(period) {}

void ReorderBuffer::Put(libav::Owner<AVPacket> packet, bool idr) {
    Waiting waiting;
    // What is damaged is not recorded, and its stamp may be another picture's.
    waiting.picture = packet->stream_index == video_.index && (packet->flags & AV_PKT_FLAG_CORRUPT) == 0;
    waiting.packet = std::move(packet);
    if (waiting.picture) {
        Enter(waiting, idr);
    }
    waiting_.push_back(std::move(waiting));
    ended_ = false;
}

void ReorderBuffer::Enter(Waiting& waiting, bool idr) {
    const std::int64_t stamp = waiting.packet->pts;
    bool follows = !idr && !groups_.empty();
    if (stamp != AV_NOPTS_VALUE) {
        const std::int64_t before = last_.value_or(stamp);
        last_ = waiting.shown = UnwrapNear(stamp, video_.pts_wrap_bits, before);
        follows &= Distance(*last_, before) <= static_cast<std::uint64_t>(kLongestStepOfReordered * period_);
    }
    if (!follows) {
        groups_.emplace_back();
    }
    Group& group = groups_.back();
    ++group.pictures;
    if (waiting.shown) {
        group.shown.insert(*waiting.shown);
    }
}

bool ReorderBuffer::IsKnown() const {
    return ended_ || groups_.size() > 1 || groups_.front().pictures > depth_ ||
           waiting_.size() >= kLongestWaitForTurn;
}

std::optional<ReorderBuffer::Next> ReorderBuffer::Take() {
    if (waiting_.empty()) {
        return std::nullopt;
    }
    Waiting& front = waiting_.front();
    while (front.picture && groups_.front().pictures == 0) {
        groups_.pop_front();
    }
    if (front.picture && !IsKnown()) {
        return std::nullopt;
    }
    Next next;
    if (front.picture) {
        GiveTurn(front, next);
    }
    next.packet = std::move(front.packet);
    waiting_.pop_front();
    return next;
}

void ReorderBuffer::GiveTurn(const Waiting& waiting, Next& next) {
    Group& group = groups_.front();
    --group.pictures;
    if (!waiting.shown) {
        return;
    }
    const std::int64_t turn = *group.shown.begin();
    group.shown.erase(group.shown.begin());
    next.shown = waiting.shown;
    next.late = group.lastTurn && turn < *group.lastTurn;
    if (!next.late) {
        next.turn = group.lastTurn = turn;
    }
}

Packets ReorderBuffer::TakeRest() {
    Packets rest;
    for (Waiting& waiting : waiting_) {
        rest.push_back(std::move(waiting.packet));
    }
    waiting_.clear();
    groups_.clear();
    last_.reset();
    return rest;
}

}  // namespace receiver
