#pragma once

// The header below counts on its includer for these.
#include <stdint.h>
#include <sys/time.h>
#include <time.h>

#include <libsmbclient.h>

#include <atomic>
#include <string>

#include "common/Mutex.h"

namespace clipfileModule {

/// libsmbclient, loaded when the first path on a share is met: a host that records to local disks never loads
/// the hundred libraries behind it. Once loaded it stays, and so does the library that this code is part of.
///
/// What it does not do for threads, and who does it here:
/// - Its stack of memory frames belongs to the process, and the second thread in it ends in a crash, until
///   it is given thread-local storage: `EnableSmbThreads`. Where it does not take that, `ProcessLock` is
///   held around every call, and a server that stalls holds up all connections.
/// - A context with all that belongs to it may then be used beside others, but making, initialising,
///   connecting and freeing one touches what belongs to the process (the settings, the count of contexts,
///   the name cache, lists of mechanisms that are filled at first use): under `ProcessLock`.
/// - It blocks SIGPIPE on one thread and needs it blocked on all: see `TimedWorker`.
/// - It reads `$HOME/.smb/smb.conf`, or else the system's smb.conf, once, when the first context is made,
///   and throws the settings away when the last one goes: one that nobody uses is kept.
struct SmbLibrary {
    decltype(&smbc_new_context) newContext;
    decltype(&smbc_init_context) initContext;
    decltype(&smbc_free_context) freeContext;
    decltype(&smbc_setDebug) setDebug;
    decltype(&smbc_setLogCallback) setLogCallback;
    decltype(&smbc_setTimeout) setTimeout;
    decltype(&smbc_setUser) setUser;
    decltype(&smbc_setWorkgroup) setWorkgroup;
    decltype(&smbc_setOptionProtocols) setOptionProtocols;
    decltype(&smbc_setOptionUserData) setOptionUserData;
    decltype(&smbc_getOptionUserData) getOptionUserData;
    decltype(&smbc_setOptionOpenShareMode) setOptionOpenShareMode;
    decltype(&smbc_setOptionNoAutoAnonymousLogin) setOptionNoAutoAnonymousLogin;
    decltype(&smbc_setOptionUseKerberos) setOptionUseKerberos;
    decltype(&smbc_setOptionUseCCache) setOptionUseCCache;
    decltype(&smbc_setFunctionAuthDataWithContext) setFunctionAuthDataWithContext;
    decltype(&smbc_setFunctionCheckServer) setFunctionCheckServer;
    decltype(&smbc_getFunctionAddCachedServer) getFunctionAddCachedServer;
    decltype(&smbc_setFunctionAddCachedServer) setFunctionAddCachedServer;
    decltype(&smbc_getFunctionRemoveCachedServer) getFunctionRemoveCachedServer;
    decltype(&smbc_setFunctionRemoveCachedServer) setFunctionRemoveCachedServer;
    decltype(&smbc_getFunctionPurgeCachedServers) getFunctionPurgeCachedServers;
    decltype(&smbc_getFunctionStat) getFunctionStat;
    decltype(&smbc_getFunctionStatVFS) getFunctionStatVFS;
    decltype(&smbc_getFunctionFstatVFS) getFunctionFstatVFS;
    decltype(&smbc_getFunctionMkdir) getFunctionMkdir;
    decltype(&smbc_getFunctionOpen) getFunctionOpen;
    decltype(&smbc_getFunctionLseek) getFunctionLseek;
    decltype(&smbc_getFunctionRead) getFunctionRead;
    decltype(&smbc_getFunctionWrite) getFunctionWrite;
    decltype(&smbc_getFunctionClose) getFunctionClose;
    decltype(&smbc_getFunctionUnlink) getFunctionUnlink;

    /// The settings of the process, of loadparm.h, which is not installed: "client signing" in force, and to
    /// set one by its name in smb.conf(5) in a section, -1 for [global]. Under `ProcessLock`.
    int (*clientSigning)();
    bool (*setParameter)(int section, const char* name, const char* value);

    /// The user of the process's Kerberos ticket; empty without one. Under `ProcessLock`.
    std::string TicketUser() const;

    /// Of the loader. Never closed.
    void* handle;
    /// False when one thread at a time may be in it.
    bool takesThreads;

    /// Null when it cannot be loaded; `reason` then says why. Any thread.
    static const SmbLibrary* Get(std::string& reason);
    /// One for the whole process, also where several of its libraries hold a copy of this code, or a host
    /// uses libsmbclient itself: a program that offers `kLockSymbol` shares its own.
    static Mutex& ProcessLock();
    /// The name of a variable of the type `Mutex` that the program itself exports.
    static constexpr const char* kLockSymbol = "clipfile_smb_process_lock";
    /// Connections that there are, from the first moment of being made to the last of being freed; one whose
    /// thread hangs in the library as well. Of the whole process, as the lock. Any thread.
    static std::atomic<int>& Clients();
    /// Of a `std::atomic<int>`.
    static constexpr const char* kClientsSymbol = "clipfile_smb_clients";
};

}  // namespace clipfileModule
