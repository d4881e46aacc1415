#include "control/ControlCall.h"

#include <sys/socket.h>
#include <sys/un.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <cstring>
#include <nlohmann/json.hpp>
#include <optional>
#include <string_view>

namespace clipfile {
namespace {

using Json = nlohmann::ordered_json;

ToolError NoReceiver(const std::string& socket, const std::string& reason) {
    return {ExitCode::kUnreadable, "no receiver can be reached at " + socket + ": " + reason + "."};
}

/// A connection that speaks in lines.
class Connection {
 public:
    explicit Connection(const std::string& path)
        : descriptor_(socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0)) {
        sockaddr_un address{};
        address.sun_family = AF_UNIX;
        const bool fits = path.size() < sizeof address.sun_path;
        path.copy(address.sun_path, sizeof address.sun_path - 1);
        if (!fits || connect(descriptor_, reinterpret_cast<const sockaddr*>(&address), sizeof address) != 0) {
            const std::string reason = fits ? std::strerror(errno) : "its name is too long";
            close(descriptor_);
            throw NoReceiver(path, reason);
        }
    }
    ~Connection() { close(descriptor_); }
    Connection(const Connection&) = delete;
    Connection& operator=(const Connection&) = delete;

    /// What cannot be sent shows as an answer that does not come.
    void Send(std::string_view bytes) const {
        while (!bytes.empty()) {
            const ssize_t count = send(descriptor_, bytes.data(), bytes.size(), MSG_NOSIGNAL);
            if (count < 0 && errno != EINTR) {
                return;
            }
            bytes.remove_prefix(count > 0 ? static_cast<std::size_t>(count) : 0);
        }
    }
    /// Nothing at the end of the connection.
    std::optional<std::string> Line() {
        std::size_t end = 0;
        while ((end = read_.find('\n')) == std::string::npos) {
            std::array<char, 65536> piece;
            const ssize_t count = recv(descriptor_, piece.data(), piece.size(), 0);
            if (count == 0 || (count < 0 && errno != EINTR)) {
                return std::nullopt;
            }
            read_.append(piece.data(), count > 0 ? static_cast<std::size_t>(count) : 0);
        }
        std::string line = read_.substr(0, end);
        read_.erase(0, end + 1);
        return line;
    }

 private:
    const int descriptor_;
    std::string read_;
};

std::string RequestOf(const ControlCall& call) {
    Json request = {{"jsonrpc", "2.0"}, {"id", 1}, {"method", call.method}};
    if (!call.params.empty()) {
        request["params"] = Json::parse(call.params, nullptr, false);
        if (!request["params"].is_object()) {
            throw ToolError(ExitCode::kUsage, "the params are no object of JSON: " + call.params + ".");
        }
    }
    return request.dump(-1, ' ', false, Json::error_handler_t::replace) + '\n';
}

void Print(std::ostream& out, const Json& json) {
    out << json.dump(-1, ' ', false, Json::error_handler_t::replace) << std::endl;
}

}  // namespace

ExitCode CallControl(const ControlCall& call, std::ostream& out, std::ostream& errors) {
    const std::string request = RequestOf(call);
    Connection connection(call.socket);
    connection.Send(request);
    const Json answer = Json::parse(connection.Line().value_or(""), nullptr, false);
    if (answer.is_object() && answer.contains("error")) {
        errors << "clipfile: " << answer["error"].value("message", std::string("it was refused")) << ".\n";
        return ExitCode::kDefects;
    }
    if (!answer.is_object() || !answer.contains("result")) {
        throw NoReceiver(call.socket, "it has not answered");
    }
    if (call.method != "events") {
        Print(out, answer["result"]);
        return ExitCode::kSuccess;
    }
    while (const std::optional<std::string> line = connection.Line()) {
        const Json message = Json::parse(*line, nullptr, false);
        if (message.is_object() && message.contains("params")) {
            Print(out, message["params"]);
        }
    }
    return ExitCode::kSuccess;
}

}  // namespace clipfile
