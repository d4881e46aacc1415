#pragma once

#include <string>

#include "QxModuleInterface.h"

namespace receiver {

/// The module's shared library, in memory from now to the end of the process.
class ModuleLibrary {
 public:
    /// Loads `file` and fetches the module object. Throws `ReceiverError` with `kModule` when there is no
    /// such file, when it is no shared library or one that lacks something, when it does not export
    /// `GetQxModuleInterface`, or when that gives no object.
    explicit ModuleLibrary(const std::string& file);
    ~ModuleLibrary();
    ModuleLibrary(const ModuleLibrary&) = delete;
    ModuleLibrary& operator=(const ModuleLibrary&) = delete;

    QxModuleInterface& Module() const { return *module_; }

    /// Where the module is when nobody says: beside the program, in the build tree that the program is in, or
    /// in ../lib. When there is none in any of these, the bare name, which the loader looks for itself.
    static std::string DefaultFile();

 private:
    void* library_ = nullptr;
    QxModuleInterface* module_ = nullptr;
};

}  // namespace receiver
