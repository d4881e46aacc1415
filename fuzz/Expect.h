#pragma once

#include <cstdio>
#include <cstdlib>

/// Ends the run with a sentence where something that must hold does not.
inline void Expect(bool holds, const char* what) {
    if (!holds) {
        std::fprintf(stderr, "expected: %s\n", what);
        std::abort();
    }
}
