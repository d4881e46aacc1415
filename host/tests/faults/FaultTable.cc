// Makes each call of short recordings fail, one run for each call and way of failing, and writes what came of
// it as the table of docs/reliability.md to standard output. What is wrong goes to standard error.
// `fault_table normal|fragment [STEP]`: with files of one type, and only every STEP-th call.

#include <unistd.h>

#include <atomic>
#include <cstdlib>
#include <iostream>
#include <map>
#include <mutex>
#include <set>
#include <thread>
#include <tuple>

#include "faults/FaultRun.h"

namespace endtoend {
namespace {

/// There are thousands of them, and what they fail is much the same.
constexpr std::size_t kEveryMalloc = 16;

/// Runs that came to the same.
struct Row {
    std::size_t runs = 0;
    std::size_t first = 0;
    std::size_t last = 0;
    std::set<std::string> effects;
};

/// Call, status and cause, exit code, what became of the file that was begun last.
using Key = std::tuple<std::string, std::string, std::string, std::string>;

std::string Joined(const std::set<std::string>& texts) {
    std::string joined;
    for (const std::string& text : texts) {
        joined += (joined.empty() ? "" : ", ") + text;
    }
    return joined;
}

class Table {
 public:
    void Enter(const Fault& fault, const FaultOutcome& outcome, const std::vector<std::string>& wrong) {
        const std::string state = outcome.files.empty() ? "none" : NameOf(outcome.files.back().state);
        const std::string status = outcome.cause ? "7, " + std::to_string(*outcome.cause) : "–";
        const std::string code = outcome.code ? std::to_string(*outcome.code) : "hangs";
        const std::lock_guard lock(mutex_);
        ++runs_;
        if (!outcome.hit && wrong.empty()) {
            ++unmet_;
            return;
        }
        Row& row = rows_[{CallOf(fault), status, code, state}];
        row.effects.insert(EffectOf(fault));
        row.first = row.runs == 0 ? fault.number : std::min(row.first, fault.number);
        row.last = std::max(row.last, fault.number);
        ++row.runs;
        for (const std::string& sentence : wrong) {
            ++wrong_;
            std::cerr << CallOf(fault) << " " << fault.number << ", " << EffectOf(fault) << ": " << sentence
                      << "\n";
        }
    }
    void Print(FileType type, std::size_t pictures, std::size_t step) const {
        std::cout << "### Files of type " << NameOf(type) << "\n\n"
                  << runs_ << " runs of " << pictures << " pictures each, " << wrong_ << " of them wrong. "
                  << unmet_ << " made fewer calls than the one without a fault, and are not in the table."
                  << (step == 1 ? "" : " One of " + std::to_string(step) + " calls was tried.") << "\n\n"
                  << "| Call | Which | What happens to it | Runs | Status, cause | Exit code | Last file |\n"
                  << "|---|---|---|---|---|---|---|\n";
        for (const auto& [key, row] : rows_) {
            const auto& [call, status, code, state] = key;
            std::cout << "| " << call << " | " << row.first
                      << (row.first == row.last ? "" : " to " + std::to_string(row.last)) << " | "
                      << Joined(row.effects) << " | " << row.runs << " | " << status << " | " << code << " | "
                      << state << " |\n";
        }
        std::cout << std::endl;
    }
    std::size_t Wrong() const { return wrong_; }

 private:
    std::mutex mutex_;
    std::map<Key, Row> rows_;
    std::size_t runs_ = 0;
    /// Made fewer such calls than the run without a fault.
    std::size_t unmet_ = 0;
    std::size_t wrong_ = 0;
};

std::size_t Tabulate(FileType type, std::size_t step) {
    const FaultRunner runner(type);
    std::vector<Fault> faults;
    for (const Fault& call : Calls()) {
        const std::size_t calls = runner.CallsOf(call);
        const std::size_t every = call.call == "malloc" ? step * kEveryMalloc : step;
        for (std::size_t number = 1; number <= calls; ++number) {
            // The errors differ in nothing but their number: all of them are tried at a few calls.
            const bool isChosen = number == 1 || number == calls / 2 || number == calls;
            if (isChosen || number % every == 0) {
                const std::vector<Fault> effects = EffectsOn(call, number, isChosen);
                faults.insert(faults.end(), effects.begin(), effects.end());
            }
        }
    }
    Table table;
    std::atomic<std::size_t> next = 0;
    std::vector<std::thread> threads;
    for (unsigned int i = 0; i < std::max(1U, std::thread::hardware_concurrency()); ++i) {
        threads.emplace_back([&] {
            for (std::size_t at = next++; at < faults.size(); at = next++) {
                const FaultOutcome outcome = runner.Run(faults[at]);
                table.Enter(faults[at], outcome, runner.WrongIn(outcome, faults[at]));
            }
        });
    }
    for (std::thread& thread : threads) {
        thread.join();
    }
    table.Print(type, runner.Pictures(), step);
    return table.Wrong();
}

}  // namespace
}  // namespace endtoend

int main(int argc, char** argv) {
    using endtoend::FileType;
    if (argc < 2) {
        std::cerr << "fault_table normal|fragment [STEP]\n";
        return 2;
    }
    const FileType type = std::string(argv[1]) == "normal" ? FileType::kNormal : FileType::kFragmented;
    const std::size_t step = argc > 2 ? std::strtoul(argv[2], nullptr, 10) : 1;
    return endtoend::Tabulate(type, std::max<std::size_t>(step, 1)) == 0 ? 0 : 1;
}
