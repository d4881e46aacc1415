#include "Receiver.h"

#include <sys/stat.h>

#include <algorithm>
#include <chrono>
#include <ctime>
#include <exception>
#include <memory>
#include <optional>
#include <utility>
#include <vector>

#include "CrashRecovery.h"
#include "GroupWatch.h"
#include "ModuleReport.h"
#include "Observers.h"
#include "Recorder.h"
#include "RunSettings.h"
#include "Shortfalls.h"
#include "StreamRates.h"
#include "module/Host.h"
#include "module/ModuleLibrary.h"
#include "module/ModuleLog.h"
#include "module/ModuleSession.h"
#include "module/SettingsFile.h"
#include "operator/CommandQueue.h"
#include "operator/Keyboard.h"
#include "operator/Service.h"
#include "output/FolderWatch.h"
#include "output/ModuleLogFile.h"
#include "output/OutputFolder.h"
#include "output/OutputPlace.h"

namespace receiver {
namespace {

using Clock = std::chrono::steady_clock;

constexpr std::chrono::milliseconds kDisplayInterval{250};
/// The run ends with the frame behind the last one; when the stream has dried up, nobody waits for it.
constexpr std::chrono::seconds kFinishPatience{2};

constexpr const char* kOver = "the run is over";
constexpr const char* kNoCommands = "in mode on everything is recorded; --mode sync takes record commands";

std::string WithFullStop(std::string sentence) {
    return sentence.ends_with('.') ? sentence : sentence + ".";
}

/// From now on the group may do with files and folders of this process what their owner may.
void GiveToGroup() {
    const mode_t mask = umask(0077);
    umask(mask & ~static_cast<mode_t>(0070));
}

/// A run with its module and its display.
class Running final : public SourceListenerInterface {
 public:
    Running(const Options& options, Signals& signals, Observers& observers, CommandQueue& commands,
            int keyboard)
        : options_(options),
          signals_(signals),
          observers_(observers),
          display_(observers.Display()),
          commands_(commands),
          keyboard_(keyboard) {}
    /// What waits to be carried out is answered by this object.
    ~Running() { commands_.Close(kOver); }
    Running(const Running&) = delete;
    Running& operator=(const Running&) = delete;

    void OnNotice(const std::string& sentence) override { display_.Notice(sentence); }

    ExitCode Record(const SourceOpener& open);

 private:
    void PrepareOutput(const OutputPlace& place);
    /// Records the source, in one session of the module after the other. Gives how far the run has come.
    Recorder::Progress RecordAll(SourceInterface& source, QxModuleInterface& module,
                                 const OutputPlace& place);
    /// Records in a session of the module what the session before has left, and the source up to where it
    /// needs another session. False when the run has failed.
    bool RecordSession(SourceInterface& source, QxModuleInterface& module, Recorder::Settings& settings);
    void RecordIn(ModuleSession& session, SourceInterface& source, Recorder::Settings& settings);
    void Loop(SourceInterface& source, Recorder& recorder);
    void CheckFolder();
    void TakeCommands(Recorder& recorder);
    /// Takes what has been commanded, for the next frame to carry out.
    void Hear();
    void TakeKeys();
    void TakeKey(char key);
    void Command(RecordCommand command);
    void TellChanges(Recorder& recorder);
    void TellMissed();
    /// While the source is being opened.
    bool QuitAsked();
    void TellLateStops(const Recorder& recorder);
    void Show(const SourceInterface& source, const Recorder& recorder);
    std::uint64_t Lost(const SourceInterface& source, const Recorder::Progress& progress) const;
    Losses LossesOf(const SourceInterface& source, const Recorder::Progress& progress) const;
    Summary Summarise(const SourceInterface& source, const Recorder::Progress& past);

