#include <iostream>

#include "Program.h"

int main(int count, char** arguments) {
    const std::vector<std::string> all(arguments, arguments + count);
    return static_cast<int>(clipfile::RunProgram(all, std::cout, std::cerr));
}
