// The smallest host: loads the module, pushes a picture and a sound that lie on the disk as a receiver would
// get them live, and has them recorded from the first frame to the last.
//
//     ffmpeg -f lavfi -i testsrc2=rate=25:size=640x360:duration=4 -c:v libx264 -bf 0 -g 25 -pix_fmt yuv420p \
//         -bsf:v h264_metadata=aud=insert pictures.h264
//     ffmpeg -f lavfi -i sine=sample_rate=48000:duration=4 -ac 2 -c:a aac sound.aac
//     example_host pictures.h264 sound.aac /tmp/recordings

#include <QxModuleInterface.h>
#include <dlfcn.h>

#include <algorithm>
#include <chrono>
#include <cstdint>
#include <cstdlib>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <iostream>
#include <iterator>
#include <memory>
#include <mutex>
#include <stdexcept>
#include <string>
#include <thread>
#include <vector>

namespace {

using Bytes = std::vector<unsigned char>;

constexpr int kPicturesPerSecond = 25;

/// Answers the module. Its operations come from several threads at once.
class ExampleHost : public QxModuleHostInterface {
 public:
    explicit ExampleHost(std::string folder) : folder_(std::move(folder)) {
        // The module separates folders by backslashes.
        std::replace(folder_.begin(), folder_.end(), '/', '\\');
    }

    void SetStatus(int status, int cause) override {
        const std::lock_guard<std::mutex> lock(mutex_);
        status_ = status;
        std::cerr << "status " << status << ", cause " << cause << '\n';
    }
    int GetStatus() override {
        const std::lock_guard<std::mutex> lock(mutex_);
        return status_;
    }
    void GetParameter(std::string key, int& value, int defaultValue) override {
        value = key == "-encodedFPS"      ? kPicturesPerSecond * 1000
                : key == "-encodedWidth"  ? 640
                : key == "-encodedHeight" ? 360
                                          : defaultValue;
    }
    void GetParameter(std::string key, std::string& value, std::string defaultValue) override {
        value = key == "-outputPath"    ? folder_
                : key == "-filePrefix"  ? "EXAMPLE"
                : key == "-outputMode"  ? "on"
                : key == "-recordRules" ? "exact"
                                        : defaultValue;
    }
    int SendTransmissionStatus(const std::map<std::string, std::string>& /*status*/) override { return 0; }

