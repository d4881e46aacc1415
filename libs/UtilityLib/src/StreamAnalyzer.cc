#include "StreamAnalyzer.h"

#include <algorithm>
#include <cstddef>
#include <limits>
#include <optional>
#include <utility>

#include "Adts.h"
#include "AnnexBReader.h"
#include "Klv.h"
#include "Logger.h"
#include "NalSyntax.h"
#include "ParameterSets.h"
#include "RecordMetadata.h"
#include "Timecode.h"

namespace nal_access {

namespace {

/// The payload of a unit; empty for a null unit and for one without payload.
Bytes PayloadOf(const std::shared_ptr<StreamData>& unit) {
    if (!unit || unit->payload == nullptr) {
        return {};
    }
    return {unit->payload, static_cast<std::size_t>(unit->size)};
}

void Append(const std::shared_ptr<StreamData>& unit, std::vector<unsigned char> bytes, bool sync,
            std::vector<std::shared_ptr<SampleData>>& samples) {
    samples.push_back(std::make_shared<SampleData>(std::move(bytes), unit ? unit->rtp_timestamp : 0,
                                                   unit ? unit->timestamp : 0, sync));
}

std::vector<unsigned char> Copy(Bytes bytes) {
    return {bytes.begin(), bytes.end()};
}

/// The NAL units of an access unit. None above 4 GiB, which a sample's 32-bit lengths cannot express.
std::vector<Bytes> SplitNalUnits(Bytes stream) {
    std::vector<Bytes> nals;
    if (stream.size() <= std::numeric_limits<std::uint32_t>::max()) {
        AnnexBReader reader(stream);
        for (Bytes nal; reader.Next(nal);) {
            nals.push_back(nal);
        }
    }
    return nals;
}

/// NAL units that have no place in a sample (ISO/IEC 14496-15 5.3.2).
bool IsStreamOnly(NalType type) {
    return type == NalType::kAccessUnitDelimiter || type == NalType::kEndOfSequence ||
           type == NalType::kEndOfStream || type == NalType::kFillerData;
}

NalUnit MakeNalUnit(Bytes bytes) {
    NalUnit unit;
    if (!bytes.empty()) {
        unit.size = bytes.size();
        unit.data.reset(new unsigned char[bytes.size()], std::default_delete<unsigned char[]>());
        std::copy(bytes.begin(), bytes.end(), unit.data.get());
    }
    return unit;
}

}  // namespace

/// What an analyser remembers from unit to unit.
struct StreamAnalyzer::Memory {
    ParameterSetFilter parameterSets;
};

StreamAnalyzer::StreamAnalyzer() : memory_(std::make_unique<Memory>()) {}

StreamAnalyzer::~StreamAnalyzer() = default;

bool StreamAnalyzer::IsAccessUnitStart(const std::shared_ptr<StreamData>& unit, NalUnit& sps, NalUnit& pps) {
    ActiveParameterSets sets;
    const bool found = FindIdrParameterSets(SplitNalUnits(PayloadOf(unit)), sets);
    sps = MakeNalUnit(sets.sequence);
    pps = MakeNalUnit(sets.picture);
    return found;
}

void StreamAnalyzer::ConvertVideo(std::vector<std::shared_ptr<StreamData>>& units,
                                  std::vector<std::shared_ptr<SampleData>>& samples) {
    constexpr std::size_t kLengthSize = 4;
    for (const auto& unit : units) {
        std::vector<Bytes> nals = SplitNalUnits(PayloadOf(unit));
        memory_->parameterSets.Observe(nals);
        std::size_t size = 0;
        bool sync = false;
        std::erase_if(nals, [&](Bytes nal) {
            if (IsStreamOnly(TypeOf(nal)) || memory_->parameterSets.IsRedundant(nal)) {
                return true;
            }
            size += kLengthSize + nal.size();
            sync = sync || TypeOf(nal) == NalType::kIdrSlice;
            return false;
        });
        if (nals.empty()) {
            Logger::Put(LOG_PRIORITY_WARNING, __FILE__, "nal_access::StreamAnalyzer::ConvertVideo", __LINE__,
                        "no nal unit. rtp_timestamp = %llu, size = %llu.",
                        static_cast<unsigned long long>(unit ? unit->rtp_timestamp : 0),
                        static_cast<unsigned long long>(unit ? unit->size : 0));
        }
        std::vector<unsigned char> bytes;
        bytes.reserve(size);
        for (const Bytes nal : nals) {
            for (const int shift : {24, 16, 8, 0}) {
                bytes.push_back(static_cast<unsigned char>(nal.size() >> shift));
            }
            bytes.insert(bytes.end(), nal.begin(), nal.end());
        }
        Append(unit, std::move(bytes), sync, samples);
    }
}

void StreamAnalyzer::ConvertAudio(std::vector<std::shared_ptr<StreamData>>& units,
                                  std::vector<std::shared_ptr<SampleData>>& samples) {
    for (const auto& unit : units) {
        Append(unit, Copy(WithoutAdtsHeader(PayloadOf(unit))), true, samples);
    }
}

void StreamAnalyzer::ConvertMeta(std::vector<std::shared_ptr<StreamData>>& units,
                                 std::vector<std::shared_ptr<SampleData>>& samples,
                                 std::vector<unsigned char>& block) {
    std::optional<Bytes> identifier;
    KlvPacket packet;
    if (KlvReader(block).Next(packet)) {
        identifier = SetIdentifier(packet);
    }
    for (const auto& unit : units) {
        const Bytes payload = PayloadOf(unit);
        std::vector<unsigned char> bytes;
        bytes.reserve(payload.size() + block.size());
        bytes.assign(payload.begin(), payload.end());
        if (!identifier || !HasSet(payload, *identifier)) {
            bytes.insert(bytes.end(), block.begin(), block.end());
        }
        Append(unit, std::move(bytes), true, samples);
    }
}

void StreamAnalyzer::ConvertTmcd(const std::shared_ptr<StreamData>& unit, std::shared_ptr<SampleData>& sample,
                                 bool& dropFrame, unsigned int frames, int offset) {
    auto timecode = ReadTimecode(PayloadOf(unit), frames);
    if (!timecode) {
        return;
    }
    if (frames > 0) {
        timecode = AddFrames(*timecode, frames, offset);
    }
    sample = std::make_shared<SampleData>(
        std::vector<unsigned char>{timecode->hours, timecode->minutes, timecode->seconds, timecode->frames},
        unit->rtp_timestamp, unit->timestamp, true);
    dropFrame = timecode->dropFrame;
}

std::uint64_t StreamAnalyzer::ConvertTimestamp(std::uint64_t value, unsigned int from, unsigned int to) {
    if (from == 0) {
        return 0;
    }
    __extension__ using Product = unsigned __int128;
    const Product result = (static_cast<Product>(value) * to + from / 2) / from;
    constexpr std::uint64_t kMax = std::numeric_limits<std::uint64_t>::max();
    return result > kMax ? kMax : static_cast<std::uint64_t>(result);
}

bool StreamAnalyzer::GetRecFlg(const unsigned char* data, std::uint64_t size) {
    if (data == nullptr) {
        return false;
    }
    return ReadRecordFlag({data, static_cast<std::size_t>(size)}).value_or(false);
}

}  // namespace nal_access
