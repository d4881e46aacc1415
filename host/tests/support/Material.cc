#include "support/Material.h"

#include <stdexcept>

#include "support/CodedMedia.h"
#include "support/Process.h"

namespace endtoend {

std::filesystem::path MakeMaterial(const TemporaryFolder& folder, const MaterialOptions& options) {
    const std::filesystem::path plain = folder.Path() / ("material." + options.container);
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
    command.push_back(plain.string());
    const Outcome outcome = RunProgram(command);
    if (outcome.code != 0) {
        throw std::runtime_error("ffmpeg: " + outcome.errors);
    }
    if (options.picturesPerKlv == 0) {
        return plain;
    }
    const std::filesystem::path withKlv = folder.Path() / "material_klv.ts";
    AddKlvStream(plain, withKlv, options.picturesPerKlv);
    return withKlv;
}

}  // namespace endtoend
