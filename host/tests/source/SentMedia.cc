#include "SentMedia.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cstdlib>
#include <stdexcept>

#include "SourceTesting.h"
#include "source/AnnexB.h"
#include "source/AudioEncoder.h"
#include "source/Libav.h"

namespace receiver {
namespace {

/// What every transport keeps of a picture and of an audio frame: the last slice, and what stands behind the
/// ADTS header.
std::string EssenceOf(Medium medium, const unsigned char* data, std::size_t size) {
    std::span<const unsigned char> bytes{data, size};
    if (medium == Medium::kVideo) {
        const auto units = NalUnits(bytes);
        bytes = units.empty() ? bytes : units.back().bytes;
    } else {
        bytes = bytes.subspan(std::min(kAdtsHeader, size));
    }
    return {reinterpret_cast<const char*>(bytes.data()), bytes.size()};
}

}  // namespace

SentMedia::SentMedia(const std::string& file) {
    AVFormatContext* opened = nullptr;
    if (avformat_open_input(&opened, file.c_str(), nullptr, nullptr) < 0) {
        throw std::runtime_error("cannot open " + file);
    }
    const libav::Owner<AVFormatContext> format(opened);
    libav::Check(avformat_find_stream_info(opened, nullptr), "read a file");
    const libav::Owner<AVPacket> packet = libav::NewPacket();
    for (; av_read_frame(opened, packet.get()) >= 0; av_packet_unref(packet.get())) {
        const AVStream& stream = *opened->streams[packet->stream_index];
        const bool video = stream.codecpar->codec_type == AVMEDIA_TYPE_VIDEO;
        const Item item{video ? Medium::kVideo : Medium::kAudio, video ? pictures_++ : sounds_++,
                        av_rescale_q(packet->pts, stream.time_base, {1, 90000})};
        const auto size = static_cast<std::size_t>(packet->size);
        if (!items_.emplace(EssenceOf(item.medium, packet->data, size), item).second) {
            throw std::runtime_error("two units of " + file + " are alike");
        }
    }
}

std::vector<SentMedia::Arrival> SentMedia::Find(Medium medium, const std::vector<SourceUnit>& units) const {
    std::vector<Arrival> arrivals;
    for (const SourceUnit& unit : Of(medium, units)) {
        const auto found = items_.find(EssenceOf(medium, unit.data.get(), unit.size));
        if (found != items_.end() && found->second.medium == medium) {
            const std::int64_t time = medium == Medium::kAudio ? unit.time * 15 / 8 : unit.time + unit.later;
            arrivals.push_back({found->second.number, time - found->second.time});
        }
    }
    return arrivals;
}

void ExpectInStep(const SentMedia& sent, const std::vector<SourceUnit>& units, std::size_t first,
                  std::int64_t tolerance) {
    const auto pictures = sent.Find(Medium::kVideo, units);
    ASSERT_FALSE(pictures.empty());
    EXPECT_EQ(pictures.size(), Of(Medium::kVideo, units).size()) << "pictures that were not sent";
    const std::int64_t offset = pictures.front().offset;
    for (std::size_t at = 0; at < pictures.size(); ++at) {
        EXPECT_EQ(pictures[at].number, first + at);
        EXPECT_NEAR(static_cast<double>(pictures[at].offset), static_cast<double>(offset), 90);
    }
    const auto sounds = sent.Find(Medium::kAudio, units);
    ASSERT_FALSE(sounds.empty());
    for (std::size_t at = 0; at < sounds.size(); ++at) {
        EXPECT_EQ(sounds[at].number, sounds.front().number + at);
        EXPECT_LE(std::abs(sounds[at].offset - offset), tolerance) << "audio frame " << sounds[at].number;
    }
    // No frame that stands at or behind the first picture is missing in front: silence leads up to a frame.
    const auto audio = Of(Medium::kAudio, units);
    EXPECT_LE(audio.size() - sounds.size(), 1u) << "silence";
}

}  // namespace receiver
