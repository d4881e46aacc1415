#include "platform/posix/PinLibrary.h"

#include <dlfcn.h>

namespace clipfileModule {

namespace {

/// Its address tells which library this code is part of.
const char kAnchor = 0;

}  // namespace

void PinLibrary() {
    Dl_info info = {};
    if (dladdr(&kAnchor, &info) != 0 && info.dli_fname != nullptr) {
        // The handle is not kept: what counts is the flag that the loader sets.
        if (void* const handle = dlopen(info.dli_fname, RTLD_NOW | RTLD_NOLOAD | RTLD_NODELETE)) {
            dlclose(handle);
        }
    }
}

}  // namespace clipfileModule
