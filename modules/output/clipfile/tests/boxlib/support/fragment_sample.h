// One fragment of one track with every table that a fragment can bring along, in static tables, and the bytes
// of its boxes, written by hand from the clauses named.
#pragma once

#include "boxlib/model/entry_model.h"
#include "boxlib/sample/sample_group_model.h"
#include "boxlib/support/sample_fixture.h"

// Three samples of 5, 6 and 7 bytes at 0x1000, of which the first is a sync sample; the track says in `trex`
// what the first sample says but its size.
struct FragmentSample {
    StaticList<MbxRun, 1> durations = {{{3, 10}}};
    StaticList<MbxRun, 1> offsets = {{{3, 0}}};
    StaticList<MbxChunkRun, 1> chunks = {{{1, 3, 1}}};
    StaticList<uint32_t, 3> sizes = {{5, 6, 7}};
    StaticList<uint64_t, 1> chunkOffsets = {{0x1000}};
    StaticList<uint32_t, 1> syncs = {{1}};
    uint8_t dependencies[2] = {0, 0};
    StaticList<uint8_t, 3> trick = {{0x41, 0x82, 0xC3}};
    uint8_t auxBytes[3] = {0xA1, 0xA2, 0xA3};
    StaticList<MbxAuxSize, 3> auxSizes = {{{1, &auxBytes[0]}, {1, &auxBytes[1]}, {1, &auxBytes[2]}}};
    StaticList<MbxAuxOffset, 1> auxOffsets = {{{1, 0x1020}}};
    MbxAvcConfig avc = {{1, 0x64, 0, 0x28, 3, 0, 0, 0, 0}, {}, {}, {}};
    StaticList<MbxSampleGroupRow, 1> rows = {{{3, 1}}};
    MbxSampleGroupParams group = {0, 0, MbxCode("tele"), 0, rows.list, nullptr};
    MbxGroupDescription description = {{}, 0, 0, {}, 1, nullptr};
    MbxGroupDescriptionParams descriptions = {MbxCode("tele"), 0, {&description, &description}, nullptr};
    MbxSubSample subSample = {5, 2, 1, nullptr};
    MbxSubSampleParams subSamples = {1, {&subSample, &subSample}, nullptr};
    MbxSampleSegment first = {};
    MbxSampleSegment segment = {};
    MbxTrack track = {};
    MbxMovie movie = {};

    FragmentSample() {
        segment.firstDecodeTime = 0x2030;
        segment.fragmentOffset = 0xF00;
        segment.durations.list = durations.list;
        segment.compositionOffsets.runs.list = offsets.list;
        segment.chunks.list = chunks.list;
        segment.chunks.chunkCount = 1;
        segment.sizes = {0, 3, sizes.list};
        segment.chunkOffsets.list = chunkOffsets.list;
        segment.syncSamples = {1, syncs.list};
        segment.dependencies.first = &dependencies[0];
        segment.dependencies.second = &dependencies[1];
        segment.dependencies.runCount = 2;
        segment.trickBytes = trick.list;
        segment.auxSizes = {1, 3, auxSizes.list};
        segment.auxOffsets = auxOffsets.list;
        segment.avcConfig = &avc;
        segment.sampleGroups = {&group, &group};
        segment.groupDescriptions = {&descriptions, &descriptions};
        segment.subSamples = {&subSamples, &subSamples};
        first.next = &segment;
        track.header.trackId = 10;
        track.mediaHeader.timescale = 1000;
        track.defaults = {1, 10, 4, 0x00010000};
        track.auxEnabled = 1;
        track.trickEnabled = 1;
        track.segments = {&first, &segment};
        track.sealedSegment = &first;
        track.segmentCount = 2;
        movie.tracks = {&track, &track};
        movie.fragmentCount = 1;
    }

    FragmentSample(const FragmentSample&) = delete;
    FragmentSample& operator=(const FragmentSample&) = delete;

    static Bytes Mfhd() {
        return Hex(
            "00000010 'mfhd'"  // 8.8.5: size, type
            "00 000000"        // version, flags
            "00000001");       // sequence_number
    }

    static Bytes Tfhd() {
        return Hex(
            "0000001C 'tfhd'"   // 8.8.7: size, type
            "00 000011"         // version, flags: base data offset, default size
            "0000000A"          // track_ID
            "0000000000001000"  // base_data_offset
            "00000005");        // default_sample_size
    }

    static Bytes Trik() {
        return Hex(
            "0000000F 'trik'"  // size, type
            "00 000000"        // version, flags
            "41 82 C3");       // pic_type, dependency_level: one byte per sample
    }

    static Bytes Trun() {
        return Hex(
            "00000024 'trun'"  // 8.8.8: size, type
            "00 000205"        // version, flags: data offset, first sample flags, sizes
            "00000003"         // sample_count
            "00000000"         // data_offset
            "00000000"         // first_sample_flags
            "00000005"         // sample_size
            "00000006"         // sample_size
            "00000007");       // sample_size
    }

    static Bytes Avcn() {
        return Hex(
            "0000000F 'avcn'"  // ISO/IEC 14496-15 5.2.4.1 as payload: size, type
            "01 64 00 28"      // configurationVersion, profile, compatibility, level
            "FF"               // reserved, lengthSizeMinusOne
            "E0"               // reserved, numOfSequenceParameterSets
            "00");             // numOfPictureParameterSets
    }

    static Bytes Traf() {
        return Hex("000000F1 'traf'") + Tfhd() + Trik() + Trun() + Avcn() +
               Hex("00000013 'senc' 00000000 00000003 A1 A2 A3"  // sample_count, bytes of each sample
                   "00000014 'saio' 00000000 00000001 00000020"  // entry_count, offset from the base
                   "00000011 'saiz' 00000000 01 00000003"        // default_sample_info_size, sample_count
                   "0000001C 'sbgp' 00000000 'tele' 00000001 00000003 00000001"
                   "00000019 'sgpd' 01000000 'tele' 00000001 00000001 80"
                   "0000001E 'subs' 00000000 00000001 00000001 0001 0005 02 01 00000000");
    }
};
