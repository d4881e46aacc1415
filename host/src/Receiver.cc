#include "Receiver.h"

#include <stdlib.h>

#include <atomic>
#include <chrono>
#include <exception>
#include <filesystem>
#include <memory>
#include <optional>
#include <utility>
#include <vector>

#include "GroupWatch.h"
#include "OutputFolder.h"
#include "QxRegistry.h"
#include "Recorder.h"
#include "StreamRates.h"
#include "common/NativePath.h"
#include "module/Host.h"
#include "module/ModuleLibrary.h"
#include "module/ModuleLog.h"
#include "module/ModuleSession.h"
#include "module/SettingsFile.h"
#include "operator/Keyboard.h"

namespace receiver {
namespace {

using Clock = std::chrono::steady_clock;

constexpr std::chrono::milliseconds kDisplayInterval{250};
constexpr std::chrono::seconds kFreeSpaceInterval{1};
/// The run ends with the frame behind the last one; when the stream has dried up, nobody waits for it.
constexpr std::chrono::seconds kFinishPatience{2};
constexpr const char* kDefaultOutput = "recordings";
/// What the module takes for an output path that is not set.
constexpr const char* kFromStore = "none";

/// A fault of the stream; the recording begins anew.
constexpr int kStatusFault = 6;
/// With it: the host went offline, which is how each run ends.
constexpr int kCauseOffline = 26;

/// The signals of the run, for the one callback that knows of no object.
std::atomic<Signals*> currentSignals{nullptr};

bool QuitRequested() {
    Signals* const signals = currentSignals;
    return signals != nullptr && signals->QuitRequested();
}

std::string WithFullStop(std::string sentence) {
    return sentence.ends_with('.') ? sentence : sentence + ".";
}

/// Where files go.
struct Output {
    /// What the module is told: the folder, or that it is to take the one of the settings store.
    std::string parameter;
    std::string folder;
};

/// The module's rule, with an output of our own where it would refuse: start parameter, else settings store.
Output OutputOf(const Options& options) {
    std::string path;
    const bool stored = !options.output &&
                        QxRegistry::GetInstance()->getValue("Qx/Other/MP4FileOut", "MP4OutputPath", path) &&
                        !path.empty();
    if (!stored) {
        path = options.output.value_or(kDefaultOutput);
    }
    std::string folder = NativePath(path);
    while (folder.size() > 1 && folder.ends_with('/')) {
        folder.pop_back();
    }
    if (stored) {
        return {kFromStore, folder};
    }
    if (folder == kFromStore) {
        folder = "./" + folder;
    }
    return {folder, folder};
}

void SetUpLog(const Options& options, const std::string& output) {
    const char* const set = getenv("QX_LOG");
    if (options.log) {
        setenv("QX_LOG", *options.log == "-" ? "" : options.log->c_str(), 1);
    } else if (set == nullptr || *set == '\0') {
        setenv("QX_LOG", (output + "/receiver.log").c_str(), 1);
    }
    if (options.logPriority) {
        setenv("QX_LOG_PRIORITY", std::to_string(*options.logPriority).c_str(), 1);
    }
}

StartParameters ParametersOf(const Options& options, const std::string& output,
                             const SourceDescription& description) {
    StartParameters parameters;
    parameters.texts = {{"-outputPath", output},
                        {"-fileType", options.fileType},
                        {"-naluType", options.naluType},
                        {"-outputMode", options.mode == OutputMode::kOn ? "on" : "sync"},
                        {"-recordRules", "exact"}};
    const auto add = [&](const char* key, const std::optional<std::string>& value) {
        if (value) {
            parameters.texts[key] = *value;
        }
    };
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

/// Minutes of a file, by the module's rule.
std::int64_t FileLength() {
    constexpr unsigned int kUsual = 120;
    unsigned int minutes = 0;
    const bool stored = QxRegistry::GetInstance()->getValue("Qx/Other/MP4FileOut", "MP4MaxFileSize", minutes);
    return stored ? minutes : kUsual;
}

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

Recorder::Settings RecorderSettings(const Options& options, const FrameRate& rate) {
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

/// A run with its module and its display.
class Running final : public SourceListenerInterface {
 public:
    Running(const Options& options, Signals& signals, DisplayInterface& display, int keyboard)
        : options_(options), signals_(signals), display_(display), keyboard_(keyboard) {}

    void OnNotice(const std::string& sentence) override { display_.Notice(sentence); }

    ExitCode Record(const SourceOpener& open);

 private:
    void Loop(SourceInterface& source, Recorder& recorder);
    void TakeCommands(Recorder& recorder);
    void TakeKey(char key, Recorder& recorder);
    void StartRecording();
    void StopRecording();
    void TellLateStops(const Recorder& recorder);
    void TakeStatuses(bool ending);
    void TakeModuleEvents();
    void FileClosed(const std::string& path);
    void Show(const SourceInterface& source, const Recorder& recorder);
    std::uint64_t Lost(const SourceInterface& source) const;
    Summary Summarise(const SourceInterface& source) const;

    struct WrittenFile {
        std::string path;
        bool closed;
    };

    const Options& options_;
    Signals& signals_;
    DisplayInterface& display_;
    Keyboard keyboard_;
    std::string output_;
    ModuleLog* log_ = nullptr;
    Host* host_ = nullptr;
    RecordPlan plan_{options_.record};
    StreamRates rates_;
    std::optional<GroupWatch> groups_;
    std::vector<WrittenFile> files_;
    std::string openFile_;
    std::uint64_t faults_ = 0;
    std::uint64_t lateStops_ = 0;
    ModuleStatus told_;
    /// The source has become another one.
    bool changed_ = false;
    std::optional<Clock::time_point> finishSince_;
    Clock::time_point shown_{};
    Clock::time_point spaceRead_{};
    std::optional<std::uint64_t> freeBytes_;
};

ExitCode Running::Record(const SourceOpener& open) {
    const SettingsFile settings(options_.settings, options_.maxMinutes);
    const Output output = OutputOf(options_);
    output_ = output.folder;
    if (PrepareOutputFolder(output_)) {
        display_.Notice("made the output folder " + output_);
    }
    SetUpLog(options_, output_);
    const ModuleLibrary library(options_.module.value_or(ModuleLibrary::DefaultFile()));
    ModuleLog log;
    log_ = &log;

    const std::unique_ptr<SourceInterface> source = open(options_.source, *this, QuitRequested);
    if (source == nullptr) {
        display_.Finish({});
        return ExitCode::kSuccess;
    }
    display_.Notice("source: " + source->Description().summary);
    CheckTimecode(options_, source->Description().frameRate);
    Recorder::Settings recorderSettings = RecorderSettings(options_, source->Description().frameRate);

    // Each lives as long as the module, which may still hold one that a hanging disk has kept.
    std::vector<std::unique_ptr<Host>> hosts;
    std::optional<ReceiverError> failure;
    // One session for each of what the source is: the module learns rate and size when it starts.
    do {
        changed_ = false;
        recorderSettings.frameRate = source->Description().frameRate;
        hosts.push_back(
            std::make_unique<Host>(ParametersOf(options_, output.parameter, source->Description())));
        host_ = hosts.back().get();
        ModuleSession session(library.Module(), *host_);
        if (options_.mode == OutputMode::kSync) {
            session.GoOnline();
        }
        Recorder recorder(recorderSettings, session, log, plan_);
        // A run that is shorter than a file has one only.
        if (const std::int64_t minutes = FileLength();
            !options_.seconds || *options_.seconds > static_cast<double>(minutes * 60)) {
            groups_.emplace(recorderSettings.frameRate, minutes, options_.source.pictureGroup);
        }
        try {
            Loop(*source, recorder);
        } catch (const ReceiverError& error) {
            failure = error;
        }
        if (!host_->Failed()) {
            recorder.Close();
        }
        TellLateStops(recorder);
        TakeStatuses(false);
        session.End();
        TakeModuleEvents();
        TakeStatuses(true);
        recorderSettings.past = recorder.Past();
        plan_.Interrupt();
    } while (changed_ && !host_->Failed());

    Summary summary = Summarise(*source);
    if (failure) {
        summary.exitCode = failure->Code();
    }
    display_.Finish(summary);
    if (failure) {
        display_.Failure(failure->Code(), WithFullStop(failure->what()));
    }
    return summary.exitCode;
}

void Running::Loop(SourceInterface& source, Recorder& recorder) {
    while (!host_->Failed()) {
        SourceUnit unit;
        const SourceInterface::Result result = source.Read(unit);
        if (result == SourceInterface::Result::kEnd || result == SourceInterface::Result::kStopped) {
            return;
        }
        if (result == SourceInterface::Result::kUnit) {
            rates_.Count(unit);
            if (const auto notice = groups_ ? groups_->Look(unit) : std::nullopt) {
                display_.Notice(*notice);
            }
            recorder.Put(std::move(unit));
        }
        if (result == SourceInterface::Result::kIdle && source.Counts().away) {
            recorder.Interrupt();
        }
        if (result == SourceInterface::Result::kChanged) {
            display_.Notice("source: " + source.Description().summary);
            changed_ = !recorder.Finishing();
            return;
        }
        TellLateStops(recorder);
        TakeCommands(recorder);
        if (recorder.Finishing()) {
            finishSince_ = finishSince_.value_or(Clock::now());
            if (recorder.Done() || Clock::now() - *finishSince_ > kFinishPatience) {
                return;
            }
        }
        if (Clock::now() - shown_ >= kDisplayInterval) {
            Show(source, recorder);
        }
    }
}

void Running::TakeCommands(Recorder& recorder) {
    const SignalCommands commands = signals_.Take();
    if (commands.start) {
        StartRecording();
    }
    if (commands.stop) {
        StopRecording();
    }
    if (commands.hangup) {
        keyboard_.Abandon();
        display_.Notice("the terminal is gone; the run goes on until SIGTERM");
    }
    if (commands.quit && !recorder.Finishing()) {
        display_.Notice("ending in order; a second signal ends at once");
        recorder.Finish();
    }
    if (const std::optional<char> key = keyboard_.Take()) {
        TakeKey(*key, recorder);
    }
}

void Running::TakeKey(char key, Recorder& recorder) {
    switch (key) {
        case 'r':
            StartRecording();
            break;
        case 's':
            StopRecording();
            break;
        case 'q':
            recorder.Finish();
            break;
        default:
            display_.Notice("keys: r records, s stops, q ends");
            break;
    }
}

void Running::StartRecording() {
    if (options_.mode == OutputMode::kOn) {
        display_.Notice("in mode on the whole run is one recording; --mode sync takes record commands");
        return;
    }
    plan_.Start();
}

void Running::StopRecording() {
    if (options_.mode == OutputMode::kOn) {
        display_.Notice("in mode on the whole run is one recording; --mode sync takes record commands");
        return;
    }
    plan_.Stop();
}

void Running::TellLateStops(const Recorder& recorder) {
    // A module that has failed takes no commands, and its status tells that.
    if (recorder.LateStops() == lateStops_ || host_->Failed()) {
        return;
    }
    lateStops_ = recorder.LateStops();
    display_.Notice(
        "the module has not carried out a stop command within 1 s: the recording ends on its frame, but its "
        "file is closed late");
}

void Running::TakeStatuses(bool ending) {
    for (const ModuleStatus& status : host_->TakeStatuses()) {
        if (status.status == kStatusFault) {
            if (ending && status.cause == kCauseOffline) {
                continue;
            }
            ++faults_;
        }
        // The module says more than once that buffering has stopped.
        if (status != told_) {
            told_ = status;
            display_.Status(status);
        }
    }
}

void Running::TakeModuleEvents() {
    for (const ModuleEvent& event : log_->TakeEvents()) {
        switch (event.kind) {
            case ModuleEvent::Kind::kFileOpened:
                openFile_ = event.text;
                files_.push_back({event.text, false});
                display_.FileOpened(event.text);
                break;
            case ModuleEvent::Kind::kFileClosed:
                FileClosed(event.text);
                break;
            case ModuleEvent::Kind::kRecordRestarted:
                display_.Notice("the recording begins anew after a fault");
                break;
            case ModuleEvent::Kind::kError:
                display_.Notice("module log: " + event.text);
                break;
            case ModuleEvent::Kind::kRecordStarted:
            case ModuleEvent::Kind::kRecordStopped:
            case ModuleEvent::Kind::kRecordRemoved:
                break;
        }
    }
}

void Running::FileClosed(const std::string& path) {
    for (WrittenFile& file : files_) {
        file.closed = file.closed || file.path == path;
    }
    if (openFile_ == path) {
        openFile_.clear();
    }
    display_.FileClosed(path);
}

void Running::Show(const SourceInterface& source, const Recorder& recorder) {
    shown_ = Clock::now();
    if (shown_ - spaceRead_ >= kFreeSpaceInterval) {
        spaceRead_ = shown_;
        freeBytes_ = FreeBytes(output_);
    }
    TakeModuleEvents();
    TakeStatuses(false);
    Snapshot snapshot;
    snapshot.timecode = recorder.LastTimecode();
    snapshot.seconds = static_cast<double>(recorder.Elapsed()) / static_cast<double>(kVideoClock);
    snapshot.recording = options_.mode == OutputMode::kOn ? log_->OpenRecordings() > 0 : plan_.Recording();
    snapshot.waiting =
        recorder.LastTimecode() && options_.mode == OutputMode::kSync && plan_.Wanted() && !plan_.Recording();
    snapshot.since = recorder.Since();
    snapshot.framesPerSecond = rates_.FramesPerSecond();
    snapshot.videoKilobits = rates_.VideoKilobits();
    snapshot.audioKilobits = rates_.AudioKilobits();
    snapshot.klvPackets = rates_.KlvPackets();
    snapshot.status = host_->Status();
    snapshot.file = openFile_;
    snapshot.freeBytes = freeBytes_;
    snapshot.lost = Lost(source);
    display_.Show(snapshot);
}

std::uint64_t Running::Lost(const SourceInterface& source) const {
    const SourceCounts counts = source.Counts();
    return log_->Losses().Total() + counts.lostFrames + counts.damagedPackets;
}

Summary Running::Summarise(const SourceInterface& source) const {
    Summary summary;
    for (const WrittenFile& file : files_) {
        // One that could not be made was announced and has told why.
        if (file.closed || std::filesystem::exists(file.path)) {
            summary.files.push_back(ReadBack(file.path));
        }
    }
    summary.lost = Lost(source);
    if (host_->Failed()) {
        summary.exitCode = ExitCode::kRecordingFailed;
    } else if (summary.lost != 0 || faults_ != 0 || lateStops_ != 0 || source.Counts().reconnections != 0 ||
               source.Counts().changes != 0) {
        summary.exitCode = ExitCode::kLost;
    }
    return summary;
}

}  // namespace

ExitCode RunReceiver(const Options& options, const SourceOpener& open, Signals& signals,
                     DisplayInterface& display, int keyboard) {
    currentSignals = &signals;
    ExitCode code = ExitCode::kInternal;
    try {
        code = Running(options, signals, display, keyboard).Record(open);
    } catch (const ReceiverError& error) {
        code = error.Code();
        display.Failure(code, WithFullStop(error.what()));
    } catch (const std::exception& error) {
        display.Failure(code, WithFullStop(error.what()));
    }
    currentSignals = nullptr;
    return code;
}

}  // namespace receiver
