#include "options/Options.h"

#include <unistd.h>

#include <CLI/CLI.hpp>
#include <charconv>
#include <cstring>
#include <filesystem>
#include <limits>
#include <sstream>

#include "common/Credentials.h"
#include "common/ReceiverError.h"
#include "options/AddressCheck.h"
#include "options/ConfigFile.h"
#include "options/OptionText.h"
#include "options/Password.h"

namespace receiver {
namespace {

ReceiverError Wrong(const std::string& sentence) {
    return {ExitCode::kUsage, sentence};
}

/// Bytes in the name of a file or folder (NAME_MAX). The module ends the process over a longer one.
constexpr std::size_t kLongestName = 255;

/// Options as they stand on the command line, before anything is made of them.
struct Texts {
    std::string frameRate;
    std::string size;
    std::string record;
    std::string timecode;
    std::string mode = "sync";
    std::string recover = "yes";
    std::string passwordFile;
    bool noDropFrame = false;
    bool noReconnect = false;
    bool check = false;
};

std::uint32_t ParseDimension(std::string_view text, const std::string& size) {
    constexpr std::uint32_t kLargest = 8192;
    std::uint32_t value = 0;
    const auto [stop, error] = std::from_chars(text.data(), text.data() + text.size(), value);
    if (error != std::errc() || stop != text.data() + text.size() || value < 16 || value > kLargest ||
        value % 2 != 0) {
        throw Wrong("--size " + size +
                    " is no picture size: write WIDTHxHEIGHT, both even and from 16 to 8192.");
    }
    return value;
}

void ReadSize(const std::string& text, SourceOptions& source) {
    const std::size_t x = text.find('x');
    const std::string_view view = text;
    source.width = ParseDimension(view.substr(0, x), text);
    source.height = ParseDimension(x == std::string::npos ? std::string_view() : view.substr(x + 1), text);
}

void Interpret(const Texts& texts, Options& options) {
    if (!texts.frameRate.empty()) {
        options.source.frameRate = ParseFrameRate(texts.frameRate);
        if (!options.source.frameRate) {
            throw Wrong(
                "--fps " + texts.frameRate +
                " is no rate that can be recorded: choose 23.98, 24, 25, 29.97, 30, 50, 59.94 or 60.");
        }
    }
    if (!texts.size.empty()) {
        ReadSize(texts.size, options.source);
    }
    if (!texts.record.empty()) {
        const auto ranges = ParseRecordRanges(texts.record);
        if (!ranges) {
            throw Wrong(
                "--record " + texts.record +
                " cannot be read: write ascending ranges of seconds that do not touch, such as 2-9,12-20 "
                "or 5-.");
        }
        options.record = *ranges;
    }
    if (!texts.timecode.empty()) {
        options.timecode = ParseTimecode(texts.timecode);
        if (!options.timecode || !IsValid(*options.timecode, 60)) {
            throw Wrong("--timecode " + texts.timecode +
                        " is no timecode: write HH:MM:SS:FF, or HH:MM:SS;FF for drop frame.");
        }
    }
    if (!texts.passwordFile.empty()) {
        options.password = ReadPasswordFile("--password-file", texts.passwordFile);
    } else if (!options.password) {
        options.password = PasswordOfService();
    }
    options.mode = texts.mode == "on" ? OutputMode::kOn : OutputMode::kSync;
    options.recover = texts.recover == "no"    ? RecoverMode::kNo
                      : texts.recover == "ask" ? RecoverMode::kAsk
                                               : RecoverMode::kYes;
    options.dropFrame = !texts.noDropFrame;
    options.source.reconnect = !texts.noReconnect;
}

/// As `CLI::Range`, which lets pass what is no number.
CLI::Validator NumberFrom(double low, double high) {
    return {[low, high](std::string& text) {
                double value = 0;
                if (CLI::detail::lexical_cast(text, value) && value >= low && value <= high) {
                    return std::string();
                }
                std::ostringstream reason;
                reason << text << " is no number from " << low << " to " << std::fixed << std::setprecision(0)
                       << high;
                return reason.str();
            },
            ""};
}

/// The path of a program: found now, and not when the first file is closed.
CLI::Validator Program() {
    return {[](std::string& text) {
                std::error_code ignored;
                const bool runs =
                    std::filesystem::is_regular_file(text, ignored) && access(text.c_str(), X_OK) == 0;
                return text.empty() || runs ? std::string()
                                            : text + " is no program that could be run: write its path";
            },
            ""};
}

CLI::Validator WebAddress() {
    return {[](std::string& text) {
                return text.empty() || text.starts_with("http://") || text.starts_with("https://")
                           ? std::string()
                           : WithoutCredentials(text) + " does not begin with http:// or https://";
            },
            ""};
}

/// An empty value is a slip, as of a variable of a script that is not set. A password alone may be empty.
void CheckEmpty(const CLI::App& app) {
    for (const CLI::Option* const option : app.get_options()) {
        const auto& values = option->results();
        if (option->get_name() != "--password" && option->get_expected_max() > 0 &&
            std::find(values.begin(), values.end(), "") != values.end()) {
            throw Wrong(option->get_name() + " is empty: give it a value, or leave it out.");
        }
    }
}

/// Options that are right by themselves and contradict each other.
void CheckTogether(const CLI::App& app, const Options& options) {
    const bool encodes = options.source.url == "test:" || options.source.transcode;
    for (const char* const name : {"--fps", "--size", "--bitrate"}) {
        if (!encodes && app.count(name) != 0) {
            throw Wrong(std::string(name) +
                        " has no effect on a source that is recorded as it is: it goes with --input test: or "
                        "--transcode.");
        }
    }
    if (app.count("--speed") != 0 && IsLive(options.source.url)) {
        throw Wrong("--speed goes with files and test:; a live source has the speed that it has.");
    }
    if (!options.record.empty() && options.mode == OutputMode::kOn) {
        throw Wrong("--record goes with --mode sync; in mode on everything is recorded.");
    }
    if (options.timecode && options.timecode->dropFrame && !options.dropFrame) {
        throw Wrong("--timecode with ';' asks for drop frame and --no-drop-frame forbids it.");
    }
    if (options.prefix && options.prefix->find_first_of("/\\") != std::string::npos) {
        throw Wrong("--prefix is the name of one folder and must contain neither / nor \\.");
    }
    if (options.prefix && options.prefix->size() > kLongestName) {
        throw Wrong("--prefix is longer than the 255 bytes that the name of a folder may have.");
    }
}

void AddSourceOptions(CLI::App& app, Options& options, Texts& texts) {
    const auto group = "Source";
    app.add_option(
           "-i,--input", options.source.url,
           "Address as FFmpeg writes it (udp://, srt://, rtsp://, rtmp://, http://, with .m3u8 for HLS, an "
           ".sdp file for RTP), a file, or test: for a picture and a tone")
        ->type_name("URL")
        ->capture_default_str()
        ->group(group);
    app.add_option("--speed", options.source.speed, "Files and test: how many times real time")
        ->check(NumberFrom(0.01, 100000.0))
        ->type_name("N")
        ->capture_default_str()
        ->group(group);
    app.add_option("--timeout", options.source.timeout,
                   "Seconds of silence after which a source counts as lost")
        ->check(NumberFrom(0.1, 3600.0))
        ->type_name("SECONDS")
        ->capture_default_str()
        ->group(group);
    const auto addChoice = [&](const char* name, std::optional<std::uint32_t>& number, const char* what) {
        app.add_option(name, number, what)->check(CLI::Range(1u, 65535u))->type_name("N")->group(group);
    };
    addChoice("--program", options.source.program, "Number of the program, of a source that carries several");
    addChoice("--video", options.source.video, "Which of several videos, from 1");
    addChoice("--audio", options.source.audio, "Which of several sounds, from 1");
    app.add_flag("--no-reconnect", texts.noReconnect,
                 "End when the source is not there or is lost instead of waiting for it")
        ->group(group);
    app.add_flag("--transcode", options.source.transcode,
                 "Convert video that cannot be recorded as it is: another codec or rate")
        ->group(group);
    app.add_option("--fps", texts.frameRate, "Frame rate: 23.98, 24, 25, 29.97, 30, 50, 59.94 or 60")
        ->type_name("RATE")
        ->group("test: and --transcode");
    app.add_option("--size", texts.size, "Picture size in pixels")
        ->type_name("WxH")
        ->group("test: and --transcode");
    app.add_option("--bitrate", options.source.bitrate, "Kilobits a second of the video")
        ->check(CLI::Range(100u, 200000u))
        ->type_name("KBITS")
        ->capture_default_str()
        ->group("test: and --transcode");
    app.add_option(
           "--gop", options.source.pictureGroup,
           "Frames from one IDR frame to the next: encoded ones, as many as in a second when not given; of "
           "a source that is recorded as it is what it sends, judged at once and not when measured")
        ->check(CLI::Range(1u, 600u))
        ->type_name("FRAMES")
        ->group("test: and --transcode");
}

void AddFileOptions(CLI::App& app, Options& options, Texts& texts) {
    const auto group = "Files";
    app.add_option(
           "-o,--output", options.output,
           "Folder under which files appear, //server/share/folder for one on a share; else MP4OutputPath of "
           "the settings store, else recordings")
        ->type_name("DIR")
        ->group(group);
    app.add_option("--prefix", options.prefix,
                   "Last folder of the path of a file; Unknown-Model when not given")
        ->type_name("NAME")
        ->group(group);
    app.add_option("--file-type", options.fileType,
                   "normal: index at the end; fragment: readable while it grows")
        ->check(CLI::IsMember({"normal", "fragment"}))
        ->type_name("normal|fragment")
        ->capture_default_str()
        ->group(group);
    app.add_option(
           "--max-minutes", options.maxMinutes,
           "Minutes of video after which a new file begins; 0 is as often as possible, 120 when not given")
        ->type_name("N")
        ->group(group);
    app.add_flag("--group-write", options.groupWrite,
                 "Give files and folders to the group too: others may record to the same folder")
        ->group(group);
    app.add_option(
           "--recover", texts.recover,
           "Files that a crash has left open in the output folder: recover them in the background, ask "
           "on the terminal first, or only tell them")
        ->check(CLI::IsMember({"no", "ask", "yes"}))
        ->type_name("no|ask|yes")
        ->capture_default_str()
        ->group(group);
    app.add_option(
           "--durable", options.durable,
           "Seconds after which what was recorded must survive a power cut, 0 for as the system likes; "
           "not on a share; 2 when not given")
        ->check(NumberFrom(0, 3600.0))
        ->type_name("SECONDS")
        ->group(group);
    app.add_option("--user", options.user, "User name for a network share: NAME, DOMAIN\\NAME or NAME@DOMAIN")
        ->type_name("NAME")
        ->group(group);
    CLI::Option* const password =
        app.add_option("--password", options.password, "Its password; others may see it, so rather:")
            ->type_name("TEXT")
            ->group(group);
    app.add_option(
           "--password-file", texts.passwordFile,
           "File whose first line is the password; else the credential receiver.password of the service, "
           "else RECEIVER_PASSWORD of the environment")
        ->type_name("FILE")
        ->excludes(password)
        ->group(group);
}

void AddRecordOptions(CLI::App& app, Options& options, Texts& texts) {
    const auto group = "Recording";
    app.add_option(
           "--mode", texts.mode,
           "sync: the record flag in the metadata starts and stops; on: from the first frame to the last")
        ->check(CLI::IsMember({"sync", "on"}))
        ->type_name("sync|on")
        ->capture_default_str()
        ->group(group);
    app.add_option("--record", texts.record,
                   "What to record, in seconds of stream: 2-9,12-20 or 5-; from the start when not given")
        ->type_name("RANGES")
        ->group(group);
    app.add_option("--seconds", options.seconds, "End after so much stream")
        ->check(NumberFrom(0.001, 366.0 * 86400))
        ->type_name("N")
        ->group(group);
    app.add_option("--timecode", texts.timecode,
                   "Timecode of the first frame where the source has none; the time of day when not given")
        ->type_name("HH:MM:SS:FF")
        ->group(group);
    app.add_flag("--no-drop-frame", texts.noDropFrame, "Count timecode without drop frame at 29.97 and 59.94")
        ->group(group);
}

void AddProgramOptions(CLI::App& app, Options& options, Texts& texts) {
    const auto group = "Program";
    app.set_config("--config", "", "Read options from this TOML file too; the command line has precedence")
        ->type_name("FILE")
        ->group(group);
    app.add_flag("--check", texts.check, "Say what is wrong with the options, and exit")
        ->configurable(false)
        ->group(group);
    app.add_option("--module", options.module, "Another build of the module than the one beside this program")
        ->type_name("FILE")
        ->group(group);
    app.add_option("--settings", options.settings,
                   "Settings store; else the one that QX_SETTINGS names, else /etc/qx/settings.ini")
        ->type_name("FILE")
        ->group(group);
    app.add_option("--nalu-type", options.naluType, "Start parameter -naluType of the module")
        ->check(CLI::IsMember({"normal", "direct"}))
        ->type_name("normal|direct")
        ->capture_default_str()
        ->group(group);
    app.add_option(
           "--log", options.log,
           "Log of the module, - for standard error; else what QX_LOG names, else OUTPUT/receiver.log")
        ->type_name("FILE")
        ->group(group);
    app.add_option("--log-priority", options.logPriority, "Finest priority that is logged; 6 when not given")
        ->check(CLI::Range(0u, 13u))
        ->type_name("0-13")
        ->group(group);
    app.add_flag("--json", options.json, "Say everything as JSON on standard output, one object a line")
        ->group(group);
    app.add_option("--control", options.control,
                   "Unix socket for status, commands, events and previews (JSON-RPC, docs/control.md)")
        ->type_name("PATH")
        ->group(group);
    app.add_option("--hook", options.hook,
                   "Program to run when a file is closed, a recording begins or ends, or something fails")
        ->check(Program())
        ->type_name("PROGRAM")
        ->group(group);
    app.add_option("--hook-url", options.hookUrl, "Address to post the same events to, as JSON")
        ->check(WebAddress())
        ->type_name("URL")
        ->group(group);
    app.set_version_flag("--version", RECEIVER_VERSION, "Print the version and exit")->group(group);
    app.set_help_flag("-h,--help", "Print this and exit")->group(group);
}

/// Makes of options that can be read what they mean. Throws `ReceiverError` (`kUsage`) for a mistake in it.
void Complete(const CLI::App& app, const Texts& texts, Options& options) {
    CheckEmpty(app);
    if (const std::string mistake = AddressMistake(options.source.url); !mistake.empty()) {
        throw Wrong("--input " + WithoutCredentials(options.source.url) + ": " + mistake + ".");
    }
    Interpret(texts, options);
    CheckTogether(app, options);
}

}  // namespace

std::optional<Options> ParseOptions(int argc, const char* const* argv, std::string& text) {
    Options options;
    Texts texts;
    CLI::App app(kHelpIntroduction, "receiver");
    app.footer(kHelpFooter);
    app.get_formatter()->column_width(34);
    app.option_defaults()->multi_option_policy(CLI::MultiOptionPolicy::Throw);
    AddSourceOptions(app, options, texts);
    AddFileOptions(app, options, texts);
    AddRecordOptions(app, options, texts);
    AddProgramOptions(app, options, texts);
    const auto config = std::make_shared<ConfigFile>(app);
    app.config_formatter(config);
    try {
        try {
            app.parse(argc, argv);
        } catch (const CLI::CallForHelp&) {
            text = app.help();
            return std::nullopt;
        } catch (const CLI::CallForVersion& version) {
            text = std::string("receiver ") + version.what() + "\n";
            return std::nullopt;
        } catch (const CLI::ParseError& error) {
            std::string reason = error.what();
            std::replace(reason.begin(), reason.end(), '\n', ' ');
            throw Wrong(reason + "; receiver --help lists the options.");
        }
        Complete(app, texts, options);
    } catch (const ReceiverError& error) {
        const std::string place = config->PlaceOf(error.what());
        throw ReceiverError(error.Code(), place + error.what());
    }
    if (texts.check) {
        text = "receiver: nothing is wrong with the options.\n";
        return std::nullopt;
    }
    return options;
}

void HideCredentials(int argc, char** argv) {
    HidePasswordVariable();
    constexpr std::string_view kName = "--password";
    for (int i = 1; i < argc; ++i) {
        const std::string_view argument = argv[i];
        if (argument.find("://") != std::string_view::npos) {
            for (const TextSpan& span : CredentialsIn(argument)) {
                std::memset(argv[i] + span.begin, 'x', span.end - span.begin);
            }
        }
        if (argument == kName && i + 1 < argc) {
            std::memset(argv[i + 1], 'x', std::strlen(argv[i + 1]));
        } else if (argument.starts_with(kName) && argument.substr(kName.size()).starts_with('=')) {
            std::memset(argv[i] + kName.size() + 1, 'x', argument.size() - kName.size() - 1);
        }
    }
}

}  // namespace receiver
