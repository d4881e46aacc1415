#include "boxlib/entry/audio_config.h"

#include "boxlib/core/bits.h"

MbxStatus MbxBuildSrat(MbxContext* context, const MbxOptions* options, const MbxSratParams* params,
                       MbxSratBox* box) {
    if (MbxAnyNull(context, options, params, box)) return MBX_ERR_INVALID_ARG;
    box->params = *params;
    return MbxMeasureBox(context, options, box, MbxWriteSratPayload);
}

// 12.2.3 SamplingRateBox
MbxStatus MbxWriteSratPayload(MbxContext* context, MbxFile* file, uint64_t position, const MbxSratBox* box,
                              uint64_t* written, uint64_t* accumulated) {
    MbxBytes bytes;
    MbxBeginBytes(context, &bytes);
    MbxPutVersionFlags(&bytes, 0, 0);
    MbxPut32(&bytes, box->params.samplingRate);  // unsigned int(32) sampling_rate
    return MbxWriteFixedPayload(context, file, position, &bytes, written, accumulated);
}

MbxStatus MbxWriteSratBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxSratBox* box, uint64_t* written, uint64_t* accumulated) {
    return MbxWriteOptionalBox(context, options, file, position, MbxCode("srat"), box, MbxWriteSratPayload,
                               written, accumulated);
}

MbxStatus MbxFreeSrat(MbxContext* context, MbxSratBox* box) {
    return MbxFreeBox(context, box);
}

MbxStatus MbxBuildDac3(MbxContext* context, const MbxOptions* options, const MbxDac3Params* params,
                       MbxDac3Box* box) {
    if (MbxAnyNull(context, options, params, box)) return MBX_ERR_INVALID_ARG;
    box->params = *params;
    return MbxMeasureBox(context, options, box, MbxWriteDac3Payload);
}

// ETSI TS 102 366 F.4 AC3SpecificBox
MbxStatus MbxWriteDac3Payload(MbxContext* context, MbxFile* file, uint64_t position, const MbxDac3Box* box,
                              uint64_t* written, uint64_t* accumulated) {
    MbxBytes bytes;
    MbxBeginBytes(context, &bytes);
    uint64_t bits = 0;
    MbxPutBits(&bits, 2, box->params.fscod);          // unsigned int(2) fscod
    MbxPutBits(&bits, 5, box->params.bsid);           // unsigned int(5) bsid
    MbxPutBits(&bits, 3, box->params.bsmod);          // unsigned int(3) bsmod
    MbxPutBits(&bits, 3, box->params.acmod);          // unsigned int(3) acmod
    MbxPutBits(&bits, 1, box->params.lfeon);          // unsigned int(1) lfeon
    MbxPutBits(&bits, 5, box->params.bit_rate_code);  // unsigned int(5) bit_rate_code
    MbxPutBits(&bits, 5, 0);                          // unsigned int(5) reserved = 0
    MbxPut24(&bytes, static_cast<uint32_t>(bits));
    return MbxWriteFixedPayload(context, file, position, &bytes, written, accumulated);
}

MbxStatus MbxWriteDac3Box(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxDac3Box* box, uint64_t* written, uint64_t* accumulated) {
    return MbxWriteOptionalBox(context, options, file, position, MbxCode("dac3"), box, MbxWriteDac3Payload,
                               written, accumulated);
}

MbxStatus MbxFreeDac3(MbxContext* context, MbxDac3Box* box) {
    return MbxFreeBox(context, box);
}

MbxStatus MbxBuildDec3(MbxContext* context, const MbxOptions* options, const MbxDec3Params* params,
                       MbxDec3Box* box) {
    if (MbxAnyNull(context, options, params, box)) return MBX_ERR_INVALID_ARG;
    box->params = *params;
    return MbxMeasureBox(context, options, box, MbxWriteDec3Payload);
}

// Contract: one-substream. Whatever `num_ind_sub` says.
// ETSI TS 102 366 F.6 EC3SpecificBox, of one independent substream
MbxStatus MbxWriteDec3Payload(MbxContext* context, MbxFile* file, uint64_t position, const MbxDec3Box* box,
                              uint64_t* written, uint64_t* accumulated) {
    MbxBytes bytes;
    MbxBeginBytes(context, &bytes);
    uint64_t bits = 0;
    MbxPutBits(&bits, 13, box->params.data_rate);   // unsigned int(13) data_rate
    MbxPutBits(&bits, 3, box->params.num_ind_sub);  // unsigned int(3) num_ind_sub
    MbxPutBits(&bits, 2, box->params.fscod);        // unsigned int(2) fscod
    MbxPutBits(&bits, 5, box->params.bsid);         // unsigned int(5) bsid
    MbxPutBits(&bits, 5, box->params.bsmod);        // unsigned int(5) bsmod
    MbxPutBits(&bits, 3, box->params.acmod);        // unsigned int(3) acmod
    MbxPutBits(&bits, 1, box->params.lfeon);        // unsigned int(1) lfeon
    MbxPut32(&bytes, static_cast<uint32_t>(bits));

    uint64_t dependent = 0;
    MbxPutBits(&dependent, 3, 0);                        // unsigned int(3) reserved = 0
    MbxPutBits(&dependent, 4, box->params.num_dep_sub);  // unsigned int(4) num_dep_sub
    if (box->params.num_dep_sub == 0) {
        MbxPutBits(&dependent, 1, 0);  // unsigned int(1) reserved = 0
        MbxPut(&bytes, dependent, 1);
    } else {
        MbxPutBits(&dependent, 9, box->params.chan_loc);  // unsigned int(9) chan_loc
        MbxPut(&bytes, dependent, 2);
    }
    return MbxWriteFixedPayload(context, file, position, &bytes, written, accumulated);
}

