#pragma once

#include <filesystem>
#include <optional>
#include <ostream>
#include <string>
#include <vector>

#include "damaged/TransportStream.h"
#include "endtoend/ReceiverFixture.h"

namespace endtoend {

// Exit codes.
inline constexpr int kEverything = 0;
inline constexpr int kUnavailable = 3;
inline constexpr int kUnsuitable = 4;
inline constexpr int kLost = 8;

/// What has to come of a damaged stream.
struct Expectation {
    int code = kLost;
    /// Or this one, where it depends on what exactly is hit.
    std::optional<int> otherCode = std::nullopt;
    /// What the receiver says, among other things.
    const char* sentence = "";
    /// Pictures that the files hold as they were sent, at least.
    std::size_t pictures = 170;
    /// Pictures that they hold and that were never sent: nobody can tell that they are damaged.
    std::size_t damaged = 0;
    /// How far audio may be out of step with the pictures, in seconds: half an audio frame, and what a stamp
    /// rounds.
    double outOfStep = 0.011;
    bool audio = true;
};

/// What is damaged: 8 seconds of picture and noise, 25 pictures a second, an IDR frame each ten. No two
/// frames are alike. Made once in a process.
struct DamagedMaterial {
    static const DamagedMaterial& Get();

    TemporaryFolder folder;
    std::filesystem::path file;
    Pieces pieces;

 private:
    DamagedMaterial();
};

/// Damaged streams and files, through the receiver, judged frame by frame.
class DamagedFixture : public ReceiverFixture {
 protected:
    /// Options of a run that records `input` as fast as it can.
    static std::vector<std::string> FastOptions(const std::filesystem::path& input);
    /// Waits for the end of the run, which has to come soon, and checks all that it left.
    void ExpectEnd(Process& receiver, const Expectation& expected, const std::filesystem::path& sent) const;
};

}  // namespace endtoend
