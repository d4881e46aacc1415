#include "RetentionCommand.h"

#include <CLI/CLI.hpp>
#include <nlohmann/json.hpp>
#include <optional>
#include <string>
#include <string_view>

#include "Output.h"

namespace clipfile {
namespace {

/// A validator that makes of a text what `read` reads in it.
template <typename Value>
CLI::Validator ReadBy(std::optional<Value> (*read)(std::string_view), std::optional<Value>& value,
                      const char* form) {
    return {[read, &value, form](std::string& text) {
                value = read(text);
                return value ? std::string() : text + " is not understood: write " + form;
            },
            ""};
}

}  // namespace

CLI::App* RetentionCommand::AddTo(CLI::App& app) {
    CLI::App* const command = app.add_subcommand(
        "retention", "Remove the oldest closed recordings of a folder, by age or for room on the disk.");
    command->add_option("DIR", options_.folder, "Folder with recordings")
        ->required()
        ->check(CLI::ExistingDirectory);
    command->add_option("--older-than", "Remove what was closed longer ago: 30d, 12h")
        ->check(ReadBy(ParseAge, options_.olderThan, "30d or 12h"));
    command->add_option("--keep-free", "Remove the oldest until so much of the disk is free: 500M, 200G, 1T")
        ->check(ReadBy(ParseBytes, options_.keepFree, "500M, 200G or 1T"));
    command->add_flag("--dry-run", options_.dryRun, "Tell what would be removed, and remove nothing");
    command->add_flag("--json", json_, "One JSON object a file and line");
    return command;
}

ExitCode RetentionCommand::Run(std::ostream& out, std::ostream& errors) const {
    if (!options_.olderThan && !options_.keepFree) {
        errors << "clipfile: --older-than or --keep-free has to say what may go.\n";
        return ExitCode::kUsage;
    }
    const std::string folder = options_.folder.string();
    ExitCode code = ExitCode::kSuccess;
    try {
        const RetentionResult result = Retain(options_, ThisSystem(), [&](const RetentionStep& step) {
            code = step.removed ? code : ExitCode::kDefects;
            Print(step, out);
        });
        for (const std::string& fault : result.faults) {
            TellFault(folder, fault, json_, out, errors);
            code = ExitCode::kUnreadable;
        }
        if (!result.standstill.empty()) {
            TellFault(folder, result.standstill, json_, out, errors);
            code = Worse(code, ExitCode::kDefects);
        }
        if (!result.isRoom) {
            TellFault(folder, "less of the disk is free than is to be kept free.", json_, out, errors);
            code = Worse(code, ExitCode::kDefects);
        }
    } catch (const ToolError& error) {
        TellFault(folder, error.what(), json_, out, errors);
        code = error.Code();
    }
    return code;
}

void RetentionCommand::Print(const RetentionStep& step, std::ostream& out) const {
    if (json_) {
        PrintJson(out, {{"file", step.path},
                        {"bytes", step.bytes},
                        {"goes", step.removed},
                        {"removed", step.removed && !options_.dryRun},
                        {"reason", step.reason}});
    } else {
        const char* const what = !step.removed     ? " stays: "
                                 : options_.dryRun ? " would be removed: "
                                                   : " is removed: ";
        out << step.path << what << step.reason << (step.reason.ends_with('.') ? "\n" : ".\n");
    }
    out.flush();  // who follows it knows at once what is gone
}

}  // namespace clipfile
