#pragma once

#include <string>

namespace clipfileModule {

/// True when `path` counts as remote: it begins with two backslashes. All else is local.
bool IsSharePath(const std::string& path);

/// A path on a network share, taken apart: `\\server\share\folder\file`. Separators are backslashes or
/// slashes; repeated and trailing ones do not count. The server is a name, an IPv4 address, or an IPv6
/// address in brackets or as a name, `2001-db8--1.ipv6-literal.net`, with a port behind a colon when it does
/// not listen on 445.
class SharePath {
 public:
    /// False when `path` names no server and share, or a server that cannot be one; `result` is left alone
    /// then.
    static bool Parse(const std::string& path, SharePath& result);

    /// A name or an address, without brackets.
    const std::string& Server() const { return server_; }
    /// In decimal digits.
    const std::string& Port() const { return port_; }
    /// `smb://server:port/share`, with the name of an IPv6 address, and with each octet outside the
    /// unreserved set of RFC 3986 2.3 percent-encoded.
    const std::string& ShareUrl() const { return shareUrl_; }
    /// `ShareUrl` with the path inside the share.
    const std::string& Url() const { return url_; }

 private:
    std::string server_;
    std::string port_;
    std::string shareUrl_;
    std::string url_;
};

}  // namespace clipfileModule
