#include "reader/Samples.h"

#include <string>

#include "reader/BigEndian.h"
#include "reader/FormatError.h"

namespace clipfile {

namespace {

constexpr std::uint64_t kFullHeader = 4;     // version, flags
constexpr std::uint64_t kCountedHeader = 8;  // and entry_count

/// The number at a place of a box that has to have it.
std::uint32_t NumberAt(const InputFile& file, const Box& box, std::uint64_t at) {
    if (box.PayloadSize() < at + 4) {
        throw FormatError(
            box.offset, "'" + FourCcText(box.type) + "' at " + std::to_string(box.offset) + " is too short.");
    }
    return ReadU32(file.Read(box.Payload() + at, 4).data());
}

Table CountedTable(const InputFile& file, const Box& box, std::uint32_t rowSize) {
    return MakeTable(box, kCountedHeader, NumberAt(file, box, kFullHeader), rowSize);
}

bool HasOffsets(const InputFile& file, const Box& ctts) {
    TableReader rows(file, CountedTable(file, ctts, 8));
    for (std::uint64_t i = 0; i < rows.RowCount(); ++i) {
        if (ReadU32(rows.Row(i) + 4) != 0) {
            return true;
        }
    }
    return false;
}

}  // namespace

SampleTables ReadSampleTables(const InputFile& file, const Box& stbl) {
    SampleTables tables;
    tables.times = CountedTable(file, RequireChild(file, stbl, FourCc("stts")), 8);
    tables.chunks = CountedTable(file, RequireChild(file, stbl, FourCc("stsc")), 12);

    const Box sizes = RequireChild(file, stbl, FourCc("stsz"));
    tables.constantSize = NumberAt(file, sizes, kFullHeader);
    tables.sampleCount = NumberAt(file, sizes, kFullHeader + 4);
    if (tables.constantSize == 0) {
        tables.sizes = MakeTable(sizes, kFullHeader + 8, tables.sampleCount, 4);
    }
    if (const auto wide = FindChild(file, stbl, FourCc("co64"))) {
        tables.chunkOffsets = CountedTable(file, *wide, 8);
    } else {
        tables.chunkOffsets = CountedTable(file, RequireChild(file, stbl, FourCc("stco")), 4);
    }
    if (const auto sync = FindChild(file, stbl, FourCc("stss"))) {
        tables.syncSamples = CountedTable(file, *sync, 4);
        tables.hasSyncSamples = true;
    }
    if (const auto composition = FindChild(file, stbl, FourCc("ctts"))) {
        tables.hasComposition = HasOffsets(file, *composition);
        TableReader rows(file, CountedTable(file, *composition, 8));
        tables.firstOffset = rows.RowCount() > 0 ? ReadU32(rows.Row(0) + 4) : 0;
    }
    return tables;
}

TableSamples::TableSamples(const InputFile& file, const SampleTables& tables)
    : sampleCount_(tables.sampleCount),
      constantSize_(tables.constantSize),
      allSync_(!tables.hasSyncSamples),
      wideOffsets_(tables.chunkOffsets.rowSize == 8),
      times_(file, tables.times),
      sizes_(file, tables.sizes),
      chunks_(file, tables.chunks),
      chunkOffsets_(file, tables.chunkOffsets),
      syncSamples_(file, tables.syncSamples) {}

std::optional<Sample> TableSamples::Next() {
    if (sample_ == sampleCount_) {
        return std::nullopt;
    }
    while (leftInChunk_ == 0) {
        EnterChunk();
    }
    Sample sample;
    sample.size = constantSize_ != 0 ? constantSize_ : ReadU32(sizes_.Row(sample_));
    sample.offset = offset_;
    sample.time = time_;
    sample.duration = NextDuration();
    sample.isSync = IsSync(sample_);
    sample.run = chunk_ - 1;
    offset_ += sample.size;
    time_ += sample.duration;
    --leftInChunk_;
    ++sample_;
    return sample;
}

void TableSamples::EnterChunk() {
    if (chunk_ == chunkOffsets_.RowCount() || chunks_.RowCount() == 0) {
        throw FormatError(0, "The chunks of a track end before its " + std::to_string(sampleCount_) +
                                 " samples, at number " + std::to_string(sample_ + 1) + ".");
    }
    // `first_chunk` counts from 1.
    while (chunkRow_ + 1 < chunks_.RowCount() && ReadU32(chunks_.Row(chunkRow_ + 1)) <= chunk_ + 1) {
        ++chunkRow_;
    }
    leftInChunk_ = ReadU32(chunks_.Row(chunkRow_) + 4);
    const unsigned char* const row = chunkOffsets_.Row(chunk_);
    offset_ = wideOffsets_ ? ReadU64(row) : ReadU32(row);
    ++chunk_;
}

std::uint32_t TableSamples::NextDuration() {
    while (leftInTimes_ == 0) {
        if (timesRow_ == times_.RowCount()) {
            throw FormatError(0, "The durations of a track end before its samples, at number " +
                                     std::to_string(sample_ + 1) + ".");
        }
        leftInTimes_ = ReadU32(times_.Row(timesRow_));
        duration_ = ReadU32(times_.Row(timesRow_) + 4);
        ++timesRow_;
    }
    --leftInTimes_;
    return duration_;
}

bool TableSamples::IsSync(std::uint64_t number) {
    if (allSync_) {
        return true;
    }
    // `sample_number` counts from 1, upwards.
    while (syncRow_ < syncSamples_.RowCount() && ReadU32(syncSamples_.Row(syncRow_)) < number + 1) {
        ++syncRow_;
    }
    return syncRow_ < syncSamples_.RowCount() && ReadU32(syncSamples_.Row(syncRow_)) == number + 1;
}

std::optional<Run> RunReader::Next() {
    if (!next_) {
        return std::nullopt;
    }
    Run run;
    run.offset = next_->offset;
    const std::uint64_t number = next_->run;
    do {
        if (run.samples.size() == kMaxSamples) {
            throw FormatError(run.offset, "More than " + std::to_string(kMaxSamples) +
                                              " samples lie in one chunk, at " + std::to_string(run.offset) +
                                              ".");
        }
        run.samples.push_back(*next_);
        next_ = source_.Next();
    } while (next_ && next_->run == number);
    return run;
}

}  // namespace clipfile
