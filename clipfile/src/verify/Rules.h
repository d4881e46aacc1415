#pragma once

#include <filesystem>
#include <functional>
#include <string>
#include <vector>

#include "inspect/Inspection.h"

namespace clipfile {

/// Takes sentences about one file. A rule that is broken thousands of times is told a few times.
class Defects {
 public:
    explicit Defects(std::vector<std::string>& sentences) : sentences_(sentences) {}
    void Add(const std::string& sentence) { sentences_.push_back(sentence); }

 private:
    std::vector<std::string>& sentences_;
};

/// Sentences of a kind that are told of one file.
inline constexpr int kMaxOfAKind = 5;

/// Closed; nothing but the boxes of its kind.
void CheckStructure(const InputFile& file, const Inspection& inspection, Defects& defects);
/// Four tracks, as the profile describes them; even durations; as much metadata as pictures, as much audio.
void CheckTracks(const Inspection& inspection, Defects& defects);
/// Every sample lies in the data, and all data are samples.
void CheckData(const InputFile& file, const Inspection& inspection, Defects& defects);
/// The timecode sample against the name in `path`, and the metadata.
void CheckTimecode(const std::filesystem::path& path, const Inspection& inspection, Defects& defects);
/// What a fragmented file tells of its fragments: their numbers, `mehd`, `mfra`.
void CheckIndex(const InputFile& file, const Inspection& inspection, Defects& defects);
/// Reads every sample: pictures are whole NAL units, sync samples are IDR pictures, metadata ends with the
/// recorder's block and its timecode goes on frame by frame, audio decodes. `onSample` may be empty.
void CheckSamples(const InputFile& file, const Inspection& inspection, const std::function<void()>& onSample,
                  Defects& defects);

}  // namespace clipfile
