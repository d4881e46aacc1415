#include "inspect/Plot.h"

#include <algorithm>
#include <array>
#include <cstdio>
#include <ostream>
#include <string>

#include "common/ToolError.h"
#include "reader/BigEndian.h"
#include "reader/FormatError.h"
#include "reader/RecordingSamples.h"

namespace clipfile {

namespace {

// Pixels.
constexpr int kWidth = 1000;
constexpr int kLeft = 90;
constexpr int kPanel = 160;
constexpr int kGap = 60;
constexpr int kTop = 60;
/// Dots of a curve.
constexpr std::size_t kDots = 800;

/// The largest value of each stretch of time.
class Curve {
 public:
    Curve(const char* name, const char* color, double seconds)
        : name_(name), color_(color), seconds_(std::max(seconds, 1e-6)) {}

    void Add(double second, double value) {
        const double place = std::clamp(second / seconds_, 0.0, 1.0) * (kDots - 1);
        double& dot = dots_[static_cast<std::size_t>(place)];
        dot = std::max(dot, value);
        largest_ = std::max(largest_, value);
    }
    double Largest() const { return largest_; }
    const char* Name() const { return name_; }
    const char* Color() const { return color_; }
    /// The points of a line in a panel whose bottom is at `bottom`. Stretches without a value are left out.
    std::string Points(int bottom, double scale) const {
        std::string points;
        for (std::size_t i = 0; i < kDots; ++i) {
            if (dots_[i] >= 0) {
                std::array<char, 48> text = {};
                std::snprintf(text.data(), text.size(), "%.1f,%.1f ",
                              kLeft + static_cast<double>(i) * (kWidth - kLeft - 10) / (kDots - 1),
                              bottom - dots_[i] * scale);
                points += text.data();
            }
        }
        return points;
    }

 private:
    static constexpr std::array<double, kDots> Empty() {
        std::array<double, kDots> dots = {};
        dots.fill(-1);
        return dots;
    }

    const char* name_;
    const char* color_;
    double seconds_;
    double largest_ = 0;
    std::array<double, kDots> dots_ = Empty();
};

/// Times of a track in seconds.
double SecondsOf(const Track& track, std::uint64_t ticks) {
    return track.timescale == 0 ? 0 : static_cast<double>(ticks) / track.timescale;
}

/// Goes through the samples that are in the file.
template <typename Visit>
void ForEachSample(const InputFile& file, const Inspection& inspection, const TrackSummary& track,
                   Visit visit) {
    const auto place = static_cast<std::size_t>(&track - inspection.tracks.data());
    RecordingSamples samples(file, inspection.recording, place);
    for (std::uint64_t i = 0; i < track.samples; ++i) {
        const auto sample = samples.Next();
        if (!sample) {
            break;
        }
        visit(*sample);
    }
}

/// The values of all curves.
struct Curves {
    explicit Curves(double seconds)
        : sizes{"all pictures", "#4477aa", seconds},
          idrSizes{"IDR pictures", "#cc3311", seconds},
          groups{"pictures in a group", "#228833", seconds},
          chunks{"video", "#4477aa", seconds},
          audioChunks{"audio", "#ee7733", seconds} {}

