#pragma once

#include <map>
#include <string>
#include <vector>

/// The settings store of a test program: it takes the place of the library's `QxRegistry` at link time, as a
/// host system's own library would. Empty at the start of each test that makes a `FakeRegistry`.
class FakeRegistry {
 public:
    FakeRegistry() { Clear(); }
    ~FakeRegistry() { Clear(); }
    FakeRegistry(const FakeRegistry&) = delete;
    FakeRegistry& operator=(const FakeRegistry&) = delete;

    /// Sets a key of the module's section.
    void Set(const std::string& key, const std::string& value);
    void Set(const std::string& key, unsigned int value);
    /// The keys that were asked for, in order.
    std::vector<std::string> AskedKeys() const;

 private:
    static void Clear();
};
