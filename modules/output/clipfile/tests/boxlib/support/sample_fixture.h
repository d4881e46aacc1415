// A session whose movie and tracks live in the test, for all that works on samples and fragments.
#pragma once

#include <deque>

#include "boxlib/sample/sample_segment.h"
#include "boxlib/sample/sample_store.h"
#include "boxlib/support/fixture.h"

class SampleTest : public BoxTest {
 protected:
    void SetUp() override {
        BoxTest::SetUp();
        session.context = context;
        session.movie = &movie;
        movie.header.timescale = 1000;
        ASSERT_EQ(MbxScratchInit(context, MBX_MEMORY_CLASS, MBX_SCRATCH_SIZE, &session.scratch), MBX_OK);
    }

    void TearDown() override {
        for (MbxTrack& track : tracks) EXPECT_EQ(MbxFreeSegments(context, &track), MBX_OK);
        MbxScratchRelease(context, &session.scratch);
        BoxTest::TearDown();
    }

    // A track with two sample entries; its identifier is ten times its number.
    MbxTrack* addTrack(uint32_t timescale = 1000) {
        MbxTrack* track = &tracks.emplace_back();
        track->header.trackId = static_cast<uint32_t>(tracks.size()) * 10;
        track->mediaHeader.timescale = timescale;
        for (int i = 0; i < 2; i++) {
            MbxSampleEntry* entry = &sampleEntries.emplace_back();
            entry->kind = MBX_ENTRY_RTMD;
            entry->code = MbxCode("rtmd");
            entry->dataReferenceIndex = 1;
            MbxListAppend(&track->sampleEntries.entries, entry);
        }
        MbxListAppend(&movie.tracks, track);
        return track;
    }

    static MbxSampleInfo sample(uint32_t size = 100, uint32_t duration = 10, uint32_t isSync = 1) {
        MbxSampleInfo info = {};
        info.size = size;
        info.duration = duration;
        info.isSync = isSync;
        info.descriptionIndex = 1;
        return info;
    }

    MbxStatus add(const MbxSampleInfo& info, uint32_t track = 1, uint32_t randomAccess = 0) {
        return MbxAddSample(context, &session, track, &info, randomAccess);
    }

    MbxStatus endChunk(uint32_t track = 1) { return MbxEndChunk(context, &session, track); }

    // A closed chunk of `count` samples at `offset`.
    void addChunk(uint32_t count, uint64_t offset, MbxSampleInfo info = sample(), uint32_t track = 1) {
        info.offset = offset;
        for (uint32_t i = 0; i < count; i++) ASSERT_EQ(add(info, track), MBX_OK);
        ASSERT_EQ(endChunk(track), MBX_OK);
    }

    MbxSession session = {};
    MbxMovie movie = {};
    std::deque<MbxTrack> tracks;
    std::deque<MbxSampleEntry> sampleEntries;
};

// The entries of a block list.
template <typename Entry>
std::vector<Entry> Entries(const MbxBlockList& list) {
    std::vector<Entry> all;
    for (const MbxBlock* block = list.first; block != nullptr; block = block->next) {
        const auto* entries = MbxBlockEntries<Entry>(block);
        all.insert(all.end(), entries, entries + block->count);
    }
    return all;
}

inline size_t BlockCount(const MbxBlockList& list) {
    size_t count = 0;
    for (const MbxBlock* block = list.first; block != nullptr; block = block->next) count++;
    return count;
}

// A block list of one block whose entries stand in the test, for tables that nothing is appended to.
template <typename Entry, size_t count>
struct StaticList {
    Entry entries[count];
    MbxBlock block = {count, entries, nullptr};
    MbxBlockList list = {count, &block, &block};
};
