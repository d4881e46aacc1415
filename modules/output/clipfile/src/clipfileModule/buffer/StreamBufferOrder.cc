// A recording of pictures in decoding order: where chunks end among them, and when each is shown.

#include <algorithm>
#include <iterator>
#include <limits>
#include <vector>

#include "buffer/IdrPicture.h"
#include "buffer/StreamBuffer.h"
#include "common/PresentationTime.h"

namespace clipfileModule {

namespace {

/// Pictures that are looked at for one that is shown earlier. None that a decoder can show is so late: at 60
/// frames a second they last five seconds.
constexpr std::size_t kLongestReordering = 300;

}  // namespace

std::uint64_t StreamBuffer::shownAt(const StreamData& unit) const {
    return PresentationRtp(unit, settings.pictureOrder);
}

std::vector<std::uint64_t> StreamBuffer::timesOf(std::size_t first, std::size_t end) const {
    std::vector<std::uint64_t> times;
    for (std::size_t i = first; i < end; ++i) {
        times.push_back(shownAt(*videoBuffer[i]));
    }
    return times;
}

std::size_t StreamBuffer::findIdrFrom(std::size_t first) const {
    while (first < videoBuffer.size() && !IsIdrPicture(*videoBuffer[first])) {
        ++first;
    }
    return std::min(first, videoBuffer.size());
}

bool StreamBuffer::isOrderKnown(std::size_t pictures) const {
    if (!inDecodingOrder() || videoBuffer.size() >= kLongestReordering) {
        return true;
    }
    // What follows the newest picture is shown no earlier than that one is decoded, and what follows an IDR
    // frame no earlier than that is shown.
    const std::uint64_t decoded = std::min(newestVideo, videoBuffer.back()->rtp_timestamp);
    for (std::size_t i = 0; i < std::min(pictures, videoBuffer.size()); ++i) {
        if (shownAt(*videoBuffer[i]) <= decoded) {
            continue;
        }
        const std::size_t idr = findIdrFrom(i + 1);
        if (idr == videoBuffer.size() || videoBuffer[idr]->rtp_timestamp > decoded) {
            return false;
        }
    }
    return true;
}

std::uint64_t StreamBuffer::firstShownAt() const {
    if (IsIdrPicture(*videoBuffer.front())) {
        return shownAt(*videoBuffer.front());
    }
    const std::vector<std::uint64_t> times = timesOf(0, findIdrFrom(1));
    return *std::min_element(times.begin(), times.end());
}

std::size_t StreamBuffer::findCut(std::size_t pictures) const {
    const std::size_t longest = std::min<std::size_t>(chunkFrames, pictures);
    if (!inDecodingOrder() || longest == 0) {
        return longest;
    }
    // A file can begin with each IDR frame, wherever the frames before it end.
    if (!IsIdrPicture(*videoBuffer.front())) {
        if (const std::size_t idr = findIdrFrom(1); idr <= longest) {
            return idr;
        }
    }
    // Where IDR frames don't come, a file may have to end between others.
    if (presentationOrder.Latest().size() >= kLongestReordering) {
        for (std::size_t cut = longest; cut > 0; --cut) {
            if (isClosedAt(cut)) {
                return cut;
            }
        }
    }
    return longest;
}

std::size_t StreamBuffer::findIdrBefore(std::size_t end) const {
    while (end > 0 && !IsIdrPicture(*videoBuffer[end - 1])) {
        --end;
    }
    return end == 0 ? 0 : end - 1;
}

std::vector<std::uint64_t> StreamBuffer::timesSinceIdr(std::size_t first, std::size_t end) const {
    std::vector<std::uint64_t> times = timesOf(first, end);
    if (first == 0 && !IsIdrPicture(*videoBuffer.front())) {
        const auto& placed = presentationOrder.Latest();
        times.insert(times.end(), placed.begin(), placed.end());
    }
    return times;
}

bool StreamBuffer::isClosedAt(std::size_t cut) const {
    if (cut >= videoBuffer.size() || IsIdrPicture(*videoBuffer[cut])) {
        return true;
    }
    const std::vector<std::uint64_t> before = timesSinceIdr(findIdrBefore(cut), cut);
    const std::vector<std::uint64_t> behind = timesOf(cut, findIdrFrom(cut));
    return *std::max_element(before.begin(), before.end()) < *std::min_element(behind.begin(), behind.end());
}

std::uint64_t StreamBuffer::countShown(std::uint64_t end) const {
    const std::size_t needed = countNeeded(end);
    // All that is decoded before an IDR frame is shown before it.
    const std::size_t first = findIdrBefore(needed);
    const std::vector<std::uint64_t> times = timesSinceIdr(first, needed);
    const auto hidden =
        std::count_if(times.begin(), times.end(), [end](std::uint64_t time) { return time >= end; });
    return chunkedVideo + needed - static_cast<std::uint64_t>(hidden);
}

std::int64_t StreamBuffer::findDelay() const {
    // Pictures that are shown before all others wait on average as long as the first one, and their jitter
    // evens out.
    std::size_t closed = std::min(findIdrFrom(1), videoBuffer.size() - 1);
    while (closed > 1 && !isClosedAt(closed)) {
        --closed;
    }
    closed = std::max<std::size_t>(closed, 1);
    std::int64_t waits = 0;
    for (std::size_t i = 0; i < closed; ++i) {
        waits += static_cast<std::int64_t>(shownAt(*videoBuffer[i]) - videoBuffer[i]->rtp_timestamp);
    }
    std::int64_t delay = framesIn(waits / static_cast<std::int64_t>(closed));
    // No less than the pictures here need.
    for (std::size_t begin = 0; begin < videoBuffer.size();) {
        const std::size_t end = findIdrFrom(begin + 1);
        delay = std::max(delay, PresentationOrder::FindDelay(timesOf(begin, end)));
        begin = end;
    }
    return delay;
}

void StreamBuffer::placePictures(ChunkData& chunk, std::size_t count, std::uint64_t end) {
    if (chunkedVideo == 0) {
        presentationOrder.Begin(findDelay());
    }
    std::vector<std::uint64_t> times;
    std::size_t first = 0;
    std::size_t behind = 0;
    for (std::size_t i = 0; i < count; ++i) {
        if (i == behind) {
            first = i;
            behind = findIdrFrom(i + 1);
            times = timesOf(first, behind);
        }
        chunk.shownLater.push_back(presentationOrder.Place(times.data() + (i - first), behind - i,
                                                           i == first && IsIdrPicture(*videoBuffer[i])));
    }
    chunk.isOrderClosed = presentationOrder.IsClosed();
    chunk.hiddenVideo = end == kNoEnd ? 0 : presentationOrder.CountFrom(end);
}

std::uint64_t StreamBuffer::findRestEnd() {
    std::uint64_t end = findEnd();
    if (!inDecodingOrder()) {
        return end;
    }
    end = std::min(end, findFirstGap());
    // Less of it, as long as the other media end earlier.
    for (std::size_t needed = countNeeded(end); needed > 0 && !findCompleteChunk(needed, end);
         needed = countNeeded(end)) {
        std::uint64_t last = 0;
        for (const std::uint64_t time : timesOf(0, needed)) {
            last = time < end ? std::max(last, time) : last;
        }
        end = last;
    }
    return end;
}

std::uint64_t StreamBuffer::findFirstGap() {
    // What is still to come stands behind the last IDR frame.
    std::vector<std::uint64_t> times = timesSinceIdr(findIdrBefore(videoBuffer.size()), videoBuffer.size());
    std::sort(times.begin(), times.end());
    const std::uint64_t frame =
        rescale(streamInfo.video_sample_duration, streamInfo.video_track_timescale, videoRtpRate);
    // Nothing is shown before the next one is decoded but what has come: an earlier gap is that of a loss.
    const std::uint64_t decoded = videoBuffer.back()->rtp_timestamp + frame;
    for (std::size_t i = 1; i < times.size(); ++i) {
        if (times[i] > decoded && times[i] - times[i - 1] > frame + frame / 2) {
            return times[i];
        }
    }
    return kNoEnd;
}

}  // namespace clipfileModule
