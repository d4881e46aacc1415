#pragma once

#include <string>

namespace receiver {

/// "udp" of "udp://239.1.1.1:5004"; empty for a file.
inline std::string SchemeOf(const std::string& url) {
    const std::size_t end = url.find("://");
    return end == std::string::npos ? "" : url.substr(0, end);
}

/// True for addresses whose stream goes on whether or not it is read: not for files and "test:", which wait.
inline bool IsLive(const std::string& url) {
    const std::string scheme = SchemeOf(url);
    return url.ends_with(".sdp") || (!scheme.empty() && scheme != "file");
}

/// True for RTMP addresses of this machine at which a sender is waited for: those of every interface.
inline bool IsRtmpListener(const std::string& url) {
    return url.starts_with("rtmp://0.0.0.0") || url.starts_with("rtmp://[::]");
}

/// True where a sender comes to us, and false where we call it.
inline bool Listens(const std::string& url) {
    const std::string scheme = SchemeOf(url);
    return url.ends_with(".sdp") || scheme == "udp" || scheme == "rtp" || IsRtmpListener(url) ||
           (scheme == "srt" && url.find("mode=listener") != std::string::npos) ||
           (scheme == "tcp" && url.find("listen") != std::string::npos);
}

}  // namespace receiver
