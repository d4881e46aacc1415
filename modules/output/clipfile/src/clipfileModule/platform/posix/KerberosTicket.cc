#include "platform/posix/KerberosTicket.h"

#include <dlfcn.h>

#include <cstdlib>

namespace clipfileModule {

namespace {

template <typename Function>
void findIn(void* handle, const char* name, Function& function) {
    function = reinterpret_cast<Function>(dlsym(handle, name));
}

}  // namespace

KerberosTicket::KerberosTicket(void* libsmbclient) {
    // Looks in the libraries behind that one too.
    findIn(libsmbclient, "krb5_init_context", initContext_);
    findIn(libsmbclient, "krb5_free_context", freeContext_);
    findIn(libsmbclient, "krb5_cc_default", openDefaultCache_);
    findIn(libsmbclient, "krb5_cc_close", closeCache_);
    findIn(libsmbclient, "krb5_cc_get_principal", getPrincipal_);
    findIn(libsmbclient, "krb5_free_principal", freePrincipal_);
    findIn(libsmbclient, "krb5_unparse_name", toText_);
    findIn(libsmbclient, "krb5_cc_get_lifetime", getLifetime_);
}

std::string KerberosTicket::User() const {
    Context context = nullptr;
    if (initContext_ == nullptr || freeContext_ == nullptr || openDefaultCache_ == nullptr ||
        closeCache_ == nullptr || getPrincipal_ == nullptr || freePrincipal_ == nullptr ||
        toText_ == nullptr || initContext_(&context) != 0) {
        return {};
    }
    std::string user;
    Cache cache = nullptr;
    if (openDefaultCache_(context, &cache) == 0) {
        user = userOf(context, cache);
        closeCache_(context, cache);
    }
    freeContext_(context);
    return user;
}

std::string KerberosTicket::userOf(Context context, Cache cache) const {
    long seconds = 0;
    if (getLifetime_ != nullptr && (getLifetime_(context, cache, &seconds) != 0 || seconds <= 0)) {
        return {};
    }
    std::string user;
    Principal principal = nullptr;
    if (getPrincipal_(context, cache, &principal) == 0) {
        char* text = nullptr;
        if (toText_(context, principal, &text) == 0) {
            user = text;
            std::free(text);
        }
        freePrincipal_(context, principal);
    }
    return user;
}

}  // namespace clipfileModule
