// The box library's public interface: models an ISO base media file in memory and measures and writes its
// boxes.
//
// Use: MbxCreateContext, MbxSessionCreate, then `ftyp`, `PROF`, the movie, its tracks, their entries, and
// samples; the writing calls in between and at the end; MbxSessionDestroy, MbxDestroyContext.
//
// Names: everything here begins with Mbx, macros and constants with MBX_, since the library has no namespace.
// The verb comes first and what it works on is the first argument: a session here, a context inside. Where an
// inner function does to a record what an operation does to a session, the record stands in the name
// (MbxSealFragment, MbxMovieSealFragment); MbxAddSample, MbxEndChunk, MbxAddTrackReference and
// MbxSetMovieTimes alone have an inner form of the same name, which takes the context first. Fields that a
// standard names are written as there (`AVCProfileIndication`). All else in this repository is classes and
// std; this folder is plain functions on plain records, files named in lower case, because whoever uses it
// brings the memory and the files: nothing here may allocate, throw or open by itself.
//
// Common to all operations:
// - The result is a status; values come back through pointers, which are left alone on failure.
// - A null session or result pointer is MBX_ERR_INVALID_ARG. A call that needs a movie gives
//   MBX_ERR_BAD_STATE when there is none. Track numbers are 1-based places in the movie's track list, not
//   track identifiers; zero where one is required is MBX_ERR_INVALID_ARG, one beyond the list
//   MBX_ERR_NOT_FOUND.
// - MBX_ERR_NO_MEMORY comes from any call that stores something. A call that failed leaves in place what it
//   had built up to then; the session can still be used and must still be destroyed.
// - Writing calls seek to the position given and never remember one. With a null file they measure: the
//   size comes back, and nothing is touched. MBX_ERR_IO when a callback fails or moves fewer bytes than
//   asked.
// - A context and its sessions belong to one thread at a time. There is no global state and no lock.
#pragma once

#include "boxlib/mbx_types.h"

// ---- Context and allocator ----

// Makes a context with a copy of the callbacks. MBX_ERR_INVALID_ARG for a null argument or an entry that is
// not set, MBX_ERR_NO_MEMORY when `alloc` refuses. The context must outlive its sessions.
MbxStatus MbxCreateContext(const MbxCallbacks* callbacks, MbxContext** context);

// Releases the context itself; null is allowed.
MbxStatus MbxDestroyContext(MbxContext* context);

// Limits the memory of the context to `quota` bytes, block headers included: `percent` of it for class 2, the
// rest for class 1. A quota of 0 means none. MBX_ERR_INVALID_ARG for a null context, a `class_` other than 0,
// a percent above 100, or when class 1 gets less than `minimum`. Counting starts at 0.
MbxStatus MbxSetQuota(MbxContext* context, uint32_t class_, uint64_t quota, uint32_t percent,
                      uint64_t minimum);

// A zeroed block of `size` bytes, or null: for a null context, a class other than 1 and 2, a size that does
// not fit 32 bits with its header of 8 bytes, or when quota or host refuse.
void* MbxAlloc(MbxContext* context, uint32_t class_, uint64_t size);

// Releases a block of MbxAlloc. A null context or pointer, or a block whose header is damaged, is left alone.
void MbxFree(MbxContext* context, void* pointer);

// Allocates `size` bytes for the scratch. MBX_ERR_INVALID_ARG for a null argument, MBX_ERR_NO_MEMORY.
MbxStatus MbxScratchInit(MbxContext* context, uint32_t class_, uint64_t size, MbxScratch* scratch);

// Releases the scratch's memory and clears the pointer. Null arguments are allowed; safe to call twice.
void MbxScratchRelease(MbxContext* context, MbxScratch* scratch);

// ---- Numbers and time ----

// Seconds from 1 January 1904, the epoch of ISO/IEC 14496-12. MBX_ERR_INVALID_ARG for a null argument, a year
// before 1904, or a field outside its range (second 60 is allowed; 29 February in leap years only).
MbxStatus MbxToMp4Time(MbxContext* context, const MbxDate* date, uint64_t* seconds);

// value * multiplier / divisor through a 128-bit product, truncated. MBX_ERR_INVALID_ARG for a divisor of 0
// or a null result, MBX_ERR_OVERFLOW for a quotient above 64 bits.
MbxStatus MbxRescale(uint64_t value, uint64_t divisor, uint64_t multiplier, uint64_t* result);

// ---- Session ----

// Makes the session of one output file: sets the context's quota, allocates the session and its scratch, and
// copies the configuration. MBX_ERR_INVALID_ARG for a null argument or a quota that cannot hold the session.
MbxStatus MbxSessionCreate(MbxContext* context, const MbxSessionConfig* config, MbxSession** session);

