// Files on a share are those of a local disk, byte for byte.

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <chrono>
#include <cstddef>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <map>
#include <memory>
#include <ostream>
#include <string>

#include "support/CodedMedia.h"
#include "support/FileOutputFixture.h"
#include "support/MuxerStream.h"
#include "support/SambaServer.h"

namespace clipfileModule {
namespace {

using ::testing::Contains;
using ::testing::IsEmpty;
using ::testing::Key;

struct Files {
    const char* fileType;
    unsigned minutesPerFile;
    std::size_t count;
};

void PrintTo(const Files& files, std::ostream* out) {
    *out << files.fileType << ", " << files.minutesPerFile << " min";
}

class ShareFiles : public FileOutputFixture, public ::testing::WithParamInterface<Files> {
 protected:
    static constexpr std::size_t kChunks = 40;

    void SetUp() override {
        platform.Set([](FakePlatform::Hooks& hooks) {
            hooks.availableSpace = nullptr;
            hooks.now = [] {
                return std::chrono::system_clock::time_point(std::chrono::seconds(1795177230));
            };
        });
        media = MakeCodedMedia(dir, 25, 1, kChunks * 8, audioBefore(kChunks));
        settings = muxer_stream::MakeSettings(dir, 25000);
        settings.width = kCodedWidth;
        settings.height = kCodedHeight;
        settings.sps = media.sps;
        settings.pps = media.pps;
        settings.fileType = GetParam().fileType;
        settings.maxFileSize = GetParam().minutesPerFile;
        settings.filePrefix = "Studio \xC3\x84 (2)";
        settings.userName = SambaServer::kUser;
        settings.password = SambaServer::kPassword;
    }

    /// 40 chunks of 8 coded pictures; sound and picture are in step behind each eighth, before an IDR
    /// picture.
    void Record(const std::string& outputPath) {
        settings.outputPath = outputPath;
        Start();
        for (std::size_t i = 0; i < kChunks; ++i) {
            const auto chunk = std::make_shared<ChunkData>();
            const auto at = [](const auto& list, std::size_t n) {
                return list.begin() + static_cast<std::ptrdiff_t>(n);
            };
            chunk->video.assign(at(media.video, 8 * i), at(media.video, 8 * i + 8));
            chunk->audio.assign(at(media.audio, audioBefore(i)), at(media.audio, audioBefore(i + 1)));
            for (std::size_t n = 0; n < 8; ++n) {
                chunk->meta.push_back(muxer_stream::MakeSample(64, static_cast<unsigned char>(8 * i + n)));
            }
            chunk->sync = i % 8 == 7;
            chunk->firstVideo = std::make_shared<StreamData>();
            chunk->firstVideo->rtp_timestamp = i;
            output->PushChunk(chunk);
        }
        Finish();
    }
    /// Audio frames that begin before the chunk.
    static std::size_t audioBefore(std::size_t chunk) {
        return (chunk * 8 * 48000 + 25 * 1024 - 1) / (25 * 1024);
    }

    /// Contents by path under `root`.
    static std::map<std::string, std::string> FilesUnder(const std::filesystem::path& root) {
        std::map<std::string, std::string> files;
        for (const auto& entry : std::filesystem::recursive_directory_iterator(root)) {
            if (entry.is_regular_file()) {
                std::ifstream in(entry.path(), std::ios::binary);
                files[entry.path().lexically_relative(root).string()] = {std::istreambuf_iterator<char>(in),
                                                                         std::istreambuf_iterator<char>()};
            }
        }
        return files;
    }

    CodedMedia media;
    TempDir local;
};

TEST_P(ShareFiles, EqualThoseOfALocalDiskAndPlay) {
    const SambaServer server(SambaServer::Shares{{"My share", {}}});
    const std::filesystem::path folder = server.Folder() / "a folder";
    std::filesystem::create_directory(folder);
    // A trailing separator makes no difference; a second recording at the same timecode gets names of its
    // own.
    for (const char* separator : {"", "\\"}) {
        Record(local.ModulePath() + separator);
        Record(server.Path("My share") + "\\a folder" + separator);
    }
    EXPECT_THAT(Statuses(), IsEmpty());
    EXPECT_THAT(Errors(), IsEmpty());

    const auto recorded = FilesUnder(folder);
    EXPECT_EQ(recorded.size(), 2 * GetParam().count);
    EXPECT_THAT(recorded, Contains(Key("20261120/Studio \xC3\x84 (2)/01_02_03_00.MP4")));
    EXPECT_THAT(recorded, Contains(Key("20261120/Studio \xC3\x84 (2)/01_02_03_00(2).MP4")));
    EXPECT_TRUE(recorded == FilesUnder(local.Path()));
    for (const auto& [name, content] : recorded) {
        SCOPED_TRACE(name);
        const ProgramResult judged =
            RunProgram(dir,
                       "ffprobe -v error -count_frames -select_streams v -show_entries stream=nb_read_frames "
                       "-of csv=p=0 '" +
                           (folder / name).string() + "'");
        EXPECT_EQ(judged.exitCode, 0);
        EXPECT_EQ(judged.errors, "");
        EXPECT_EQ(judged.output.substr(0, judged.output.find_first_of(",\n")),
                  std::to_string(kChunks * 8 / GetParam().count));
    }
}

INSTANTIATE_TEST_SUITE_P(Kinds, ShareFiles,
                         ::testing::Values(Files{"normal", 60, 1}, Files{"normal", 0, 5},
                                           Files{"fragment", 60, 1}, Files{"fragment", 0, 5}),
                         [](const auto& tested) {
                             return std::string(tested.param.fileType) +
                                    (tested.param.minutesPerFile == 0 ? "AtEachSyncPoint" : "OneFile");
                         });

}  // namespace
}  // namespace clipfileModule
