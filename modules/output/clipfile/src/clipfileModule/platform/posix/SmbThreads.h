#pragma once

namespace clipfileModule {

/// Lets Samba's libraries behind `libsmbclient`, a handle of the loader, be used by several threads: gives
/// them mutexes and thread-local storage. False when they do not take them; they may then be used by one
/// thread at a time. Once in a process, before anything else is done with them.
bool EnableSmbThreads(void* libsmbclient);

}  // namespace clipfileModule
