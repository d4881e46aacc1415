#include "module/ModuleLines.h"

namespace receiver {
namespace {

/// What stands for the `*` of `pattern` in `text`; empty where it has none. Nothing when the text is another
/// one.
std::optional<std::string_view> RestOf(std::string_view text, std::string_view pattern) {
    const std::size_t star = pattern.find('*');
    if (star == std::string_view::npos) {
        return text == pattern ? std::optional<std::string_view>("") : std::nullopt;
    }
    const std::string_view begin = pattern.substr(0, star);
    const std::string_view end = pattern.substr(star + 1);
    if (text.size() < begin.size() + end.size() || !text.starts_with(begin) || !text.ends_with(end)) {
        return std::nullopt;
    }
    return text.substr(begin.size(), text.size() - begin.size() - end.size());
}

}  // namespace

std::optional<UnderstoodLine> Understand(const LogLine& line) {
    const std::string_view function = line.function == nullptr ? "" : line.function;
    for (const ModuleLine& known : kModuleLines) {
        if (line.priority != known.priority || !function.ends_with(known.function)) {
            continue;
        }
        if (const auto rest = RestOf(line.text, known.text)) {
            return UnderstoodLine{known.meaning, *rest};
        }
    }
    return std::nullopt;
}

}  // namespace receiver