    const Options& options_;
    Signals& signals_;
    Observers& observers_;
    DisplayInterface& display_;
    CommandQueue& commands_;
    Keyboard keyboard_;
    Service service_;
    std::unique_ptr<OutputFolder> folder_;
    std::optional<FolderWatch> watch_;
    std::optional<CrashRecovery> recovery_;
    std::optional<ModuleLog> log_;
    /// Each lives as long as the module, which may still hold one that a hanging disk has kept.
    std::vector<std::unique_ptr<Host>> hosts_;
    Host* host_ = nullptr;
    RecordPlan plan_{options_.record};
    /// The operator ends the run.
    bool quit_ = false;
    /// He did so while the source went on.
    bool endedByOperator_ = false;
    StreamRates rates_;
    ModuleReport report_{display_};
    std::optional<GroupWatch> groups_;
    std::uint64_t lateStops_ = 0;
    /// Recordings of which there is nothing.
    bool missed_ = false;
    /// The source has become another one, which is for the next session.
    bool changed_ = false;
    /// A gap has ended a session, and what came behind it is for the next one.
    bool gap_ = false;
    std::vector<SourceUnit> rest_;
    std::optional<ReceiverError> failure_;
    std::optional<Clock::time_point> finishSince_;
    Clock::time_point shown_{};
};

void Running::PrepareOutput(const OutputPlace& place) {
    if (options_.groupWrite) {
        GiveToGroup();
    }
    folder_ = OpenOutputFolder(place);
    const bool folderIsNew = folder_->Prepare();
    if (folderIsNew) {
        display_.Notice("made the output folder " + place.folder);
    }
    ExpectDatedFolders(*folder_, place.prefix, std::time(nullptr));
    if (const std::string leftover = folder_->TakeLeftover(); !leftover.empty()) {
        display_.Notice(leftover);
    }
    if (const auto warning = SetUpLog(options_, place)) {
        display_.Notice(*warning);
    }
    watch_.emplace(OpenOutputFolder(place), place.prefix);
    recovery_.emplace(options_, place, folderIsNew, display_, keyboard_.IsThere());
}

ExitCode Running::Record(const SourceOpener& open) {
    if (options_.mode == OutputMode::kOn) {
        commands_.Close(kNoCommands);
    }
    const SettingsFile settings(options_.settings, options_.maxMinutes);
    const OutputPlace place = PlaceOf(options_);
    CheckUser(options_, place);
    PrepareOutput(place);
    const ModuleLibrary library(options_.module.value_or(ModuleLibrary::DefaultFile()));
    log_.emplace();
    service_.Ready();

    std::unique_ptr<SourceInterface> source;
    try {
        source = open(options_.source, *this, [this] { return QuitAsked(); });
    } catch (...) {
        // What it has found out is told before the reason of the end.
        recovery_->End(report_);
        throw;
    }
    if (source == nullptr) {
        recovery_->End(report_);
        display_.Finish({});
        return ExitCode::kSuccess;
    }
    display_.Notice("source: " + source->Description().summary);
    const Recorder::Progress progress = RecordAll(*source, library.Module(), place);
    service_.Stopping();
    commands_.Close(kOver);
    plan_.Finish();
    TellMissed();
    recovery_->End(report_);
    observers_.Settle();
    Summary summary = Summarise(*source, progress);
    if (failure_) {
        summary.exitCode = failure_->Code();
    }
    display_.Finish(summary);
    if (failure_) {
        display_.Failure(failure_->Code(), WithFullStop(failure_->what()));
    }
    return summary.exitCode;
}

Recorder::Progress Running::RecordAll(SourceInterface& source, QxModuleInterface& module,
                                      const OutputPlace& place) {
    SourceDescription description;
    Recorder::Settings settings = RecorderSettingsOf(options_, source.Description().frameRate);
    settings.meanwhile = [this] { Hear(); };
    const std::int64_t minutes = FileMinutes();
    bool gap = false;
    bool changed = true;
    while (changed || gap) {
        if (changed) {
            changed_ = false;
            description = source.Description();
            settings.frameRate = description.frameRate;
            settings.reordering = description.reordering;
            recovery_->Describe(description);
            observers_.Describe(description);
            // A run that is shorter than a file has one only.
            if (!options_.seconds || *options_.seconds > static_cast<double>(minutes * 60)) {
                groups_.emplace(settings.frameRate, minutes, options_.source.pictureGroup,
                                settings.reordering > 0);
            }
        }
        // The module learns rate and size when it starts.
        hosts_.push_back(std::make_unique<Host>(ParametersOf(options_, place, description)));
        host_ = hosts_.back().get();
        const bool over = !RecordSession(source, module, settings);
        // What came behind a gap is of the source as it was.
        gap = !over && gap_;
        changed = !over && changed_ && !gap_;
    }
    return *settings.past;
}

bool Running::RecordSession(SourceInterface& source, QxModuleInterface& module,
                            Recorder::Settings& settings) {
    try {
        ModuleSession session(module, *host_);
        RecordIn(session, source, settings);
    } catch (const ReceiverError& error) {
        // The sessions before have left files.
        if (!settings.past) {
            throw;
        }
        failure_ = error;
    }
    return !failure_ && !host_->Failed();
}

void Running::RecordIn(ModuleSession& session, SourceInterface& source, Recorder::Settings& settings) {
    if (options_.mode == OutputMode::kSync) {
        session.GoOnline();
    }
    Recorder recorder(settings, session, *log_, plan_, commands_);
    for (SourceUnit& unit : std::exchange(rest_, {})) {
        recorder.Put(std::move(unit));
    }
    try {
        if (!changed_) {
            Loop(source, recorder);
        }
    } catch (const ReceiverError& error) {
        failure_ = error;
    }
    // What is heard from here on comes too late to have ended anything.
    endedByOperator_ = quit_;
    if (!host_->Failed()) {
        recorder.Close();
    }
    recorder.NoteEnd();
    TellChanges(recorder);
    TellLateStops(recorder);
    report_.Tell(host_->TakeStatuses(), false);
    session.End();
    report_.Tell(log_->TakeEvents());
    report_.Tell(host_->TakeStatuses(), true);
    recovery_->Follow(report_);
    settings.past = recorder.Past();
    plan_.Interrupt();
    gap_ = recorder.EndedByGap();
    rest_ = recorder.TakeRest();
}

void Running::Loop(SourceInterface& source, Recorder& recorder) {
    while (!host_->Failed() && !recorder.EndedByGap()) {
        SourceUnit unit;
        const SourceInterface::Result result = source.Read(unit);
        if (result == SourceInterface::Result::kEnd || result == SourceInterface::Result::kStopped) {
            return;
        }
        if (result == SourceInterface::Result::kUnit) {
            rates_.Count(unit);
            recovery_->LookAt(unit);
            observers_.LookAt(unit);
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
        CheckFolder();
        TakeCommands(recorder);
        TellChanges(recorder);
        TellMissed();
        report_.Tell(log_->TakeEvents());
        recovery_->Follow(report_);
        observers_.Follow();
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

void Running::CheckFolder() {
    if (const std::optional<std::string> warning = watch_->TakeWarning()) {
        display_.Notice("tomorrow nothing can be recorded: " + *warning);
    }
    if (const std::optional<std::string> leftover = watch_->TakeLeftover()) {
        display_.Notice(*leftover);
    }
    const std::string obstacle = watch_->Obstacle();
    if (!obstacle.empty()) {
        throw ReceiverError(ExitCode::kOutput, obstacle);
    }
}

void Running::TakeCommands(Recorder& recorder) {
    Hear();
    commands_.Apply(plan_);
    if (quit_ && !recorder.Finishing()) {
        recorder.Finish();
    }
}

void Running::Hear() {
    const SignalCommands commands = signals_.Take();
    for (const RecordCommand command : commands.record) {
        Command(command);
    }
    if (commands.hangup) {
        keyboard_.Abandon();
        display_.Notice("the terminal is gone; the run goes on until SIGTERM");
    }
    TakeKeys();
    if (commands.quit && !quit_ && !plan_.Finished()) {
        quit_ = true;
        display_.Notice("ending in order; a second signal ends at once");
    }
}

bool Running::QuitAsked() {
    service_.Alive("waiting for the source");
    TakeKeys();
    recovery_->Follow(report_);
    return quit_ || signals_.QuitRequested();
}

void Running::TakeKeys() {
    while (const std::optional<char> key = keyboard_.Take()) {
        TakeKey(*key);
    }
}

void Running::TakeKey(char key) {
    switch (key) {
        case 'r':
            Command(RecordCommand::kStart);
            break;
        case 's':
            Command(RecordCommand::kStop);
            break;
        case 'n':
            Command(RecordCommand::kSplit);
            break;
        case 'q':
            quit_ = true;
            break;
        case 'y':
            if (recovery_ && recovery_->Agree()) {
                break;
            }
            [[fallthrough]];
        default:
            display_.Notice("keys: r records, s stops, n goes on in a new file, q ends");
            break;
    }
}

void Running::Command(RecordCommand command) {
    commands_.Post(command, [this](const CommandResult& result) {
        if (!result.reason.empty()) {
            display_.Notice("no effect: " + result.reason);
        }
    });
}

void Running::TellChanges(Recorder& recorder) {
    for (const Recorder::Change& change : recorder.TakeChanges()) {
        if (change.begins) {
            display_.RecordStarted(change.at);
        } else {
            display_.RecordStopped(change.at);
        }
    }
}

void Running::TellMissed() {
    for (const MissedRecording& missed : plan_.TakeMissed()) {
        missed_ = true;
        display_.Notice(Describe(missed));
    }
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

void Running::Show(const SourceInterface& source, const Recorder& recorder) {
    shown_ = Clock::now();
    report_.Tell(host_->TakeStatuses(), false);
    Snapshot snapshot;
    snapshot.timecode = recorder.LastTimecode();
    snapshot.seconds = static_cast<double>(recorder.Elapsed()) / static_cast<double>(kVideoClock);
    snapshot.recording = options_.mode == OutputMode::kOn ? log_->OpenRecordings() > 0 : plan_.Recording();
    // Before the first picture it is the source that is awaited.
    snapshot.waiting = recorder.Waiting() && (recorder.LastTimecode() || source.Counts().earlyPictures != 0);
    snapshot.framesPerSecond = rates_.FramesPerSecond();
    snapshot.videoKilobits = rates_.VideoKilobits();
    snapshot.audioKilobits = rates_.AudioKilobits();
    snapshot.klvPackets = rates_.KlvPackets();
    snapshot.status = host_->Status();
    snapshot.file = report_.OpenFile();
    snapshot.freeBytes = watch_->FreeBytes();
    snapshot.syncTime = recovery_->SyncLatency();
    const Recorder::Progress progress = recorder.Past();
    snapshot.lost = Lost(source, progress);
    snapshot.losses = LossesOf(source, progress);
    const SourceCounts counts = source.Counts();
    snapshot.source = {counts.reconnections, counts.changes, counts.silentFrames, counts.earlyPictures,
                       counts.away};
    snapshot.heldPictures = recorder.HeldPictures();
    const HookCounts hooked = observers_.Hooked();
    snapshot.hooksTold = hooked.delivered;
    snapshot.hooksFailed = hooked.failed;
    display_.Show(snapshot);
    service_.Alive(!snapshot.recording     ? "not recording"
                   : snapshot.file.empty() ? "recording, no file yet"
                                           : "recording " + snapshot.file);
}

std::uint64_t Running::Lost(const SourceInterface& source, const Recorder::Progress& progress) const {
    const SourceCounts counts = source.Counts();
    const std::uint64_t reported = log_->Losses().Total();
    return reported - std::min(reported, progress.droppedMarks) + progress.droppedPackets +
           counts.lostFrames + counts.damagedPackets;
}

Losses Running::LossesOf(const SourceInterface& source, const Recorder::Progress& progress) const {
    const SourceCounts counts = source.Counts();
    const QueueLosses queues = log_->Losses();
    return {counts.lostFrames, counts.damagedPackets, queues.video,
            queues.audio,      queues.meta,           progress.droppedPackets};
}

Summary Running::Summarise(const SourceInterface& source, const Recorder::Progress& past) {
    RunRecord run;
    run.endedByOperator = endedByOperator_;
    run.anyFrame = past.firstFrame.has_value();
    run.recordedFrames = past.recorded;
    run.everything = options_.mode == OutputMode::kOn;
    run.length = run.anyFrame ? past.lastFrame - *past.firstFrame : 0;
    run.unreached = plan_.Unreached();
    const SourceCounts counts = source.Counts();
    run.silentFrames = counts.silentFrames;
    run.earlyPictures = counts.earlyPictures != 0;
    run.transcode = options_.source.transcode;
    for (const ModuleReport::WrittenFile& file : report_.Files()) {
        // One that could not be made was announced and has told why.
        if (file.closed || folder_->Exists(file.path)) {
            run.files.push_back(folder_->ReadBackFile(file.path));
        }
    }
    const std::vector<std::string> shortfalls =
        host_->Failed() ? std::vector<std::string>() : ShortfallsOf(run);
    for (const std::string& shortfall : shortfalls) {
        display_.Notice(shortfall);
    }
    Summary summary;
    summary.files = std::move(run.files);
    summary.lost = Lost(source, past);
    if (host_->Failed()) {
        summary.exitCode = ExitCode::kRecordingFailed;
    } else if (summary.lost != 0 || report_.Faults() != 0 || recovery_->SyncFaults() != 0 ||
               lateStops_ != 0 || missed_ || !shortfalls.empty() || counts.reconnections != 0 ||
               counts.changes != 0) {
        summary.exitCode = ExitCode::kLost;
    }
    return summary;
}

}  // namespace

ExitCode RunReceiver(const Options& options, const SourceOpener& open, Signals& signals,
                     DisplayInterface& display, int keyboard) {
    ExitCode code = ExitCode::kInternal;
    const auto commands = std::make_shared<CommandQueue>();
    Observers observers(display);
    try {
        observers.Start(options, commands);
        code = Running(options, signals, observers, *commands, keyboard).Record(open);
    } catch (const ReceiverError& error) {
        code = error.Code();
        observers.Display().Failure(code, WithFullStop(error.what()));
    } catch (const std::exception& error) {
        observers.Display().Failure(code, WithFullStop(SentenceOf(error)));
    }
    commands->Close(kOver);
    observers.End();
    return code;
}

}  // namespace receiver
