#include "RunSettings.h"

#include "common/ReceiverError.h"

namespace receiver {
namespace {

void CheckTimecode(const Options& options, const FrameRate& rate) {
    if (!options.timecode) {
        return;
    }
    if (!IsValid(*options.timecode, rate.timecodeFrames) ||
        (options.timecode->dropFrame && !rate.dropFrame)) {
        throw ReceiverError(ExitCode::kUsage,
                            "--timecode " + ToString(*options.timecode) +
                                " does not exist at the frame rate of the source, which counts " +
                                std::to_string(rate.timecodeFrames) + " frames a second.");
    }
}

}  // namespace

void CheckUser(const Options& options, const OutputPlace& place) {
    if (options.user && !place.onShare) {
        throw ReceiverError(
            ExitCode::kUsage,
            "--user goes with a folder on a network share, such as //server/share/folder, and "
            "the output folder '" +
                place.folder + "' is none.");
    }
}

StartParameters ParametersOf(const Options& options, const OutputPlace& place,
                             const SourceDescription& description) {
    StartParameters parameters;
    parameters.texts = {{"-outputPath", place.parameter},
                        {"-fileType", options.fileType},
                        {"-naluType", options.naluType},
                        {"-outputMode", options.mode == OutputMode::kOn ? "on" : "sync"},
                        {"-recordRules", "exact"}};
    const auto add = [&](const char* key, const std::optional<std::string>& value) {
        if (value) {
            parameters.texts[key] = *value;
        }
    };
    if (description.reordering > 0) {
        parameters.texts["-pictureOrder"] = "decoding";
    }
    add("-filePrefix", options.prefix);
    add("-userName", options.user);
    add("-password", options.password);
    parameters.numbers = {{"-encodedHeight", static_cast<int>(description.height)},
                          {"-encodedWidth", static_cast<int>(description.width)},
                          {"-encodedFPS", static_cast<int>(description.frameRate.key)}};
    if (description.bitrate != 0) {
        parameters.numbers["-encodedBPS"] = static_cast<int>(description.bitrate);
    }
    return parameters;
}

Recorder::Settings RecorderSettingsOf(const Options& options, const FrameRate& rate) {
    CheckTimecode(options, rate);
    Recorder::Settings settings;
    settings.mode = options.mode;
    settings.frameRate = rate;
    settings.timecode = options.timecode;
    settings.dropFrame = options.dropFrame;
    if (settings.timecode && rate.dropFrame && options.dropFrame) {
        // The rate asks for drop frame, also where the address was written with a colon.
        settings.timecode->dropFrame = true;
        if (!IsValid(*settings.timecode, rate.timecodeFrames)) {
            throw ReceiverError(ExitCode::kUsage, "--timecode " + ToString(*options.timecode) +
                                                      " is left out by the drop-frame rule; choose another "
                                                      "one, or forbid drop frame with --no-drop-frame.");
        }
    }
    if (options.seconds) {
        settings.length = static_cast<std::int64_t>(*options.seconds * static_cast<double>(kVideoClock));
    }
    settings.fragments = options.fileType == "fragment";
    settings.followDisk = !IsLive(options.source.url);
    return settings;
}

}  // namespace receiver
