#include "CrashRecovery.h"

#include <string>
#include <vector>

namespace receiver {

CrashRecovery::CrashRecovery(const Options& options, const OutputPlace& place, DisplayInterface& display,
                             bool hasTerminal)
    : display_(display) {
    if (place.onShare) {
        if (options.recover != RecoverMode::kNo) {
            display_.Notice(
                "no journal is kept on a share: files that a crash leaves open there have to be recovered by "
                "hand, with clipfile recover");
        }
        return;
    }
    const bool canAsk = options.recover != RecoverMode::kAsk || hasTerminal;
    recovery_.emplace(place.folder, canAsk ? options.recover : RecoverMode::kNo);
    journal_.emplace(place.folder);
}

void CrashRecovery::Describe(const SourceDescription& source) {
    if (journal_) {
        journal_->Describe(source);
    }
}

void CrashRecovery::LookAt(const SourceUnit& unit) {
    if (journal_) {
        journal_->LookAt(unit);
    }
}

void CrashRecovery::Follow(const ModuleReport& report) {
    if (!journal_) {
        return;
    }
    std::vector<std::string> open;
    for (const ModuleReport::WrittenFile& file : report.Files()) {
        if (!file.closed) {
            open.push_back(file.path);
        }
    }
    journal_->SetOpenFiles(open);
    if (const auto warning = journal_->TakeWarning()) {
        display_.Notice(*warning);
    }
    for (const std::string& sentence : recovery_->TakeSentences()) {
        display_.Notice(sentence);
    }
}

void CrashRecovery::End(const ModuleReport& report) {
    if (recovery_) {
        recovery_->End();
    }
    Follow(report);
}

}  // namespace receiver