    Curve sizes;
    Curve idrSizes;
    Curve groups;
    Curve chunks;
    Curve audioChunks;
};

void AddPictures(const InputFile& file, const Inspection& inspection, const TrackSummary& video,
                 Curves& curves) {
    constexpr double kKilobyte = 1000;
    double groupBegin = 0;
    std::uint64_t group = 0;
    const auto endGroup = [&] {
        if (group != 0) {
            curves.groups.Add(groupBegin, static_cast<double>(group));
        }
    };
    ForEachSample(file, inspection, video, [&](const Sample& sample) {
        const double second = SecondsOf(video.track, sample.time);
        curves.sizes.Add(second, sample.size / kKilobyte);
        if (sample.isSync) {
            curves.idrSizes.Add(second, sample.size / kKilobyte);
            endGroup();
            groupBegin = second;
            group = 0;
        }
        ++group;
    });
    endGroup();
}

void AddChunks(const InputFile& file, const Inspection& inspection, const TrackSummary& track, Curve& curve) {
    constexpr double kMilliseconds = 1000;
    std::optional<Sample> first;
    std::uint64_t end = 0;
    const auto endChunk = [&] {
        if (first) {
            curve.Add(SecondsOf(track.track, first->time),
                      SecondsOf(track.track, end - first->time) * kMilliseconds);
        }
    };
    ForEachSample(file, inspection, track, [&](const Sample& sample) {
        if (!first || sample.run != first->run) {
            endChunk();
            first = sample;
        }
        end = sample.time + sample.duration;
    });
    endChunk();
}

std::string Escaped(const std::string& text) {
    std::string escaped;
    for (const char letter : text) {
        switch (letter) {
            case '&':
                escaped += "&amp;";
                break;
            case '<':
                escaped += "&lt;";
                break;
            case '>':
                escaped += "&gt;";
                break;
            default:
                // XML has no control characters, and the other bytes of a name need not be UTF-8.
                escaped += letter >= ' ' && letter != 0x7F ? letter : '?';
        }
    }
    return escaped;
}

void PrintText(std::ostream& out, int x, int y, const std::string& text, const std::string& more = "") {
    out << "<text x=\"" << x << "\" y=\"" << y << "\"" << more << ">" << Escaped(text) << "</text>\n";
}

void PrintPanel(std::ostream& out, int number, const std::string& title, double seconds,
                std::initializer_list<const Curve*> curves) {
    const int top = kTop + number * (kPanel + kGap);
    const int bottom = top + kPanel;
    double largest = 0;
    for (const Curve* const curve : curves) {
        largest = std::max(largest, curve->Largest());
    }
    PrintText(out, kLeft, top - 8, title);
    int x = kWidth - 10;
    for (const Curve* const curve : curves) {
        PrintText(out, x, top - 8, curve->Name(),
                  std::string(" text-anchor=\"end\" fill=\"") + curve->Color() + "\"");
        x -= 140;
    }
    std::array<char, 32> text = {};
    std::snprintf(text.data(), text.size(), "%.4g", largest);
    PrintText(out, kLeft - 6, top + 10, text.data(), " text-anchor=\"end\"");
    PrintText(out, kLeft - 6, bottom, "0", " text-anchor=\"end\"");
    PrintText(out, kLeft, bottom + 16, "0 s");
    std::snprintf(text.data(), text.size(), "%.1f s", seconds);
    PrintText(out, kWidth - 10, bottom + 16, text.data(), " text-anchor=\"end\"");
    out << "<path d=\"M" << kLeft << ' ' << top << "V" << bottom << "H" << kWidth - 10
        << "\" stroke=\"#888\" fill=\"none\"/>\n";
    for (const Curve* const curve : curves) {
        out << "<polyline fill=\"none\" stroke=\"" << curve->Color() << "\" points=\""
            << curve->Points(bottom, largest > 0 ? kPanel / largest : 0) << "\"/>\n";
    }
}

}  // namespace

void PrintPlot(std::ostream& out, const InputFile& file, const Inspection& inspection) {
    const TrackSummary* const video = inspection.Find(FourCc("vide"));
    if (video == nullptr) {
        throw ToolError(ExitCode::kUnreadable, file.Path().string() +
                                                   " gives no plot: it has no index yet, which 'recover' "
                                                   "makes.");
    }
    const double seconds = video->Seconds();
    Curves curves(seconds);
    AddPictures(file, inspection, *video, curves);
    AddChunks(file, inspection, *video, curves.chunks);
    if (const TrackSummary* const audio = inspection.Find(FourCc("soun"))) {
        AddChunks(file, inspection, *audio, curves.audioChunks);
    }
    out << "<svg xmlns=\"http://www.w3.org/2000/svg\" width=\"" << kWidth << "\" height=\""
        << kTop + 3 * (kPanel + kGap) << "\" font-family=\"sans-serif\" font-size=\"13\">\n"
        << "<rect width=\"100%\" height=\"100%\" fill=\"white\"/>\n";
    PrintText(out, kLeft, 24, inspection.path, " font-weight=\"bold\"");
    PrintPanel(out, 0, "size of pictures, kilobytes", seconds, {&curves.sizes, &curves.idrSizes});
    PrintPanel(out, 1, "pictures from one IDR picture to the next", seconds, {&curves.groups});
    PrintPanel(out, 2, "time of a chunk, milliseconds", seconds, {&curves.chunks, &curves.audioChunks});
    out << "</svg>\n";
}

}  // namespace clipfile