// Releases the whole tree and the session; null is allowed and gives MBX_OK.
MbxStatus MbxSessionDestroy(MbxSession* session);

// ---- File type and profile ----

// Makes the file type record, or overwrites the two words of the existing one.
MbxStatus MbxCreateFileType(MbxSession* session, uint32_t majorBrand, uint32_t minorVersion);

// Appends a compatible brand. MBX_ERR_BAD_STATE without a file type record.
MbxStatus MbxAddCompatibleBrand(MbxSession* session, uint32_t brand);

// Measures, and with a file writes, `ftyp`. MBX_ERR_BAD_STATE without a file type record.
MbxStatus MbxWriteFileType(MbxSession* session, MbxFile* file, uint64_t position, uint64_t* size);

// Makes the profile with its `FPRF` word, or overwrites the word of the existing one.
MbxStatus MbxCreateProfile(MbxSession* session, uint32_t format);

// Appends an `APRF` record. MBX_ERR_BAD_STATE without a profile.
MbxStatus MbxAddAudioProfile(MbxSession* session, const MbxAudioProfile* profile);

// Appends a `VPRF` record. MBX_ERR_BAD_STATE without a profile.
MbxStatus MbxAddVideoProfile(MbxSession* session, const MbxVideoProfile* profile);

// Measures, and with a file writes, the `uuid` box that carries the profile; an empty one without a profile.
MbxStatus MbxWriteProfile(MbxSession* session, MbxFile* file, uint64_t position, uint64_t* size);

// ---- Movie and tracks ----

// Makes the movie. MBX_ERR_INVALID_ARG for a timescale of 0, MBX_ERR_BAD_STATE when there is one already,
// which is left untouched.
MbxStatus MbxCreateMovie(MbxSession* session, uint32_t timescale);

// Append a track with handler `vide`, `soun`, `tmcd` or `meta`; `track` receives its number.
// MBX_ERR_INVALID_ARG for a timescale of 0, a language of 32768 or more, an identifier outside 1 to 639 and
// 1024 to 63487 or in use, or an unknown `enable_mode` (read for video only). MBX_ERR_BAD_STATE after
// MbxSealFirstFragment: fragments count alike in all tracks.
MbxStatus MbxAddVideoTrack(MbxSession* session, const MbxTrackParams* params, uint32_t* track);
MbxStatus MbxAddSoundTrack(MbxSession* session, const MbxTrackParams* params, uint32_t* track);
MbxStatus MbxAddTimecodeTrack(MbxSession* session, const MbxTrackParams* params, uint32_t* track);
MbxStatus MbxAddMetaTrack(MbxSession* session, const MbxTrackParams* params, uint32_t* track);

// An identifier for the next track: one more than the highest in use, which passes over 640 to 1023, or
// beyond 63486 the lowest free one. MBX_ERR_NOT_FOUND when all are taken.
MbxStatus MbxGetNextTrackId(MbxSession* session, uint32_t* trackId);

// Appends a `url ` entry to the track's `dref`; an empty location means "in this file". `index` receives its
// 1-based place. MBX_ERR_INVALID_ARG for a location with a length but no text.
MbxStatus MbxAddDataReference(MbxSession* session, uint32_t track, const char* location, uint64_t length,
                              uint32_t* index);

// Append a sample entry; `index` receives its 1-based place. MBX_ERR_INVALID_ARG for a kind of video entry
// other than those of MbxVisualEntryParams, or a data reference index outside 1 to 65535 or that the track
// does not have; MBX_ERR_BAD_STATE when the track's handler is not `vide`, `soun`, `tmcd` or `meta`
// respectively.
MbxStatus MbxAddVideoEntry(MbxSession* session, uint32_t track, const MbxVisualEntryParams* params,
                           uint32_t* index);
MbxStatus MbxAddSoundEntry(MbxSession* session, uint32_t track, const MbxAudioEntryParams* params,
                           uint32_t* index);
MbxStatus MbxAddTimecodeEntry(MbxSession* session, uint32_t track, const MbxTimecodeEntryParams* params,
                              uint32_t* index);
MbxStatus MbxAddMetaEntry(MbxSession* session, uint32_t track, const MbxMetaEntryParams* params,
                          uint32_t* index);

// Sets or overwrites the fixed values of the `avcC` of an `avc1` entry. MBX_ERR_BAD_STATE for an entry of
// another kind, MBX_ERR_INVALID_ARG for a value out of its range.
MbxStatus MbxSetAvcConfig(MbxSession* session, uint32_t track, uint32_t entry,
                          const MbxAvcConfigParams* params);

