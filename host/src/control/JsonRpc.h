#pragma once

#include <nlohmann/json.hpp>
#include <optional>
#include <stdexcept>
#include <string>
#include <string_view>

namespace receiver {

/// Error codes of JSON-RPC 2.0, and from -32000 down our own.
enum class RpcCode : int {
    kParse = -32700,
    kInvalidRequest = -32600,
    kNoMethod = -32601,
    kInvalidParams = -32602,
    kInternal = -32603,
    /// The source is not there yet.
    kNoSource = -32001,
    /// A command that changes nothing, or can't be carried out any more.
    kNoEffect = -32002,
    /// No picture has come that could be shown.
    kNoPicture = -32003,
    /// Too many commands wait.
    kBusy = -32004,
    kLineTooLong = -32005,
    kTooManyClients = -32006,
};

/// What becomes of a request that is not carried out.
class RpcError : public std::runtime_error {
 public:
    RpcError(RpcCode code, const std::string& sentence) : std::runtime_error(sentence), code_(code) {}
    RpcCode Code() const { return code_; }

 private:
    RpcCode code_;
};

/// A question of a client.
struct RpcRequest {
    /// A text, a number or null. Nothing for a notification, which is not answered.
    std::optional<nlohmann::ordered_json> id;
    std::string method;
    /// An object or an array; null without one. A client decides how deep it is nested: it is moved, and
    /// never copied, compared or written, which takes a call for each level.
    nlohmann::json params;
    /// Why it is none. `id` is then what could be read of it, else null.
    std::optional<RpcError> error;
};

/// Reads one message. Batches are refused: messages are lines, and many may be sent at once.
RpcRequest ParseRpcRequest(std::string_view line);

// Lines with their ends.

std::string RpcAnswer(const nlohmann::ordered_json& id, const nlohmann::ordered_json& result);
std::string RpcErrorAnswer(const nlohmann::ordered_json& id, const RpcError& error);
std::string RpcNotification(const char* method, const nlohmann::ordered_json& params);
/// The same for an object that is a line of JSON already.
std::string RpcNotificationOf(const char* method, std::string_view line);

}  // namespace receiver
