// Types of the box library's public interface: status, callbacks, configuration and parameter records.
//
// A caller fills parameter records, and a call copies what it keeps, pointed-to bytes included.
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
// The host's handle of one open file. Opaque (see mbx_stdio.h); null where a call only measures.
struct MbxFile;

// Contract: callbacks-without-caller. `read`, `tell`, `size`, `strncmp`, `strncpy`, `memcmp`, `memmove`.
// The host's half of the library: every file operation, allocation and memory primitive goes through this
// table. Every entry but `user_data` must be set. The I/O entries return MBX_OK or a status.
struct MbxCallbacks {
    void* user_data;  // passed first to `alloc`, `free` and to the string and memory entries
    MbxStatus (*read)(MbxFile* file, void* buffer, uint64_t size, uint64_t* count);
    MbxStatus (*write)(MbxFile* file, const void* buffer, uint64_t size, uint64_t* count);
    MbxStatus (*seek)(MbxFile* file, int64_t offset, uint32_t origin);  // MbxSeekOrigin
    MbxStatus (*tell)(MbxFile* file, uint64_t* position);
    MbxStatus (*size)(MbxFile* file, uint64_t* length);
    void* (*alloc)(void* user_data, uint64_t size);  // at least 8-byte aligned memory, or null
    void (*free)(void* user_data, void* pointer);
    int (*strncmp)(void* user_data, const char* a, const char* b, uint64_t n);
    // The copying entries return the destination, or null for a null pointer or a `capacity` below `count`.
    char* (*strncpy)(void* user_data, char* destination, uint64_t capacity, const char* source,
                     uint64_t count);
    int (*memcmp)(void* user_data, const void* a, const void* b, uint64_t n);
    void* (*memcpy)(void* user_data, void* destination, uint64_t capacity, const void* source,
                    uint64_t count);
    void* (*memmove)(void* user_data, void* destination, uint64_t capacity, const void* source,
                     uint64_t count);
    void* (*memset)(void* user_data, void* pointer, int byte, uint64_t count);
};

// A four-character code of a box, brand or handler, as the number that boxes carry.
consteval uint32_t MbxCode(const char (&code)[5]) {
    uint32_t value = 0;
    for (int i = 0; i < 4; i++) value = value << 8 | static_cast<uint8_t>(code[i]);
    return value;
}

// Codes that callers of the library name.
constexpr uint32_t MBX_BOX_MDAT = MbxCode("mdat");
constexpr uint32_t MBX_CODE_AVC1 = MbxCode("avc1");       // H.264 with its parameter sets in the sample entry
constexpr uint32_t MBX_CODE_MP4A = MbxCode("mp4a");       // MPEG-4 audio
constexpr uint32_t MBX_REFERENCE_CDSC = MbxCode("cdsc");  // the track describes the one referred to

// Handlers of tracks (ISO/IEC 14496-12 8.4.3).
constexpr uint32_t MBX_HANDLER_VIDEO = MbxCode("vide");
constexpr uint32_t MBX_HANDLER_SOUND = MbxCode("soun");
constexpr uint32_t MBX_HANDLER_TIMECODE = MbxCode("tmcd");
constexpr uint32_t MBX_HANDLER_META = MbxCode("meta");
constexpr uint32_t MBX_HANDLER_SUBTITLE = MbxCode("subt");
constexpr uint32_t MBX_HANDLER_OBJECT_DESCRIPTOR = MbxCode("odsm");
constexpr uint32_t MBX_HANDLER_BOOK = MbxCode("BKDT");
constexpr uint32_t MBX_HANDLER_PACKED_DATA = MbxCode("PKDT");
constexpr uint32_t MBX_HANDLER_GRAPHICS = MbxCode("GRAP");

// Languages (ISO 639-2/T), three letters of five bits each.
constexpr uint16_t MBX_LANGUAGE_ENGLISH = 0x15C7;
constexpr uint16_t MBX_LANGUAGE_UNDETERMINED = 0x55C4;

// Where a seek counts from.
enum MbxSeekOrigin : uint32_t {
    MBX_SEEK_START = 0,
    MBX_SEEK_POSITION = 1,
    MBX_SEEK_END = 2,
};

// box_size_mode: the width of box sizes. Anything else is MBX_ERR_INVALID_ARG.
enum MbxBoxSizeMode : uint32_t {
    MBX_SIZES_32 = 0,        // a larger box is MBX_ERR_BAD_STATE
    MBX_SIZES_BY_VALUE = 1,  // 32 bits unless the size needs more, then `largesize`
    MBX_SIZES_64 = 2,        // always the header of 16 bytes
};

