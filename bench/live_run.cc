// Hours of a live test picture over SRT through a network that loses packets, recorded, and judged frame by
// frame: live_run MINUTES. Prints a row of a table every ten minutes (every 30 seconds of a short run), and a
// row for each file and the statistics at the end. Needs no rights but for --real-time: the network is a
// relay on this machine, since few kernels have what tc netem asks for. What was sent and recorded lies below
// TMPDIR meanwhile, some 450 MB an hour.

#include <sched.h>

#include <CLI/CLI.hpp>
#include <cerrno>
#include <chrono>
#include <csignal>
#include <cstdio>
#include <cstdlib>
#include <exception>
#include <fstream>
#include <iterator>
#include <map>
#include <memory>
#include <nlohmann/json.hpp>
#include <optional>
#include <sstream>
#include <string>
#include <system_error>
#include <thread>

#include "support/FrameJudge.h"
#include "support/FreePorts.h"
#include "support/LossyRelay.h"
#include "support/Process.h"
#include "support/Senders.h"
#include "support/TemporaryFolder.h"

namespace {

using endtoend::Process;
using std::chrono::milliseconds;
using std::chrono::seconds;
using std::chrono::steady_clock;

/// Half an audio frame, and what a stamp rounds.
constexpr double kInStep = 0.011;

volatile std::sig_atomic_t interrupted = 0;

struct Arguments {
    unsigned minutes = 0;
    double lossPercent = 2;
    std::uint32_t seed = 1;
    unsigned burstMilliseconds = 0;
    unsigned burstEverySeconds = 20;
    double burstLossPercent = 80;
    bool realTime = false;

    endtoend::PacketLoss Loss() const {
        return {lossPercent / 100, burstLossPercent / 100, milliseconds(burstMilliseconds),
                seconds(burstEverySeconds)};
    }
};

/// While it lives this thread, and whatever is started by it, goes before all programs of ordinary priority.
class RealTime {
 public:
    RealTime() {
        const sched_param lowest{.sched_priority = 1};
        if (sched_setscheduler(0, SCHED_RR, &lowest) != 0) {
            throw std::system_error(errno, std::generic_category(), "real-time priority");
        }
    }
    ~RealTime() {
        const sched_param ordinary{};
        sched_setscheduler(0, SCHED_OTHER, &ordinary);
    }
    RealTime(const RealTime&) = delete;
    RealTime& operator=(const RealTime&) = delete;
};

/// What a process has in use.
struct Usage {
    double mebibytes = 0;
    std::ptrdiff_t openFiles = 0;

    static Usage Of(pid_t process) {
        const std::string folder = "/proc/" + std::to_string(process);
        std::ifstream status(folder + "/status");
        Usage usage;
        for (std::string line; std::getline(status, line);) {
            if (line.starts_with("VmRSS:")) {
                usage.mebibytes = std::strtod(line.c_str() + 6, nullptr) / 1024;
            }
        }
        std::error_code error;
        usage.openFiles = std::distance(std::filesystem::directory_iterator(folder + "/fd", error), {});
        return usage;
    }
};

/// The sender: a moving picture and noise, of which no two frames are alike, and always the same for a seed.
/// What it sends it also keeps.
std::vector<std::string> SenderCommand(std::uint16_t port, const std::filesystem::path& sent, unsigned start,
                                       std::uint32_t seed, long length) {
    const std::string segments = (sent / (std::to_string(start) + "-%05d.ts")).string();
    const std::string address = "srt://127.0.0.1:" + std::to_string(port) + "?mode=caller&latency=200000";
    return {"ffmpeg",
            "-nostdin",
            "-v",
            "error",
            "-re",
            "-f",
            "lavfi",
            "-i",
            "testsrc2=size=320x180:rate=25",
            "-re",
            "-f",
            "lavfi",
            "-i",
            "anoisesrc=sample_rate=48000:amplitude=0.2:seed=" + std::to_string(seed),
            "-t",
            std::to_string(length),
            "-map",
            "0:v",
            "-map",
            "1:a",
            "-c:v",
            "libx264",
            "-preset",
            "ultrafast",
            "-tune",
            "zerolatency",
            "-threads",
            "1",
            "-pix_fmt",
            "yuv420p",
            "-g",
            "25",
            "-c:a",
            "aac",
            "-ac",
            "2",
            "-b:a",
            "96k",
            "-f",
            "tee",
            "[f=mpegts]" + address + "|[f=segment:segment_time=600:segment_format=mpegts]" + segments};
}

/// A run from the first packet to the last.
class LiveRun {
 public:
    explicit LiveRun(const Arguments& arguments)
        : arguments_(arguments),
          relay_(ports_.First(), static_cast<std::uint16_t>(ports_.First() + 1), arguments.Loss(),
                 arguments.seed) {
        for (const auto& name : {Sent(), Recorded()}) {
            std::filesystem::create_directory(name);
        }
    }

