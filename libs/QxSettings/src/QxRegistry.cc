#include "QxRegistry.h"

#include "Logger.h"
#include "SettingsStore.h"

namespace {

using qx_settings::SettingsStore;

SettingsStore loadStore() {
    SettingsStore store;
    qx_settings::SettingsError error;
    const std::string path = qx_settings::SettingsPath();
    if (!store.Load(path, error)) {
        if (error.line != 0) {
            Logger::Put(LOG_PRIORITY_ERROR, __FILE__, "QxRegistry::getValue", __LINE__,
                        "settings file %s, line %lu: %s. no settings.", path.c_str(), error.line,
                        error.reason.c_str());
        } else {
            Logger::Put(LOG_PRIORITY_ERROR, __FILE__, "QxRegistry::getValue", __LINE__,
                        "settings file %s: %s. no settings.", path.c_str(), error.reason.c_str());
        }
    }
    return store;
}

/// The store of this process. Threads that come first at the same time wait for the one that reads the file.
const SettingsStore& processStore() {
    static const SettingsStore store = loadStore();
    return store;
}

}  // namespace

QxRegistry* QxRegistry::GetInstance() {
    static QxRegistry registry;
    return &registry;
}

bool QxRegistry::getValue(const std::string& section, const std::string& key, std::string& value) {
    const std::string* const text = processStore().Find(section, key);
    if (text == nullptr) {
        return false;
    }
    value = *text;
    return true;
}

bool QxRegistry::getValue(const std::string& section, const std::string& key, unsigned int& value) {
    const std::string* const text = processStore().Find(section, key);
    return text != nullptr && qx_settings::ParseNumber(*text, value);
}
