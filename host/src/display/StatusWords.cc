#include "display/StatusWords.h"

#include <map>
#include <utility>

namespace receiver {
namespace {

const std::map<std::pair<int, int>, const char*>& Words() {
    static const std::map<std::pair<int, int>, const char*> words{
        {{0, 0}, "starting"},
        {{3, 0}, "buffering has stopped"},
        {{4, 0}, "buffering"},
        {{6, 22}, "the disk is too slow: more than 48 chunks wait for it"},
        {{6, 23}, "more than 600 video units wait for the other media"},
        {{6, 24}, "more than 900 audio units wait for the other media"},
        {{6, 25}, "more than 600 metadata units wait for the other media"},
        {{6, 26}, "the host went offline while a recording ran"},
        {{7, 2}, "no output path is set, or there is no memory or no thread"},
        {{7, 21}, "the credentials for a share were refused"},
        {{7, 22}, "the free space of the output path cannot be read"},
        {{7, 23}, "the disk is full: less than 150 MiB are free"},
        {{7, 24}, "the dated directory cannot be made"},
        {{7, 25}, "a file cannot be created"},
        {{7, 26}, "a chunk could not be written, or a recording failed before its first chunk"},
        {{7, 27}, "a file could not be completed, or the disk hangs"},
    };
    return words;
}

}  // namespace

std::string StatusWords(const ModuleStatus& status) {
    const auto found = Words().find({status.status, status.cause});
    if (found != Words().end()) {
        return found->second;
    }
    return "status " + std::to_string(status.status) + ", cause " + std::to_string(status.cause);
}

}  // namespace receiver