// Append a copy of one NAL unit, header byte included and start code not, to the entry's sequence or picture
// parameter sets. MBX_ERR_BAD_STATE for an entry of another kind, or before MbxSetAvcConfig. Counts and
// lengths are checked when the box is built.
MbxStatus MbxAddAvcSps(MbxSession* session, uint32_t track, uint32_t entry, const uint8_t* data,
                       uint64_t size);
MbxStatus MbxAddAvcPps(MbxSession* session, uint32_t track, uint32_t entry, const uint8_t* data,
                       uint64_t size);

// Sets or overwrites the fixed values of the `hvcC` of an `hvc1` entry; its arrays stay. MBX_ERR_BAD_STATE
// for an entry of another kind, MBX_ERR_INVALID_ARG for a value wider than its field.
MbxStatus MbxSetHvcConfig(MbxSession* session, uint32_t track, uint32_t entry, const MbxHvcCValues* params);

// Appends a copy of one NAL unit to the `hvcC` array of its type (below 64), which is made when needed;
// `completeness` (below 2) is that of the array and overwrites. MBX_ERR_BAD_STATE for an entry of another
// kind, or before MbxSetHvcConfig.
MbxStatus MbxAddHvcNalUnit(MbxSession* session, uint32_t track, uint32_t entry, uint8_t nalType,
                           uint8_t completeness, const uint8_t* data, uint64_t size);

// Sets or replaces the elementary stream descriptor of an MP4V, MP4A or SYSTEMS entry. MBX_ERR_BAD_STATE for
// another kind, or for an MP4A entry that describes another codec; MBX_ERR_INVALID_ARG for a value out of its
// range, MBX_ERR_INTERNAL for an unknown form.
MbxStatus MbxSetEsds(MbxSession* session, uint32_t track, uint32_t entry, const MbxEsdsParams* params);

// Puts an item of user metadata on a track, or with track 0 on the movie. MBX_ERR_INVALID_ARG for a value out
// of its range.
MbxStatus MbxAddTrackMetadata(MbxSession* session, uint32_t track, const MbxMetadataItemParams* item);

// Refers from a track to another by identifier; `index` receives the target's 1-based place among the track's
// references of that type. MBX_ERR_INVALID_ARG for the track itself or a target that does not exist.
MbxStatus MbxAddTrackReference(MbxSession* session, uint32_t track, const MbxTrackReferenceParams* params,
                               uint32_t* index);

// Appends an edit that spans the media of the track's first sample segment, at rate 1. With `fromZero` it
// starts at media time 0, otherwise at the earliest presentation time. MBX_ERR_BAD_STATE for values above 32
// bits in time_version_mode 0 and 2.
MbxStatus MbxAddEdit(MbxSession* session, uint32_t track, uint32_t fromZero);

// Overwrites how long the track's last edit lasts, in ticks of the movie. MBX_ERR_BAD_STATE for a track
// without edits, and as above.
MbxStatus MbxSetEditDuration(MbxSession* session, uint32_t track, uint64_t duration);

// Sets the times that `selector` (MbxTimeSelector) names, in seconds since 1904: with track 0 on the movie,
// every track and every metadata track, otherwise on that track's headers alone. MBX_ERR_BAD_STATE for a time
// above 32 bits in time_version_mode 0 and 2.
MbxStatus MbxSetMovieTimes(MbxSession* session, uint32_t track, uint32_t selector, uint64_t creation,
                           uint64_t modification);

// Makes the track's composition offsets signed (`ctts` and `trun` version 1). Allowed until the first sample
// with a composition offset is added, MBX_ERR_BAD_STATE afterwards.
MbxStatus MbxSetSignedOffsets(MbxSession* session, uint32_t track, uint32_t signedOffsets);

// ---- Samples and fragments ----

// Appends one sample to the track's open chunk, which is opened when needed. `randomAccess`, an MbxIndexRow,
// asks for a row in the fragment index, which the samples of `moov` never get. MBX_ERR_BAD_STATE for a track
// or sample entry that does not exist, MBX_ERR_OVERFLOW when the decode time leaves 64 bits.
MbxStatus MbxAddSample(MbxSession* session, uint32_t track, const MbxSampleInfo* sample,
                       uint32_t randomAccess);

// Closes the track's open chunk. MBX_ERR_BAD_STATE for a track that has none open.
MbxStatus MbxEndChunk(MbxSession* session, uint32_t track);