    void Record();
    /// False when something is out of step, or was lost. In bursts something is lost: then false when the
    /// receiver does not tell all of it.
    bool Tell();

 private:
    std::filesystem::path Sent() const { return folder_.Path() / "sent"; }
    std::filesystem::path Recorded() const { return folder_.Path() / "recorded"; }
    void Row(steady_clock::time_point begin) const;
    void TellRelay(const char* name, const endtoend::LossyRelay::Counts& counts) const;
    void TellEvents();
    endtoend::FrameJudge::Verdict TellFiles();

    const Arguments arguments_;
    const endtoend::TemporaryFolder folder_;
    const endtoend::FreePorts ports_;
    endtoend::LossyRelay relay_;
    std::unique_ptr<Process> receiver_;
    unsigned starts_ = 0;
    int exitCode_ = -1;
    /// By the receiver's own count.
    std::uint64_t lost_ = 0;
};

void LiveRun::Record() {
    const auto receiving = static_cast<std::uint16_t>(ports_.First() + 1);
    receiver_ = std::make_unique<Process>(
        std::vector<std::string>{
            RECEIVER_PROGRAM, "--module", CLIPFILE_MODULE, "--output", Recorded().string(), "--input",
            "srt://127.0.0.1:" + std::to_string(receiving) + "?mode=listener&latency=200000", "--max-minutes",
            "10", "--timecode", "00:00:00:00", "--json"},
        std::map<std::string, std::string>{{"QX_SETTINGS", (folder_.Path() / "settings.ini").string()},
                                           {"QX_LOG", (folder_.Path() / "module.log").string()}});
    if (!endtoend::WaitUntilBound(receiving)) {
        throw std::runtime_error("the receiver does not listen: " + receiver_->AllText());
    }
    const auto begin = steady_clock::now();
    const auto end = begin + std::chrono::minutes(arguments_.minutes);
    const seconds step(arguments_.minutes < 30 ? 30 : 600);
    auto next = begin + step;
    std::printf("| Minutes | Files | Resident MiB | Open files | Packets dropped |\n|---|---|---|---|---|\n");
    std::unique_ptr<Process> sender;
    while (steady_clock::now() < end && interrupted == 0 && !receiver_->Wait(std::chrono::milliseconds(1))) {
        if (sender == nullptr || sender->Wait(std::chrono::milliseconds(1))) {
            const auto left = std::chrono::ceil<seconds>(end - steady_clock::now()).count();
            sender = std::make_unique<Process>(
                SenderCommand(ports_.First(), Sent(), starts_, arguments_.seed * 1000 + starts_, left));
            ++starts_;
        }
        if (steady_clock::now() >= next) {
            next += step;
            Row(begin);
        }
        std::this_thread::sleep_for(std::chrono::milliseconds(200));
    }
    if (sender != nullptr) {
        sender->Signal(interrupted != 0 ? SIGINT : 0);
        sender->Wait();
    }
    // The end of the stream ends its file.
    receiver_->WaitForText("\"event\":\"file_closed\"", seconds(10));
    receiver_->WaitForText("the source was lost", seconds(20));
    Row(begin);
    receiver_->Signal(SIGINT);
    exitCode_ = receiver_->Wait().value_or(-1);
}

void LiveRun::Row(steady_clock::time_point begin) const {
    const Usage usage = Usage::Of(receiver_->Id());
    std::printf("| %.1f | %zu | %.1f | %td | %llu |\n",
                std::chrono::duration<double, std::ratio<60>>(steady_clock::now() - begin).count(),
                endtoend::RecordingsIn(Recorded()).size(), usage.mebibytes, usage.openFiles,
                static_cast<unsigned long long>(relay_.Forth().dropped));
    std::fflush(stdout);
}

bool LiveRun::Tell() {
    std::printf("\nSender: started %u time(s)\n", starts_);
    TellRelay("Network, to the receiver", relay_.Forth());
    TellRelay("Network, back", relay_.Back());
    TellEvents();
    const endtoend::FrameJudge::Verdict all = TellFiles();
    std::printf("Exit code of the receiver: %d\n", exitCode_);
    // Frames that were never sent stand for missing ones, or for the sound of the last pictures of a
    // connection.
    const bool inStep = all.unknownPictures == 0 && all.outOfStep < kInStep;
    const bool whole = all.missingPictures + all.missingSounds == 0 && exitCode_ == 0;
    constexpr int kIncomplete = 8;
    const bool told = all.missingPictures <= lost_ && lost_ > 0 && exitCode_ == kIncomplete;
    return inStep && (whole || (arguments_.burstMilliseconds > 0 && told));
}

void LiveRun::TellRelay(const char* name, const endtoend::LossyRelay::Counts& counts) const {
    const auto all = static_cast<double>(counts.passed + counts.dropped);
    std::printf("%s: %llu packets passed, %llu dropped (%.2f %%)\n", name,
                static_cast<unsigned long long>(counts.passed),
                static_cast<unsigned long long>(counts.dropped),
                all > 0 ? 100 * static_cast<double>(counts.dropped) / all : 0);
}

void LiveRun::TellEvents() {
    std::map<std::string, unsigned> kinds;
    std::istringstream lines(receiver_->Output());
    nlohmann::json summary;
    for (std::string line; std::getline(lines, line);) {
        const auto event = nlohmann::json::parse(line, nullptr, false);
        if (event.is_discarded() || !event.is_object()) {
            continue;
        }
        const std::string kind = event.value("event", "");
        if (kind == "notice" || kind == "failure") {
            ++kinds[event.value("text", "")];
        } else if (kind == "status") {
            ++kinds["status: " + event.value("words", "")];
        } else if (kind == "summary") {
            summary = event;
        }
    }
    std::printf("The receiver said:\n");
    for (const auto& [text, count] : kinds) {
        std::printf("  %u x %s\n", count, text.c_str());
    }
    std::printf("%s", receiver_->Errors().c_str());
    lost_ = summary.is_object() ? summary.value("lost", std::uint64_t{0}) : 0;
    std::printf("Lost, by its own count: %llu\n", static_cast<unsigned long long>(lost_));
}

endtoend::FrameJudge::Verdict LiveRun::TellFiles() {
    endtoend::FrameJudge judge;
    for (unsigned start = 0; start < starts_; ++start) {
        for (unsigned segment = 0;; ++segment) {
            char name[32];
            std::snprintf(name, sizeof name, "%u-%05u.ts", start, segment);
            if (!std::filesystem::exists(Sent() / name)) {
                break;
            }
            judge.AddSent(Sent() / name);
        }
    }
    endtoend::FrameJudge::Verdict all;
    const auto files = endtoend::RecordingsIn(Recorded());
    std::printf(
        "\n| File | Pictures | Missing | Audio frames | Missing | Silence | Audio out of step, ms |\n"
        "|---|---|---|---|---|---|---|\n");
    for (const auto& file : files) {
        const endtoend::FrameJudge::Verdict one = judge.Judge(file);
        std::printf("| %s | %zu | %zu | %zu | %zu | %zu | %.1f |\n", file.filename().c_str(), one.pictures,
                    one.missingPictures, one.sounds, one.missingSounds, one.unknownSounds,
                    one.outOfStep * 1000);
        all += one;
    }
    const std::size_t found = all.pictures - all.unknownPictures;
    std::printf("\nSent: %zu pictures, %zu audio frames\n", judge.SentPictures(), judge.SentSounds());
    std::printf("Recorded: %zu pictures, %zu audio frames in %zu files\n", all.pictures, all.sounds,
                files.size());
    std::printf("Missing within files: %zu pictures, %zu audio frames\n", all.missingPictures,
                all.missingSounds);
    std::printf("In front of, between and behind files: %zu pictures\n",
                judge.SentPictures() - found - all.missingPictures);
    std::printf("Recorded and never sent: %zu pictures, %zu audio frames (silence)\n", all.unknownPictures,
                all.unknownSounds);
    std::printf("Audio out of step by at most %.1f ms\n", all.outOfStep * 1000);
    return all;
}

}  // namespace

