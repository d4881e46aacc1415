// The module's muxers against libavformat's: the same samples, in turns, in one process and one thread.
// Prints one line of JSON. `muxer_race --help` tells the options.

#include <malloc.h>
#include <time.h>

#include <CLI/CLI.hpp>
#include <cstdint>
#include <cstdio>
#include <filesystem>
#include <functional>
#include <memory>
#include <string>

#include "LibavMuxer.h"
#include "MuxerMaterial.h"
#include "boxlib/mbx_stdio.h"
#include "mp4/FileAccess.h"
#include "mp4/Mp4FragmentMuxer.h"
#include "mp4/Mp4NormalMuxer.h"
#include "platform/PlatformInterface.h"
#include "support/TempDir.h"

namespace {

bool counting = false;
std::uint64_t counted = 0;

}  // namespace

namespace clipfileModule {

/// In the place of the library's: files, or a sink that only counts.
FileAccess GetFileAccess() {
    FileAccess access = {};
    MbxStdioCallbacks(&access.callbacks);
    access.open = [](const char* path, std::uint32_t unused, MbxFile** file) {
        return MbxOpenFile(GetPlatform().NativePath(path).c_str(), unused, file);
    };
    if (counting) {
        access.callbacks.write = [](MbxFile*, const void*, std::uint64_t size, std::uint64_t* count) {
            counted += size;
            *count = size;
            return MBX_OK;
        };
        access.callbacks.seek = [](MbxFile*, std::int64_t, std::uint32_t) { return MBX_OK; };
    }
    return access;
}

}  // namespace clipfileModule

