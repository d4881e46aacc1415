// Types of the box library's public interface: status, callbacks, configuration and parameter records.
//
// Parameter records are plain structures that a caller fills and a call reads. The library copies what it
// keeps, pointed-to bytes included, so a record need only live for the length of the call.
#pragma once

#include <cstdint>

// Result of every operation. No other value is ever returned.
enum [[nodiscard]] MbxStatus : uint32_t{
    MBX_OK = 0,
    // Null pointer, zero where an identifier is required, or a value out of its range.
    MBX_ERR_INVALID_ARG = 1,
    // What the call needs does not exist yet, or exists already; or the configured mode forbids the value.
    MBX_ERR_BAD_STATE = 2,
    // Allocation refused, by the host or by the quota.
    MBX_ERR_NO_MEMORY = 256,
    // A read, write, seek or tell callback failed, or moved fewer bytes than asked.
    MBX_ERR_IO = 257,
    // A track, sample entry or fragment looked up by number does not exist; no free track identifier is left.
    MBX_ERR_NOT_FOUND = 512,
    // Arithmetic overflow, or a count that its field cannot carry.
    MBX_ERR_OVERFLOW = 513,
    // Broken invariant: an unknown enumerator, a record set twice.
    MBX_ERR_INTERNAL = 0x10000000,
};

// One user's callbacks and memory quota. Opaque; made by MbxCreateContext.
struct MbxContext;
// The tree of one output file. Opaque; made by MbxSessionCreate.
struct MbxSession;
// The host's handle of one open file. Opaque to the library (see mbx_stdio.h); null where a call only
// measures.
struct MbxFile;

// Contract: callbacks-without-caller. `read`, `tell`, `size`, `strncmp`, `strncpy`, `memcmp`, `memmove`.
// The host's half of the library: every file operation, allocation and memory primitive goes through this
// table. Every entry but `user_data` must be set. The I/O entries return MBX_OK or a status.
struct MbxCallbacks {
    void* user_data;  // passed first to `alloc`, `free` and to the string and memory entries
    MbxStatus (*read)(MbxFile* file, void* buffer, uint64_t size, uint64_t* count);
    MbxStatus (*write)(MbxFile* file, const void* buffer, uint64_t size, uint64_t* count);
    MbxStatus (*seek)(MbxFile* file, int64_t offset, uint32_t origin);  // origin 0 start, 1 position, 2 end
    MbxStatus (*tell)(MbxFile* file, uint64_t* position);
    MbxStatus (*size)(MbxFile* file, uint64_t* length);
    void* (*alloc)(void* user_data, uint64_t size);  // at least 8-byte aligned memory, or null
    void (*free)(void* user_data, void* pointer);
    int (*strncmp)(void* user_data, const char* a, const char* b, uint64_t n);
    // The copying entries return the destination, or null when a pointer is null or `capacity` is below
    // `count`.
    char* (*strncpy)(void* user_data, char* destination, uint64_t capacity, const char* source,
                     uint64_t count);
    int (*memcmp)(void* user_data, const void* a, const void* b, uint64_t n);
    void* (*memcpy)(void* user_data, void* destination, uint64_t capacity, const void* source,
                    uint64_t count);
    void* (*memmove)(void* user_data, void* destination, uint64_t capacity, const void* source,
                     uint64_t count);
    void* (*memset)(void* user_data, void* pointer, int byte, uint64_t count);
};

// The configuration words that choose the form of boxes.
struct MbxOptions {
    // 0: 32-bit box sizes only, a larger box is MBX_ERR_BAD_STATE. 1: 32-bit unless the size needs more, then
    // `largesize`. 2: always the 16-byte header. Anything else is MBX_ERR_INVALID_ARG.
    uint32_t box_size_mode;
    // Version of boxes with 32/64-bit time fields. 0 and 2: version 0, MBX_ERR_BAD_STATE if a value needs 64
    // bits. 1: version 0 unless needed. 3: always version 1. version.h tells the exact choice of each box.
    uint32_t time_version_mode;
    // 0: `stco`, MBX_ERR_BAD_STATE if an offset needs 64 bits. 1: `stco` unless an offset needs `co64`.
    // 2: always `co64`.
    uint32_t chunk_offset_mode;
    // 0: no `mehd`. 1: width chosen by the value. 2: 32-bit, MBX_ERR_BAD_STATE if more is needed. 3: 64-bit.
    uint32_t mehd_mode;
    // 0: `tfhd` carries an explicit base data offset. 1: the base runs on from the end of the previous track
    // fragment. 2: the base is `moof`. Non-zero also forgives overflow from offset shifting in a fragment and
    // the 31-bit check on `trun` data offsets.
    uint32_t base_offset_mode;
    uint32_t trun_offset_mode;   // 0: every `trun` carries a data offset
    uint32_t trun_version_mode;  // 1: `trun` version 1; otherwise the sample composition offsets decide
    uint32_t tfdt_mode;          // 1: each track fragment gets a `tfdt`
    uint32_t reserved;           // 0
};

