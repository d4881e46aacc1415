#include "source/Libav.h"

#include <array>
#include <cstdio>
#include <cstring>
#include <new>

#include "common/ReceiverError.h"

namespace receiver::libav {
namespace {

thread_local std::string lastError;

/// Messages of the libraries' own threads go to those threads' strings and are never read.
void Collect(void* /*object*/, int level, const char* format, va_list arguments) {
    if (level > AV_LOG_ERROR) {
        return;
    }
    va_list again;
    va_copy(again, arguments);
    const int length = std::vsnprintf(nullptr, 0, format, again);
    va_end(again);
    // Whole: what is cut out of the middle of an address could not be told from a host's name any more.
    std::string line(length > 0 ? static_cast<std::size_t>(length) : 0, '\0');
    std::vsnprintf(line.data(), line.size() + 1, format, arguments);
    while (!line.empty() && (line.back() == '\n' || line.back() == '\r' || line.back() == ' ')) {
        line.pop_back();
    }
    if (!line.empty()) {
        lastError = line;
    }
}

template <typename T>
Owner<T> Own(T* object) {
    if (object == nullptr) {
        throw std::bad_alloc();
    }
    return Owner<T>(object);
}

}  // namespace

Owner<AVFrame> NewFrame() {
    return Own(av_frame_alloc());
}

Owner<AVPacket> NewPacket() {
    return Own(av_packet_alloc());
}

Owner<AVCodecContext> NewCodec(const AVCodec* codec) {
    return Own(avcodec_alloc_context3(codec));
}

std::string ErrorText(int error) {
    std::array<char, AV_ERROR_MAX_STRING_SIZE> text{};
    av_strerror(error, text.data(), text.size());
    return text.data();
}

int Check(int result, const char* action) {
    if (result < 0) {
        throw ReceiverError(ExitCode::kInternal, std::string("cannot ") + action + ": " + ErrorText(result));
    }
    return result;
}

std::shared_ptr<unsigned char> Share(const AVPacket& packet) {
#if defined(__SANITIZE_THREAD__)
    // The thread sanitizer does not see how the libraries, which are not built with it, count references: it
    // would call the last release on one thread a race with what another read before its own release.
    const std::shared_ptr<unsigned char> copy(new unsigned char[static_cast<std::size_t>(packet.size)],
                                              std::default_delete<unsigned char[]>());
    std::memcpy(copy.get(), packet.data, static_cast<std::size_t>(packet.size));
    return copy;
#else
    const std::shared_ptr<AVPacket> reference = Own(av_packet_clone(&packet));
    return {reference, reference->data};
#endif
}

void CollectMessages() {
    av_log_set_callback(Collect);
}

std::string LastError() {
    return lastError;
}

void ForgetErrors() {
    lastError.clear();
}

}  // namespace receiver::libav
