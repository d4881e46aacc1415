#pragma once

#include <dlfcn.h>

#include <stdexcept>

#include "QxModuleInterface.h"
#include "QxModuleNotifyInterface.h"
#include "QxModuleStreamInterface.h"

/// libclipfile.so as a host has it. Throws `std::runtime_error` for what no host could work with.
class LoadedModule {
 public:
    LoadedModule() : library_(dlopen(CLIPFILE_MODULE, RTLD_NOW | RTLD_LOCAL)) {
        if (library_ == nullptr) {
            throw std::runtime_error(dlerror());
        }
        using Entry = bool (*)(QxModuleInterface**);
        const auto entry = reinterpret_cast<Entry>(dlsym(library_, "GetQxModuleInterface"));
        if (entry == nullptr || !entry(&module_) || !module_->GetStreamInterface(&stream_) ||
            !module_->GetNotifyInterface(&notify_)) {
            throw std::runtime_error("the module gives no interface");
        }
    }
    ~LoadedModule() { Unload(); }
    LoadedModule(const LoadedModule&) = delete;
    LoadedModule& operator=(const LoadedModule&) = delete;

    QxModuleInterface& Module() { return *module_; }
    QxModuleStreamInterface& Stream() { return *stream_; }
    QxModuleNotifyInterface& Notify() { return *notify_; }

    /// False when the loader refuses.
    bool Unload() {
        void* const library = library_;
        library_ = nullptr;
        return library == nullptr || dlclose(library) == 0;
    }
    /// True while the library is in the process.
    static bool IsInMemory() {
        void* const library = dlopen(CLIPFILE_MODULE, RTLD_NOW | RTLD_NOLOAD);
        return library != nullptr && dlclose(library) == 0;
    }

 private:
    void* library_;
    QxModuleInterface* module_ = nullptr;
    QxModuleStreamInterface* stream_ = nullptr;
    QxModuleNotifyInterface* notify_ = nullptr;
};
