// Fragmented files of the exact rules, closed, left open and torn, before two programs that read every sample
// of them: ffprobe and GStreamer's demuxer.

#include <gtest/gtest.h>

#include <cstddef>
#include <fstream>
#include <map>
#include <sstream>
#include <string>

#include "support/BoxFinder.h"
#include "support/CodedRecording.h"

namespace clipfileModule {
namespace {

/// 64 chunks are in the file before it is closed, in `moov` and one fragment; 8 follow on closing.
constexpr std::size_t kClosedChunks = 72;
constexpr std::size_t kFlushedChunks = 64;
constexpr std::size_t kPictures = 8 * kClosedChunks;
constexpr std::size_t kFlushedPictures = 8 * kFlushedChunks;
constexpr std::size_t kPicturesInMoov = 8 * 32;

constexpr RecordingPlan kPlan = {"fragment", RecordRules::kExact, 25000, 25000, 1000, false, kClosedChunks};

/// Counts the samples that come out of each of the demuxer's pads until its end of stream.
constexpr const char* kDemuxerScript = R"(
import gi, sys
gi.require_version('Gst', '1.0')
from gi.repository import Gst
Gst.init(None)
pipeline = Gst.Pipeline()
source = Gst.ElementFactory.make('filesrc')
source.set_property('location', sys.argv[1])
demuxer = Gst.ElementFactory.make('qtdemux')
pipeline.add(source)
pipeline.add(demuxer)
source.link(demuxer)
counts = {}

def added(_, pad):
    name = pad.get_name()
    counts[name] = 0
    def count(_, info):
        counts[name] += 1
        return Gst.PadProbeReturn.OK
    pad.add_probe(Gst.PadProbeType.BUFFER, count)
    sink = Gst.ElementFactory.make('fakesink')
    sink.set_property('async', False)
    pipeline.add(sink)
    sink.sync_state_with_parent()
    pad.link(sink.get_static_pad('sink'))

demuxer.connect('pad-added', added)
pipeline.set_state(Gst.State.PLAYING)
end = pipeline.get_bus().timed_pop_filtered(60 * Gst.SECOND, Gst.MessageType.EOS | Gst.MessageType.ERROR)
pipeline.set_state(Gst.State.NULL)
if end is None or end.type != Gst.MessageType.EOS:
    sys.exit('no end of stream' if end is None else str(end.parse_error()))
for name in sorted(counts):
    print(name, counts[name])
)";

struct Samples {
    std::size_t video;
    std::size_t audio;
    std::size_t meta;

    bool operator==(const Samples&) const = default;
};

std::ostream& operator<<(std::ostream& out, const Samples& samples) {
    return out << samples.video << " pictures, " << samples.audio << " frames of audio, " << samples.meta
               << " units of metadata";
}

class JudgedFragments : public ::testing::Test {
 protected:
    Samples flushed() const {
        return {kFlushedPictures, recorded.AudioBefore(kFlushedChunks), kFlushedPictures};
    }
    /// A copy of the file as it is on disk by now, or of its first bytes.
    std::filesystem::path copy(std::size_t size = std::string::npos) {
        const muxer_stream::Bytes bytes = muxer_stream::ReadFile(recorded.Path());
        const std::filesystem::path path = recorded.Work().Path() / "copy.MP4";
        std::ofstream out(path, std::ios::binary);
        out.write(reinterpret_cast<const char*>(bytes.data()),
                  static_cast<std::streamsize>(std::min(size, bytes.size())));
        return path;
    }
    Samples ofFfprobe(const std::filesystem::path& path) {
        return count(
            "ffprobe -v quiet -count_packets -show_entries stream=index,nb_read_packets"
            " -of default=nw=1:nk=1 '" +
                path.string() + "'",
            "0", "1", "3");
    }
    Samples ofGStreamer(const std::filesystem::path& path) {
        const std::filesystem::path script = recorded.Work().Path() / "demux.py";
        std::ofstream(script) << kDemuxerScript;
        // The bindings belong to the system's own Python, which need not be the first of the path.
        return count("/usr/bin/python3 '" + script.string() + "' '" + path.string() + "'", "video_0",
                     "audio_0", "meta_0");
    }

    CodedRecording recorded;