namespace {

struct Options {
    double minutes = 1;
    std::size_t pictureBytes = 12500;
    int pairs = 5;
    bool fragmented = false;
    bool spaceCheck = false;
    bool toFile = false;
    bool withoutPeer = false;
};

/// What one file took. `seconds` are of the processor, without the close.
struct Cost {
    double seconds = 0;
    double closeSeconds = 0;
    std::uint64_t heapBytes = 0;
    std::uint64_t samples = 0;
    std::uint64_t bytes = 0;
};

double ProcessorSeconds() {
    timespec now = {};
    clock_gettime(CLOCK_THREAD_CPUTIME_ID, &now);
    return static_cast<double>(now.tv_sec) + static_cast<double>(now.tv_nsec) / 1e9;
}

std::uint64_t HeapBytes() {
    const struct mallinfo2 info = mallinfo2();
    return info.uordblks + info.hblkhd;
}

void Require(bool done, const char* what) {
    if (!done) {
        std::fprintf(stderr, "the muxer failed to %s\n", what);
        std::abort();
    }
}

/// Times `write` for all chunks of the file and `close` behind them. Making the chunks is not counted.
Cost Time(const Options& options,
          const std::function<void(const std::shared_ptr<clipfileModule::ChunkData>&)>& write,
          const std::function<void()>& close) {
    constexpr std::size_t kBatch = 64;
    muxer_material::Chunks chunks(options.pictureBytes);
    const auto count =
        static_cast<std::uint64_t>(options.minutes * 60 * muxer_material::kPictureTimescale /
                                   muxer_material::kPictureTicks / muxer_material::kPicturesPerChunk);
    Cost cost;
    const std::uint64_t heapBefore = HeapBytes();
    for (std::uint64_t done = 0; done < count;) {
        std::vector<std::shared_ptr<clipfileModule::ChunkData>> batch;
        for (; batch.size() < kBatch && done < count; ++done) {
            batch.push_back(chunks.Next());
            cost.samples +=
                batch.back()->video.size() + batch.back()->audio.size() + batch.back()->meta.size();
        }
        const double begin = ProcessorSeconds();
        for (const auto& chunk : batch) {
            write(chunk);
        }
        cost.seconds += ProcessorSeconds() - begin;
    }
    cost.heapBytes = HeapBytes() - heapBefore;
    const double begin = ProcessorSeconds();
    close();
    cost.closeSeconds = ProcessorSeconds() - begin;
    return cost;
}

clipfileModule::OutputSettings Settings(const TempDir& directory) {
    const auto nal = [](const std::vector<unsigned char>& bytes) {
        nal_access::NalUnit unit;
        unit.size = bytes.size();
        unit.data.reset(new unsigned char[bytes.size()], std::default_delete<unsigned char[]>());
        std::copy(bytes.begin(), bytes.end(), unit.data.get());
        return unit;
    };
    clipfileModule::OutputSettings settings;
    settings.outputPath = directory.ModulePath();
    settings.framerate = 59940;
    settings.width = 1920;
    settings.height = 1080;
    settings.bitrate = 6000000;
    settings.sps = nal(muxer_material::kSequenceSet);
    settings.pps = nal(muxer_material::kPictureSet);
    return settings;
}

Cost TimeOurs(const Options& options) {
    const TempDir directory;
    std::unique_ptr<clipfileModule::Mp4Muxer> muxer;
    if (options.fragmented) {
        muxer = std::make_unique<clipfileModule::Mp4FragmentMuxer>();
    } else {
        muxer = std::make_unique<clipfileModule::Mp4NormalMuxer>();
    }
    constexpr unsigned char kTimecode[] = {1, 0, 0, 0};
    counted = 0;
    Require(muxer->Initialize() && muxer->Open(Settings(directory), kTimecode, true), "open a file");
    const auto write = [&](const std::shared_ptr<clipfileModule::ChunkData>& chunk) {
        if (options.spaceCheck) {
            Require(muxer->GetBoxSize() != 0, "measure");
        }
        Require(muxer->Write(chunk), "write a chunk");
    };
    const auto close = [&] { Require(muxer->WriteTmcd(kTimecode) && muxer->Close(), "close the file"); };
    Cost cost = Time(options, write, close);
    cost.bytes = counting ? counted : std::filesystem::file_size(directory.Path() / "01_00_00_00.MP4");
    muxer->Uninitialize();
    return cost;
}

Cost TimeTheirs(const Options& options) {
    const TempDir directory;
    const std::string path = options.toFile ? (directory.Path() / "peer.mp4").string() : std::string();
    LibavMuxer muxer(path, options.fragmented);
    Cost cost = Time(
        options, [&](const std::shared_ptr<clipfileModule::ChunkData>& chunk) { muxer.Write(*chunk); },
        [&] { muxer.Close(); });
    cost.bytes = options.toFile ? std::filesystem::file_size(path) : muxer.Bytes();
    return cost;
}

void Print(const char* name, const std::vector<Cost>& costs) {
    std::printf("\"%s\": [", name);
    for (const Cost& cost : costs) {
        const auto samples = static_cast<double>(cost.samples);
        std::printf(
            "%s{\"ns_per_sample\": %.1f, \"mb_per_second\": %.1f, \"heap_bytes_per_sample\": %.2f, "
            "\"close_ms\": %.3f, \"samples\": %llu, \"bytes\": %llu}",
            &cost == &costs.front() ? "" : ", ", cost.seconds / samples * 1e9,
            static_cast<double>(cost.bytes) / 1e6 / (cost.seconds + cost.closeSeconds),
            static_cast<double>(cost.heapBytes) / samples, cost.closeSeconds * 1e3,
            static_cast<unsigned long long>(cost.samples), static_cast<unsigned long long>(cost.bytes));
    }
    std::printf("]");
}

}  // namespace

int main(int argc, char** argv) {
    Options options;
    CLI::App app("muxer_race: the module's muxers against libavformat's");
    app.add_option("--minutes", options.minutes, "length of the file")->check(CLI::PositiveNumber);
    app.add_option("--picture-bytes", options.pictureBytes, "mean size of a picture");
    app.add_option("--pairs", options.pairs, "files of each, in turns")->check(CLI::PositiveNumber);
    app.add_flag("--fragmented", options.fragmented, "fragmented files");
    app.add_flag("--space-check", options.spaceCheck, "ours measures its closing boxes at each chunk");
    app.add_flag("--to-file", options.toFile,
                 "into files of the temporary folder; without, into a sink that counts");
    app.add_flag("--without-peer", options.withoutPeer, "ours alone");
    CLI11_PARSE(app, argc, argv);
    counting = !options.toFile;
    std::vector<Cost> ours;
    std::vector<Cost> theirs;
    for (int pair = 0; pair < options.pairs; ++pair) {
        ours.push_back(TimeOurs(options));
        if (!options.withoutPeer) {
            theirs.push_back(TimeTheirs(options));
        }
    }
    std::printf("{");
    Print("ours", ours);
    std::printf(", ");
    Print("peer", theirs);
    std::printf("}\n");
    return 0;
}
