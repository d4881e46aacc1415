#include <stdlib.h>

#include <filesystem>

#include "MemoryFile.h"
#include "common/ToolError.h"
#include "recover/Recovery.h"

namespace {

/// A folder for what is recovered, removed at the end.
class OutputFolder {
 public:
    OutputFolder() {
        std::string name = (std::filesystem::temp_directory_path() / "fuzz_recover.XXXXXX").string();
        if (mkdtemp(name.data()) == nullptr) {
            __builtin_trap();
        }
        path_ = name;
    }
    ~OutputFolder() {
        std::error_code ignored;
        std::filesystem::remove_all(path_, ignored);
    }
    OutputFolder(const OutputFolder&) = delete;
    OutputFolder& operator=(const OutputFolder&) = delete;

    const std::filesystem::path& Path() const { return path_; }
    void Clear() const {
        for (const auto& entry : std::filesystem::directory_iterator(path_)) {
            std::filesystem::remove(entry);
        }
    }

 private:
    std::filesystem::path path_;
};

}  // namespace

extern "C" int LLVMFuzzerInitialize(int*, char***) {
    return setenv("QX_LOG_PRIORITY", "0", 1);
}

/// The file is also the one whose parameter sets are taken, where it has some.
extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    static const OutputFolder folder;
    const MemoryFile memory(data, size);
    try {
        clipfile::RecoverFile(memory.Path(), {memory.Path(), folder.Path(), false});
    } catch (const clipfile::ToolError&) {
        return 0;
    }
    folder.Clear();
    return 0;
}