MbxStatus MbxWriteDec3Box(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxDec3Box* box, uint64_t* written, uint64_t* accumulated) {
    return MbxWriteOptionalBox(context, options, file, position, MbxCode("dec3"), box, MbxWriteDec3Payload,
                               written, accumulated);
}

MbxStatus MbxFreeDec3(MbxContext* context, MbxDec3Box* box) {
    return MbxFreeBox(context, box);
}

MbxStatus MbxBuildDdts(MbxContext* context, const MbxOptions* options, const MbxDdtsParams* params,
                       MbxDdtsBox* box) {
    if (MbxAnyNull(context, options, params, box)) return MBX_ERR_INVALID_ARG;
    box->params = *params;
    return MbxMeasureBox(context, options, box, MbxWriteDdtsPayload);
}

// ETSI TS 102 114 E.2.2.3.1 DTSSpecificBox
MbxStatus MbxWriteDdtsPayload(MbxContext* context, MbxFile* file, uint64_t position, const MbxDdtsBox* box,
                              uint64_t* written, uint64_t* accumulated) {
    MbxBytes bytes;
    MbxBeginBytes(context, &bytes);
    MbxPut32(&bytes, box->params.DTSSamplingFrequency);  // unsigned int(32) DTSSamplingFrequency
    MbxPut32(&bytes, box->params.maxBitrate);            // unsigned int(32) maxBitrate
    MbxPut32(&bytes, box->params.avgBitrate);            // unsigned int(32) avgBitrate
    MbxPut8(&bytes, box->params.pcmSampleDepth);         // unsigned int(8) pcmSampleDepth
    uint64_t bits = 0;
    MbxPutBits(&bits, 2, box->params.FrameDuration);       // bit(2) FrameDuration
    MbxPutBits(&bits, 5, box->params.StreamConstruction);  // bit(5) StreamConstruction
    MbxPutBits(&bits, 1, box->params.CoreLFEPresent);      // bit(1) CoreLFEPresent
    MbxPutBits(&bits, 6, box->params.CoreLayout);          // bit(6) CoreLayout
    MbxPutBits(&bits, 14, box->params.CoreSize);           // bit(14) CoreSize
    MbxPutBits(&bits, 1, box->params.StereoDownmix);       // bit(1) StereoDownmix
    MbxPutBits(&bits, 3, box->params.RepresentationType);  // bit(3) RepresentationType
    MbxPutBits(&bits, 16, box->params.ChannelLayout);      // bit(16) ChannelLayout
    MbxPut48(&bytes, bits);
    MbxPut8(&bytes, 0);  // bit(1) MultiAssetFlag, LBRDurationMod, ReservedBoxPresent, bit(5) Reserved
    return MbxWriteFixedPayload(context, file, position, &bytes, written, accumulated);
}

MbxStatus MbxWriteDdtsBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxDdtsBox* box, uint64_t* written, uint64_t* accumulated) {
    return MbxWriteOptionalBox(context, options, file, position, MbxCode("ddts"), box, MbxWriteDdtsPayload,
                               written, accumulated);
}

MbxStatus MbxFreeDdts(MbxContext* context, MbxDdtsBox* box) {
    return MbxFreeBox(context, box);
}

MbxStatus MbxBuildFcfg(MbxContext* context, const MbxOptions* options, const MbxFcfgParams* params,
                       MbxFcfgBox* box) {
    if (MbxAnyNull(context, options, params, box)) return MBX_ERR_INVALID_ARG;
    box->params = *params;
    return MbxMeasureBox(context, options, box, MbxWriteFcfgPayload);
}

// A box of this system's own: a word, then values of four, four and two bits
MbxStatus MbxWriteFcfgPayload(MbxContext* context, MbxFile* file, uint64_t position, const MbxFcfgBox* box,
                              uint64_t* written, uint64_t* accumulated) {
    MbxBytes bytes;
    MbxBeginBytes(context, &bytes);
    uint64_t bits = 0;
    MbxPutBits(&bits, 4, box->params.values[0]);
    MbxPutBits(&bits, 4, box->params.values[1]);
    MbxPutBits(&bits, 2, box->params.values[2]);
    MbxPutBits(&bits, 6, 0);
    MbxPut32(&bytes, box->params.word);
    MbxPut(&bytes, bits, 2);
    return MbxWriteFixedPayload(context, file, position, &bytes, written, accumulated);
}

MbxStatus MbxWriteFcfgBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxFcfgBox* box, uint64_t* written, uint64_t* accumulated) {
    return MbxWriteOptionalBox(context, options, file, position, MbxCode("fcfg"), box, MbxWriteFcfgPayload,
                               written, accumulated);
}

MbxStatus MbxFreeFcfg(MbxContext* context, MbxFcfgBox* box) {
    return MbxFreeBox(context, box);
}
