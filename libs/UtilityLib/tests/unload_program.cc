// Loads the library named by the second argument as a host loads a module: it is not linked with it.

#include <dlfcn.h>

#include <cstdio>
#include <cstdlib>
#include <string>

namespace {

using Put = void (*)(int priority, const char* file, const char* function, int line, const char* format, ...);

Put put = nullptr;

void* Load(const char* path) {
    void* library = dlopen(path, RTLD_NOW | RTLD_LOCAL);
    if (library == nullptr) {
        std::fprintf(stderr, "%s\n", dlerror());
        std::exit(3);
    }
    put = reinterpret_cast<Put>(dlsym(library, "_ZN6Logger3PutE12_LogPriorityPKcS2_iS2_z"));
    if (put == nullptr) {
        std::exit(4);
    }
    return library;
}

/// Every load logs and leaves nothing behind.
int Cycle(const char* path) {
    for (int i = 0; i < 20; ++i) {
        void* library = Load(path);
        put(4, "file.cc", "function", 1, "cycle %d", i);
        put(4, "file.cc", "function", 1, "cycle %d again", i);
        if (dlclose(library) != 0) {
            return 5;
        }
        if (dlopen(path, RTLD_NOW | RTLD_NOLOAD) != nullptr) {
            return 6;  // it was not unloaded
        }
    }
    return 0;
}

/// A line after the log has closed: the handler was registered before the library was loaded, so it runs
/// after the destructors of the library.
int Late(const char* path) {
    std::atexit([] { put(4, nullptr, nullptr, 0, "late"); });
    Load(path);
    put(4, nullptr, nullptr, 0, "early");
    return 0;
}

}  // namespace

int main(int argc, char** argv) {
    if (argc != 3) {
        return 99;
    }
    return argv[1] == std::string("Cycle") ? Cycle(argv[2]) : Late(argv[2]);
}
