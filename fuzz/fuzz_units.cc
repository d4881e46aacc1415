// What reads the units of a stream: the converters of the host system's library, and the receiver's KLV
// packets. Each unit lies in memory of its own, so that a read beyond its end is seen. What a converter gives
// is looked at with the reader of the program `clipfile`.

#include <stdlib.h>

#include <algorithm>
#include <cstring>
#include <vector>

#include "Expect.h"
#include "StreamAnalyzer.h"
#include "metadata/RecordMetadata.h"
#include "reader/MetadataUnit.h"
#include "source/KlvPackets.h"

namespace {

using Bytes = std::vector<unsigned char>;
using Units = std::vector<std::shared_ptr<StreamData>>;
using Samples = std::vector<std::shared_ptr<nal_access::SampleData>>;

std::shared_ptr<StreamData> MakeUnit(const std::uint8_t* data, std::size_t size) {
    auto unit = std::make_shared<StreamData>();
    unit->data =
        std::shared_ptr<unsigned char>(new unsigned char[size], std::default_delete<unsigned char[]>());
    std::copy(data, data + size, unit->data.get());
    unit->payload = unit->data.get();
    unit->size = size;
    return unit;
}

Bytes BytesOf(nal_access::SampleData& sample) {
    return {sample.GetData(), sample.GetData() + sample.GetDataSize()};
}

/// NAL units, each behind its length, fill the sample (ISO/IEC 14496-15 5.2.3).
void ExpectNalUnits(const Bytes& sample) {
    std::size_t at = 0;
    while (at < sample.size()) {
        Expect(sample.size() - at > 4, "a length stands in front of each NAL unit");
        std::size_t length = 0;
        for (int i = 0; i < 4; ++i) {
            length = length << 8 | sample[at++];
        }
        Expect(length != 0 && length <= sample.size() - at, "a NAL unit lies in its sample");
        at += length;
    }
}

void Video(const std::shared_ptr<StreamData>& unit) {
    nal_access::StreamAnalyzer analyzer;
    nal_access::NalUnit sps;
    nal_access::NalUnit pps;
    const bool starts = analyzer.IsAccessUnitStart(unit, sps, pps);
    Expect(starts || (sps.size == 0 && pps.size == 0), "parameter sets belong to an IDR picture");
    Units units{unit, unit};
    Samples samples;
    analyzer.ConvertVideo(units, samples);
    Expect(samples.size() == 2, "there is a sample for each unit");
    for (const auto& sample : samples) {
        ExpectNalUnits(BytesOf(*sample));
        Expect(!starts || sample->GetSync(), "an IDR picture is a sync sample");
    }
}

void Audio(const std::shared_ptr<StreamData>& unit) {
    nal_access::StreamAnalyzer analyzer;
    Units units{unit};
    Samples samples;
    analyzer.ConvertAudio(units, samples);
    Expect(samples.size() == 1 && samples[0]->GetDataSize() <= unit->size, "a frame is a part of its unit");
}

void Metadata(const std::shared_ptr<StreamData>& unit) {
    nal_access::StreamAnalyzer analyzer;
    const clipfile::MetadataUnit read = clipfile::ReadMetadataUnit({unit->payload, unit->size});
    Expect(analyzer.GetRecFlg(unit->payload, unit->size) == read.recordFlag.value_or(false),
           "both read the same record flag");
    std::shared_ptr<nal_access::SampleData> timecode;
    bool dropFrame = false;
    analyzer.ConvertTmcd(unit, timecode, dropFrame, 0, 0);
    Expect(timecode == nullptr || timecode->GetDataSize() == 4, "a timecode has four bytes");
    for (const unsigned int frames : {24U, 30U, 60U}) {
        analyzer.ConvertTmcd(unit, timecode, dropFrame, frames, -3);
    }
    Units units{unit};
    Samples samples;
    Bytes block = {0x01, 0x06, 0x0E, 0x2B};
    analyzer.ConvertMeta(units, samples, block);
    Expect(samples.size() == 1 && samples[0]->GetDataSize() >= unit->size, "a unit stays whole");
}

/// Packets out of a stream's KLV, and into a unit of the module.
void Klv(const std::uint8_t* data, std::size_t size) {
    receiver::KlvPackets source;
    std::vector<Bytes> packets;
    for (const std::string& packet : source.Take({data, size})) {
        packets.emplace_back(packet.begin(), packet.end());
    }
    for (const bool record : {false, true}) {
        const Bytes unit = receiver::BuildMetadata(record, receiver::Timecode{1, 2, 3, 4, false}, packets);
        const clipfile::MetadataUnit read = clipfile::ReadMetadataUnit(unit);
        Expect(read.packets == packets.size() + 1, "a unit has its set and the packets of its source");
        nal_access::StreamAnalyzer analyzer;
        Expect(analyzer.GetRecFlg(unit.data(), unit.size()) == record,
               "the record flag is the receiver's own");
    }
}

}  // namespace

extern "C" int LLVMFuzzerInitialize(int*, char***) {
    return setenv("QX_LOG_PRIORITY", "0", 1);
}

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    if (size == 0) {
        return 0;
    }
    const auto unit = MakeUnit(data + 1, size - 1);
    switch (data[0] % 4) {
        case 0:
            Video(unit);
            return 0;
        case 1:
            Audio(unit);
            return 0;
        case 2:
            Metadata(unit);
            return 0;
        default:
            Klv(unit->payload, unit->size);
            return 0;
    }
}
