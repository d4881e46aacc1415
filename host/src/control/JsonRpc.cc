#include "control/JsonRpc.h"

#include <utility>

namespace receiver {
namespace {

using Json = nlohmann::ordered_json;

std::string LineOf(const Json& object) {
    // Paths may hold any bytes.
    return object.dump(-1, ' ', false, Json::error_handler_t::replace) + '\n';
}

RpcRequest Refused(RpcRequest request, RpcCode code, const char* sentence) {
    // An error is told even where it cannot be read whether an answer is wanted.
    request.id = request.id.value_or(nullptr);
    request.error.emplace(code, sentence);
    return request;
}

}  // namespace

RpcRequest ParseRpcRequest(std::string_view line) {
    RpcRequest request;
    // Members in an order of our own: those of an `ordered_json` are looked for one by one, and a line has
    // room for thousands.
    nlohmann::json message = nlohmann::json::parse(line, nullptr, false);
    if (message.is_discarded()) {
        return Refused(request, RpcCode::kParse, "the line is no JSON");
    }
    if (message.is_array()) {
        return Refused(request, RpcCode::kInvalidRequest,
                       "batches are not taken: send a line for each message");
    }
    if (!message.is_object()) {
        return Refused(request, RpcCode::kInvalidRequest, "a message is an object");
    }
    if (const auto id = message.find("id"); id != message.end()) {
        if (!id->is_string() && !id->is_number() && !id->is_null()) {
            return Refused(request, RpcCode::kInvalidRequest, "id is a text, a number or null");
        }
        request.id = *id;
    }
    const auto version = message.find("jsonrpc");
    if (version == message.end() || *version != "2.0") {
        return Refused(request, RpcCode::kInvalidRequest, "jsonrpc is \"2.0\"");
    }
    const auto method = message.find("method");
    if (method == message.end() || !method->is_string()) {
        return Refused(request, RpcCode::kInvalidRequest, "method is a text");
    }
    request.method = method->get<std::string>();
    if (const auto params = message.find("params"); params != message.end()) {
        if (!params->is_structured()) {
            return Refused(request, RpcCode::kInvalidRequest, "params is an object");
        }
        request.params = std::move(*params);
    }
    return request;
}

std::string RpcAnswer(const Json& id, const Json& result) {
    return LineOf({{"jsonrpc", "2.0"}, {"id", id}, {"result", result}});
}

std::string RpcErrorAnswer(const Json& id, const RpcError& error) {
    const Json members = {{"code", static_cast<int>(error.Code())}, {"message", error.what()}};
    return LineOf({{"jsonrpc", "2.0"}, {"id", id}, {"error", members}});
}

std::string RpcNotification(const char* method, const Json& params) {
    return LineOf({{"jsonrpc", "2.0"}, {"method", method}, {"params", params}});
}

std::string RpcNotificationOf(const char* method, std::string_view line) {
    while (line.ends_with('\n')) {
        line.remove_suffix(1);
    }
    return std::string(R"({"jsonrpc":"2.0","method":")") + method + R"(","params":)" + std::string(line) +
           "}\n";
}

}  // namespace receiver
