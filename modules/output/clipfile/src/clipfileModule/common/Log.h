#pragma once

#include <cstddef>

#include "Logger.h"

namespace clipfileModule {

/// The qualified name of a function, cut out of `__PRETTY_FUNCTION__` at compile time: result type,
/// parameters and what follows them are left off, so that "bool
/// clipfileModule::Controller::Initialize(Host*)" reads "clipfileModule::Controller::Initialize". In a lambda
/// it is the name of the function around it.
template <std::size_t Size>
struct FunctionName {
    char text[Size] = {};

    constexpr explicit FunctionName(const char (&pretty)[Size]) {
        std::size_t end = 0;
        std::size_t begin = 0;
        int depth = 0;
        for (; end < Size - 1; ++end) {
            const char c = pretty[end];
            if (c == '<') {
                ++depth;
            } else if (c == '>') {
                --depth;
            } else if (depth == 0 && (c == ' ' || c == '*' || c == '&')) {
                begin = end + 1;
            } else if (depth == 0 && c == '(') {
                break;
            }
        }
        for (std::size_t i = begin; i < end; ++i) {
            text[i - begin] = pretty[i];
        }
    }
};

}  // namespace clipfileModule

/// Logs a line with the place where it stands: source path, qualified function name, line number.
#define CLIPFILE_LOG(priority, ...)                                                         \
    do {                                                                                    \
        static constexpr ::clipfileModule::FunctionName kFunctionName(__PRETTY_FUNCTION__); \
        ::Logger::Put(priority, __FILE__, kFunctionName.text, __LINE__, __VA_ARGS__);       \
    } while (false)

/// Logs a line for operators ("OP:") or of the statistics ("ST:"), which names no place.
#define CLIPFILE_LOG_PLAIN(priority, ...) ::Logger::Put(priority, nullptr, nullptr, 0, __VA_ARGS__)
