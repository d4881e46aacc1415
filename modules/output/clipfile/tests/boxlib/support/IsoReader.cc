#include "boxlib/support/IsoReader.h"

#include <algorithm>
#include <map>
#include <set>

namespace iso {

namespace {

[[noreturn]] void fail(const std::string& what, uint64_t position) {
    throw IsoError(what + " at " + std::to_string(position));
}

// Reads forward through a range of the file.
class Cursor {
 public:
    Cursor(const std::vector<uint8_t>& file, uint64_t position, uint64_t end)
        : file_(file), position_(position), end_(end) {
        if (end > file.size() || position > end) fail("range outside the file", position);
    }

    Cursor(const std::vector<uint8_t>& file, const Box& box)
        : Cursor(file, box.position + box.headerSize, box.position + box.size) {}

    uint64_t position() const { return position_; }
    uint64_t left() const { return end_ - position_; }

    uint64_t number(uint64_t width) {
        if (left() < width) fail("field beyond its box", position_);
        uint64_t value = 0;
        for (uint64_t i = 0; i < width; i++) value = value << 8 | file_[position_++];
        return value;
    }

    uint8_t u8() { return static_cast<uint8_t>(number(1)); }
    uint16_t u16() { return static_cast<uint16_t>(number(2)); }
    uint32_t u32() { return static_cast<uint32_t>(number(4)); }
    uint64_t u64() { return number(8); }

    std::string code() {
        std::string text;
        for (int i = 0; i < 4; i++) text += static_cast<char>(u8());
        return text;
    }

    void skip(uint64_t count) {
        if (left() < count) fail("field beyond its box", position_);
        position_ += count;
    }

    void zeros(uint64_t count) {
        for (uint64_t i = 0; i < count; i++) {
            if (u8() != 0) fail("reserved byte that is not zero", position_ - 1);
        }
    }

    void finish(const std::string& type) const {
        if (left() != 0) fail(std::to_string(left()) + " bytes left over in " + type, position_);
    }

 private:
    const std::vector<uint8_t>& file_;
    uint64_t position_;
    uint64_t end_;
};

struct FullBox {
    uint32_t version = 0;
    uint32_t flags = 0;
};

FullBox readFullBox(Cursor* cursor, uint32_t newestVersion) {
    const uint32_t word = cursor->u32();
    if (word >> 24 > newestVersion) fail("version " + std::to_string(word >> 24), cursor->position());
    return {word >> 24, word & 0xFFFFFF};
}

const std::set<std::string> kContainers = {"moov", "trak", "mdia", "minf", "stbl", "edts",
                                           "dinf", "mvex", "moof", "traf", "mfra"};

std::vector<Box> readChildren(const std::vector<uint8_t>& file, uint64_t position, uint64_t end) {
    std::vector<Box> boxes;
    while (position < end) {
        Cursor cursor(file, position, end);
        Box box;
        box.position = position;
        box.size = cursor.u32();
        box.type = cursor.code();
        if (box.size == 1) box.size = cursor.u64();
        box.headerSize = cursor.position() - position;
        if (box.size < box.headerSize || box.size > end - position) fail("size of " + box.type, position);
        if (kContainers.contains(box.type)) {
            box.children = readChildren(file, position + box.headerSize, position + box.size);
        }
        position += box.size;
        boxes.push_back(std::move(box));
    }
    return boxes;
}

// ---- Tables of `stbl`
// ----------------------------------------------------------------------------------------------

struct Run {
    uint32_t count = 0;
    uint32_t value = 0;
};

struct ChunkRun {
    uint32_t firstChunk = 0;
    uint32_t samplesPerChunk = 0;
    uint32_t descriptionIndex = 0;
};

class SampleTable {
 public:
    SampleTable(const std::vector<uint8_t>& file, const Box& stbl) : file_(file), stbl_(stbl) {
        readSizes();
        readTimes();
        readSyncs();
        readDependencies();
        readChunks();
    }

    std::vector<Sample> samples;

 private:
    Cursor open(const Box& box, uint32_t newestVersion, uint32_t* version) const {
        Cursor cursor(file_, box);
        const FullBox full = readFullBox(&cursor, newestVersion);
        if (full.flags != 0) fail("flags of " + box.type, box.position);
        if (version != nullptr) *version = full.version;
        return cursor;
    }

    // 8.7.3.2
    void readSizes() {
        Cursor cursor = open(stbl_.get("stsz"), 0, nullptr);
        const uint32_t size = cursor.u32();
        const uint32_t count = cursor.u32();
        if (size == 0 && cursor.left() != uint64_t{count} * 4) fail("count of stsz", cursor.position());
        samples.resize(count);
        for (Sample& sample : samples) sample.size = size != 0 ? size : cursor.u32();
        cursor.finish("stsz");
    }