int main(int argc, char** argv) {
    Arguments arguments;
    CLI::App app("A live test picture over SRT and a bad network, recorded, and judged frame by frame.");
    app.add_option("MINUTES", arguments.minutes)->required()->check(CLI::PositiveNumber);
    app.add_option("--loss", arguments.lossPercent, "packets that are lost, in percent")
        ->check(CLI::Range(0, 100))
        ->capture_default_str();
    app.add_option("--seed", arguments.seed, "of the noise that is sent, and of what is lost")
        ->capture_default_str();
    app.add_option("--burst", arguments.burstMilliseconds,
                   "milliseconds of heavy loss, from time to time: what is not there after the 200 of SRT's "
                   "latency is lost for good")
        ->capture_default_str();
    app.add_option("--burst-every", arguments.burstEverySeconds, "seconds")
        ->check(CLI::PositiveNumber)
        ->capture_default_str();
    app.add_option("--burst-loss", arguments.burstLossPercent, "packets that are lost meanwhile, in percent")
        ->check(CLI::Range(0, 100))
        ->capture_default_str();
    app.add_flag("--real-time", arguments.realTime, "goes before other programs of the machine");
    CLI11_PARSE(app, argc, argv);
    std::signal(SIGINT, [](int) { interrupted = 1; });
    std::signal(SIGTERM, [](int) { interrupted = 1; });
    try {
        std::optional<RealTime> realTime;
        if (arguments.realTime) {
            realTime.emplace();
        }
        LiveRun run(arguments);
        run.Record();
        // The judge may take its time.
        realTime.reset();
        return run.Tell() ? 0 : 1;
    } catch (const std::exception& error) {
        std::fprintf(stderr, "live_run: %s\n", error.what());
        return 1;
    }
}
