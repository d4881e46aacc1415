#include "Observers.h"

namespace receiver {

void Observers::Start(const Options& options, const std::shared_ptr<CommandQueue>& commands) {
    if (options.control) {
        control_ = std::make_unique<Control>(*options.control, commands, SizeOnDisk);
        for (DisplayInterface* const display : control_->Displays()) {
            group_.Add(*display);
        }
    }
    if (options.hook || options.hookUrl) {
        hooks_ = std::make_unique<Hooks>(options.hook, options.hookUrl);
        group_.Add(hooks_->Display());
    }
}

void Observers::Describe(const SourceDescription& source) {
    if (control_) {
        control_->Describe(source);
    }
}

void Observers::LookAt(const SourceUnit& unit) {
    if (control_) {
        control_->LookAt(unit);
    }
}

void Observers::Follow() {
    if (control_) {
        if (const std::optional<std::string> fault = control_->TakeFault()) {
            group_.Notice(*fault);
        }
    }
    if (hooks_) {
        for (const std::string& sentence : hooks_->TakeSentences()) {
            group_.Notice(sentence);
        }
    }
}

void Observers::Settle() {
    if (hooks_) {
        hooks_->Settle();
        Follow();
    }
}

void Observers::End() {
    // They may have been told of a failure since.
    Settle();
    if (control_) {
        control_->End();
    }
}

}  // namespace receiver
