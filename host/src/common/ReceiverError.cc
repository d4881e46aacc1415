#include "common/ReceiverError.h"

#include <system_error>

namespace receiver {

std::string SentenceOf(const std::exception& error) {
    const auto* const refusal = dynamic_cast<const std::system_error*>(&error);
    if (refusal != nullptr && refusal->code() == std::errc::resource_unavailable_try_again) {
        return "the system starts no more threads: " + refusal->code().message() +
               "; find what uses them up (ulimit -u, TasksMax=).";
    }
    return error.what();
}

}  // namespace receiver