    std::vector<Run> readRuns(const Box& box, uint32_t newestVersion, uint32_t* version) const {
        Cursor cursor = open(box, newestVersion, version);
        std::vector<Run> runs(cursor.u32());
        uint64_t total = 0;
        for (Run& run : runs) {
            run.count = cursor.u32();
            run.value = cursor.u32();
            if (run.count == 0) fail("run of no samples", cursor.position());
            total += run.count;
        }
        cursor.finish(box.type);
        if (total != samples.size()) fail("samples of " + box.type, box.position);
        return runs;
    }

    // 8.6.1.2, 8.6.1.3
    void readTimes() {
        uint64_t time = 0;
        size_t index = 0;
        for (const Run& run : readRuns(stbl_.get("stts"), 0, nullptr)) {
            for (uint32_t i = 0; i < run.count; i++) {
                samples[index].decodeTime = time;
                samples[index++].duration = run.value;
                time += run.value;
            }
        }
        const Box* ctts = stbl_.find("ctts");
        if (ctts == nullptr) return;
        uint32_t version = 0;
        index = 0;
        for (const Run& run : readRuns(*ctts, 1, &version)) {
            const int64_t offset =
                version == 1 ? int64_t{static_cast<int32_t>(run.value)} : int64_t{run.value};
            for (uint32_t i = 0; i < run.count; i++) samples[index++].compositionOffset = offset;
        }
    }

    // 8.6.2: without the box every sample is a sync sample
    void readSyncs() {
        const Box* stss = stbl_.find("stss");
        for (Sample& sample : samples) sample.isSync = stss == nullptr;
        if (stss == nullptr) return;
        Cursor cursor = open(*stss, 0, nullptr);
        const uint32_t count = cursor.u32();
        uint32_t last = 0;
        for (uint32_t i = 0; i < count; i++) {
            const uint32_t number = cursor.u32();
            if (number <= last || number > samples.size()) fail("sample number of stss", cursor.position());
            samples[number - 1].isSync = true;
            last = number;
        }
        cursor.finish("stss");
    }

    // 8.6.4
    void readDependencies() {
        const Box* sdtp = stbl_.find("sdtp");
        if (sdtp == nullptr) return;
        Cursor cursor = open(*sdtp, 0, nullptr);
        for (Sample& sample : samples) sample.dependency = cursor.u8();
        cursor.finish("sdtp");
    }

    std::vector<uint64_t> readOffsets() const {
        const Box* stco = stbl_.find("stco");
        const Box* co64 = stbl_.find("co64");
        if ((stco != nullptr) == (co64 != nullptr)) fail("one of stco and co64", stbl_.position);
        Cursor cursor = open(stco != nullptr ? *stco : *co64, 0, nullptr);
        std::vector<uint64_t> offsets(cursor.u32());
        for (uint64_t& offset : offsets) offset = cursor.number(stco != nullptr ? 4 : 8);
        cursor.finish("chunk offsets");
        return offsets;
    }

    // 8.7.4, 8.7.5
    void readChunks() {
        const std::vector<uint64_t> offsets = readOffsets();
        Cursor cursor = open(stbl_.get("stsc"), 0, nullptr);
        std::vector<ChunkRun> runs(cursor.u32());
        uint32_t next = 1;
        for (ChunkRun& run : runs) {
            run = {cursor.u32(), cursor.u32(), cursor.u32()};
            if (run.firstChunk < next || run.firstChunk > offsets.size())
                fail("first chunk", cursor.position());
            next = run.firstChunk + 1;
        }
        cursor.finish("stsc");
        if (!runs.empty() && runs[0].firstChunk != 1) fail("first run of stsc", stbl_.position);
        size_t index = 0;
        for (size_t i = 0; i < runs.size(); i++) {
            const size_t end = i + 1 < runs.size() ? runs[i + 1].firstChunk - 1 : offsets.size();
            for (size_t chunk = runs[i].firstChunk - 1; chunk < end; chunk++) {
                uint64_t offset = offsets[chunk];
                for (uint32_t n = 0; n < runs[i].samplesPerChunk; n++) {
                    if (index == samples.size()) fail("more samples in chunks than sizes", stbl_.position);
                    samples[index].descriptionIndex = runs[i].descriptionIndex;
                    samples[index].offset = offset;
                    offset += samples[index++].size;
                }
            }
        }
        if (index != samples.size()) fail("fewer samples in chunks than sizes", stbl_.position);
    }

