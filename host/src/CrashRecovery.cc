#include "CrashRecovery.h"

#include <algorithm>
#include <cmath>
#include <string>

namespace receiver {
namespace {

/// With fragments of some seconds, a power cut costs hardly more than a kill.
constexpr double kDurableSeconds = 2;

}  // namespace

CrashRecovery::CrashRecovery(const Options& options, const OutputPlace& place, bool folderIsNew,
                             DisplayInterface& display, bool hasTerminal)
    : display_(display) {
    if (place.onShare) {
        if (options.recover != RecoverMode::kNo) {
            display_.Notice(
                "no journal is kept on a share: files that a crash leaves open there have to be recovered by "
                "hand, with clipfile recover");
        }
        if (options.durable.value_or(0) != 0) {
            display_.Notice("--durable has no effect on a share: its server makes durable what it is given");
        }
        return;
    }
    if (const double seconds = options.durable.value_or(kDurableSeconds); seconds != 0) {
        BackgroundSync::Settings settings;
        settings.folder = place.folder;
        settings.folderIsNew = folderIsNew;
        settings.interval =
            std::max(std::chrono::milliseconds(1), std::chrono::milliseconds(std::llround(seconds * 1000)));
        sync_.emplace(settings);
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
    const std::vector<ModuleReport::WrittenFile>& files = report.Files();
    std::vector<std::string> open;
    std::vector<std::string> closed;
    wasClosed_.resize(files.size());
    for (std::size_t i = 0; i < files.size(); ++i) {
        if (!files[i].closed) {
            open.push_back(files[i].path);
        } else if (!wasClosed_[i]) {
            wasClosed_[i] = true;
            closed.push_back(files[i].path);
        }
    }
    journal_->SetOpenFiles(open);
    if (sync_) {
        sync_->SetFiles(open, closed);
        Tell(sync_->TakeSentences());
    }
    if (const auto warning = journal_->TakeWarning()) {
        display_.Notice(*warning);
    }
    Tell(recovery_->TakeSentences());
}

std::optional<std::chrono::milliseconds> CrashRecovery::SyncLatency() const {
    return sync_ ? sync_->Latency() : std::nullopt;
}

void CrashRecovery::End(const ModuleReport& report) {
    Follow(report);
    if (recovery_) {
        recovery_->End();
    }
    if (sync_) {
        sync_->End();
    }
    // What they had to say at the end.
    Follow(report);
}

void CrashRecovery::Tell(const std::vector<std::string>& sentences) {
    for (const std::string& sentence : sentences) {
        display_.Notice(sentence);
    }
}

}  // namespace receiver
