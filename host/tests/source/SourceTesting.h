#pragma once

#include <gtest/gtest.h>

#include <filesystem>
#include <string>
#include <vector>

#include "common/ReceiverError.h"
#include "source/SourceInterface.h"

namespace receiver {

/// Keeps what the operator would read.
class Notices final : public SourceListenerInterface {
 public:
    void OnNotice(const std::string& sentence) override { sentences.push_back(sentence); }
    /// How many sentences contain `text`.
    std::size_t CountOf(const std::string& text) const;

    std::vector<std::string> sentences;
};

/// A folder of its own for a test, with what it needs of other programs.
class SourceTest : public testing::Test {
 protected:
    SourceTest();
    ~SourceTest() override;

    std::string Path(const std::string& name) const { return (folder_ / name).string(); }
    /// Runs ffmpeg with `arguments` in the folder and expects it to succeed.
    void Ffmpeg(const std::string& arguments) const;
    /// What a shell command in the folder prints. Expects it to succeed.
    std::string Shell(const std::string& command) const;

    /// Options for `name` in the folder (or an address), fast.
    SourceOptions Fast(const std::string& url) const;
    /// Reads until the end, or until `enough` units have come (0: until the end).
    std::vector<SourceUnit> ReadAll(SourceInterface& source, std::size_t enough = 0) const;
    /// Opens a file and reads it to its end.
    std::vector<SourceUnit> ReadFile(const std::string& name);
    /// What `OpenSource` refuses with, without waiting for the source. Fails when it does not.
    ReceiverError Refusal(SourceOptions options);

    Notices notices_;

 private:
    std::filesystem::path folder_;
};

/// The units of one medium.
std::vector<SourceUnit> Of(Medium medium, const std::vector<SourceUnit>& units);
/// Their bytes, one behind the other.
std::string BytesOf(const std::vector<SourceUnit>& units);
std::string BytesOf(const SourceUnit& unit);
std::string FileBytes(const std::string& path);
/// The types of the NAL units of an Annex B access unit, in their order.
std::vector<int> NalTypes(const SourceUnit& unit);

/// Arguments of ffmpeg: x264 as a recorder wants it, small.
inline constexpr const char* kPlainH264 =
    " -pix_fmt yuv420p -c:v libx264 -preset ultrafast -tune zerolatency -bf 0 -g 12 -sc_threshold 0 ";
inline constexpr const char* kPlainAac = " -c:a aac -ar 48000 -ac 2 -b:a 64k ";
/// Inputs of ffmpeg: a picture at 25 frames a second and a tone, of one second.
inline constexpr const char* kPicture = " -f lavfi -i testsrc2=size=128x96:rate=25:duration=1 ";
inline constexpr const char* kTone = " -f lavfi -i sine=frequency=500:sample_rate=48000:duration=1 ";

}  // namespace receiver