    const std::vector<uint8_t>& file_;
    const Box& stbl_;
};

// ---- `moov` and its fragments
// --------------------------------------------------------------------------------------

// 8.8.3
struct Defaults {
    uint32_t descriptionIndex = 0;
    uint32_t duration = 0;
    uint32_t size = 0;
    uint32_t flags = 0;
};

class MovieReader {
 public:
    explicit MovieReader(const std::vector<uint8_t>& file) : file_(file) {}

    Movie read() {
        const std::vector<Box> boxes = ReadBoxes(file_);
        const Box* moov = nullptr;
        for (const Box& box : boxes) {
            if (box.type == "moov" && moov != nullptr) fail("second moov", box.position);
            if (box.type == "moov") moov = &box;
        }
        if (moov == nullptr) throw IsoError("no moov");
        readMoov(*moov);
        for (const Box& box : boxes) {
            if (box.type == "moof") readMoof(box);
        }
        for (const Box& box : boxes) {
            if (box.type == "mfra") readMfra(box, box.position + box.size == file_.size());
        }
        return std::move(movie_);
    }

 private:
    Track& trackOf(uint32_t trackId, uint64_t position) {
        for (Track& track : movie_.tracks) {
            if (track.trackId == trackId) return track;
        }
        fail("track " + std::to_string(trackId), position);
    }

    void readMoov(const Box& moov) {
        Cursor cursor(file_, moov.get("mvhd"));  // 8.2.2
        const uint64_t width = readFullBox(&cursor, 1).version == 1 ? 8 : 4;
        cursor.skip(2 * width);
        movie_.timescale = cursor.u32();
        movie_.duration = cursor.number(width);
        cursor.skip(4 + 2);
        cursor.zeros(2 + 8);
        cursor.skip(36);
        cursor.zeros(24);
        movie_.nextTrackId = cursor.u32();
        cursor.finish("mvhd");
        for (const Box* trak : moov.all("trak")) readTrak(*trak);
        if (const Box* mvex = moov.find("mvex")) readMvex(*mvex);
    }

    void readTrak(const Box& trak) {
        Track track;
        Cursor tkhd(file_, trak.get("tkhd"));  // 8.3.2
        const FullBox full = readFullBox(&tkhd, 1);
        const uint64_t width = full.version == 1 ? 8 : 4;
        track.flags = full.flags;
        tkhd.skip(2 * width);
        track.trackId = tkhd.u32();
        tkhd.zeros(4);
        track.duration = tkhd.number(width);
        tkhd.zeros(8);
        tkhd.skip(2 + 2 + 2);
        tkhd.zeros(2);
        tkhd.skip(36 + 8);
        tkhd.finish("tkhd");
        if (const Box* edts = trak.find("edts")) readEdits(*edts, &track);

        const Box& mdia = trak.get("mdia");
        Cursor mdhd(file_, mdia.get("mdhd"));  // 8.4.2
        const uint64_t mediaWidth = readFullBox(&mdhd, 1).version == 1 ? 8 : 4;
        mdhd.skip(2 * mediaWidth);
        track.timescale = mdhd.u32();
        track.mediaDuration = mdhd.number(mediaWidth);
        track.language = mdhd.u16();
        mdhd.zeros(2);
        mdhd.finish("mdhd");
        Cursor hdlr(file_, mdia.get("hdlr"));  // 8.4.3
        readFullBox(&hdlr, 0);
        hdlr.zeros(4);
        track.handler = hdlr.code();

        const Box& stbl = mdia.get("minf").get("stbl");
        Cursor stsd(file_, stbl.get("stsd"));  // 8.5.2
        readFullBox(&stsd, 1);
        const uint32_t entries = stsd.u32();
        const uint64_t end = stsd.position() + stsd.left();
        for (const Box& entry : readChildren(file_, stsd.position(), end))
            track.entryTypes.push_back(entry.type);
        if (track.entryTypes.size() != entries) fail("entries of stsd", stbl.position);
        track.samples = SampleTable(file_, stbl).samples;
        for (const Sample& sample : track.samples)
            checkDescription(track, sample.descriptionIndex, stbl.position);

        const Sample* last = track.samples.empty() ? nullptr : &track.samples.back();
        decodeEnds_[track.trackId] = last != nullptr ? last->decodeTime + last->duration : 0;
        if (!trackIds_.insert(track.trackId).second) fail("track identifier used twice", trak.position);
        movie_.tracks.push_back(std::move(track));
    }

    static void checkDescription(const Track& track, uint32_t index, uint64_t position) {
        if (index == 0 || index > track.entryTypes.size()) fail("sample description index", position);
    }

