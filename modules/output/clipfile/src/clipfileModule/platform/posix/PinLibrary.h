#pragma once

namespace clipfileModule {

/// Keeps the library that this code is part of in memory until the process ends. Nothing happens in a program
/// that has the code linked in, which is never unloaded anyway.
void PinLibrary();

}  // namespace clipfileModule
