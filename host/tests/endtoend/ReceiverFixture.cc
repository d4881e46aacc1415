#include "endtoend/ReceiverFixture.h"

#include <algorithm>
#include <fstream>
#include <sstream>

namespace endtoend {
namespace {

std::string textOf(const std::filesystem::path& file) {
    std::ifstream in(file);
    std::ostringstream text;
    text << in.rdbuf();
    return text.str();
}

}  // namespace

ReceiverFixture::ReceiverFixture() {
    std::filesystem::create_directory(OutputFolder());
    // Nothing of this machine's own configuration.
    environment["QX_SETTINGS"] = (folder.Path() / "settings.ini").string();
    environment["QX_LOG"] = (folder.Path() / "module.log").string();
}

std::vector<std::string> ReceiverFixture::CommandOf(const std::vector<std::string>& options) const {
    std::vector<std::string> command = {RECEIVER_PROGRAM};
    const auto names = [&](const std::string& option) {
        return std::find(options.begin(), options.end(), option) != options.end();
    };
    if (!names("--module")) {
        command.insert(command.end(), {"--module", CLIPFILE_MODULE});
    }
    if (!names("--output")) {
        command.insert(command.end(), {"--output", OutputFolder().string()});
    }
    command.insert(command.end(), options.begin(), options.end());
    return command;
}

std::unique_ptr<Process> ReceiverFixture::Start(const std::vector<std::string>& options,
                                                Process::Terminal terminal) const {
    return std::make_unique<Process>(CommandOf(options), environment, terminal);
}

Outcome ReceiverFixture::RunReceiver(const std::vector<std::string>& options) const {
    return RunProgram(CommandOf(options), environment);
}

std::string ReceiverFixture::Log() const {
    return textOf(folder.Path() / "module.log");
}

}  // namespace endtoend
