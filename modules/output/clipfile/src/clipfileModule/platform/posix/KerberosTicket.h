#pragma once

#include <string>

namespace clipfileModule {

/// The process's Kerberos ticket, as Samba's libraries see it: through the Kerberos library behind
/// `libsmbclient`, a handle of the loader, which may be a copy of their own.
class KerberosTicket {
 public:
    /// Finds the library. Under `SmbLibrary::ProcessLock`, as `User`.
    explicit KerberosTicket(void* libsmbclient);

    /// The principal, `user@REALM`, of the default credentials cache (kinit(1), KRB5CCNAME). Empty when there
    /// is none, or its initial ticket has expired.
    std::string User() const;

 private:
    // Opaque in the interface too, but for the number that its functions return, 0 for success.
    using Context = void*;
    using Cache = void*;
    using Principal = void*;

    std::string userOf(Context context, Cache cache) const;

    int (*initContext_)(Context* context) = nullptr;
    void (*freeContext_)(Context context) = nullptr;
    int (*openDefaultCache_)(Context context, Cache* cache) = nullptr;
    int (*closeCache_)(Context context, Cache cache) = nullptr;
    int (*getPrincipal_)(Context context, Cache cache, Principal* principal) = nullptr;
    void (*freePrincipal_)(Context context, Principal principal) = nullptr;
    int (*toText_)(Context context, Principal principal, char** text) = nullptr;
    /// Seconds that the initial ticket has left. Not every library has it.
    int (*getLifetime_)(Context context, Cache cache, long* seconds) = nullptr;
};

}  // namespace clipfileModule
