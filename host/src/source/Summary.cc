#include "source/Summary.h"

#include <array>
#include <cstdio>

namespace receiver {

std::string VideoSummary(const std::string& codec, const SourceDescription& description) {
    std::array<char, 64> rate{};
    std::snprintf(rate.data(), rate.size(), "%ux%u %.5g fps", description.width, description.height,
                  static_cast<double>(description.frameRate.key) / 1000);
    return codec + " " + rate.data();
}

VideoEncoding EncodingOf(const SourceOptions& options, const SourceDescription& source) {
    VideoEncoding encoding;
    encoding.frameRate = options.frameRate.value_or(source.frameRate);
    encoding.width = options.width.value_or(source.width);
    encoding.height = options.height.value_or(source.height);
    encoding.bitrate = options.bitrate;
    encoding.pictureGroup =
        options.pictureGroup != 0 ? options.pictureGroup : encoding.frameRate.timecodeFrames;
    return encoding;
}

}  // namespace receiver
