#pragma once

#include <functional>
#include <random>
#include <set>

#include "damaged/TransportStream.h"

namespace endtoend {

/// Always the same sequence for the same seed, on every machine.
using Random = std::mt19937;
/// What a network, a sender or a disk does to a stream.
using Damage = std::function<Pieces(Pieces, Random&)>;

/// Packets that are sent in one datagram.
inline constexpr std::size_t kDatagramPackets = 7;

/// Packets of these PIDs; of all without any.
using Pids = std::set<int>;

// Packets, each with a probability of one in a hundred.

Damage Drop(const Pids& pids = {});
/// Inverts a byte anywhere behind the header.
Damage Flip(const Pids& pids = {});
/// Inverts a byte of the header.
Damage FlipHeaders(const Pids& pids = {});
Damage Double(const Pids& pids = {});
/// A packet comes up to ten later.
Damage Reorder(const Pids& pids = {});
/// The counter that tells of lost packets lies, and nothing is lost.
Damage MiscountPackets(const Pids& pids = {});
/// The transport error indicator is set.
Damage MarkAsErroneous(const Pids& pids = {});

// Stretches of the stream: from and to are shares of it, 0 to 1.

Damage Remove(const Pids& pids, double from = 0, double to = 1);
Damage Scramble(const Pids& pids, double from = 0, double to = 1);
/// Comes a second time, right behind itself.
Damage Repeat(double from, double to);
/// One PID becomes another, in the map of the programme too.
Damage Rename(int from, int to, double begin);

// Bytes.

/// Noise in which no byte looks like the begin of a packet.
Damage NoiseInFront(std::size_t bytes);
Damage NoiseAt(double place, std::size_t bytes);
/// So many bytes of the packet there are missing.
Damage CutAt(double place, std::size_t bytes);
/// The file ends there, in the middle of a packet.
Damage EndAt(double place);
Damage Nothing();
Damage OnlyNoise(std::size_t bytes);

// Stamps, from `place` on.

Damage JumpBy(std::int64_t ticks, double place, const Pids& pids = {});
/// All counters wrap there.
Damage WrapAt(double place);
Damage StandStillAt(double place, const Pids& pids = {});
Damage WithoutStamps(const Pids& pids);
Damage WithoutClock();

// Pictures.

/// PES packets without any bytes of media stand between the others.
Damage EmptyUnits(int pid);
/// Inverts the sequence parameter sets from `place` to `end`.
Damage BreakParameterSets(double place, double end);

/// A datagram of each in turn, as two senders on one port do.
Pieces Interleave(const Pieces& one, const Pieces& other);

}  // namespace endtoend
