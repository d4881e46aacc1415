#include "support/Material.h"

#include <unistd.h>

#include <cstdint>
#include <stdexcept>

#include "support/CodedMedia.h"
#include "support/Process.h"

namespace endtoend {
namespace {

namespace fs = std::filesystem;

/// FNV-1a, which is the same in every process. A command that never changes always has the same name.
std::string NameOf(const std::vector<std::string>& command) {
    std::uint64_t hash = 0xCBF29CE484222325;
    for (const std::string& word : command) {
        for (const char character : word + '\n') {
            hash = (hash ^ static_cast<unsigned char>(character)) * 0x100000001B3;
        }
    }
    return std::to_string(hash);
}

/// What `command` writes to the file that it is given as its last argument. It is made once for all tests of
/// a build, since each test is a process of its own and most of them want the same.
fs::path MadeOnce(std::vector<std::string> command, const std::string& extension) {
    const fs::path made = fs::path(TEST_MATERIAL_FOLDER) / (NameOf(command) + "." + extension);
    if (fs::exists(made)) {
        return made;
    }
    fs::create_directories(made.parent_path());
    // Another test may make the same at this moment: whoever is last replaces it by its equal.
    const fs::path mine =
        made.parent_path() / (made.stem().string() + "." + std::to_string(getpid()) + "." + extension);
    command.push_back(mine.string());
    const Outcome outcome = RunProgram(command);
    if (outcome.code != 0) {
        throw std::runtime_error("ffmpeg: " + outcome.errors);
    }
    fs::rename(mine, made);
    return made;
}

}  // namespace

fs::path MakeMaterial(const TemporaryFolder& folder, const MaterialOptions& options) {
    const fs::path plain = folder.Path() / ("material." + options.container);
    std::vector<std::string> command = {
        "ffmpeg",       "-v",
        "error",        "-y",
        "-f",           "lavfi",
        "-i",           "testsrc2=size=" + options.size + ":rate=" + options.rate,
        "-f",           "lavfi",
        "-i",           options.sound,
        "-t",           std::to_string(options.seconds),
        "-c:v",         "libx264",
        "-preset",      "ultrafast",
        "-threads",     "1",
        "-bf",          "0",
        "-pix_fmt",     "yuv420p",
        "-g",           std::to_string(options.pictureGroup),
        "-x264-params", "scenecut=0:open-gop=0",
        "-c:a",         "aac",
        "-ac",          "2",
        "-b:a",         "96k",
    };
    command.insert(command.end(), options.more.begin(), options.more.end());
    fs::copy_file(MadeOnce(command, options.container), plain, fs::copy_options::overwrite_existing);
    if (options.picturesPerKlv == 0) {
        return plain;
    }
    const fs::path withKlv = folder.Path() / "material_klv.ts";
    AddKlvStream(plain, withKlv, options.picturesPerKlv);
    return withKlv;
}

}  // namespace endtoend
