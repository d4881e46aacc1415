// The tree of a file as the session keeps it: what callers entered, before any box is made from it.
//
// All of it is owned by the session and released with it. Lists are in order of addition, which is the order
// of the file. Pointers to parameters are null for "none".
#pragma once

#include "boxlib/core/buffer.h"
#include "boxlib/core/list.h"
#include "boxlib/model/entry_model.h"
#include "boxlib/model/sample_model.h"

struct MbxAinfParams;
struct MbxIodsParams;
struct MbxMetaParams;
struct MbxLevel;
struct MbxPsshParams;

// ---- File type and profile ----

struct MbxBrand {
    uint32_t brand;
    MbxBrand* next;
};

struct MbxFileType {
    uint32_t majorBrand;
    uint32_t minorVersion;
    MbxList<MbxBrand> compatibleBrands;
};

struct MbxProfileEntry {
    uint32_t code;        // `APRF`, `VPRF`, `BPRF` or `PPRF`
    uint32_t values[10];  // of which the code uses 8, 10, 3, 3
    MbxProfileEntry* next;
};

struct MbxProfileExtra {
    uint32_t subType;
    uint32_t values[2];  // written for `VPRF` and `APRF`
    MbxBuffer data;
    MbxProfileExtra* next;
};

struct MbxProfile {
    uint32_t format;  // the `FPRF` value
    MbxList<MbxProfileEntry> entries;
    MbxList<MbxProfileExtra> extras;
};

// ---- User metadata ----

struct MbxMetadataItem {
    uint32_t type;
    uint8_t flag;
    uint16_t language;
    uint16_t encoding;
    MbxBuffer data;
    MbxMetadataItem* next;
};

struct MbxDataEntry {
    uint32_t code;  // `url ` or `urn `
    MbxBuffer name;
    MbxBuffer location;  // empty: the media is in this file
    MbxDataEntry* next;
};

struct MbxMetadataTrackHeader {
    uint32_t version;
    uint64_t creationTime;  // in seconds since 1904
    uint64_t modificationTime;
    uint32_t trackId;  // 63488 to 65535
};

struct MbxMetadataTrackEntry {
    uint32_t values[3];
    MbxMetadataTrackEntry* next;
};

// A metadata track of `USMT`, which carries no samples.
struct MbxMetadataTrack {
    MbxMetadataTrackHeader header;
    MbxList<MbxDataEntry> dataEntries;
    MbxSampleEntryList sampleEntries;
    MbxList<MbxMetadataTrackEntry> entries;
    MbxMetadataTrack* next;
};

struct MbxUserMetadata {
    MbxList<MbxMetadataItem> items;      // `MTDT`
    MbxList<MbxMetadataItem> fileItems;  // `MTDF`
    MbxList<MbxMetadataTrack> tracks;    // `MTSM`
};

// ---- Track ----

// Bits of MbxTrackHeader::fieldsSet: what the caller gave. The builders compute a field whose bit is clear.
enum MbxTrackHeaderField : uint32_t {
    MBX_TRACK_FLAGS = 1,
    MBX_TRACK_CREATION = 2,
    MBX_TRACK_MODIFICATION = 4,
    MBX_TRACK_ID = 8,
    MBX_TRACK_DURATION = 16,
    MBX_TRACK_LAYER = 32,
    MBX_TRACK_ALTERNATE_GROUP = 64,
    MBX_TRACK_VOLUME = 128,
    MBX_TRACK_VOLUME_FRACTION = 256,
    MBX_TRACK_MATRIX = 512,
    MBX_TRACK_WIDTH = 1024,
    MBX_TRACK_WIDTH_FRACTION = 2048,
    MBX_TRACK_HEIGHT = 4096,
    MBX_TRACK_HEIGHT_FRACTION = 8192,
};

struct MbxTrackHeader {
    uint32_t fieldsSet;     // MbxTrackHeaderField bits
    uint32_t flags;         // low 24 bits
    uint64_t creationTime;  // in seconds since 1904
    uint64_t modificationTime;
    uint32_t trackId;
    uint64_t duration;  // in ticks of the movie
    int16_t layer;
    int16_t alternateGroup;
    uint16_t volume;  // 8.8
    uint32_t matrix[9];
    uint32_t width;   // 16.16
    uint32_t height;  // 16.16
};

struct MbxReferenceTarget {
    uint32_t trackId;
    MbxReferenceTarget* next;
};

// All references of one type, in order of their first use.
struct MbxReferenceGroup {
    uint32_t type;
    MbxList<MbxReferenceTarget> targets;
    MbxReferenceGroup* next;
};