// time_version_mode: the version of boxes with times of 32 or 64 bits. version.h tells the exact choice of
// each box.
enum MbxTimeVersionMode : uint32_t {
    MBX_TIMES_32 = 0,        // version 0, MBX_ERR_BAD_STATE if a value needs 64 bits; `tfra` has version 1
    MBX_TIMES_BY_VALUE = 1,  // version 0 unless a value needs more
    MBX_TIMES_32_WITH_TFRA = 2,  // version 0 as above, `tfra` included
    MBX_TIMES_64 = 3,            // always version 1
};

// chunk_offset_mode: the box of chunk offsets.
enum MbxChunkOffsetMode : uint32_t {
    MBX_OFFSETS_32 = 0,        // `stco`, MBX_ERR_BAD_STATE if an offset needs 64 bits
    MBX_OFFSETS_BY_VALUE = 1,  // `stco` unless an offset needs `co64`
    MBX_OFFSETS_64 = 2,        // always `co64`
};

// mehd_mode: the length of a fragmented movie.
enum MbxMehdMode : uint32_t {
    MBX_MEHD_NONE = 0,
    MBX_MEHD_BY_VALUE = 1,
    MBX_MEHD_32 = 2,  // MBX_ERR_BAD_STATE if more is needed
    MBX_MEHD_64 = 3,
};

// base_offset_mode: where the data offsets of a track fragment count from. Anything else is
// MBX_ERR_INVALID_ARG. All but the first also forgive overflow when offsets of a fragment are shifted, and
// the 31-bit check on the data offsets of `trun`.
enum MbxBaseOffsetMode : uint32_t {
    MBX_BASE_EXPLICIT = 0,  // `tfhd` carries a base data offset
    MBX_BASE_RUNS_ON = 1,   // the end of the previous track fragment
    MBX_BASE_MOOF = 2,      // the start of `moof`
};

// trun_offset_mode: any value but 0 leaves data offsets out where the data runs on.
enum MbxTrunOffsetMode : uint32_t {
    MBX_TRUN_OFFSET_ALWAYS = 0,
    MBX_TRUN_OFFSET_AS_NEEDED = 1,
};

// trun_version_mode: any value but 1 leaves the choice to the sample composition offsets.
enum MbxTrunVersionMode : uint32_t {
    MBX_TRUN_VERSION_BY_VALUE = 0,
    MBX_TRUN_VERSION_1 = 1,
};

// tfdt_mode: whether each track fragment tells its decode time. Any value but 1 is no.
enum MbxTfdtMode : uint32_t {
    MBX_TFDT_NONE = 0,
    MBX_TFDT_ALWAYS = 1,
};

// The configuration words that choose the form of boxes.
struct MbxOptions {
    uint32_t box_size_mode;      // MbxBoxSizeMode
    uint32_t time_version_mode;  // MbxTimeVersionMode
    uint32_t chunk_offset_mode;  // MbxChunkOffsetMode
    uint32_t mehd_mode;          // MbxMehdMode
    uint32_t base_offset_mode;   // MbxBaseOffsetMode
    uint32_t trun_offset_mode;   // MbxTrunOffsetMode
    uint32_t trun_version_mode;  // MbxTrunVersionMode
    uint32_t tfdt_mode;          // MbxTfdtMode
    uint32_t reserved;           // 0
};

// What the row of a sample in the fragment index (`tfra`) tells. Any other number counts as 1.
enum MbxIndexRow : uint32_t {
    MBX_NO_INDEX_ROW = 0,
    MBX_INDEX_ROW_OF_DECODING = 1,
    MBX_INDEX_ROW_OF_PRESENTATION = 2,  // as ISO/IEC 14496-12 8.8.10.3 has it
};