    // 8.6.6
    void readEdits(const Box& edts, Track* track) {
        const Box* elst = edts.find("elst");
        if (elst == nullptr) return;
        Cursor cursor(file_, *elst);
        const uint64_t width = readFullBox(&cursor, 1).version == 1 ? 8 : 4;
        track->edits.resize(cursor.u32());
        for (Edit& edit : track->edits) {
            edit.segmentDuration = cursor.number(width);
            const uint64_t time = cursor.number(width);
            edit.mediaTime = width == 8 ? static_cast<int64_t>(time) : int64_t{static_cast<int32_t>(time)};
            edit.rateInteger = static_cast<int16_t>(cursor.u16());
            edit.rateFraction = static_cast<int16_t>(cursor.u16());
        }
        cursor.finish("elst");
    }

    void readMvex(const Box& mvex) {
        movie_.fragmented = true;
        if (const Box* mehd = mvex.find("mehd")) {  // 8.8.2
            Cursor cursor(file_, *mehd);
            movie_.fragmentDuration = cursor.number(readFullBox(&cursor, 1).version == 1 ? 8 : 4);
            cursor.finish("mehd");
        }
        for (const Box* trex : mvex.all("trex")) {  // 8.8.3
            Cursor cursor(file_, *trex);
            readFullBox(&cursor, 0);
            const uint32_t trackId = cursor.u32();
            trackOf(trackId, trex->position);
            const bool added =
                defaults_.emplace(trackId, Defaults{cursor.u32(), cursor.u32(), cursor.u32(), cursor.u32()})
                    .second;
            if (!added) fail("second trex of a track", trex->position);
            cursor.finish("trex");
        }
        if (defaults_.size() != movie_.tracks.size()) fail("tracks without trex", mvex.position);
    }

    void readMoof(const Box& moof) {
        if (!movie_.fragmented) fail("moof without mvex", moof.position);
        Cursor cursor(file_, moof.get("mfhd"));  // 8.8.5
        readFullBox(&cursor, 0);
        const uint32_t sequence = cursor.u32();
        cursor.finish("mfhd");
        if (!movie_.fragments.empty() && sequence <= movie_.fragments.back()) fail("sequence", moof.position);
        movie_.fragments.push_back(sequence);
        uint64_t dataEnd = moof.position;
        uint32_t number = 0;
        for (const Box* traf : moof.all("traf")) readTraf(moof, *traf, sequence, ++number, &dataEnd);
    }

    void readTraf(const Box& moof, const Box& traf, uint32_t sequence, uint32_t number, uint64_t* dataEnd) {
        Cursor tfhd(file_, traf.get("tfhd"));  // 8.8.7
        const uint32_t flags = readFullBox(&tfhd, 0).flags;
        const uint32_t trackId = tfhd.u32();
        Track& track = trackOf(trackId, traf.position);
        Defaults defaults = defaults_.at(trackId);
        // Without an offset of its own the first counts from `moof`, the others from the end of the one
        // before.
        uint64_t base = number == 1 || (flags & 0x020000) != 0 ? moof.position : *dataEnd;
        if ((flags & 0x000001) != 0) base = tfhd.u64();
        if ((flags & 0x000002) != 0) defaults.descriptionIndex = tfhd.u32();
        if ((flags & 0x000008) != 0) defaults.duration = tfhd.u32();
        if ((flags & 0x000010) != 0) defaults.size = tfhd.u32();
        if ((flags & 0x000020) != 0) defaults.flags = tfhd.u32();
        tfhd.finish("tfhd");
        checkDescription(track, defaults.descriptionIndex, traf.position);

        uint64_t& time = decodeEnds_[trackId];
        if (const Box* tfdt = traf.find("tfdt")) {  // 8.8.12
            Cursor cursor(file_, *tfdt);
            time = cursor.number(readFullBox(&cursor, 1).version == 1 ? 8 : 4);
            cursor.finish("tfdt");
        }
        Sample sample;
        sample.fragment = sequence;
        sample.moofPosition = moof.position;
        sample.trafNumber = number;
        sample.descriptionIndex = defaults.descriptionIndex;
        uint64_t position = base;
        for (const Box* trun : traf.all("trun")) {
            sample.trunNumber++;
            readTrun(*trun, base, defaults, sample, &position, &time, &track);
        }
        *dataEnd = position;
    }

