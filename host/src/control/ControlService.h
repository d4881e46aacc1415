#pragma once

#include <cstdint>
#include <memory>
#include <set>
#include <string>

#include "control/CommandDesk.h"
#include "control/ControlServer.h"
#include "control/EventQueue.h"
#include "control/JsonRpc.h"
#include "control/Preview.h"
#include "control/RunState.h"
#include "control/StatusReport.h"

namespace receiver {

/// The methods of the control socket. On the thread of its server.
class ControlService final : public LineHandlerInterface {
 public:
    // Limits of a preview's width in pixels.
    static constexpr int kLeastWidth = 32;
    static constexpr int kMostWidth = 1920;
    static constexpr int kDefaultWidth = 320;

    /// The references must outlive the service. `answered` is called on any thread when there may be
    /// something to send.
    ControlService(std::shared_ptr<CommandQueue> commands, const RunState& state, EventQueue& events,
                   const Preview& preview, FileSizer sizer, const std::function<void()>& answered)
        : desk_(std::move(commands), state, answered),
          state_(state),
          events_(events),
          preview_(preview),
          sizer_(std::move(sizer)) {}

    /// Sends what is left to be told at the end of the run.
    void Finish(LineSenderInterface& sender);

    // LineHandlerInterface
    void OnLine(ClientId client, const std::string& line, LineSenderInterface& sender) override;
    std::optional<Clock::time_point> OnRound(LineSenderInterface& sender) override;
    bool Owes(ClientId client) const override { return desk_.Owes(client) || subscribers_.contains(client); }
    void OnGone(ClientId client) override;

 private:
    using Json = nlohmann::ordered_json;

    /// What is known at once; nothing where it is told later.
    std::optional<Json> Call(ClientId client, const RpcRequest& request);
    Json MakePreview(const nlohmann::json& params);
    void SendOutcomes(LineSenderInterface& sender, bool all);
    void TellEvents(LineSenderInterface& sender);

    CommandDesk desk_;
    const RunState& state_;
    EventQueue& events_;
    const Preview& preview_;
    const FileSizer sizer_;
    std::set<ClientId> subscribers_;
    /// The picture made last, for whoever asks for the same one.
    std::uint64_t madeOf_ = 0;
    int madeWidth_ = 0;
    Json made_;
};

}  // namespace receiver
