#pragma once

#include <cstdint>
#include <functional>
#include <ostream>
#include <string>
#include <vector>

namespace receiver {

/// A file that was written, as a reader of it sees it.
struct RecordedFile {
    std::string path;
    std::uint64_t bytes = 0;
    /// "10:20:30:12"; empty when the file has none.
    std::string startTimecode;
    double seconds = 0;
    std::uint64_t frames = 0;
    /// Why the file could not be read; empty when it could.
    std::string problem;
};

/// Opens a closed file with FFmpeg's libraries and reads what it holds.
RecordedFile ReadBack(const std::string& path);

/// Reads octets of a file from an offset on, and returns how many: 0 at the end of the file, a negative
/// number on a failure.
using FileReader = std::function<int(std::int64_t offset, unsigned char* data, int size)>;

/// The same of a file that is no local one, of `bytes` octets.
RecordedFile ReadBack(const std::string& path, std::uint64_t bytes, const FileReader& reader);

/// One line a file under a headline. Nothing for no files.
void PrintFiles(std::ostream& out, const std::vector<RecordedFile>& files);

/// "12.3 MB", with a decimal point and units of 1000.
std::string FormatBytes(std::uint64_t bytes);

/// "00:01:02.040".
std::string FormatSeconds(double seconds);

}  // namespace receiver
