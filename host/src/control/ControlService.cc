#include "control/ControlService.h"

#include <cmath>

#include "common/ReceiverError.h"
#include "control/PreviewPicture.h"

namespace receiver {
namespace {

using Json = nlohmann::ordered_json;

/// A tenth of a decibel is more than anybody sees.
double Rounded(double decibels) {
    return std::round(decibels * 10) / 10;
}

void RefuseParams(const nlohmann::json& params) {
    if (!params.empty()) {
        throw RpcError(RpcCode::kInvalidParams, "the method takes no params");
    }
}

int WidthOf(const nlohmann::json& params) {
    int width = ControlService::kDefaultWidth;
    if (params.is_array() && !params.empty()) {
        throw RpcError(RpcCode::kInvalidParams, "params is an object with the member width");
    }
    for (const auto& [name, value] : params.items()) {
        if (name != "width") {
            throw RpcError(RpcCode::kInvalidParams, "params has the member width and no other");
        }
        if (!value.is_number_integer() || value < ControlService::kLeastWidth ||
            value > ControlService::kMostWidth) {
            throw RpcError(RpcCode::kInvalidParams, "width is a number of pixels from " +
                                                        std::to_string(ControlService::kLeastWidth) + " to " +
                                                        std::to_string(ControlService::kMostWidth));
        }
        // Chroma wants it even.
        width = value.get<int>() / 2 * 2;
    }
    return width;
}

std::optional<RecordCommand> CommandOf(const std::string& method) {
    if (method == "record.start") {
        return RecordCommand::kStart;
    }
    if (method == "record.stop") {
        return RecordCommand::kStop;
    }
    if (method == "record.split") {
        return RecordCommand::kSplit;
    }
    return std::nullopt;
}

}  // namespace

void ControlService::OnLine(ClientId client, const std::string& line, LineSenderInterface& sender) {
    const RpcRequest request = ParseRpcRequest(line);
    std::optional<RpcError> error = request.error;
    if (!error) {
        try {
            const std::optional<Json> result = Call(client, request);
            if (result && request.id) {
                sender.Send(client, RpcAnswer(*request.id, *result));
            }
        } catch (const RpcError& refused) {
            error = refused;
        } catch (const std::exception& failed) {
            error.emplace(RpcCode::kInternal, failed.what());
        }
    }
    if (error && request.id) {
        sender.Send(client, RpcErrorAnswer(*request.id, *error));
    }
    // A command may have been refused at once.
    SendOutcomes(sender, false);
}

std::optional<Json> ControlService::Call(ClientId client, const RpcRequest& request) {
    if (request.method == "preview") {
        return MakePreview(request.params);
    }
    const std::optional<RecordCommand> command = CommandOf(request.method);
    const bool known =
        command || request.method == "status" || request.method == "files" || request.method == "events";
    if (!known) {
        throw RpcError(RpcCode::kNoMethod, "there is no such method");
    }
    RefuseParams(request.params);
    if (command) {
        desk_.Post(*command, client, request.id);
        return std::nullopt;
    }
    if (request.method == "events") {
        subscribers_.insert(client);
        return Json::object();
    }
    return request.method == "status" ? StatusReport(state_.Look(), sizer_)
                                      : FilesReport(state_.Files(), state_.Look().snapshot.timecode, sizer_);
}

Json ControlService::MakePreview(const nlohmann::json& params) {
    const int width = WidthOf(params);
    const Preview::Material material = preview_.Take();
    if (material.picture == nullptr) {
        throw RpcError(RpcCode::kNoPicture, "no picture has come that could be shown");
    }
    if (material.number != madeOf_ || width != madeWidth_) {
        const PreviewPicture picture =
            MakePreviewPicture(material.picture.get(), material.pictureSize, width);
        made_ = {{"width", picture.width}, {"height", picture.height}, {"jpeg", Base64(picture.jpeg)}};
        madeOf_ = material.number;
        madeWidth_ = width;
    }
    Json result = made_;
    result["peaks_dbfs"] = Json::array();
    for (const double peak : PeaksOf(material.audio)) {
        result["peaks_dbfs"].push_back(Rounded(peak));
    }
    return result;
}

std::optional<LineHandlerInterface::Clock::time_point> ControlService::OnRound(LineSenderInterface& sender) {
    SendOutcomes(sender, false);
    TellEvents(sender);
    return desk_.NextDeadline();
}

void ControlService::Finish(LineSenderInterface& sender) {
    SendOutcomes(sender, true);
    TellEvents(sender);
}

void ControlService::SendOutcomes(LineSenderInterface& sender, bool all) {
    for (const CommandDesk::Outcome& outcome : desk_.Settle(all)) {
        sender.Send(outcome.client, outcome.error ? RpcErrorAnswer(outcome.id, *outcome.error)
                                                  : RpcAnswer(outcome.id, outcome.result));
    }
}

void ControlService::TellEvents(LineSenderInterface& sender) {
    static const std::string kLast = RpcNotification(
        "events.ended", Json{{"text", "events are not read quickly enough; the connection ends"}});
    for (const std::string& event : events_.Take()) {
        const std::string line = RpcNotificationOf("event", event);
        std::erase_if(subscribers_, [&](ClientId client) { return !sender.Tell(client, line, kLast); });
    }
}

void ControlService::OnGone(ClientId client) {
    desk_.Forget(client);
    subscribers_.erase(client);
}

}  // namespace receiver
