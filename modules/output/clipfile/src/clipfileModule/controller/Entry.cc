// The one export of the library.

#include "controller/Mp4FileOutput.h"

namespace {

/// Built while the library loads, before a host can call anything; starts no thread.
clipfileModule::Mp4FileOutput module;

}  // namespace

bool GetQxModuleInterface(QxModuleInterface** out) {
    *out = &module;
    return true;
}
