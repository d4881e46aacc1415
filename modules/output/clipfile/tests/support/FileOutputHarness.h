#pragma once

// A file output whose muxers are fakes too.

#include <cstdint>
#include <filesystem>
#include <fstream>
#include <map>
#include <memory>
#include <sstream>
#include <string>
#include <vector>

#include "support/FakeMuxer.h"
#include "support/FileOutputFixture.h"

/// Chunk `number` with 8 video samples, of which the first is a sync sample for `idr`, and with `size` bytes
/// of payload for the fake muxers.
inline std::shared_ptr<clipfileModule::ChunkData> MakeChunk(std::uint64_t number, bool sync = false,
                                                            std::uint64_t size = 10, bool idr = false) {
    auto chunk = std::make_shared<clipfileModule::ChunkData>();
    chunk->size = size;
    chunk->sync = sync;
    for (int i = 0; i < 8; ++i) {
        chunk->video.push_back(std::make_shared<nal_access::SampleData>(
            std::vector<unsigned char>{1, 2, 3, 4}, 0, 0, idr && i == 0));
    }
    chunk->firstVideo = std::make_shared<StreamData>();
    chunk->firstVideo->rtp_timestamp = number;
    chunk->firstMeta = std::make_shared<StreamData>();
    return chunk;
}

class FileOutputTest : public FileOutputFixture {
 protected:
    ~FileOutputTest() override { EndOutput(); }

    void Push(std::uint64_t number, bool sync = false, std::uint64_t size = 10) {
        output->PushChunk(MakeChunk(number, sync, size));
    }

    /// The calls of muxers that contain `part`.
    std::vector<std::string> MuxerCalls(const std::string& part) const {
        std::vector<std::string> calls;
        for (const std::string& call : muxers.Calls()) {
            if (call.find(part) != std::string::npos) {
                calls.push_back(call);
            }
        }
        return calls;
    }

    /// What stands in a file, without the payloads: "open, chunk 0, tmcd 01:02:03:00, closed".
    static std::string Summary(const std::filesystem::path& file) {
        std::ifstream in(file);
        std::string summary;
        for (std::string line; std::getline(in, line);) {
            if (line.empty() || line[0] == '.') {
                continue;
            }
            std::istringstream words(line);
            std::string word;
            std::string value;
            words >> word >> value;
            summary += (summary.empty() ? "" : ", ") + word + (value.empty() ? "" : " " + value);
        }
        return summary;
    }
    /// Everything on disk, directories with a slash behind, by path under the output path: summaries of
    /// files.
    std::map<std::string, std::string> Disk() const { return DiskUnder(dir.Path()); }
    static std::map<std::string, std::string> DiskUnder(const std::filesystem::path& root) {
        std::map<std::string, std::string> disk;
        for (const auto& entry : std::filesystem::recursive_directory_iterator(root)) {
            const std::string path = entry.path().lexically_relative(root).string();
            if (entry.is_directory()) {
                disk[path + "/"] = "";
            } else {
                disk[path] = entry.is_regular_file() ? Summary(entry.path()) : "not a file";
            }
        }
        return disk;
    }

    FakeMuxers muxers;
};
