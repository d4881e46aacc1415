// Asks the settings store of a fresh process and prints what it answers, one line an answer:
//
//     settings_probe text KEY ...      text KEY=VALUE, or missing KEY
//     settings_probe number KEY ...    number KEY=VALUE, or missing KEY
//     settings_probe again KEY FILE    text, then the same once more after FILE was removed
//     settings_probe race KEY THREADS  as many threads ask first at the same time; the number of hits
//
// Stands in for the log as well: log PRIORITY FILE FUNCTION: TEXT.

#include <atomic>
#include <barrier>
#include <cstdarg>
#include <cstdio>
#include <cstdlib>
#include <string>
#include <thread>
#include <vector>

#include "Logger.h"
#include "QxRegistry.h"

namespace {

const std::string kSection = "Qx/Other/MP4FileOut";

void printText(const char* key) {
    std::string value = "untouched";
    if (QxRegistry::GetInstance()->getValue(kSection, key, value)) {
        std::printf("text %s=%s\n", key, value.c_str());
    } else {
        std::printf("missing %s (%s)\n", key, value.c_str());
    }
}

void printNumber(const char* key) {
    unsigned int value = 99;
    if (QxRegistry::GetInstance()->getValue(kSection, key, value)) {
        std::printf("number %s=%u\n", key, value);
    } else {
        std::printf("missing %s (%u)\n", key, value);
    }
}

void race(const char* key, int count) {
    std::barrier start(count);
    std::atomic<int> hits = 0;
    std::vector<std::thread> threads;
    for (int i = 0; i < count; ++i) {
        threads.emplace_back([&] {
            std::string value;
            start.arrive_and_wait();
            hits += QxRegistry::GetInstance()->getValue(kSection, key, value) ? 1 : 0;
        });
    }
    for (std::thread& thread : threads) {
        thread.join();
    }
    std::printf("hits %d\n", hits.load());
}

}  // namespace

void Logger::Put(_LogPriority priority, const char* file, const char* function, int, const char* format,
                 ...) {
    std::va_list arguments;
    va_start(arguments, format);
    std::printf("log %d %s %s: ", static_cast<int>(priority), file, function);
    std::vprintf(format, arguments);
    std::printf("\n");
    va_end(arguments);
}

int main(int argc, char** argv) {
    if (argc < 3) {
        return EXIT_FAILURE;
    }
    const std::string mode = argv[1];
    if (mode == "again") {
        printText(argv[2]);
        std::remove(argv[3]);
        printText(argv[2]);
    } else if (mode == "race") {
        race(argv[2], std::atoi(argv[3]));
    } else {
        for (int i = 2; i < argc; ++i) {
            mode == "number" ? printNumber(argv[i]) : printText(argv[i]);
        }
    }
    return EXIT_SUCCESS;
}
