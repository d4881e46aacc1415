#include "support/FakeRegistry.h"

#include <mutex>

#include "QxRegistry.h"

namespace {

struct Store {
    std::mutex mutex;
    std::map<std::string, std::string> texts;
    std::map<std::string, unsigned int> numbers;
    std::vector<std::string> asked;
};

Store& store() {
    static Store instance;
    return instance;
}

template <typename Value>
bool find(const std::map<std::string, Value>& values, const std::string& section, const std::string& key,
          Value& value) {
    store().asked.push_back(section + "/" + key);
    const auto found = values.find(key);
    if (section != "Qx/Other/MP4FileOut" || found == values.end()) {
        return false;
    }
    value = found->second;
    return true;
}

}  // namespace

void FakeRegistry::Set(const std::string& key, const std::string& value) {
    const std::lock_guard lock(store().mutex);
    store().texts[key] = value;
}

void FakeRegistry::Set(const std::string& key, unsigned int value) {
    const std::lock_guard lock(store().mutex);
    store().numbers[key] = value;
}

void FakeRegistry::Clear() {
    const std::lock_guard lock(store().mutex);
    store().texts.clear();
    store().numbers.clear();
    store().asked.clear();
}

std::vector<std::string> FakeRegistry::AskedKeys() const {
    const std::lock_guard lock(store().mutex);
    return store().asked;
}

QxRegistry* QxRegistry::GetInstance() {
    static QxRegistry instance;
    return &instance;
}

bool QxRegistry::getValue(const std::string& section, const std::string& key, std::string& value) {
    const std::lock_guard lock(store().mutex);
    return find(store().texts, section, key, value);
}

bool QxRegistry::getValue(const std::string& section, const std::string& key, unsigned int& value) {
    const std::lock_guard lock(store().mutex);
    return find(store().numbers, section, key, value);
}