 private:
    /// Of a program that prints names of tracks and numbers in turn.
    Samples count(const std::string& command, const char* video, const char* audio, const char* meta) {
        const ProgramResult judged = RunProgram(recorded.Work(), command);
        EXPECT_EQ(judged.exitCode, 0) << judged.errors;
        std::map<std::string, std::size_t> counts;
        std::istringstream in(judged.output);
        for (std::string name, number; in >> name >> number;) {
            counts[name] = number == "N/A" ? 0 : std::stoul(number);
        }
        return {counts[video], counts[audio], counts[meta]};
    }
};

TEST_F(JudgedFragments, AClosedFileIsReadWhole) {
    recorded.Record(kPlan);
    recorded.Close();
    const Samples all = {kPictures, recorded.AudioBefore(kClosedChunks), kPictures};
    EXPECT_EQ(ofFfprobe(recorded.Path()), all);
    EXPECT_EQ(ofGStreamer(recorded.Path()), all);
}

TEST_F(JudgedFragments, AnOpenFileIsReadUpToItsLastFragment) {
    recorded.Record(kPlan);
    const auto path = copy();
    EXPECT_EQ(ofFfprobe(path), flushed());
    EXPECT_EQ(ofGStreamer(path), flushed());
}

TEST_F(JudgedFragments, AFileTornInTheSamplesOfAFragmentIsReadUpToThere) {
    recorded.Record(kPlan);
    const auto mdat = box_finder::Find(muxer_stream::ReadFile(recorded.Path()), "mdat:2");
    const auto path = copy(mdat.offset + mdat.size / 2);
    for (const Samples& samples : {ofFfprobe(path), ofGStreamer(path)}) {
        EXPECT_GE(samples.video, kPicturesInMoov);
        EXPECT_LT(samples.video, kFlushedPictures);
        EXPECT_GE(samples.audio, recorded.AudioBefore(32));
        EXPECT_GE(samples.meta, kPicturesInMoov);
    }
}

TEST_F(JudgedFragments, AFileTornInTheIndexOfAFragmentIsReadUpToItByGStreamer) {
    recorded.Record(kPlan);
    const auto moof = box_finder::Find(muxer_stream::ReadFile(recorded.Path()), "moof");
    EXPECT_EQ(ofGStreamer(copy(moof.offset + moof.size / 2)),
              (Samples{kPicturesInMoov, recorded.AudioBefore(32), kPicturesInMoov}));
}

TEST_F(JudgedFragments, AudioAndMetadataThatBeginAfterTheFirstFragmentAreReadOpenAndClosed) {
    RecordingPlan plan = kPlan;
    plan.silentChunks = 40;
    plan.chunksWithoutMeta = 48;
    recorded.Record(plan);
    const std::size_t silent = recorded.AudioBefore(40);
    const Samples open = {kFlushedPictures, recorded.AudioBefore(kFlushedChunks) - silent, 8 * (64 - 48)};
    const auto path = copy();
    EXPECT_EQ(ofFfprobe(path), open);
    EXPECT_EQ(ofGStreamer(path), open);
    recorded.Close();
    const Samples closed = {kPictures, recorded.AudioBefore(kClosedChunks) - silent,
                            8 * (kClosedChunks - 48)};
    EXPECT_EQ(ofFfprobe(recorded.Path()), closed);
    EXPECT_EQ(ofGStreamer(recorded.Path()), closed);
}

TEST_F(JudgedFragments, AnOpenFileOfTheTimecodesFragmentIsRead) {
    // Closing has written its last fragment, and dies before `moov` is written again.
    recorded.Record(kPlan);
    const muxer_stream::Bytes open = muxer_stream::ReadFile(recorded.Path());
    recorded.Close();
    muxer_stream::Bytes bytes = muxer_stream::ReadFile(recorded.Path());
    const auto moov = box_finder::Find(open, "moov");
    const auto mfra = box_finder::Find(bytes, "mfra");
    std::copy(moov.payload.begin(), moov.payload.end(),
              bytes.begin() + static_cast<std::ptrdiff_t>(moov.offset + moov.header));
    bytes.resize(mfra.offset);
    const std::filesystem::path path = recorded.Work().Path() / "died.MP4";
    std::ofstream(path, std::ios::binary)
        .write(reinterpret_cast<const char*>(bytes.data()), static_cast<std::streamsize>(bytes.size()));
    const Samples all = {kPictures, recorded.AudioBefore(kClosedChunks), kPictures};
    EXPECT_EQ(ofFfprobe(path), all);
    EXPECT_EQ(ofGStreamer(path), all);
}

}  // namespace
}  // namespace clipfileModule
