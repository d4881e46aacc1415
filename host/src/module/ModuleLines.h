#pragma once

#include <array>
#include <optional>
#include <string_view>

#include "LogSink.h"

namespace receiver {

/// What a line of the module's log tells the receiver.
enum class LineMeaning {
    /// The output path of the start parameters. It comes before any logon.
    kOutputPath,
    /// The folder of the next file that the thread opens.
    kFolder,
    /// The name of the file that the thread is about to make.
    kFile,
    /// The thread has closed its last file and ends.
    kWriterEnded,
    kRecordStarted,
    kRecordStopped,
    kRecordRemoved,
    kRecordRestarted,
    /// The event thread has carried out a command to stop, whether or not there was anything to stop.
    kStopCarriedOut,
    /// One unit that found its queue full.
    kVideoDropped,
    kAudioDropped,
    kMetaDropped,
    /// Its rest holds path, user name and password.
    kLogonRefused,
};

/// A line of the module's log.
struct ModuleLine {
    LineMeaning meaning;
    _LogPriority priority;
    /// Its text. `*` stands for any text, and occurs once at the most.
    std::string_view text;
    /// How the name of the function that writes it ends; empty where that does not matter.
    std::string_view function;
};

/// Every line that the receiver listens to.
inline constexpr std::array<ModuleLine, 13> kModuleLines = {{
    {LineMeaning::kRecordStarted, LOG_PRIORITY_OPERATOR, "OP: REC START.*", ""},
    {LineMeaning::kRecordStopped, LOG_PRIORITY_OPERATOR, "OP: REC STOP.*", ""},
    {LineMeaning::kRecordRemoved, LOG_PRIORITY_OPERATOR, "OP: REMOVE STREAM.*", ""},
    {LineMeaning::kRecordRestarted, LOG_PRIORITY_OPERATOR, "OP: REC RESTART.*", ""},
    {LineMeaning::kLogonRefused, LOG_PRIORITY_ERROR, "LogonUser call failed.*", ""},
    {LineMeaning::kVideoDropped, LOG_PRIORITY_WARNING, "queue overflow (video)", ""},
    {LineMeaning::kAudioDropped, LOG_PRIORITY_WARNING, "queue overflow (audio)", ""},
    {LineMeaning::kMetaDropped, LOG_PRIORITY_WARNING, "queue overflow (meta)", ""},
    {LineMeaning::kOutputPath, LOG_PRIORITY_TRACE, "file output path = *.", ""},
    {LineMeaning::kFolder, LOG_PRIORITY_TRACE, "output path = \"*\".", ""},
    {LineMeaning::kFile, LOG_PRIORITY_TRACE, "ST: out_filename = \"*\"", ""},
    {LineMeaning::kWriterEnded, LOG_PRIORITY_TRACE, "start. event_id = 6.", ""},
    {LineMeaning::kStopCarriedOut, LOG_PRIORITY_TRACE, "end.", "Controller::OnStopStream"},
}};

/// A line that means something.
struct UnderstoodLine {
    LineMeaning meaning;
    /// What stands for the `*`, as the module writes it; valid as long as the line.
    std::string_view rest;
};

/// What the line means; nothing for one that the receiver does not listen to.
std::optional<UnderstoodLine> Understand(const LogLine& line);

}  // namespace receiver