    // 8.8.8
    void readTrun(const Box& trun, uint64_t base, const Defaults& defaults, Sample sample, uint64_t* position,
                  uint64_t* time, Track* track) {
        Cursor cursor(file_, trun);
        const FullBox full = readFullBox(&cursor, 1);
        const uint32_t count = cursor.u32();
        if ((full.flags & 0x000001) != 0) {
            *position = base + static_cast<uint64_t>(int64_t{static_cast<int32_t>(cursor.u32())});
        }
        std::optional<uint32_t> firstFlags;
        if ((full.flags & 0x000004) != 0) firstFlags = cursor.u32();
        if (firstFlags && (full.flags & 0x000400) != 0) fail("flags told twice", trun.position);
        for (uint32_t i = 0; i < count; i++) {
            sample.sampleNumber = i + 1;
            sample.duration = (full.flags & 0x000100) != 0 ? cursor.u32() : defaults.duration;
            sample.size = (full.flags & 0x000200) != 0 ? cursor.u32() : defaults.size;
            uint32_t sampleFlags = i == 0 && firstFlags ? *firstFlags : defaults.flags;
            if ((full.flags & 0x000400) != 0) sampleFlags = cursor.u32();
            const uint32_t offset = (full.flags & 0x000800) != 0 ? cursor.u32() : 0;
            sample.compositionOffset =
                full.version == 1 ? int64_t{static_cast<int32_t>(offset)} : int64_t{offset};
            if ((sampleFlags & 0xF0000000) != 0) fail("reserved sample flags", trun.position);
            sample.isSync = (sampleFlags & 0x00010000) == 0;
            sample.dependency = static_cast<uint8_t>(sampleFlags >> 20);
            sample.offset = *position;
            sample.decodeTime = *time;
            *position += sample.size;
            *time += sample.duration;
            track->samples.push_back(sample);
        }
        cursor.finish("trun");
    }

    void readMfra(const Box& mfra, bool last) {
        movie_.indexed = true;
        if (!last || mfra.children.empty() || mfra.children.back().type != "mfro") {
            fail("mfra and mfro at the end of the file", mfra.position);
        }
        Cursor mfro(file_, mfra.children.back());  // 8.8.11
        readFullBox(&mfro, 0);
        if (mfro.u32() != mfra.size) fail("size in mfro", mfra.position);
        mfro.finish("mfro");
        for (const Box* tfra : mfra.all("tfra")) readTfra(*tfra);
    }

    // 8.8.10
    void readTfra(const Box& tfra) {
        Cursor cursor(file_, tfra);
        const uint64_t width = readFullBox(&cursor, 1).version == 1 ? 8 : 4;
        Track& track = trackOf(cursor.u32(), tfra.position);
        const uint32_t lengths = cursor.u32();
        if (lengths >> 6 != 0) fail("reserved bits of tfra", tfra.position);
        track.index.resize(cursor.u32());
        for (IndexEntry& entry : track.index) {
            entry.time = cursor.number(width);
            entry.moofPosition = cursor.number(width);
            entry.trafNumber = static_cast<uint32_t>(cursor.number((lengths >> 4 & 3) + 1));
            entry.trunNumber = static_cast<uint32_t>(cursor.number((lengths >> 2 & 3) + 1));
            entry.sampleNumber = static_cast<uint32_t>(cursor.number((lengths & 3) + 1));
        }
        cursor.finish("tfra");
    }

    const std::vector<uint8_t>& file_;
    Movie movie_;
    std::set<uint32_t> trackIds_;
    std::map<uint32_t, Defaults> defaults_;
    std::map<uint32_t, uint64_t> decodeEnds_;  // of what was read of each track so far
};

}  // namespace

const Box* Box::find(const std::string& childType) const {
    const std::vector<const Box*> found = all(childType);
    if (found.size() > 1) fail("more than one " + childType, position);
    return found.empty() ? nullptr : found.front();
}

const Box& Box::get(const std::string& childType) const {
    const Box* found = find(childType);
    if (found == nullptr) fail("no " + childType + " in " + type, position);
    return *found;
}

std::vector<const Box*> Box::all(const std::string& childType) const {
    std::vector<const Box*> found;
    for (const Box& child : children) {
        if (child.type == childType) found.push_back(&child);
    }
    return found;
}

std::string Box::childTypes() const {
    std::string types;
    for (const Box& child : children) types += (types.empty() ? "" : " ") + child.type;
    return types;
}

const Track& Movie::track(uint32_t trackId) const {
    for (const Track& track : tracks) {
        if (track.trackId == trackId) return track;
    }
    throw IsoError("no track " + std::to_string(trackId));
}

std::vector<Box> ReadBoxes(const std::vector<uint8_t>& file) {
    return readChildren(file, 0, file.size());
}

Movie ReadMovie(const std::vector<uint8_t>& file) {
    return MovieReader(file).read();
}

}  // namespace iso
