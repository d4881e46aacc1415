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

    constexpr FunctionName() = default;
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

/// A class that has a member of this name logs under that class name; all others log under their own.
inline constexpr std::nullptr_t kLogClass = nullptr;

template <std::size_t Size>
constexpr FunctionName<Size> NameFunction(const char (&pretty)[Size], std::nullptr_t) {
    return FunctionName<Size>(pretty);
}

/// The same with the class name replaced: "clipfileModule::logClass::Initialize".
template <std::size_t Size, std::size_t ClassSize>
constexpr FunctionName<Size + ClassSize> NameFunction(const char (&pretty)[Size],
                                                      const char (&logClass)[ClassSize]) {
    const FunctionName<Size> own(pretty);
    std::size_t function = 0;  // where "::function" begins
    std::size_t name = 0;      // where the class name begins
    for (std::size_t i = 0; own.text[i] != '\0'; ++i) {
        if (own.text[i] == ':' && own.text[i + 1] == ':') {
            name = function == 0 ? 0 : function + 2;
            function = i++;
        }
    }
    FunctionName<Size + ClassSize> result;
    std::size_t end = 0;
    for (std::size_t i = 0; i < name; ++i) {
        result.text[end++] = own.text[i];
    }
    for (std::size_t i = 0; i < ClassSize - 1; ++i) {
        result.text[end++] = logClass[i];
    }
    for (std::size_t i = function; own.text[i] != '\0'; ++i) {
        result.text[end++] = own.text[i];
    }
    return result;
}

}  // namespace clipfileModule

/// Logs a line with the place where it stands: source path, qualified function name, line number.
#define CLIPFILE_LOG(priority, ...)                                                   \
    do {                                                                              \
        static constexpr auto kFunctionName =                                         \
            ::clipfileModule::NameFunction(__PRETTY_FUNCTION__, kLogClass);           \
        ::Logger::Put(priority, __FILE__, kFunctionName.text, __LINE__, __VA_ARGS__); \
    } while (false)

/// Logs a line for operators ("OP:") or of the statistics ("ST:"), which names no place.
#define CLIPFILE_LOG_PLAIN(priority, ...) ::Logger::Put(priority, nullptr, nullptr, 0, __VA_ARGS__)