// Forms of MbxWriteWideMdatHeader. The numbers are not those of MbxBoxSizeMode.
enum MbxMdatHeaderForm : uint32_t {
    MBX_MDAT_HEADER_32 = 0,
    MBX_MDAT_HEADER_64 = 1,  // always 16 bytes, so that it can be patched in place whatever the size
    MBX_MDAT_HEADER_BY_VALUE = 2,
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

// enable_mode of a track. 8 and 16 are as MBX_ENABLE_ALL, 6 as MBX_ENABLE_HIDDEN, 0xFFFFFFFF as
// MBX_ENABLE_NONE.
enum MbxEnableMode : uint32_t {
    MBX_ENABLE_NONE = 0,    // `tkhd` flags 0
    MBX_ENABLE_ALL = 1,     // flags 7: enabled, in the movie, in its preview
    MBX_ENABLE_HIDDEN = 2,  // flags 6: the same, not enabled
};

// The default values of a fragment's samples: places in fragmentDefaults and defaultsForced.
enum MbxSampleDefault : uint32_t {
    MBX_DEFAULT_DESCRIPTION = 0,
    MBX_DEFAULT_DURATION = 1,
    MBX_DEFAULT_SIZE = 2,
    MBX_DEFAULT_FLAGS = 3,
};

// A new track. A zeroed record with identifier, timescale, language and, for video, size and enable_mode is
// complete. Metadata and audio tracks leave what they do not name at 0.
struct MbxTrackParams {
    uint32_t noUsageEntry;         // 0: the track gets its usage item (user metadata of type 10)
    uint32_t noEditList;           // 0: `edts` is written even without an edit
    uint32_t stsdVersion;          // sound tracks only: version of `stsd` and of its audio entries
    uint32_t auxEnabled;           // the samples carry auxiliary information (`saiz`, `saio`, `senc`)
    uint32_t trickEnabled;         // the samples carry trick play bytes (`trik`)
    uint32_t fragmentDefaults[4];  // `trex`, by MbxSampleDefault; 0 for "derive it"
    uint32_t defaultsForced[4];    // per default: 0 in `tfhd` only where it differs from `trex`, 1 always
    uint32_t perSampleForced[3];   // duration, size, flags: 1 writes the field on every sample of a `trun`
    uint32_t trackId;              // 1 to 639 or 1024 to 63487
    uint16_t width;                // in pixels; video tracks only
    uint16_t widthFraction;        // in 1/65536 pixel
    uint16_t height;
    uint16_t heightFraction;
    uint32_t timescale;    // ticks per second, not 0
    uint16_t language;     // as MBX_LANGUAGE_ENGLISH
    uint32_t enable_mode;  // MbxEnableMode; video tracks only
};

// The kinds of sample entry.
enum MbxEntryKind : uint32_t {
    MBX_ENTRY_MP4V = 1,
    MBX_ENTRY_AVC1 = 2,
    MBX_ENTRY_MP4A = 3,
    MBX_ENTRY_SYSTEMS = 4,  // code given: a bare entry with an optional `esds`
    MBX_ENTRY_PLAIN = 5,    // code given: head and four zero bytes
    MBX_ENTRY_RTMD = 6,
    MBX_ENTRY_PLAIN2 = 7,       // code given: as kind 5
    MBX_ENTRY_GRAPHICS = 8,     // code given: a 32-byte body
    MBX_ENTRY_GRAPHICS_3D = 9,  // code given: as kind 8, with a `3STP`
    MBX_ENTRY_TEXT = 10,        // code given: three texts
    MBX_ENTRY_HVC1 = 11,
    MBX_ENTRY_TMCD = 12,
};

// A video sample entry.
struct MbxVisualEntryParams {
    uint32_t kind;                // MBX_ENTRY_MP4V, MBX_ENTRY_AVC1 or MBX_ENTRY_HVC1
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

// Bits of MbxTimecodeEntryParams::flags.
constexpr uint32_t MBX_TIMECODE_DROP_FRAME = 1;

// A timecode sample entry, `tmcd`.
struct MbxTimecodeEntryParams {
    uint32_t dataReferenceIndex;
    uint32_t flags;          // MBX_TIMECODE_DROP_FRAME
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

// What MbxEsdsParams::form says about which part of the parameters counts.
enum MbxEsdsForm : uint32_t {
    MBX_ESDS_FIELDS = 0,
    MBX_ESDS_RAW = 1,
};

// The elementary stream descriptor of an entry, as fields or as ready bytes.
struct MbxEsdsParams {
    uint32_t form;  // MbxEsdsForm
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

// Type of the item that says how a track is used; of its data the first four bytes are `enable_mode`.
constexpr uint32_t MBX_USAGE_TYPE = 10;

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
    uint32_t type;     // four-character code, such as MBX_REFERENCE_CDSC
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

// Bits of MbxSetMovieTimes' selector.
enum MbxTimeSelector : uint32_t {
    MBX_TIME_MOVIE_CREATION = 1,
    MBX_TIME_MOVIE_MODIFICATION = 2,
    MBX_TIME_TRACK_CREATION = 4,
    MBX_TIME_TRACK_MODIFICATION = 8,
    MBX_TIME_MEDIA_CREATION = 16,
    MBX_TIME_MEDIA_MODIFICATION = 32,
    MBX_TIME_METADATA_CREATION = 64,
    MBX_TIME_METADATA_MODIFICATION = 128,
    MBX_TIME_ALL = UINT32_MAX,
};
