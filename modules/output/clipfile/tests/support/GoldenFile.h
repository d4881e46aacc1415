#pragma once

// The golden description of recorded files, box by box: what all of them share. The recordings themselves
// stand with their tests.

#include <cstdint>
#include <ostream>
#include <string_view>

#include "support/GoldenBytes.h"
#include "support/MuxerStream.h"

namespace golden {

/// What the frame rate decides, for a recording whose drop-frame flag is set.
struct RateRow {
    std::uint32_t key;          // frames per 1000 seconds
    std::uint32_t timescale;    // ticks per second of video, timecode, metadata and movie
    std::uint32_t duration;     // ticks of a frame
    std::uint16_t rate;         // frames a second: integer part
    std::uint16_t ratePoint;    // and fraction, in 1/65536
    std::uint8_t numFrames;     // frames of a timecode second
    std::uint32_t tmcdFlags;    // bit 0: drop frame
    std::uint32_t frameNumber;  // of 01:02:03:04
    std::uint32_t audio5;       // 5 audio frames of 1024 / 48000 s in movie ticks, truncated
    std::uint32_t audio64;      // 64 of them
};

inline std::ostream& operator<<(std::ostream& out, const RateRow& row) {
    return out << row.key;
}

// Frame numbers: (1 * 3600 + 2 * 60 + 3) * numFrames + 4, less 2 or 4 numbers for each of the 62 minutes but
// the six that end in 0, besides 00:00.
inline constexpr RateRow kRates[] = {
    {23980, 24000, 1001, 23, 63965, 24, 0x0A, 89356, 2560, 32768},
    {24000, 24000, 1000, 24, 0, 24, 0x0A, 89356, 2560, 32768},
    {25000, 25000, 1000, 25, 0, 25, 0x0A, 93079, 2666, 34133},
    {29970, 30000, 1001, 29, 63572, 30, 0x0B, 111582, 3200, 40960},
    {30000, 30000, 1000, 30, 0, 30, 0x0A, 111694, 3200, 40960},
    {50000, 50000, 1000, 50, 0, 50, 0x0A, 186154, 5333, 68266},
    {59940, 60000, 1001, 59, 61608, 60, 0x0B, 223160, 6400, 81920},
    {60000, 60000, 1000, 60, 0, 60, 0x0A, 223384, 6400, 81920},
};

inline constexpr unsigned char kTimecode[4] = {1, 2, 3, 4};

inline const Bytes kMatrix =
    U32(0x00010000) + U32(0) + U32(0) + U32(0) + U32(0x00010000) + U32(0) + U32(0) + U32(0) + U32(0x40000000);

/// ISO/IEC 14496-12 4.3
inline Bytes Ftyp() {
    return Box("ftyp", Text("ZQVC")                                        // major_brand
                           + U32(0x01001FFF)                               // minor_version
                           + Text("ZQVC") + Text("mp42") + Text("iso2"));  // compatible_brands
}

/// The profile; `format` tells the kind of file.
inline Bytes UuidProf(const RateRow& row, std::uint32_t format) {
    const Bytes rate = U16(row.rate) + U16(row.ratePoint);
    return Box("uuid",
               OwnUuid("PROF") + U32(0) + U32(3)  // entries
                   + Box("FPRF", U32(0) + U32(format) + U32(0)) +
                   Box("APRF", U32(0) + U32(2)              // track
                                   + Text("mp4a")           // codec
                                   + U32(553) + U32(0)      //
                                   + U32(125) + U32(128)    // average and maximum rate
                                   + U32(48000)             // sampling rate
                                   + U32(2)) +              // channels
                   Box("VPRF", U32(0) + U32(1)              // track
                                   + Text("avc1")           // codec
                                   + U32(0x01640028)        // version 1, High profile, level 4.0
                                   + U32(0x00030000)        //
                                   + U32(50000000)          // average bit rate
                                   + U32(50000000)          // maximum bit rate
                                   + rate                   // average frame rate
                                   + rate                   // maximum frame rate
                                   + U16(1920) + U16(1080)  // size
                                   + U16(1) + U16(1)));
}

/// 8.2.2
inline Bytes Mvhd(const RateRow& row, std::uint32_t duration) {
    return FullBox("mvhd", 0, 0,
                   U32(muxer_stream::kStoppedMp4Time)        // creation_time
                       + U32(muxer_stream::kStoppedMp4Time)  // modification_time
                       + U32(row.timescale) + U32(duration)  //
                       + U32(0x00010000)                     // rate
                       + U16(0x0100)                         // volume
                       + Zeros(10) + kMatrix + Zeros(24)     //
                       + U32(5));                            // next_track_ID
}

/// 8.3.2
inline Bytes Tkhd(std::uint32_t trackId, std::uint32_t duration, std::uint16_t volume, std::uint16_t width,
                  std::uint16_t height) {
    return FullBox("tkhd", 0, 7,
                   U32(muxer_stream::kStoppedMp4Time)                  // creation_time
                       + U32(muxer_stream::kStoppedMp4Time)            // modification_time
                       + U32(trackId) + U32(0) + U32(duration)         //
                       + Zeros(8) + U16(0)                             // layer
                       + U16(0)                                        // alternate_group
                       + U16(volume) + U16(0) + kMatrix                //
                       + U16(width) + U16(0) + U16(height) + U16(0));  // 16.16
}

/// 8.4.2
inline Bytes Mdhd(std::uint32_t timescale, std::uint32_t duration) {
    return FullBox("mdhd", 0, 0,
                   U32(muxer_stream::kStoppedMp4Time)        // creation_time
                       + U32(muxer_stream::kStoppedMp4Time)  // modification_time
                       + U32(timescale) + U32(duration)      //
                       + U16(0x15C7)                         // language "eng"
                       + U16(0));
}

/// 8.4.3
inline Bytes Hdlr(std::string_view type, std::string_view name) {
    return FullBox("hdlr", 0, 0, U32(0) + Text(type) + Zeros(12) + CString(name));
}

/// 8.7.1 and 8.7.2: the media is in this file.
inline Bytes Dinf() {
    return Box("dinf", FullBox("dref", 0, 0, U32(1) + FullBox("url ", 0, 1, {})));
}

/// One item of user metadata of type 10, undetermined language, with eight bytes.
inline Bytes Usage(const Bytes& data) {
    return Box("uuid", OwnUuid("USMT") + Box("MTDT", U16(1)             // items
                                                         + U16(18)      // size of the item
                                                         + U32(10)      // type
                                                         + U16(0x55C4)  // flag 0, language "und"
                                                         + U16(0)       // encoding
                                                         + data));
}

/// ISO/IEC 14496-12 12.1.3, ISO/IEC 14496-15 5.3.4
inline Bytes VideoStsd() {
    const Bytes avcC = Box("avcC", U8(1) + U8(0x64) + U8(0x00) + U8(0x28)        // version, profile, level
                                       + U8(0xFF)                                // lengthSizeMinusOne 3
                                       + U8(0xE1) + U16(5) + muxer_stream::kSps  //
                                       + U8(1) + U16(3) + muxer_stream::kPps);
    return FullBox("stsd", 0, 0,
                   U32(1) + Box("avc1", Zeros(6) + U16(1)                              // data_reference_index
                                            + Zeros(16)                                //
                                            + U16(1920) + U16(1080)                    // width, height
                                            + U32(0x00480000)                          // 72 pixels per inch
                                            + U32(0x00480000)                          //
                                            + U32(0)                                   //
                                            + U16(1)                                   // frame_count
                                            + U8(10) + Text("AVC Coding") + Zeros(21)  // compressorname
                                            + U16(24)                                  // depth
                                            + U16(0xFFFF)                              // pre_defined
                                            + avcC));
}

/// ISO/IEC 14496-12 12.2.3, ISO/IEC 14496-14 6.7.2, ISO/IEC 14496-1 7.2.6
inline Bytes AudioStsd() {
    const Bytes esds = FullBox("esds", 0, 0,
                               Bytes{0x03, 0x19, 0x00, 0x00, 0x00} +  // ES_Descriptor, ES_ID 0
                                   Bytes{0x04, 0x11, 0x40, 0x15} +    // DecoderConfig: AAC, audio stream
                                   U24(1536) + U32(128000) + U32(125376) +  // bufferSizeDB, maximum, average
                                   Bytes{0x05, 0x02, 0x11, 0x90} +          // DecoderSpecificInfo
                                   Bytes{0x06, 0x01, 0x02});                // SLConfig
    return FullBox("stsd", 0, 0,
                   U32(1) + Box("mp4a", Zeros(6) + U16(1)       // data_reference_index
                                            + Zeros(8)          //
                                            + U16(2) + U16(16)  // channelcount, samplesize
                                            + U32(0)            //
                                            + U32(0xBB800000)   // samplerate 48000.0
                                            + esds));
}

inline Bytes TimecodeStsd(const RateRow& row) {
    return FullBox("stsd", 0, 0,
                   U32(1) + Box("tmcd", Zeros(6) + U16(1)                             // data_reference_index
                                            + U32(0) + U32(row.tmcdFlags)             //
                                            + U32(row.timescale) + U32(row.duration)  //
                                            + U8(row.numFrames) + U8(0)));
}

inline Bytes MetaStsd() {
    return FullBox("stsd", 0, 0, U32(1) + Box("rtmd", Zeros(6) + U16(1)));
}

// 8.6.1.2, 8.7.4, 8.7.3, 8.7.5: rows as they stand.
inline Bytes Stts(std::uint32_t count, const Bytes& rows) {
    return FullBox("stts", 0, 0, U32(count) + rows);
}
inline Bytes Stsc(std::uint32_t count, const Bytes& rows) {
    return FullBox("stsc", 0, 0, U32(count) + rows);
}
inline Bytes Stsz(std::uint32_t sampleSize, std::uint32_t count, const Bytes& rows = {}) {
    return FullBox("stsz", 0, 0, U32(sampleSize) + U32(count) + rows);
}
inline Bytes Co64(std::uint32_t count, const Bytes& rows) {
    return FullBox("co64", 0, 0, U32(count) + rows);
}
inline Bytes Stco(std::uint32_t count, const Bytes& rows) {
    return FullBox("stco", 0, 0, U32(count) + rows);
}
inline Bytes Stss(std::uint32_t count, const Bytes& rows) {
    return FullBox("stss", 0, 0, U32(count) + rows);
}

/// Durations of a track: in movie ticks, which is that of its edit too, and of its media in its own.
struct Durations {
    std::uint32_t movie;
    std::uint32_t media;
    bool hasEdit = true;
};

/// 8.6.5 and 8.6.6, with one edit from the start of the media; nothing for a track without.
inline Bytes Edts(const Durations& durations) {
    if (!durations.hasEdit) {
        return {};
    }
    return Box("edts", FullBox("elst", 0, 0,
                               U32(1)                      // entry_count
                                   + U32(durations.movie)  // segment_duration
                                   + U32(0)                // media_time
                                   + U16(1) + U16(0)));    // media_rate
}

// The four tracks, with their sample tables behind `stsd`.
inline Bytes VideoTrak(const RateRow& row, const Durations& durations, const Bytes& tables) {
    return Box("trak",
               Tkhd(1, durations.movie, 0, 1920, 1080) + Edts(durations) +
                   Box("mdia", Mdhd(row.timescale, durations.media) + Hdlr("vide", "Video Media Handler") +
                                   Box("minf", FullBox("vmhd", 0, 1, Zeros(8)) + Dinf() +
                                                   Box("stbl", VideoStsd() + tables))) +
                   Usage(U32(1) + Zeros(4)));
}
inline Bytes AudioTrak(const Durations& durations, const Bytes& tables) {
    return Box("trak", Tkhd(2, durations.movie, 0x0100, 0, 0) + Edts(durations) +
                           Box("mdia", Mdhd(48000, durations.media) + Hdlr("soun", "Sound Media Handler") +
                                           Box("minf", FullBox("smhd", 0, 0, Zeros(4)) + Dinf() +
                                                           Box("stbl", AudioStsd() + tables))) +
                           Usage(U32(1) + Zeros(4)));
}
inline Bytes TimecodeTrak(const RateRow& row, const Durations& durations, const Bytes& tables) {
    return Box("trak", Tkhd(3, durations.movie, 0, 0, 0) + Edts(durations) +
                           Box("mdia", Mdhd(row.timescale, durations.media) +
                                           Hdlr("tmcd", "Time Code Media Handler") +
                                           Box("minf", FullBox("nmhd", 0, 0, {}) + Dinf() +
                                                           Box("stbl", TimecodeStsd(row) + tables))) +
                           Usage(Bytes{0xFF, 0xFF, 0xFF, 0xFF, 0x00, 0x00, 0xFF, 0xFF}));
}
inline Bytes MetaTrak(const RateRow& row, const Durations& durations, const Bytes& tables) {
    return Box(
        "trak",
        Tkhd(4, durations.movie, 0, 0, 0) + Box("tref", Box("cdsc", U32(1))) + Edts(durations) +
            Box("mdia",
                Mdhd(row.timescale, durations.media) + Hdlr("meta", "Timed Metadata Media Handler") +
                    Box("minf", FullBox("nmhd", 0, 0, {}) + Dinf() + Box("stbl", MetaStsd() + tables))) +
            Usage(U32(16) + Zeros(4)));
}

}  // namespace golden
