#pragma once

#include <fcntl.h>
#include <sys/mman.h>
#include <unistd.h>

#include <filesystem>
#include <stdexcept>
#include <type_traits>

/// A `T` in a file that several processes map; all zeros at first. It is what it is when a process dies.
template <typename T>
class SharedMemory {
    static_assert(std::is_standard_layout_v<T>);

 public:
    explicit SharedMemory(const std::filesystem::path& path) {
        const int file = open(path.c_str(), O_RDWR | O_CREAT | O_CLOEXEC, 0600);
        if (file < 0 || ftruncate(file, sizeof(T)) != 0) {
            throw std::runtime_error("no shared memory at " + path.string());
        }
        memory_ = mmap(nullptr, sizeof(T), PROT_READ | PROT_WRITE, MAP_SHARED, file, 0);
        close(file);
        if (memory_ == MAP_FAILED) {
            throw std::runtime_error("no shared memory at " + path.string());
        }
    }
    ~SharedMemory() { munmap(memory_, sizeof(T)); }
    SharedMemory(const SharedMemory&) = delete;
    SharedMemory& operator=(const SharedMemory&) = delete;

    T* operator->() const { return static_cast<T*>(memory_); }

 private:
    void* memory_ = nullptr;
};
