#pragma once

#include <cstdint>
#include <memory>

/// One unit of the live stream as the host hands it over: a video access unit, an audio frame or a timed
/// metadata packet, undecoded, with its timestamps.
///
/// The record belongs to the host system and is compiled into hosts: the order and the width of its fields
/// are an ABI. It is always held by `std::shared_ptr<StreamData>`; the payload is shared, never copied, on
/// its way through the module, and is not changed by anyone once the unit was pushed.
struct StreamData {
    virtual ~StreamData() = default;

    /// Media clock of the unit: 90000 ticks a second for video and metadata, 48000 for audio. With the start
    /// parameter "-pictureOrder" at "decoding", video is pushed in decoding order and these are its decoding
    /// times; for audio and metadata they are the times at which they are presented in any case.
    std::uint64_t rtp_timestamp = 0;
    /// The same instant in milliseconds, on one clock for all three media.
    std::uint64_t timestamp = 0;
    /// Video with "-pictureOrder" at "decoding": when the picture is shown, in 90000 ticks a second of the
    /// same clock as `rtp_timestamp`, and not before it. The low 32 bits count, so it may wrap as RTP
    /// timestamps do. A picture whose time lies before its decoding or more than 3 seconds behind counts as
    /// shown when it is decoded. Not read otherwise.
    std::uint64_t presentation_timestamp = 0;
    std::uint64_t reserved1 = 0;
    std::uint64_t reserved2 = 0;
    std::uint64_t reserved3 = 0;
    /// Owner of the payload.
    std::shared_ptr<unsigned char> data;
    /// Length of the payload in bytes.
    std::uint64_t size = 0;
    std::uint64_t reserved4 = 0;
    bool reservedFlag = true;
    /// Second owner slot of the host.
    std::shared_ptr<unsigned char> buffer;
    /// The payload itself; null in a unit that carries none.
    const unsigned char* payload = nullptr;
};