struct MbxEdit {
    uint64_t segmentDuration;  // in ticks of the movie
    int64_t mediaTime;         // in ticks of the movie, as this system writes it
    int16_t rateInteger;
    int16_t rateFraction;
    MbxEdit* next;
};

struct MbxEditList {
    MbxList<MbxEdit> edits;
};

// Bits of MbxMediaHeader::fieldsSet.
enum MbxMediaHeaderField : uint32_t {
    MBX_MEDIA_CREATION = 1,
    MBX_MEDIA_MODIFICATION = 2,
    MBX_MEDIA_TIMESCALE = 4,
    MBX_MEDIA_DURATION = 8,
    MBX_MEDIA_LANGUAGE = 16,
};

struct MbxMediaHeader {
    uint32_t fieldsSet;  // MbxMediaHeaderField bits
    uint64_t creationTime;
    uint64_t modificationTime;
    uint32_t timescale;  // ticks per second
    uint64_t duration;   // in ticks
    uint16_t language;   // 15 bits
};

struct MbxHandler {
    uint32_t type;
    MbxBuffer name;  // terminator included
};

struct MbxMediaInformation {
    uint32_t code;  // `vmhd`, `smhd`, `sthd` or `nmhd`
    uint16_t graphicsMode;
    uint16_t opcolor[3];
    int16_t balance;  // 8.8
};

struct MbxSampleDefaults {
    uint32_t descriptionIndex;
    uint32_t duration;
    uint32_t size;
    uint32_t flags;
};

struct MbxTrack {
    MbxTrackHeader header;
    MbxList<MbxReferenceGroup> references;
    MbxEditList* editList;  // owned; null: no `edts`
    MbxMediaHeader mediaHeader;
    MbxHandler handler;
    MbxMediaInformation mediaInformation;
    MbxList<MbxDataEntry> dataEntries;
    MbxSampleEntryList sampleEntries;
    MbxList<MbxSampleSegment> segments;  // the first is what `moov` reports
    MbxSampleSegment* sealedSegment;     // the one before the last; null with fewer than two
    uint32_t segmentCount;               // records in `segments`
    uint64_t baseDecodeTime;             // decode time of the first segment
    uint32_t auxEnabled;
    uint32_t trickEnabled;
    MbxSampleDefaults defaults;  // of `trex`
    uint32_t defaultsDone;       // not 0: derived from samples, or nothing left to derive
    uint32_t defaultsMask;       // 1 << MbxSampleDefault: given by the caller, never derived
    uint32_t defaultsForced[4];
    uint32_t perSampleForced[3];  // duration, size, flags
    MbxBlockList fragmentIndex;   // of MbxFragmentIndexEntry
    MbxUserMetadata userMetadata;
    MbxTrack* next;
};

// ---- Movie ----

// Bits of MbxMovieHeader::fieldsSet.
enum MbxMovieHeaderField : uint32_t {
    MBX_MOVIE_CREATION = 1,
    MBX_MOVIE_MODIFICATION = 2,
    MBX_MOVIE_TIMESCALE = 4,
    MBX_MOVIE_DURATION = 8,
    MBX_MOVIE_RATE = 16,
    MBX_MOVIE_RATE_FRACTION = 32,
    MBX_MOVIE_VOLUME = 64,
    MBX_MOVIE_VOLUME_FRACTION = 128,
    MBX_MOVIE_MATRIX = 256,
    MBX_MOVIE_NEXT_TRACK_ID = 512,
};

struct MbxMovieHeader {
    uint32_t fieldsSet;  // MbxMovieHeaderField bits
    uint64_t creationTime;
    uint64_t modificationTime;
    uint32_t timescale;
    uint64_t duration;
    uint32_t rate;    // 16.16
    uint16_t volume;  // 8.8
    uint32_t matrix[9];
    uint32_t nextTrackId;
};
static_assert(sizeof(MbxMovieHeader) == 88);

struct MbxMovie {
    MbxMovieHeader header;
    MbxAinfParams* ainf;
    MbxMetaParams* meta;
    MbxList<MbxTrack> tracks;
    MbxIodsParams* iods;
    MbxUserMetadata userMetadata;
    MbxList<MbxPsshParams> pssh;
    MbxList<MbxLevel> levels;  // `leva`; empty: none
    uint32_t freeBytes;        // reserved behind everything else of `moov`
    uint32_t fragmentCount;    // 0: not fragmented; otherwise the number of the open fragment
};