// Sets which defaults the `tfhd` of each of the track's fragments carries even where they equal those of
// `trex`: description index, duration, size, flags, a word each as in MbxTrackParams::defaultsForced. For a
// track that has no sample yet when `moov` is written: that `trex` knows no defaults, and who reads the file
// before `moov` is written again needs them from elsewhere. MBX_ERR_INVALID_ARG for a word above 1.
MbxStatus MbxForceDefaults(MbxSession* session, uint32_t track, const uint32_t forced[4]);

// Adds `delta` to chunk offsets of what `moov` reports: of one track or with 0 of all, of one chunk or with 0
// of all. MBX_ERR_OVERFLOW when an offset wrapped, after all are shifted; MBX_ERR_NOT_FOUND for a missing
// chunk.
MbxStatus MbxShiftChunkOffsets(MbxSession* session, uint32_t track, uint32_t chunk, int64_t delta);

// The same for one fragment (0: all) instead of what `moov` reports. MBX_ERR_NOT_FOUND for a fragment that a
// track lacks; MBX_ERR_OVERFLOW is forgiven when base_offset_mode is not 0.
MbxStatus MbxShiftFragmentOffsets(MbxSession* session, uint32_t fragment, uint32_t track, uint32_t chunk,
                                  int64_t delta);

// Tells where the fragment's `moof` stands, for the fragment index. MBX_ERR_INVALID_ARG for fragment 0,
// MBX_ERR_NOT_FOUND when a track lacks the fragment.
MbxStatus MbxSetFragmentBase(MbxSession* session, uint32_t fragment, uint64_t position);

// Ends what `moov` reports and opens fragment 1. MBX_ERR_BAD_STATE with an open chunk, or the second time;
// MBX_ERR_OVERFLOW when a track's decode time leaves 64 bits. Nothing changes on failure.
MbxStatus MbxSealFirstFragment(MbxSession* session);

// Ends the open fragment and opens the next. MBX_ERR_BAD_STATE with an open chunk, or before
// MbxSealFirstFragment; otherwise as MbxSealFirstFragment.
MbxStatus MbxSealFragment(MbxSession* session);

// Releases the sample tables of a written fragment, or with 0 of all but the open one, for which there must
// be at least two (MBX_ERR_BAD_STATE). MBX_ERR_BAD_STATE for the open fragment, MBX_ERR_NOT_FOUND beyond it.
// The fragment keeps its times and position.
MbxStatus MbxReleaseFragment(MbxSession* session, uint32_t fragment);

// ---- Writing ----

// Writes a box header in the session's box_size_mode for a payload of `payloadSize` bytes that the caller
// writes; `headerSize` receives 8 or 16. MBX_ERR_INVALID_ARG for a payload of 2^64 - 16 bytes or more,
// MBX_ERR_BAD_STATE for one that the mode cannot carry.
MbxStatus MbxWriteMdatHeader(MbxSession* session, MbxFile* file, uint64_t position, uint32_t type,
                             uint64_t payloadSize, uint64_t* headerSize);

// The same for `mdat` with a form (MbxMdatHeaderForm) of its own in place of the session's box_size_mode.
// MBX_ERR_INVALID_ARG for another type.
MbxStatus MbxWriteWideMdatHeader(MbxSession* session, uint32_t form, MbxFile* file, uint64_t position,
                                 uint32_t type, uint64_t payloadSize, uint64_t* headerSize);

// Measures, and with a file writes, `moov`. MBX_ERR_BAD_STATE while a track has an open chunk, or when a
// value needs 64 bits in a mode that forbids them.
MbxStatus MbxWriteMoov(MbxSession* session, MbxFile* file, uint64_t position, uint64_t* size);

// Measures, and with a file writes, the `moof` of a sealed fragment. MBX_ERR_INVALID_ARG for fragment 0, an
// unknown base_offset_mode or a forced word of a track above 1; MBX_ERR_BAD_STATE for the open fragment, one
// with samples outside a chunk, or a time that the mode cannot carry; MBX_ERR_NOT_FOUND beyond the open
// fragment; MBX_ERR_OVERFLOW for a run that its base offset cannot reach.
MbxStatus MbxWriteMoof(MbxSession* session, MbxFile* file, uint32_t fragment, uint64_t position,
                       uint64_t* size);

// Measures, and with a file writes, `mfra`: the fragment index of every track that has rows.
// MBX_ERR_NOT_FOUND for a row of a fragment that its track lacks; MBX_ERR_BAD_STATE for a time or position
// that the mode cannot carry, or a box above 32 bits.
MbxStatus MbxWriteMfra(MbxSession* session, MbxFile* file, uint64_t position, uint64_t* size);
