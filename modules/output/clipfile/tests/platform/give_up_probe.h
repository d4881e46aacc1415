#pragma once

// What the library of the unload test has: a thread that waits for a byte from a pipe and then counts in
// memory of its own, as a writer does whose disk answers late.

extern "C" {
/// Starts the thread. It reads a byte from `input`, then writes one to `output`.
void ProbeStart(int input, int output);
/// Gives the thread up.
void ProbeGiveUp();
/// Waits for the thread instead.
void ProbeJoin();
}
