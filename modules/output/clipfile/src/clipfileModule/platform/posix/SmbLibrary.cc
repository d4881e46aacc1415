#include "platform/posix/SmbLibrary.h"

#include <dlfcn.h>

#include <array>
#include <cstdio>

#include "platform/posix/KerberosTicket.h"
#include "platform/posix/PinLibrary.h"
#include "platform/posix/SmbThreads.h"

namespace clipfileModule {

namespace {

/// Trivially destructible: a thread may use it while the process ends.
struct LoadResult {
    bool loaded = false;
    std::array<char, 256> reason = {};
    SmbLibrary library = {};
};

template <typename Function>
bool find(void* handle, const char* name, Function& function) {
    function = reinterpret_cast<Function>(dlsym(handle, name));
    return function != nullptr;
}

bool findAll(void* handle, SmbLibrary& library) {
    return find(handle, "smbc_new_context", library.newContext) &&
           find(handle, "smbc_init_context", library.initContext) &&
           find(handle, "smbc_free_context", library.freeContext) &&
           find(handle, "smbc_setDebug", library.setDebug) &&
           find(handle, "smbc_setLogCallback", library.setLogCallback) &&
           find(handle, "smbc_setTimeout", library.setTimeout) &&
           find(handle, "smbc_setUser", library.setUser) &&
           find(handle, "smbc_setWorkgroup", library.setWorkgroup) &&
           find(handle, "smbc_setOptionProtocols", library.setOptionProtocols) &&
           find(handle, "smbc_setOptionUserData", library.setOptionUserData) &&
           find(handle, "smbc_getOptionUserData", library.getOptionUserData) &&
           find(handle, "smbc_setOptionOpenShareMode", library.setOptionOpenShareMode) &&
           find(handle, "smbc_setOptionNoAutoAnonymousLogin", library.setOptionNoAutoAnonymousLogin) &&
           find(handle, "smbc_setOptionUseKerberos", library.setOptionUseKerberos) &&
           find(handle, "smbc_setOptionUseCCache", library.setOptionUseCCache) &&
           find(handle, "smbc_setFunctionAuthDataWithContext", library.setFunctionAuthDataWithContext) &&
           find(handle, "smbc_setFunctionCheckServer", library.setFunctionCheckServer) &&
           find(handle, "smbc_getFunctionAddCachedServer", library.getFunctionAddCachedServer) &&
           find(handle, "smbc_setFunctionAddCachedServer", library.setFunctionAddCachedServer) &&
           find(handle, "smbc_getFunctionRemoveCachedServer", library.getFunctionRemoveCachedServer) &&
           find(handle, "smbc_setFunctionRemoveCachedServer", library.setFunctionRemoveCachedServer) &&
           find(handle, "smbc_getFunctionPurgeCachedServers", library.getFunctionPurgeCachedServers) &&
           find(handle, "smbc_getFunctionStat", library.getFunctionStat) &&
           find(handle, "smbc_getFunctionStatVFS", library.getFunctionStatVFS) &&
           find(handle, "smbc_getFunctionFstatVFS", library.getFunctionFstatVFS) &&
           find(handle, "smbc_getFunctionMkdir", library.getFunctionMkdir) &&
           find(handle, "smbc_getFunctionOpen", library.getFunctionOpen) &&
           find(handle, "smbc_getFunctionLseek", library.getFunctionLseek) &&
           find(handle, "smbc_getFunctionRead", library.getFunctionRead) &&
           find(handle, "smbc_getFunctionWrite", library.getFunctionWrite) &&
           find(handle, "smbc_getFunctionClose", library.getFunctionClose) &&
           find(handle, "smbc_getFunctionUnlink", library.getFunctionUnlink) &&
           find(handle, "lp_client_signing", library.clientSigning) &&
           find(handle, "lp_do_parameter", library.setParameter);
}

LoadResult load() {
    LoadResult result;
    void* const handle = dlopen("libsmbclient.so.0", RTLD_NOW | RTLD_LOCAL | RTLD_NODELETE);
    result.loaded = handle != nullptr && findAll(handle, result.library);
    if (result.loaded) {
        PinLibrary();
        MutexLock lock(SmbLibrary::ProcessLock());
        result.library.handle = handle;
        result.library.takesThreads = EnableSmbThreads(handle);
    } else {
        const char* const error = dlerror();
        std::snprintf(result.reason.data(), result.reason.size(), "%s", error != nullptr ? error : "");
    }
    return result;
}

}  // namespace

const SmbLibrary* SmbLibrary::Get(std::string& reason) {
    static const LoadResult result = load();
    if (!result.loaded) {
        reason = result.reason.data();
        return nullptr;
    }
    return &result.library;
}

std::string SmbLibrary::TicketUser() const {
    return KerberosTicket(handle).User();
}

Mutex& SmbLibrary::ProcessLock() {
    static Mutex own;
    static void* const offered = dlsym(RTLD_DEFAULT, kLockSymbol);
    return offered != nullptr ? *static_cast<Mutex*>(offered) : own;
}

std::atomic<int>& SmbLibrary::Clients() {
    static std::atomic<int> own = 0;
    static void* const offered = dlsym(RTLD_DEFAULT, kClientsSymbol);
    return offered != nullptr ? *static_cast<std::atomic<int>*>(offered) : own;
}

}  // namespace clipfileModule
