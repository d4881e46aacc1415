#pragma once

// A coded stream that decoders accept: moving picture and tone by ffmpeg, cut into access units and frames.

#include <cstdint>
#include <memory>
#include <string>
#include <vector>

#include "StreamAnalyzer.h"
#include "support/TempDir.h"

struct CodedMedia {
    std::vector<std::shared_ptr<nal_access::SampleData>> video;
    std::vector<std::shared_ptr<nal_access::SampleData>> audio;
    nal_access::NalUnit sps;
    nal_access::NalUnit pps;
};

inline constexpr std::uint32_t kCodedWidth = 320;
inline constexpr std::uint32_t kCodedHeight = 180;

/// `pictures` pictures of H.264 without reordering, an IDR picture each 16, at `timescale / duration` a
/// second, and at least `audioFrames` frames of AAC LC, 48 kHz, stereo. Leaves
/// them in `directory` as "coded.h264" and "coded.aac".
CodedMedia MakeCodedMedia(const TempDir& directory, std::uint32_t timescale, std::uint32_t duration,
                          std::size_t pictures, std::size_t audioFrames);

/// What a program writes to its standard output, and apart from that to standard error, and how it ended.
struct ProgramResult {
    int exitCode;
    std::string output;
    std::string errors;
};

/// Runs a command line of the shell, with the two texts going through files in `directory`.
ProgramResult RunProgram(const TempDir& directory, const std::string& command);