struct MbxSessionConfig {
    uint64_t memory_quota;  // in bytes, block headers included; 0 for none
    MbxOptions options;     // copied by the session
};

// A block of reusable memory for serialising many fixed rows.
struct MbxScratch {
    uint64_t size;
    uint8_t* data;
};

// A calendar date and time of day. The fields are read as they stand: no time zone is known here.
struct MbxDate {
    uint16_t year;
    uint16_t month;   // 1 to 12
    uint16_t day;     // 1 to 31
    uint16_t hour;    // 0 to 23
    uint16_t minute;  // 0 to 59
    uint16_t second;  // 0 to 60, for a leap second
};

// The `APRF` record: eight words, written in this order.
struct MbxAudioProfile {
    uint32_t words[8];
};

// The `VPRF` record: six words, then four pairs that are folded high half first into one word each.
struct MbxVideoProfile {
    uint32_t words[6];
    uint16_t pairs[4][2];
};

// A new track. A zeroed record with identifier, timescale, language and, for video, size and enable_mode is
// complete. Metadata and audio tracks leave what they do not name at 0.
struct MbxTrackParams {
    uint32_t noUsageEntry;         // 0: the track gets its usage item (user metadata of type 10)
    uint32_t noEditList;           // 0: `edts` is written even without an edit
    uint32_t stsdVersion;          // sound tracks only: version of `stsd` and of its audio entries
    uint32_t auxEnabled;           // the samples carry auxiliary information (`saiz`, `saio`, `senc`)
    uint32_t trickEnabled;         // the samples carry trick play bytes (`trik`)
    uint32_t fragmentDefaults[4];  // `trex`: description index, duration, size, flags; 0 for "derive it"
    uint32_t defaultsForced[4];    // per default: 0 in `tfhd` only where it differs from `trex`, 1 always
    uint32_t perSampleForced[3];   // duration, size, flags: 1 writes the field on every sample of a `trun`
    uint32_t trackId;              // 1 to 639 or 1024 to 63487
    uint16_t width;                // in pixels; video tracks only
    uint16_t widthFraction;        // in 1/65536 pixel
    uint16_t height;
    uint16_t heightFraction;
    uint32_t timescale;    // ticks per second, not 0
    uint16_t language;     // ISO 639-2/T, three times five bits
    uint32_t enable_mode;  // video tracks only: `tkhd` flags, 1, 8, 16: 7; 2, 6: 6; 0, 0xFFFFFFFF: 0
};

// A video sample entry.
struct MbxVisualEntryParams {
    uint32_t kind;                // 1 `mp4v`, 2 `avc1`, 11 `hvc1`
    uint32_t dataReferenceIndex;  // 1-based, as MbxAddDataReference returned it
    uint16_t width;               // in pixels
    uint16_t height;
    uint16_t horizontalResolution;  // in pixels per inch
    uint16_t horizontalResolutionFraction;
    uint16_t verticalResolution;
    uint16_t verticalResolutionFraction;
};

// A sound sample entry, `mp4a`. The sample rate is the track's timescale.
struct MbxAudioEntryParams {
    uint32_t dataReferenceIndex;
    uint16_t channelCount;
    uint16_t sampleSize;  // in bits
};

// A timecode sample entry, `tmcd`.
struct MbxTimecodeEntryParams {
    uint32_t dataReferenceIndex;
    uint32_t flags;          // 1: drop frame
    uint32_t timescale;      // ticks per second
    uint32_t frameDuration;  // in ticks
    uint8_t frameCount;      // frames per second, rounded
    uint8_t reserved[3];
};

