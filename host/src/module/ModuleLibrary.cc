#include "module/ModuleLibrary.h"

#include <dlfcn.h>

#include <array>
#include <filesystem>
#include <system_error>

#include "common/ReceiverError.h"

namespace receiver {
namespace {

constexpr const char* kName = "libclipfile.so";

ReceiverError Unusable(const std::string& file, const std::string& reason) {
    return {ExitCode::kModule, "the module '" + file + "' cannot be used: " + reason +
                                   "; --module names the file of another build."};
}

}  // namespace

ModuleLibrary::ModuleLibrary(const std::string& file) {
    // In memory to the end of the process: a module leaves globals behind in libraries of its own, and a
    // writer that hangs on a disk may outlive every stop.
    library_ = dlopen(file.c_str(), RTLD_NOW | RTLD_LOCAL | RTLD_NODELETE);
    if (library_ == nullptr) {
        throw Unusable(file, dlerror());
    }
    try {
        using Entry = bool (*)(QxModuleInterface**);
        const auto entry = reinterpret_cast<Entry>(dlsym(library_, "GetQxModuleInterface"));
        if (entry == nullptr) {
            throw Unusable(file, "it does not export GetQxModuleInterface and so is no output module");
        }
        if (!entry(&module_) || module_ == nullptr) {
            throw Unusable(file, "it gives no module object");
        }
    } catch (...) {
        dlclose(library_);
        throw;
    }
}

ModuleLibrary::~ModuleLibrary() {
    dlclose(library_);
}

std::string ModuleLibrary::DefaultFile() {
    std::error_code error;
    const std::filesystem::path program = std::filesystem::read_symlink("/proc/self/exe", error);
    // Beside the program, in a build, where it is installed.
    constexpr std::array<const char*, 3> kPlaces{"", "../modules/output/clipfile/src/clipfileModule",
                                                 RECEIVER_MODULE_FOLDER};
    for (const char* const place : kPlaces) {
        const std::filesystem::path file = program.parent_path() / place / kName;
        if (!error && std::filesystem::exists(file, error)) {
            return file.lexically_normal().string();
        }
    }
    return kName;
}

}  // namespace receiver
