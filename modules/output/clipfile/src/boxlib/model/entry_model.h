// Sample entries as the movie keeps them: one record for all kinds, of which each kind uses its part.
#pragma once

#include "boxlib/core/buffer.h"
#include "boxlib/core/list.h"

struct MbxSinfParams;

// A parameter set or NAL unit: bytes of `avcC` and `hvcC`.
struct MbxParameterSet {
    MbxBuffer bytes;
    MbxParameterSet* next;
};

struct MbxAvcConfig {
    MbxAvcConfigParams values;
    MbxList<MbxParameterSet> sequenceSets;
    MbxList<MbxParameterSet> pictureSets;
    MbxList<MbxParameterSet> sequenceExtensions;
};

struct MbxHvcCArray {
    uint8_t completeness;  // 1: all NAL units of that type are here, none in the stream
    uint8_t nalType;
    MbxList<MbxParameterSet> nalUnits;
    MbxHvcCArray* next;
};

struct MbxHvcCParams {
    MbxHvcCValues values;
    MbxList<MbxHvcCArray> arrays;
};

// MbxEsdsParams with its bytes owned.
struct MbxEsdsValues {
    uint32_t form;
    uint8_t objectTypeIndication;
    uint8_t streamType;
    uint8_t upStream;
    uint32_t bufferSizeDB;
    uint32_t maxBitrate;
    uint32_t avgBitrate;
    MbxBuffer decoderSpecificInfo;
    MbxBuffer raw;
};

struct MbxBtrtParams {
    uint32_t bufferSizeDB;
    uint32_t maxBitrate;
    uint32_t avgBitrate;
};

struct MbxSratParams {
    uint32_t samplingRate;  // in Hz
};

struct MbxDac3Params {
    uint8_t fscod;
    uint8_t bsid;
    uint8_t bsmod;
    uint8_t acmod;
    uint8_t lfeon;
    uint8_t bit_rate_code;
};

struct MbxDec3Params {
    uint16_t data_rate;  // in kbit/s
    uint8_t num_ind_sub;
    uint8_t fscod;
    uint8_t bsid;
    uint8_t bsmod;
    uint8_t acmod;
    uint8_t lfeon;
    uint8_t num_dep_sub;
    uint16_t chan_loc;
};

struct MbxDdtsParams {
    uint32_t DTSSamplingFrequency;
    uint32_t maxBitrate;
    uint32_t avgBitrate;
    uint8_t pcmSampleDepth;
    uint8_t FrameDuration;
    uint8_t StreamConstruction;
    uint8_t CoreLFEPresent;
    uint8_t CoreLayout;
    uint16_t CoreSize;
    uint8_t StereoDownmix;
    uint8_t RepresentationType;
    uint16_t ChannelLayout;
};

struct MbxFcfgParams {
    uint32_t word;
    uint8_t values[3];  // of four, four and two bits
};

struct Mbx3stpParams {
    uint8_t mode;         // three bits
    uint8_t value;        // five bits
    uint16_t details[3];  // written in modes 1 and 2
};

struct MbxVisualEntry {
    MbxVisualEntryParams params;
    MbxAvcConfig* avcConfig;   // kind 2, required
    MbxHvcCParams* hvcConfig;  // kind 11, required
    MbxBuffer stereo;          // bytes of the uuid box `3DDS`; empty for none
    MbxBuffer restricted;      // bytes of `rinf`; empty for none
};

// Bits of MbxAudioEntry::fieldsSet.
enum MbxAudioEntryField : uint32_t {
    MBX_AUDIO_DATA_REFERENCE = 2,
    MBX_AUDIO_CHANNELS = 4,
    MBX_AUDIO_SAMPLE_SIZE = 8,
    MBX_AUDIO_SAMPLE_RATE = 16,  // without it the rate is the track's timescale
};

struct MbxAudioEntry {
    uint32_t fieldsSet;
    MbxAudioEntryParams params;
    uint32_t sampleRate;  // 16.16
    MbxSratParams* srat;  // owned, null for none, as are the following
    MbxDdtsParams* ddts;
    MbxDac3Params* dac3;
    MbxDec3Params* dec3;
    MbxFcfgParams* fcfg;
};

// Kinds 8 and 9: the values that their body carries, in order; the rest of its 32 bytes is zero.
struct MbxGraphicsEntry {
    uint16_t words8[3];   // at bytes 8, 12, 14
    uint32_t words16[2];  // at bytes 16, 20
    uint16_t words24[2];  // at bytes 24, 26
    uint8_t byte28;       // at byte 28
    Mbx3stpParams* step;  // kind 9, required; owned
};

struct MbxTextEntry {
    MbxBuffer texts[3];
    MbxBtrtParams* btrt;  // owned, null for none
};

struct MbxSampleEntry {
    uint32_t kind;  // MbxEntryKind
    uint32_t code;
    uint32_t dataReferenceIndex;
    MbxVisualEntry visual;            // kinds 1, 2, 11
    MbxAudioEntry audio;              // kind 3
    MbxGraphicsEntry graphics;        // kinds 8, 9
    MbxTextEntry text;                // kind 10
    MbxTimecodeEntryParams timecode;  // kind 12
    MbxEsdsValues* esds;              // kinds 1 to 4, 11; owned, null for none
    MbxBuffer rawTail;                // kinds 3, 6, 12: ready bytes in place of all child boxes
    MbxList<MbxSinfParams> sinf;
    MbxSampleEntry* next;
};

struct MbxSampleEntryList {
    uint32_t version;  // of `stsd`
    MbxList<MbxSampleEntry> entries;
};
