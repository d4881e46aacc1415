#include "hooks/UrlHook.h"

#include <curl/curl.h>

#include <memory>
#include <new>
#include <stdexcept>
#include <utility>

#include "common/Credentials.h"

namespace receiver {
namespace {

struct FreeCurl {
    void operator()(CURL* handle) const { curl_easy_cleanup(handle); }
    void operator()(curl_slist* list) const { curl_slist_free_all(list); }
};
using Handle = std::unique_ptr<CURL, FreeCurl>;
using Headers = std::unique_ptr<curl_slist, FreeCurl>;

constexpr long kTooManyRequests = 429;
constexpr long kServerError = 500;

/// What a server answers with is of no use here.
std::size_t Ignore(char* /*data*/, std::size_t size, std::size_t count, void* /*user*/) {
    return size * count;
}

template <typename Value>
void Set(CURL* handle, CURLoption option, Value value) {
    if (const CURLcode code = curl_easy_setopt(handle, option, value); code != CURLE_OK) {
        throw std::runtime_error(curl_easy_strerror(code));
    }
}

}  // namespace

UrlHook::UrlHook(std::string url, Pauses pauses, std::chrono::milliseconds limit)
    : url_(std::move(url)), pauses_(std::move(pauses)), limit_(limit) {
    // Once in a process, before any other use; a repetition has no effect.
    static const CURLcode ready = curl_global_init(CURL_GLOBAL_DEFAULT);
    if (ready != CURLE_OK) {
        throw std::runtime_error(curl_easy_strerror(ready));
    }
}

std::string UrlHook::Name() const {
    return "hook " + WithoutCredentials(url_);
}

void UrlHook::End() {
    const std::lock_guard lock(mutex_);
    ending_ = true;
    changed_.notify_all();
}

bool UrlHook::Ending() {
    const std::lock_guard lock(mutex_);
    return ending_;
}

bool UrlHook::Pause(std::chrono::milliseconds pause) {
    std::unique_lock lock(mutex_);
    return !changed_.wait_for(lock, pause, [this] { return ending_; });
}

std::optional<std::string> UrlHook::Deliver(const HookEvent& event) {
    auto pause = pauses_.begin();
    for (;;) {
        const Attempt attempt = Post(event.json);
        if (attempt.problem.empty()) {
            return std::nullopt;
        }
        if (!attempt.mayPass || pause == pauses_.end() || !Pause(*pause++)) {
            return attempt.problem;
        }
    }
}

UrlHook::Attempt UrlHook::Post(const std::string& json) {
    const Handle handle(curl_easy_init());
    const Headers headers(curl_slist_append(nullptr, "Content-Type: application/json"));
    if (handle == nullptr || headers == nullptr) {
        throw std::bad_alloc();
    }
    CURL* const curl = handle.get();
    Set(curl, CURLOPT_URL, url_.c_str());
    Set(curl, CURLOPT_PROTOCOLS_STR, "http,https");
    Set(curl, CURLOPT_HTTPHEADER, headers.get());
    Set(curl, CURLOPT_POSTFIELDSIZE, static_cast<long>(json.size()));
    Set(curl, CURLOPT_POSTFIELDS, json.c_str());
    Set(curl, CURLOPT_WRITEFUNCTION, &Ignore);
    Set(curl, CURLOPT_TIMEOUT_MS, static_cast<long>(limit_.count()));
    // A name that is still looked up at the end is left to itself.
    Set(curl, CURLOPT_QUICK_EXIT, 1L);
    // Signals are for the thread that takes them.
    Set(curl, CURLOPT_NOSIGNAL, 1L);
    Set(curl, CURLOPT_NOPROGRESS, 0L);
    Set(curl, CURLOPT_XFERINFODATA, this);
    const curl_xferinfo_callback stop = [](void* self, curl_off_t, curl_off_t, curl_off_t, curl_off_t) {
        return static_cast<UrlHook*>(self)->Ending() ? 1 : 0;
    };
    Set(curl, CURLOPT_XFERINFOFUNCTION, stop);
    if (const CURLcode code = curl_easy_perform(curl); code != CURLE_OK) {
        return {curl_easy_strerror(code), code != CURLE_ABORTED_BY_CALLBACK && code != CURLE_URL_MALFORMAT};
    }
    long answer = 0;
    curl_easy_getinfo(curl, CURLINFO_RESPONSE_CODE, &answer);
    if (answer >= 200 && answer < 300) {
        return {};
    }
    return {"the server answered " + std::to_string(answer),
            answer == kTooManyRequests || answer >= kServerError};
}

}  // namespace receiver
