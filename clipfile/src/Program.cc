#include "Program.h"

#include <CLI/CLI.hpp>
#include <cerrno>
#include <cstdio>
#include <exception>
#include <filesystem>
#include <functional>
#include <nlohmann/json.hpp>
#include <sstream>
#include <string_view>
#include <system_error>

#include "Output.h"
#include "RetentionCommand.h"
#include "control/ControlCall.h"
#include "inspect/BoxTree.h"
#include "inspect/Inspection.h"
#include "inspect/JsonReport.h"
#include "inspect/Plot.h"
#include "inspect/TextReport.h"
#include "inspect/Thumbnails.h"
#include "reader/Folder.h"
#include "reader/FormatError.h"
#include "recover/Recovery.h"
#include "recover/Unattended.h"
#include "recover/UnfinishedFiles.h"
#include "verify/Verification.h"

namespace clipfile {

namespace {

namespace fs = std::filesystem;
using Json = nlohmann::ordered_json;

/// Of a file that is verified, from one look at the free space to the next: seconds, at most.
constexpr int kSamplesBetweenChecks = 256;

/// Options as they stand on the command line.
struct Options {
    std::vector<std::string> files;
    bool json = false;
    bool boxes = false;
    std::size_t rows = 4;
    std::string plot;
    std::string thumbnails;
    RecoveryOptions recovery;
    bool unattended = false;
    bool deep = false;
    ControlCall call;
    RetentionCommand retention;
};

/// Tells which folders could not be read.
ExitCode TellFaults(const std::string& folder, const FolderListing& listing, const Options& options,
                    std::ostream& out, std::ostream& errors) {
    for (const std::string& fault : listing.faults) {
        TellFault(folder, fault, options.json, out, errors);
    }
    return listing.faults.empty() ? ExitCode::kSuccess : ExitCode::kUnreadable;
}

/// What cannot be examined is none: whoever opens it tells why.
bool IsFolder(const std::string& path) {
    std::error_code ignored;
    return std::filesystem::is_directory(path, ignored);
}

/// Does `work` on each file and goes on behind those that fail.
ExitCode ForEachFile(const Options& options, std::ostream& out, std::ostream& errors,
                     const std::function<ExitCode(const std::string&)>& work) {
    ExitCode result = ExitCode::kSuccess;
    for (const std::string& path : options.files) {
        ExitCode code = ExitCode::kSuccess;
        std::string sentence;
        try {
            code = work(path);
        } catch (const ToolError& error) {
            code = error.Code();
            sentence = error.what();
        } catch (const std::exception& error) {
            code = ExitCode::kUnreadable;
            sentence = path + " cannot be worked on: " + error.what();
        }
        if (!sentence.empty()) {
            TellFault(path, sentence, options.json, out, errors);
        }
        out.flush();  // an archive takes hours
        result = Worse(result, code);
    }
    return result;
}

/// Writes a file that is not there yet.
void WriteNew(const std::string& path, std::string_view bytes) {
    std::FILE* const file = std::fopen(path.c_str(), "wbxe");
    bool isWritten = file != nullptr && std::fwrite(bytes.data(), 1, bytes.size(), file) == bytes.size();
    isWritten = (file == nullptr || std::fclose(file) == 0) && isWritten;
    if (!isWritten) {
        throw ToolError(ExitCode::kUnreadable,
                        path + " cannot be written: " + std::generic_category().message(errno) + ".");
    }
}

/// What `inspect` draws, besides what it tells.
void Draw(const InputFile& file, const Inspection& inspection, const Options& options) {
    if (!options.plot.empty()) {
        std::ostringstream plot;
        PrintPlot(plot, file, inspection);
        WriteNew(options.plot, plot.str());
    }
    if (!options.thumbnails.empty()) {
        const std::vector<unsigned char> png = MakeThumbnails(file, inspection);
        WriteNew(options.thumbnails, {reinterpret_cast<const char*>(png.data()), png.size()});
    }
}

ExitCode InspectFile(const std::string& path, const Options& options, std::ostream& out) {
    const InputFile file(path);
    if (options.boxes && options.json) {
        PrintJson(out, {{"file", path}, {"boxes", BoxesToJson(file, options.rows)}});
    } else if (options.boxes) {
        PrintBoxes(out, file, options.rows);
    } else {
        const Inspection inspection = Inspect(file);
        options.json ? PrintJson(out, ToJson(inspection)) : PrintText(out, inspection);
        Draw(file, inspection, options);
    }
    return ExitCode::kSuccess;
}

std::string Plural(std::uint64_t count, const std::string& word) {
    return std::to_string(count) + " " + word + (count == 1 ? "" : "s");
}

/// Warns where nobody could tell whether the file was still recorded.
void TellLockFault(const std::string& path, const RecoveryResult& result, const Options& options,
                   std::ostream& errors) {
    if (!result.lockFault.empty() && !options.json) {
        errors << "clipfile: " << path << " could not be locked against a recorder: " << result.lockFault
               << ".\n";
    }
}

/// Why a file that was to take the place of its original stands beside it.
void TellDefects(const std::string& path, const RecoveryResult& result, const Options& options,
                 std::ostream& out) {
    if (!options.unattended || options.json || !result.isRecovered || result.written == fs::absolute(path)) {
        return;
    }
    out << path << " stays beside it: ";
    if (result.defects.empty()) {
        out << "behind its last whole picture there is more than a chunk.\n";
    } else {
        out << "the recovered file has " << Plural(result.defects.size(), "defect")
            << ", the first is: " << result.defects.front() << '\n';
    }
}

/// Recovers a file beside a running recorder, which needs the disk more. A file in which no later attempt
/// will find more counts as one that cannot be recovered.
RecoveryResult RecoverUnattended(const std::string& path, RecoveryOptions options) {
    CheckRoomForCopy(path);
    options.checkRoom = [path] { CheckRoom(path); };
    options.verify = [path](const fs::path& file, const fs::path& name) {
        const auto onSample = [path, count = 0]() mutable {
            if (++count % kSamplesBetweenChecks == 0) {
                CheckRoom(path);
            }
        };
        return VerifyFile(file, {.deep = true, .name = name, .onSample = onSample}).defects;
    };
    try {
        return RecoverFile(path, options);
    } catch (const NoRecordingError& error) {
        throw ToolError(ExitCode::kDefects, error.what());
    } catch (const FormatError& error) {
        throw ToolError(ExitCode::kDefects, path + " cannot be recovered: " + error.what());
    }
}

ExitCode RecoverOne(const std::string& path, const Options& options, std::ostream& out,
                    std::ostream& errors) {
    const RecoveryResult result =
        options.unattended ? RecoverUnattended(path, options.recovery) : RecoverFile(path, options.recovery);
    TellLockFault(path, result, options, errors);
    if (options.json) {
        PrintJson(out, {{"file", path},
                        {"recovered", result.isRecovered},
                        {"written", result.written.string()},
                        {"pictures", result.pictures},
                        {"audio_frames", result.audioFrames},
                        {"metadata_units", result.metadataUnits},
                        {"bytes_left", result.bytesLeft},
                        {"parameter_sets", result.parameterSets},
                        {"lock_fault", result.lockFault},
                        {"defects", result.defects}});
    } else if (!result.isRecovered) {
        out << path << " is closed: nothing to recover.\n";
    } else {
        out << path << ": " << Plural(result.pictures, "picture") << ", "
            << Plural(result.audioFrames, "audio frame") << " and " << Plural(result.metadataUnits, "unit")
            << " of metadata are in " << result.written.string();
        if (!result.parameterSets.empty()) {
            out << ", with parameter sets from " << result.parameterSets;
        }
        out << "; " << Plural(result.bytesLeft, "byte") << " behind them belong to nothing whole.\n";
    }
    TellDefects(path, result, options, out);
    return ExitCode::kSuccess;
}

/// Takes away and tells the files that stand recovered already.
void PassOverRecovered(Options& found, std::ostream& out) {
    std::erase_if(found.files, [&](const std::string& path) {
        const auto target = RecoveredBefore(path, found.recovery);
        if (target && found.json) {
            PrintJson(out, {{"file", path}, {"recovered", false}, {"there_already", target->string()}});
        } else if (target) {
            out << path << " is passed over: " << target->string() << " is there already.\n";
        }
        return target.has_value();
    });
}

/// Files as they are, and of folders the recordings in them that are not closed.
ExitCode Recover(const std::string& path, const Options& options, std::ostream& out, std::ostream& errors) {
    if (!IsFolder(path)) {
        Options one = options;
        one.files = {path};
        if (options.unattended) {
            PassOverRecovered(one, out);
        }
        return one.files.empty() ? ExitCode::kSuccess : RecoverOne(path, options, out, errors);
    }
    FolderListing listing = UnfinishedIn(path);
    const ExitCode searched = TellFaults(path, listing, options, out, errors);
    Options found = options;
    found.files = std::move(listing.files);
    found.recovery.searched = path;
    if (found.files.empty() && listing.faults.empty() && !options.json) {
        out << path << " has no unfinished recording.\n";
    }
    PassOverRecovered(found, out);
    return Worse(searched, ForEachFile(found, out, errors, [&](const std::string& file) {
                     return RecoverOne(file, found, out, errors);
                 }));
}

/// The files that are named, and those below the folders that are.
ExitCode FindFiles(Options& options, std::ostream& out, std::ostream& errors) {
    ExitCode result = ExitCode::kSuccess;
    std::vector<std::string> files;
    for (const std::string& path : options.files) {
        if (IsFolder(path)) {
            const FolderListing listing = FilesIn(path);
            files.insert(files.end(), listing.files.begin(), listing.files.end());
            result = Worse(result, TellFaults(path, listing, options, out, errors));
        } else {
            files.push_back(path);
        }
    }
    options.files = std::move(files);
    return result;
}

ExitCode PrintDefects(const Verification& file, const Options& options, std::ostream& out) {
    if (options.json) {
        PrintJson(out, {{"file", file.path.string()}, {"defects", file.defects}});
    } else {
        for (const std::string& defect : file.defects) {
            out << file.path.string() << ": " << defect << '\n';
        }
    }
    return file.defects.empty() ? ExitCode::kSuccess : ExitCode::kDefects;
}

/// Lines come file by file, and in the end those about neighbours. An object has both, and comes in the end.
ExitCode Verify(const Options& options, std::ostream& out, std::ostream& errors) {
    Options found = options;
    ExitCode result = FindFiles(found, out, errors);
    std::vector<Verification> files;
    const ExitCode read = ForEachFile(found, out, errors, [&](const std::string& path) {
        Verification& file = files.emplace_back(VerifyFile(path, {.deep = options.deep}));
        if (options.json) {
            return ExitCode::kSuccess;
        }
        const ExitCode code = PrintDefects(file, options, out);
        file.defects.clear();
        return code;
    });
    result = Worse(result, read);
    VerifyNeighbours(files);
    for (const Verification& file : files) {
        result = Worse(result, PrintDefects(file, options, out));
    }
    return result;
}

void AddInspect(CLI::App& app, Options& options) {
    CLI::App* const command =
        app.add_subcommand("inspect", "Tell what is in recordings, closed or unfinished.");
    command->add_option("FILE", options.files, "Recordings")->required();
    CLI::Option* const boxes = command->add_flag(
        "--boxes", options.boxes,
        "List the boxes of any MP4 file, with offsets, and fields by their names in the standard");
    command->add_option("--rows", options.rows, "Rows of each table that --boxes shows")
        ->capture_default_str();
    command
        ->add_option("--plot", options.plot,
                     "Draw sizes of pictures, groups, and times of chunks into a new file (SVG)")
        ->excludes(boxes);
    command->add_option("--thumbnails", options.thumbnails, "Put pictures of the file into a new file (PNG)")
        ->excludes(boxes);
    command->add_flag("--json", options.json, "One JSON object a file and line");
}

CLI::App* AddVerify(CLI::App& app, Options& options) {
    CLI::App* const command =
        app.add_subcommand("verify", "Tell what is wrong with recordings, a line a defect.");
    command->add_option("FILE|DIR", options.files, "Recordings, or folders with recordings")->required();
    command->add_flag("--deep", options.deep, "Read all samples, not headers and tables alone");
    command->add_flag("--json", options.json, "One JSON object a file and line");
    return command;
}

CLI::App* AddRecover(CLI::App& app, Options& options) {
    CLI::App* const command = app.add_subcommand(
        "recover", "Make whole files of recordings that were cut off. The originals stay as they are.");
    command->add_option("FILE|DIR", options.files, "Recordings, or folders to search for unfinished ones")
        ->required();
    command->add_option("--like", options.recovery.like,
                        "A closed recording of the same stream, for the parameter sets of a normal file");
    CLI::Option* const output =
        command->add_option("--output", options.recovery.output, "Folder for the recovered files")
            ->check(CLI::ExistingDirectory);
    CLI::Option* const inPlace = command
                                     ->add_flag("--in-place", options.recovery.inPlace,
                                                "Put each recovered file in the place of its original")
                                     ->excludes(output);
    command
        ->add_flag("--unattended", options.unattended,
                   "Beside a running recorder: give way to it, and put a recovered file in the place of its "
                   "original when verify --deep finds nothing wrong with it, else beside")
        ->excludes(output)
        ->excludes(inPlace);
    command->add_flag("--json", options.json, "One JSON object a file and line");
    return command;
}

CLI::App* AddControl(CLI::App& app, Options& options) {
    CLI::App* const command =
        app.add_subcommand("control", "Ask a running receiver, and print its answer (JSON).");
    command->add_option("SOCKET", options.call.socket, "Its control socket")->required();
    command
        ->add_option("METHOD", options.call.method,
                     "status, record.start, record.stop, record.split, files, preview, events")
        ->required();
    command->add_option("PARAMS", options.call.params, "An object of JSON, as '{\"width\": 640}'");
    return command;
}

/// Asks a receiver, and tells why not.
ExitCode Control(const ControlCall& call, std::ostream& out, std::ostream& errors) {
    try {
        return CallControl(call, out, errors);
    } catch (const ToolError& error) {
        errors << "clipfile: " << error.what() << '\n';
        return error.Code();
    }
}

}  // namespace

ExitCode RunProgram(const std::vector<std::string>& arguments, std::ostream& out, std::ostream& errors) {
    Options options;
    CLI::App app("Looks into the recordings of the clipfile module.", "clipfile");
    app.require_subcommand(1);
    AddInspect(app, options);
    const CLI::App* const verify = AddVerify(app, options);
    const CLI::App* const recover = AddRecover(app, options);
    const CLI::App* const retention = options.retention.AddTo(app);
    const CLI::App* const control = AddControl(app, options);
    std::vector<std::string> reversed(arguments.rbegin(), arguments.rend() - 1);
    try {
        app.parse(reversed);
    } catch (const CLI::ParseError& error) {
        return app.exit(error, out, errors) == 0 ? ExitCode::kSuccess : ExitCode::kUsage;
    }
    if (options.files.size() > 1 && !(options.plot + options.thumbnails).empty()) {
        errors << "clipfile: --plot and --thumbnails go with one file.\n";
        return ExitCode::kUsage;
    }
    if (options.unattended) {
        GiveWay();
        EndWithParent();
    }
    if (control->parsed()) {
        return Control(options.call, out, errors);
    }
    if (retention->parsed()) {
        return options.retention.Run(out, errors);
    }
    if (verify->parsed()) {
        return Verify(options, out, errors);
    }
    return ForEachFile(options, out, errors, [&](const std::string& path) {
        return recover->parsed() ? Recover(path, options, out, errors) : InspectFile(path, options, out);
    });
}

}  // namespace clipfile
