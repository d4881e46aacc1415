#pragma once

#include <gmock/gmock.h>

#include <algorithm>
#include <cstddef>
#include <string>
#include <vector>

#include "LogCapture.h"

// Matchers and questions about captured log lines.

/// A line that names the place where it was logged.
MATCHER_P4(LineOf, file, priority, function, text, "") {
    return arg.priority == priority && arg.text == std::string(text) &&
           arg.function == std::string(function) && arg.file == std::string(file) && arg.line > 0;
}

/// A line of operators or of the statistics, which names no place.
MATCHER_P2(PlainLine, priority, text, "") {
    return arg.priority == priority && arg.text == std::string(text) && !arg.function.has_value() &&
           !arg.file.has_value() && arg.line == 0;
}

/// The name under which an operation of the controller logs.
inline std::string controllerFunction(const std::string& operation) {
    return "clipfileModule::Controller::" + operation;
}

inline std::vector<std::string> operatorLines(const LogCapture& log) {
    return log.Texts(LOG_PRIORITY_OPERATOR);
}

inline std::size_t countPrefix(const LogCapture& log, const std::string& prefix) {
    return log.CountIf([&](const CapturedLine& line) { return line.text.rfind(prefix, 0) == 0; });
}

inline bool waitForPrefix(const LogCapture& log, const std::string& prefix) {
    return log.WaitFor([&](const std::vector<CapturedLine>& lines) {
        return std::any_of(lines.begin(), lines.end(),
                           [&](const CapturedLine& line) { return line.text.rfind(prefix, 0) == 0; });
    });
}