// A timed metadata sample entry, `rtmd`.
struct MbxMetaEntryParams {
    uint32_t dataReferenceIndex;
};

// The fixed values of `avcC` (ISO/IEC 14496-15 5.2.4.1).
struct MbxAvcConfigParams {
    uint8_t configurationVersion;
    uint8_t AVCProfileIndication;
    uint8_t profile_compatibility;
    uint8_t AVCLevelIndication;
    uint8_t lengthSizeMinusOne;       // 0 to 3
    uint32_t hasExtension;            // not 0: the three fields below are written
    uint8_t chroma_format;            // 0 to 3
    uint8_t bit_depth_luma_minus8;    // 0 to 7
    uint8_t bit_depth_chroma_minus8;  // 0 to 7
};

// The fixed values of `hvcC` (ISO/IEC 14496-15 8.3.3.1).
struct MbxHvcCValues {
    uint8_t configurationVersion;
    uint8_t general_profile_space;
    uint8_t general_tier_flag;
    uint8_t general_profile_idc;
    uint32_t general_profile_compatibility_flags;
    uint64_t general_constraint_indicator_flags;  // low 48 bits
    uint8_t general_level_idc;
    uint16_t min_spatial_segmentation_idc;
    uint8_t parallelismType;
    uint8_t chromaFormat;
    uint8_t bitDepthLumaMinus8;
    uint8_t bitDepthChromaMinus8;
    uint16_t avgFrameRate;  // in frames per 256 seconds
    uint8_t constantFrameRate;
    uint8_t numTemporalLayers;
    uint8_t temporalIdNested;
    uint8_t lengthSizeMinusOne;
};

// The elementary stream descriptor of an entry, as fields or as ready bytes.
struct MbxEsdsParams {
    uint32_t form;  // 0: the fields, 1: the bytes of `raw`
    uint8_t objectTypeIndication;
    uint8_t streamType;     // below 64
    uint8_t upStream;       // below 2
    uint32_t bufferSizeDB;  // below 2^24
    uint32_t maxBitrate;    // in bits per second
    uint32_t avgBitrate;    // in bits per second
    const uint8_t* decoderSpecificInfo;
    uint64_t decoderSpecificInfoSize;
    const uint8_t* raw;
    uint64_t rawSize;
};

// One item of user metadata. An item of the same type, language and encoding is replaced.
struct MbxMetadataItemParams {
    uint32_t type;
    uint8_t flag;       // below 2
    uint16_t language;  // below 32768
    uint16_t encoding;
    const uint8_t* data;
    uint64_t dataSize;  // at most 65525
};

struct MbxTrackReferenceParams {
    uint32_t type;     // four-character code, such as `cdsc`
    uint32_t trackId;  // the track referred to; 63488 to 65535 names a metadata track of the movie
};

// One sample as MbxAddSample takes it. Sample bytes never pass through the library.
struct MbxSampleInfo {
    uint32_t size;       // in bytes
    uint64_t offset;     // position in the file, or in whatever MbxShiftChunkOffsets makes absolute later
    uint32_t duration;   // in ticks of the track's timescale
    uint32_t isSync;     // not 0: a sync sample
    uint8_t dependency;  // the byte of `sdtp`
    int32_t compositionOffset;  // in ticks
    uint32_t descriptionIndex;  // 1-based sample entry
    uint64_t auxOffset;  // position of the sample's auxiliary information; read at the first of a chunk
    uint8_t auxSize;
    const uint8_t* auxData;
    uint8_t pictureType;      // two bits
    uint8_t dependencyLevel;  // six bits
};

// Bits of MbxSetMovieTimes' selector. UINT32_MAX selects all.
enum MbxTimeSelector : uint32_t {
    MBX_TIME_MOVIE_CREATION = 1,
    MBX_TIME_MOVIE_MODIFICATION = 2,
    MBX_TIME_TRACK_CREATION = 4,
    MBX_TIME_TRACK_MODIFICATION = 8,
    MBX_TIME_MEDIA_CREATION = 16,
    MBX_TIME_MEDIA_MODIFICATION = 32,
    MBX_TIME_METADATA_CREATION = 64,
    MBX_TIME_METADATA_MODIFICATION = 128,
};
