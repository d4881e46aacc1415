#include "hooks/Hooks.h"

#include <algorithm>
#include <iterator>

#include "hooks/HookEvent.h"
#include "hooks/ProgramHook.h"
#include "hooks/UrlHook.h"

namespace receiver {

Hooks::Hooks(const std::optional<std::string>& program, const std::optional<std::string>& url)
    : stream_([this](const std::string& line) { Post(line); }), display_(stream_) {
    if (program) {
        queues_.push_back(std::make_unique<HookQueue>(std::make_shared<ProgramHook>(*program)));
    }
    if (url) {
        queues_.push_back(std::make_unique<HookQueue>(std::make_shared<UrlHook>(*url)));
    }
}

void Hooks::Post(std::string_view line) {
    if (const std::optional<HookEvent> event = HookEventOf(line)) {
        for (const auto& queue : queues_) {
            queue->Post(*event);
        }
    }
}

std::vector<std::string> Hooks::TakeSentences() {
    std::vector<std::string> sentences;
    for (const auto& queue : queues_) {
        std::ranges::move(queue->TakeSentences(), std::back_inserter(sentences));
    }
    return sentences;
}

HookCounts Hooks::Counts() const {
    HookCounts sum;
    for (const auto& queue : queues_) {
        const HookCounts counts = queue->Counts();
        sum.delivered += counts.delivered;
        sum.failed += counts.failed;
    }
    return sum;
}

void Hooks::Settle() {
    const auto deadline = std::chrono::steady_clock::now() + kEndPatience;
    std::vector<HookQueue*> late;
    for (const auto& queue : queues_) {
        const auto left = std::chrono::duration_cast<std::chrono::milliseconds>(
            deadline - std::chrono::steady_clock::now());
        if (!queue->Wait(std::max(std::chrono::milliseconds(0), left))) {
            late.push_back(queue.get());
        }
    }
    // All of them are told before one is waited for.
    for (HookQueue* const queue : late) {
        queue->GiveUp();
    }
    for (HookQueue* const queue : late) {
        queue->End();
    }
}

}  // namespace receiver
