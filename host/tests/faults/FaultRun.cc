#include "faults/FaultRun.h"

#include <algorithm>
#include <cerrno>
#include <chrono>
#include <cstdlib>
#include <cstring>
#include <fstream>
#include <map>
#include <nlohmann/json.hpp>
#include <sstream>

#include "support/Judges.h"
#include "support/Process.h"

namespace endtoend {
namespace {

/// A healthy run takes a second, one that gives up a writer four more.
constexpr std::chrono::seconds kDeadline{60};

constexpr int kSignalled = 125;

constexpr std::size_t kPicturesOfAChunk = 8;
/// The module keeps a fragment in memory until it is whole: 32 chunks of 8 pictures.
constexpr std::size_t kPicturesOfAFragment = 256;

std::string TextOf(const std::filesystem::path& file) {
    std::ifstream in(file);
    std::ostringstream text;
    text << in.rdbuf();
    return text.str();
}

std::vector<std::string> LinesOf(const std::string& text) {
    std::vector<std::string> lines;
    std::istringstream in(text);
    for (std::string line; std::getline(in, line);) {
        lines.push_back(line);
    }
    return lines;
}

bool Contains(const std::string& text, const std::string& part) {
    return text.find(part) != std::string::npos;
}

/// Of a line of the shim's log, "write /path".
bool IsCallOf(const Fault& fault, const std::string& line) {
    return line.starts_with(fault.call + " ") && line.ends_with(fault.suffix);
}

std::map<std::string, std::string> EnvironmentOf(const std::filesystem::path& folder, const Fault& fault) {
    return {{"LD_PRELOAD", FAULT_SHIM},
            // Nothing of this machine's own configuration.
            {"QX_SETTINGS", folder / "settings.ini"},
            {"QX_LOG", folder / "module.log"},
            {"FAULT_FOLDER", folder / "recordings"},
            {"FAULT_LOG", folder / "calls"},
            {"FAULT_KIND", fault.call},
            {"FAULT_SUFFIX", fault.suffix},
            {"FAULT_FROM", std::to_string(fault.number)},
            {"FAULT_COUNT", fault.once ? "1" : "0"},
            {"FAULT_ERROR", std::to_string(fault.error)},
            {"FAULT_SHORT", fault.isShort ? "1" : "0"},
            {"FAULT_DELAY", std::to_string(fault.delayMilliseconds)}};
}

/// Three files of 16, 16 and 8 pictures; or one with a fragment of 256 pictures and another one.
std::vector<std::string> CommandOf(FileType type, const std::filesystem::path& folder, const Fault& fault) {
    std::vector<std::string> command = {RECEIVER_PROGRAM,
                                        "--module",
                                        CLIPFILE_MODULE,
                                        "--output",
                                        folder / "recordings",
                                        "--file-type",
                                        NameOf(type),
                                        "--size",
                                        "160x90",
                                        "--bitrate",
                                        "100",
                                        "--gop",
                                        "16",
                                        "--speed",
                                        "1000",
                                        "--timecode",
                                        "10:00:00:00",
                                        "--recover",
                                        "no",
                                        "--log-priority",
                                        "13",
                                        "--durable",
                                        fault.durable,
                                        "--fps"};
    const std::vector<std::string> rest =
        type == FileType::kNormal ? std::vector<std::string>{"50", "--seconds", "0.8", "--max-minutes", "0"}
                                  : std::vector<std::string>{"60", "--seconds", "4.8"};
    command.insert(command.end(), rest.begin(), rest.end());
    return command;
}

/// The number behind the last `words`, which came at `at`, and the one before that.
struct Progress {
    std::size_t last = 0;
    std::size_t before = 0;
};

Progress WrittenIn(const std::vector<std::string>& log) {
    const std::string words = "write chunk. ";
    Progress progress;
    for (const std::string& line : log) {
        if (const std::size_t at = line.find(words); at != std::string::npos) {
            progress.before = progress.last;
            progress.last = std::stoul(line.substr(at + words.size()));
        }
    }
    return progress;
}

/// Pictures in front of the first one that a line of verify names, or whose metadata one names.
std::size_t IntactBefore(const std::string& defects) {
    std::size_t first = std::string::npos;
    for (const std::string word : {" picture ", " unit "}) {
        for (std::size_t at = defects.find(word); at != std::string::npos; at = defects.find(word, at + 1)) {
            first = std::min(first, std::strtoul(defects.c_str() + at + word.size(), nullptr, 10));
        }
    }
    return first == 0 || first == std::string::npos ? first : first - 1;
}

std::optional<int> CauseIn(const std::string& said) {
    const std::string words = "(status 7, cause ";
    const std::size_t at = said.find(words);
    return at == std::string::npos ? std::nullopt
                                   : std::optional<int>(std::stoi(said.substr(at + words.size())));
}

/// What the module's log has to say for each cause (docs/operation.md).
const std::map<int, std::vector<std::string>>& LinesOfCauses() {
    static const std::map<int, std::vector<std::string>> lines{
        {2, {"mp4 file initialize error.", "end. threads cannot be started. "}},
        {22, {"disk size could not be obtained. error = "}},
        {23, {"mp4 box size could not be measured."}},
        {24, {"mp4 mkdir error. "}},
        {25, {"mp4 file open error.", "create mp4 file object failed."}},
        {26, {"mp4 file write error.", "recording cannot be started. "}},
        {27, {"mp4 file close error."}},
    };
    return lines;
}

/// The causes that a call of the module may fail with, in the output folder.
std::vector<int> CausesOf(const Fault& fault) {
    if (fault.suffix == ".MP4") {
        return fault.call == "open"    ? std::vector<int>{25}
               : fault.call == "write" ? std::vector<int>{25, 26, 27}
                                       : std::vector<int>{};
    }
    return fault.call == "mkdir"    ? std::vector<int>{24}
           : fault.call == "space"  ? std::vector<int>{22}
           : fault.call == "malloc" ? std::vector<int>{2, 23, 25, 26, 27}
           : fault.call == "thread" ? std::vector<int>{2, 26}
                                    : std::vector<int>{};
}

/// What is wrong with how a run that the fault ended has ended.
std::vector<std::string> WrongInFailure(const FaultOutcome& outcome, const Fault& fault) {
    std::vector<std::string> wrong;
    const int cause = *outcome.cause;
    const std::vector<int> causes = CausesOf(fault);
    const int code = Contains(outcome.said, "the module refuses to start") ? 5 : 7;
    if (outcome.code != code) {
        wrong.push_back("status 7 and exit code " + std::to_string(outcome.code.value_or(-1)));
    }
    if (std::find(causes.begin(), causes.end(), cause) == causes.end()) {
        wrong.push_back("cause " + std::to_string(cause));
    }
    const auto lines = LinesOfCauses().find(cause);
    if (lines == LinesOfCauses().end() ||
        std::none_of(lines->second.begin(), lines->second.end(),
                     [&outcome](const std::string& line) { return Contains(outcome.log, line); })) {
        wrong.push_back("no line for cause " + std::to_string(cause));
    }
    return wrong;
}

}  // namespace

std::string NameOf(FileType type) {
    return type == FileType::kNormal ? "normal" : "fragment";
}

std::string NameOf(LeftFile::State state) {
    return state == LeftFile::State::kWhole       ? "whole"
           : state == LeftFile::State::kRecovered ? "recovered"
           : state == LeftFile::State::kDamaged   ? "damaged"
                                                  : "empty";
}

std::string CallOf(const Fault& fault) {
    return fault.suffix.empty() ? fault.call : fault.call + " " + fault.suffix;
}

std::string EffectOf(const Fault& fault) {
    const std::string effect = fault.isShort ? "half is written"
                               : fault.delayMilliseconds != 0
                                   ? std::to_string(fault.delayMilliseconds) + " ms late"
                               : fault.call == "malloc" ? "no memory"
                                                        : strerrorname_np(fault.error);
    return fault.once ? effect : effect + " from there on";
}

std::size_t CountCalls(const std::string& calls, const Fault& fault) {
    const std::vector<std::string> lines = LinesOf(calls);
    return static_cast<std::size_t>(std::count_if(
        lines.begin(), lines.end(), [&fault](const std::string& line) { return IsCallOf(fault, line); }));
}

const std::vector<Fault>& Calls() {
    static const std::vector<Fault> calls{
        {"write", ".MP4"},
        {"open", ".MP4"},
        {"mkdir", ""},
        {"space", ""},
        {"sync", ".MP4"},
        {"sync", "Unknown-Model"},
        {"malloc", ""},
        {"thread", ""},
        {"open", ".journal.new"},
        {"write", ".journal.new"},
        {"sync", ".journal.new"},
        {"rename", ".journal"},
    };
    return calls;
}

std::vector<Fault> EffectsOn(const Fault& call, std::size_t number, bool all) {
    const auto with = [&](int error, bool once) {
        Fault fault = call;
        fault.number = number;
        fault.error = error;
        fault.once = once;
        fault.durable = call.call == "sync" ? "0.001" : "0";
        return fault;
    };
    if (call.call == "malloc") {
        return {with(ENOMEM, true)};
    }
    if (call.call == "thread") {
        return {with(EAGAIN, true), with(EAGAIN, false)};
    }
    std::vector<Fault> faults = {with(EIO, true), with(ENOSPC, false)};
    if (!all) {
        return faults;
    }
    for (const int error : {ENOSPC, EINTR, ESTALE, EDQUOT, EROFS}) {
        faults.push_back(with(error, true));
    }
    Fault late = with(0, true);
    late.delayMilliseconds = 200;
    faults.push_back(late);
    if (call.call == "write") {
        Fault half = with(0, true);
        half.isShort = true;
        faults.push_back(half);
    }
    return faults;
}

FaultRunner::FaultRunner(FileType type) : type_(type) {
    Fault none;
    none.durable = "0.001";
    const FaultOutcome outcome = RunIn(reference_.Path(), none);
    if (outcome.code != 0 || outcome.files.empty()) {
        throw std::runtime_error("a run without a fault has failed: " + outcome.said);
    }
    pictures_ = outcome.pictures;
    like_ = outcome.files.front().path;
    calls_ = outcome.calls;
}

FaultOutcome FaultRunner::Run(const Fault& fault) const {
    const TemporaryFolder folder;
    return RunIn(folder.Path(), fault);
}

FaultOutcome FaultRunner::RunIn(const std::filesystem::path& folder, const Fault& fault) const {
    std::filesystem::create_directory(folder / "recordings");
    std::filesystem::create_directory(folder / "recovered");
    FaultOutcome outcome;
    {
        Process receiver(CommandOf(type_, folder, fault), EnvironmentOf(folder, fault));
        outcome.code = receiver.Wait(kDeadline);
        outcome.said = receiver.AllText();
    }
    outcome.log = TextOf(folder / "module.log");
    outcome.cause = CauseIn(outcome.said);
    const Progress written = WrittenIn(LinesOf(outcome.log));
    outcome.taken = Contains(outcome.log, "mp4 file write error.") ? written.before : written.last;
    // The end of a chunk waits in its stream for the next one.
    outcome.taken -= std::min(outcome.taken, kPicturesOfAChunk);
    if (type_ == FileType::kFragmented) {
        outcome.taken -= outcome.taken % kPicturesOfAFragment;
    }
    outcome.calls = TextOf(folder / "calls");
    outcome.hit = fault.number != 0 && CountCalls(outcome.calls, fault) >= fault.number;
    for (const auto& file : RecordingsIn(folder / "recordings")) {
        outcome.files.push_back(Judge(file, folder / "recovered"));
        outcome.pictures += outcome.files.back().pictures;
    }
    return outcome;
}

LeftFile FaultRunner::Judge(const std::filesystem::path& file, const std::filesystem::path& scratch) const {
    const auto picturesOf = [](const std::filesystem::path& path) -> std::size_t {
        const std::string count = StreamOf(AskFfprobe(path), "video").value("nb_read_packets", "0");
        return std::stoul(count);
    };
    const auto defectsOf = [](const std::filesystem::path& path) {
        return RunProgram({CLIPFILE_PROGRAM, "verify", "--deep", path.string()});
    };
    LeftFile left{file, LeftFile::State::kNothing, 0, {}};
    const Outcome verified = defectsOf(file);
    if (verified.code == 0) {
        left.state = LeftFile::State::kWhole;
        left.pictures = picturesOf(file);
        return left;
    }
    left.defects = verified.output + verified.errors;
    std::vector<std::string> command = {CLIPFILE_PROGRAM, "recover", "--output", scratch.string(),
                                        file.string()};
    if (!like_.empty()) {
        command.insert(command.end() - 1, {"--like", like_});
    }
    const Outcome recovery = RunProgram(command);
    if (Contains(recovery.output + recovery.errors, "is closed: nothing to recover.")) {
        left.state = LeftFile::State::kDamaged;
        left.pictures = std::min(picturesOf(file), IntactBefore(left.defects));
        return left;
    }
    const std::filesystem::path recovered = scratch / file.filename();
    if (std::filesystem::exists(recovered) && defectsOf(recovered).code == 0) {
        left.state = LeftFile::State::kRecovered;
        left.pictures = picturesOf(recovered);
    }
    return left;
}

std::vector<std::string> FaultRunner::WrongIn(const FaultOutcome& outcome, const Fault& fault) const {
    if (!outcome.code) {
        return {"it hangs"};
    }
    if (*outcome.code >= kSignalled) {
        return {"it ends with " + std::to_string(*outcome.code)};
    }
    std::vector<std::string> wrong;
    if (outcome.pictures < outcome.taken) {
        wrong.push_back(std::to_string(outcome.taken) + " pictures were written, and " +
                        std::to_string(outcome.pictures) + " are there");
    }
    if (outcome.cause) {
        const std::vector<std::string> more = WrongInFailure(outcome, fault);
        wrong.insert(wrong.end(), more.begin(), more.end());
        return wrong;
    }
    if (*outcome.code == 0 || *outcome.code == 8) {
        if (outcome.pictures != Pictures()) {
            wrong.push_back("exit code " + std::to_string(*outcome.code) + " and " +
                            std::to_string(outcome.pictures) + " pictures of " + std::to_string(Pictures()));
        }
    } else if (!Contains(outcome.said, "receiver: ")) {
        wrong.push_back("exit code " + std::to_string(*outcome.code) + " without a sentence");
    }
    return wrong;
}

}  // namespace endtoend
