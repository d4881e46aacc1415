#pragma once

#include <filesystem>
#include <ostream>
#include <string>
#include <vector>

#include "damaged/Intact.h"
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
    /// True when it depends on what exactly is hit whether something is lost: then `code` is that of a loss,
    /// and success is right too where nothing is told.
    bool maybeUnharmed = false;
    /// What the receiver says, among other things; of a success nothing else, and without a sentence nothing.
    const char* sentence = "";
    /// Nothing is recorded, or nothing of use.
    bool refused = false;
    /// Everything that was sent is recorded: the damage is to what stands around it.
    bool unharmed = false;
    /// Frames that arrive whole, behind an IDR frame, and may be missing from the files all the same.
    Owed besides = {};
    /// Pictures that they hold and that were never sent: nobody can tell that they are damaged.
    std::size_t damaged = 0;
    /// How far audio may be out of step with the pictures, in seconds: half an audio frame, and what a stamp
    /// rounds.
    double outOfStep = 0.011;
};

/// What is damaged: 8 seconds of picture and noise, 25 pictures a second, an IDR frame each ten. No two
/// frames are alike. Made once in a process.
struct DamagedMaterial {
    static const DamagedMaterial& Get();

    TemporaryFolder folder;
    std::filesystem::path file;
    Pieces pieces;
    CodedMedia media;

 private:
    DamagedMaterial();
};

/// Damaged streams and files, through the receiver, judged frame by frame.
class DamagedFixture : public ReceiverFixture {
 protected:
    /// Options of a run that records `input` as fast as it can.
    static std::vector<std::string> FastOptions(const std::filesystem::path& input);
    /// Waits for the end of the run, which has to come soon, and checks all that it left of the frames that
    /// came through the damage.
    void ExpectEnd(Process& receiver, const Expectation& expected, const Intact& intact) const;

 private:
    static void ExpectTold(const std::string& lines, int code, const Expectation& expected);
};

}  // namespace endtoend
