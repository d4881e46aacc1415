#include "support/TestStream.h"

#include <gtest/gtest.h>

#include <fstream>
#include <iterator>

#include "mp4/Mp4MuxerFactory.h"
#include "reader/TimecodeCount.h"
#include "support/CodedMedia.h"

namespace test_stream {

const Data kRecorderBlock = {0x01, 0x06, 0x0E, 0x2B, 0x34, 0x02, 0x53, 0x01, 0x01, 0x0C, 0x02, 0x01, 0x01,
                             0x7F, 0x01, 0x00, 0x00, 0x83, 0x00, 0x00, 0x2B, 0xE0, 0x00, 0x00, 0x10, 0x85,
                             0x1D, 0x08, 0x00, 0x46, 0x78, 0x03, 0x1C, 0xE8, 0x1F, 0x06, 0xF5, 0xA8, 0x84,
                             0x11, 0xE2, 0x85, 0x00, 0x00, 0x04, 0x02, 0x03, 0x00, 0x00, 0x85, 0x09, 0x00,
                             0x01, 0x56, 0x85, 0x12, 0x00, 0x06, 0x57, 0x47, 0x53, 0x2D, 0x38, 0x34};

namespace {

constexpr unsigned char kStartBytes[4] = {1, 2, 3, 4};
constexpr std::uint64_t kPicturesInChunk = 8;

std::shared_ptr<nal_access::SampleData> Sample(const Data& bytes, bool sync = true) {
    return std::make_shared<nal_access::SampleData>(bytes, 0, 0, sync);
}

nal_access::NalUnit Nal(const Data& bytes) {
    nal_access::NalUnit unit;
    unit.size = bytes.size();
    unit.data = std::shared_ptr<unsigned char>(new unsigned char[bytes.size()],
                                               std::default_delete<unsigned char[]>());
    std::copy(bytes.begin(), bytes.end(), unit.data.get());
    return unit;
}

/// Audio frames in front of a chunk: those that begin at least half a frame before it does.
std::size_t AudioBefore(std::size_t chunk) {
    const std::uint64_t begin = chunk * kPicturesInChunk * 1001 * 48000 / 30000;
    return begin < 512 ? 0 : static_cast<std::size_t>((begin - 512) / 1024 + 1);
}

clipfileModule::OutputSettings Settings(std::uint32_t width, std::uint32_t height) {
    clipfileModule::OutputSettings settings;
    settings.outputPath = "anywhere";
    settings.framerate = 29970;
    settings.width = width;
    settings.height = height;
    settings.bitrate = 50000;
    return settings;
}

std::shared_ptr<clipfileModule::ChunkData> MetadataChunk(std::size_t number) {
    auto chunk = std::make_shared<clipfileModule::ChunkData>();
    const std::int64_t first = clipfile::FrameNumberOf(kStart, kRate);
    for (std::size_t i = 0; i < kPicturesInChunk; ++i) {
        const auto frame = first + static_cast<std::int64_t>(number * kPicturesInChunk + i);
        chunk->meta.push_back(Sample(MakeUnit(true, clipfile::TimecodeOf(frame, kRate, true))));
    }
    return chunk;
}

}  // namespace

Data MakeUnit(bool recordFlag, const clipfile::Timecode& timecode) {
    Data unit = {0x01, 0x06, 0x0E, 0x2B, 0x34, 0x02, 0x53, 0x01, 0x01, 0x0C, 0x02, 0x01, 0x01, 0x7F,
                 0x01, 0x00, 0x00, 0x22, 0xE0, 0x00, 0x00, 0x10, 0x9B, 0x1F, 0x5C, 0x2E, 0x4D, 0x60,
                 0x4A, 0x17, 0xA6, 0x3B, 0x0E, 0x72, 0xD8, 0x41, 0xC5, 0x93, 0xE1, 0x01, 0x00, 0x01};
    unit.push_back(recordFlag ? 1 : 0);
    for (const int byte : {0xE1, 0x02, 0x00, 0x05, int{timecode.hours}, int{timecode.minutes},
                           int{timecode.seconds}, int{timecode.frames}, timecode.dropFrame ? 1 : 0}) {
        unit.push_back(static_cast<unsigned char>(byte));
    }
    unit.insert(unit.end(), kRecorderBlock.begin(), kRecorderBlock.end());
    return unit;
}

Stream MakePlainStream(std::size_t chunks) {
    Stream stream;
    stream.settings = Settings(1920, 1080);
    stream.settings.sps = Nal({0x67, 0x64, 0x00, 0x28, 0xAC});
    stream.settings.pps = Nal({0x68, 0xEE, 0x3C});
    for (std::size_t number = 0; number < chunks; ++number) {
        auto chunk = MetadataChunk(number);
        for (std::size_t i = AudioBefore(number); i < AudioBefore(number + 1); ++i) {
            chunk->audio.push_back(Sample({0x21, 0x10, 0x04, static_cast<unsigned char>(i), 0x55, 0xAA}));
        }
        for (std::size_t i = 0; i < kPicturesInChunk; ++i) {
            const bool sync = (number * kPicturesInChunk + i) % 16 == 0;
            const auto size = static_cast<unsigned char>(20 + 3 * i);
            Data picture = {0, 0, 0, size, static_cast<unsigned char>(sync ? 0x65 : 0x41), 0x88};
            picture.resize(4U + size, static_cast<unsigned char>(0x80 + number + i));
            chunk->video.push_back(Sample(picture, sync));
        }
        stream.chunks.push_back(chunk);
    }
    return stream;
}

Stream MakeCodedStream(std::size_t chunks) {
    const TempDir work;
    const CodedMedia media =
        MakeCodedMedia(work, 30000, 1001, chunks * kPicturesInChunk, AudioBefore(chunks));
    Stream stream;
    stream.settings = Settings(kCodedWidth, kCodedHeight);
    stream.settings.sps = media.sps;
    stream.settings.pps = media.pps;
    const auto at = [](const auto& list, std::size_t n) {
        return list.begin() + static_cast<std::ptrdiff_t>(n);
    };
    for (std::size_t number = 0; number < chunks; ++number) {
        auto chunk = MetadataChunk(number);
        chunk->audio.assign(at(media.audio, AudioBefore(number)), at(media.audio, AudioBefore(number + 1)));
        chunk->video.assign(at(media.video, 8 * number), at(media.video, 8 * number + 8));
        stream.chunks.push_back(chunk);
    }
    return stream;
}

void Record(const std::filesystem::path& path, const Recording& plan, const Stream& stream) {
    std::filesystem::remove(path);
    const clipfile::MuxerTarget target(path, kOpened);
    clipfileModule::OutputSettings settings = stream.settings;
    settings.recordRules = plan.rules;
    std::shared_ptr<clipfileModule::Mp4Muxer> muxer;
    ASSERT_TRUE(clipfileModule::Mp4MuxerFactory().Create(plan.type, muxer));
    ASSERT_TRUE(muxer->Initialize());
    ASSERT_TRUE(muxer->Open(settings, kStartBytes, true));
    for (const auto& chunk : stream.chunks) {
        ASSERT_TRUE(muxer->Write(chunk));
    }
    if (plan.close) {
        ASSERT_TRUE(muxer->WriteTmcd(kStartBytes));
        ASSERT_TRUE(muxer->Close());
    }
    ASSERT_TRUE(muxer->Uninitialize());
}

Data ReadAll(const std::filesystem::path& path) {
    std::ifstream in(path, std::ios::binary);
    EXPECT_TRUE(in) << path;
    return {std::istreambuf_iterator<char>(in), std::istreambuf_iterator<char>()};
}

void WriteAll(const std::filesystem::path& path, const Data& bytes) {
    std::ofstream out(path, std::ios::binary | std::ios::trunc);
    out.write(reinterpret_cast<const char*>(bytes.data()), static_cast<std::streamsize>(bytes.size()));
    EXPECT_TRUE(out) << path;
}

}  // namespace test_stream
