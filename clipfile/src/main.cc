#include <cstdlib>
#include <exception>
#include <iostream>

#include "Program.h"

int main(int count, char** arguments) {
    // The module's log is for those who look for faults: its lines would stand between those of the program.
    setenv("QX_LOG_PRIORITY", "0", 0);
    const std::vector<std::string> all(arguments, arguments + count);
    try {
        return static_cast<int>(clipfile::RunProgram(all, std::cout, std::cerr));
    } catch (const std::exception& error) {
        std::cerr << "clipfile: " << error.what() << '\n';
        return static_cast<int>(clipfile::ExitCode::kUnreadable);
    }
}