 private:
    std::string folder_;
    std::mutex mutex_;
    int status_ = 0;
};

Bytes ReadFile(const char* name) {
    std::ifstream file(name, std::ios::binary);
    if (!file) {
        throw std::runtime_error(std::string("cannot read ") + name);
    }
    return {std::istreambuf_iterator<char>(file), {}};
}

/// Access units of an Annex B byte stream in which each begins with a delimiter (ISO/IEC 14496-10 7.3.2.4).
std::vector<Bytes> SplitPictures(const Bytes& stream) {
    const unsigned char delimiter[] = {0, 0, 0, 1, 9};
    std::vector<Bytes> units;
    for (auto begin = stream.begin(); begin != stream.end();) {
        const auto end = std::search(begin + 1, stream.end(), std::begin(delimiter), std::end(delimiter));
        units.emplace_back(begin, end);
        begin = end;
    }
    return units;
}

/// Frames of AAC with ADTS headers, which tell their length (ISO/IEC 13818-7 6.2).
std::vector<Bytes> SplitSound(const Bytes& stream) {
    std::vector<Bytes> frames;
    for (std::size_t at = 0; at + 7 <= stream.size();) {
        const std::size_t size = (stream[at + 3] & 3u) << 11 | stream[at + 4] << 3 | stream[at + 5] >> 5;
        if (size < 7 || at + size > stream.size()) {
            throw std::runtime_error("the sound is no AAC with ADTS headers");
        }
        frames.emplace_back(stream.begin() + static_cast<std::ptrdiff_t>(at),
                            stream.begin() + static_cast<std::ptrdiff_t>(at + size));
        at += size;
    }
    return frames;
}

/// The metadata of a frame: a packet with a local set that has its timecode (docs/metadata-format.md).
Bytes MakeMetadata(std::size_t frame) {
    const std::size_t seconds = frame / kPicturesPerSecond;
    Bytes packet = {1,    0x06, 0x0E, 0x2B, 0x34, 0x02, 0x53, 0x01, 0x01, 0x0C, 0x02, 0x01, 0x01, 0x7F,
                    0x01, 0x00, 0x00, 29,   0xE0, 0x00, 0x00, 0x10, 0x9B, 0x1F, 0x5C, 0x2E, 0x4D, 0x60,
                    0x4A, 0x17, 0xA6, 0x3B, 0x0E, 0x72, 0xD8, 0x41, 0xC5, 0x93, 0xE1, 0x02, 0x00, 0x05};
    packet.push_back(10);
    packet.push_back(static_cast<unsigned char>(seconds / 60 % 60));
    packet.push_back(static_cast<unsigned char>(seconds % 60));
    packet.push_back(static_cast<unsigned char>(frame % kPicturesPerSecond));
    packet.push_back(0);
    return packet;
}

/// `rtpTimestamp` counts at 90000 a second, at 48000 for audio; `milliseconds` is the same instant.
std::shared_ptr<StreamData> MakeUnit(const Bytes& payload, std::uint64_t rtpTimestamp,
                                     std::uint64_t milliseconds) {
    auto unit = std::make_shared<StreamData>();
    unit->rtp_timestamp = rtpTimestamp;
    unit->timestamp = milliseconds;
    unit->size = payload.size();
    unit->data = {new unsigned char[payload.size()], std::default_delete<unsigned char[]>()};
    std::memcpy(unit->data.get(), payload.data(), payload.size());
    unit->payload = unit->data.get();
    return unit;
}

void Push(QxModuleStreamInterface& stream, const std::vector<Bytes>& pictures,
          const std::vector<Bytes>& sound) {
    const auto begin = std::chrono::steady_clock::now();
    std::size_t sounds = 0;
    for (std::size_t picture = 0; picture < pictures.size(); ++picture) {
        const std::uint64_t milliseconds = picture * 1000 / kPicturesPerSecond;
        std::this_thread::sleep_until(begin + std::chrono::milliseconds(milliseconds));
        for (; sounds < sound.size() && sounds * 1024 * 1000 / 48000 <= milliseconds; ++sounds) {
            stream.PushAudio(MakeUnit(sound[sounds], sounds * 1024, sounds * 1024 * 1000 / 48000));
        }
        const std::uint64_t rtpTimestamp = picture * 90000 / kPicturesPerSecond;
        stream.PushMeta(MakeUnit(MakeMetadata(picture), rtpTimestamp, milliseconds));
        stream.PushVideo(MakeUnit(pictures[picture], rtpTimestamp, milliseconds));
    }
}

int Record(const char* pictures, const char* sound, const char* folder) {
    const std::vector<Bytes> pictureUnits = SplitPictures(ReadFile(pictures));
    const std::vector<Bytes> soundFrames = SplitSound(ReadFile(sound));
    // It stays loaded: a thread that hangs on a disk may outlive every stop.
    void* const library = dlopen(CLIPFILE_MODULE, RTLD_NOW | RTLD_LOCAL | RTLD_NODELETE);
    if (library == nullptr) {
        throw std::runtime_error(dlerror());
    }
    const auto entry =
        reinterpret_cast<bool (*)(QxModuleInterface**)>(dlsym(library, "GetQxModuleInterface"));
    QxModuleInterface* module = nullptr;
    if (entry == nullptr || !entry(&module)) {
        throw std::runtime_error(CLIPFILE_MODULE " is no output module");
    }
    // The module makes folders under it, and looks for room in it before.
    std::filesystem::create_directories(folder);
    ExampleHost host(std::filesystem::absolute(folder).string());
    if (!module->Initialize(&host)) {
        return EXIT_FAILURE;
    }
    QxModuleStreamInterface* stream = nullptr;
    QxModuleNotifyInterface* notify = nullptr;
    module->GetStreamInterface(&stream);
    module->GetNotifyInterface(&notify);
    module->Execute();
    notify->NotifyOnlineStatus();
    Push(*stream, pictureUnits, soundFrames);
    notify->NotifyOfflineStatus();
    module->Uninitialize();
    return host.GetStatus() == 7 ? EXIT_FAILURE : EXIT_SUCCESS;
}

}  // namespace

int main(int argc, char** argv) {
    if (argc != 4) {
        std::cerr << "usage: example_host PICTURES.h264 SOUND.aac FOLDER\n";
        return EXIT_FAILURE;
    }
    try {
        return Record(argv[1], argv[2], argv[3]);
    } catch (const std::exception& error) {
        std::cerr << "example_host: " << error.what() << '\n';
        return EXIT_FAILURE;
    }
}
