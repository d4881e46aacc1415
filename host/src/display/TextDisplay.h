#pragma once

#include <ostream>
#include <string>

#include "display/DisplayInterface.h"

namespace receiver {

/// Text for people: a line for each change, and the table of files at the end. The streams must outlive it.
class TextDisplay : public DisplayInterface {
 public:
    /// `messages` is for what happens, `results` for the table of files.
    TextDisplay(std::ostream& messages, std::ostream& results) : messages_(messages), results_(results) {}

    void Notice(const std::string& sentence) override;
    void Failure(ExitCode code, const std::string& sentence) override;
    void Status(const ModuleStatus& status) override;
    void FileOpened(const std::string& path) override;
    void FileClosed(const std::string& path) override;
    /// A line when a recording begins or ends or units were lost.
    void Show(const Snapshot& snapshot) override;
    void Finish(const Summary& summary) override;

 protected:
    virtual void Line(const std::string& text);
    std::ostream& Messages() { return messages_; }

 private:
    std::ostream& messages_;
    std::ostream& results_;
    bool recording_ = false;
    bool waiting_ = false;
    std::uint64_t lost_ = 0;
};

/// Units in words: "1 unit", "2 units".
std::string Counted(std::uint64_t count, const std::string& noun);

}  // namespace receiver
