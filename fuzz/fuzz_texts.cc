// What reads texts that people write: the settings store, the command line and a channel's configuration,
// record ranges, addresses with credentials.

#include <fuzzer/FuzzedDataProvider.h>

#include <algorithm>
#include <vector>

#include "Expect.h"
#include "MemoryFile.h"
#include "SettingsStore.h"
#include "common/Credentials.h"
#include "common/FrameRate.h"
#include "common/ReceiverError.h"
#include "common/Timecode.h"
#include "operator/RecordPlan.h"
#include "options/Options.h"

namespace {

MemoryFile FileOf(const std::string& text) {
    return {reinterpret_cast<const std::uint8_t*>(text.data()), text.size()};
}

void Settings(const std::string& text) {
    qx_settings::SettingsStore store;
    qx_settings::SettingsError error;
    if (!store.Load(FileOf(text).Path(), error)) {
        Expect(!error.reason.empty(), "a store that cannot be read has a reason");
        return;
    }
    const std::string written = store.FileText();
    qx_settings::SettingsStore again;
    Expect(again.Load(FileOf(written).Path(), error), "what a store writes it can read");
    Expect(again.FileText() == written, "a store that is written and read is the same");
}

void Numbers(const std::string& text) {
    if (const auto ranges = receiver::ParseRecordRanges(text)) {
        std::int64_t end = -1;
        for (const receiver::RecordRange& range : *ranges) {
            Expect(end < range.begin, "ranges ascend and do not touch");
            Expect(!range.end || range.begin < *range.end, "a range ends behind its beginning");
            end = range.end.value_or(INT64_MAX);
        }
    }
    if (const auto timecode = receiver::ParseTimecode(text)) {
        Expect(receiver::ParseTimecode(receiver::ToString(*timecode)) == timecode,
               "a timecode is read as it is written");
    }
    static_cast<void>(receiver::ParseFrameRate(text));
}

void CommandLine(const std::vector<std::string>& arguments) {
    std::vector<const char*> pointers{"receiver"};
    for (const std::string& argument : arguments) {
        pointers.push_back(argument.c_str());
    }
    std::string text;
    try {
        receiver::ParseOptions(static_cast<int>(pointers.size()), pointers.data(), text);
    } catch (const receiver::ReceiverError& error) {
        Expect(error.Code() == receiver::ExitCode::kUsage, "what is wrong with options is a mistake in them");
        Expect(*error.what() != '\0', "and is told");
    }
}

/// A secret in the place of a password is never shown, whatever stands around it.
void Secrets(const std::string& text) {
    const std::string secret = "Tr0ub4dor";
    if (text.find(secret) != std::string::npos) {
        return;
    }
    std::string user = text;
    std::erase_if(user, [](unsigned char c) { return c < 'a' || c > 'z'; });
    const std::string shown =
        receiver::WithoutCredentials("srt://" + user + ":" + secret + "@host:1/" + text);
    Expect(shown.find(secret) == std::string::npos, "a password is not shown");
    static_cast<void>(receiver::WithoutCredentials(text));
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    FuzzedDataProvider input(data, size);
    const int kind = input.ConsumeIntegralInRange(0, 4);
    if (kind == 0) {
        std::vector<std::string> arguments;
        while (input.remaining_bytes() != 0 && arguments.size() < 20) {
            arguments.push_back(input.ConsumeRandomLengthString(60));
            // It would be read: a path of somebody else's.
            std::erase(arguments.back(), '\0');
        }
        CommandLine(arguments);
        return 0;
    }
    const std::string text = input.ConsumeRemainingBytesAsString();
    switch (kind) {
        case 1:
            Settings(text);
            return 0;
        case 2:
            Numbers(text);
            return 0;
        case 3:
            Secrets(text);
            return 0;
        default: {
            const MemoryFile file = FileOf(text);
            CommandLine({"--config", file.Path()});
            return 0;
        }
    }
}
