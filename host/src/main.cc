#include <unistd.h>

#include <cstdio>
#include <iostream>
#include <memory>
#include <string>

#include "Receiver.h"
#include "common/ReceiverError.h"
#include "display/JsonDisplay.h"
#include "display/TerminalDisplay.h"
#include "display/TextDisplay.h"
#include "operator/Keyboard.h"
#include "operator/Signals.h"
#include "options/Options.h"

namespace {

std::unique_ptr<receiver::DisplayInterface> MakeDisplay(const receiver::Options& options) {
    if (options.json) {
        return std::make_unique<receiver::JsonDisplay>(std::cout);
    }
    if (isatty(STDERR_FILENO) == 1) {
        return std::make_unique<receiver::TerminalDisplay>(std::cerr, std::cout, STDERR_FILENO);
    }
    return std::make_unique<receiver::TextDisplay>(std::cerr, std::cout);
}

}  // namespace

int main(int argc, char** argv) {
    std::optional<receiver::Options> options;
    try {
        std::string text;
        options = receiver::ParseOptions(argc, argv, text);
        if (!options) {
            std::cout << text;
            return static_cast<int>(receiver::ExitCode::kSuccess);
        }
    } catch (const receiver::ReceiverError& error) {
        std::cerr << "receiver: " << error.what() << '\n';
        return static_cast<int>(error.Code());
    }
    receiver::HideCredentials(argc, argv);
    receiver::Signals signals(receiver::Keyboard::RestoreTerminal);
    const std::unique_ptr<receiver::DisplayInterface> display = MakeDisplay(*options);
    return static_cast<int>(
        receiver::RunReceiver(*options, receiver::OpenSource, signals, *display, STDIN_FILENO));
}
