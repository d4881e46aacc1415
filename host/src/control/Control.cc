#include "control/Control.h"

#include <atomic>
#include <chrono>
#include <exception>
#include <mutex>
#include <utility>

#include "common/LowPriority.h"
#include "control/ControlServer.h"
#include "control/ControlService.h"
#include "control/ControlSocket.h"
#include "control/EventQueue.h"
#include "control/Preview.h"
#include "control/RunState.h"
#include "control/WakeUp.h"

namespace receiver {
namespace {

/// How long the end of a run waits for clients to read what is left.
constexpr std::chrono::milliseconds kReaderPatience{1000};

}  // namespace

struct Control::State {
    State(const std::string& path, std::shared_ptr<CommandQueue> commands, FileSizer sizer)
        : socket(path), service(std::move(commands), run, events, preview, std::move(sizer), Waker()) {}

    std::function<void()> Waker() const {
        return [shared = wakeUp] { shared->Signal(); };
    }

    /// Without it the run goes on.
    void Fail(const std::string& reason) {
        server.Close();
        socket.Refuse();
        const std::lock_guard lock(mutex);
        fault = "the control socket serves nobody any more: " + reason;
    }

    std::mutex mutex;
    // Guarded by mutex:
    std::optional<std::string> fault;

    /// Commands that nobody has carried out own it too.
    const std::shared_ptr<WakeUp> wakeUp = std::make_shared<WakeUp>();
    ControlSocket socket;
    std::atomic<bool> ending{false};
    Preview preview;
    // The events wake the thread, and what the run tells of itself comes before them.
    RunState run{[] {}};
    EventQueue events{Waker()};
    // The thread's own:
    ControlService service;
    ControlServer server{socket, *wakeUp, service};
};

Control::Control(const std::string& path, std::shared_ptr<CommandQueue> commands, FileSizer sizer)
    : state_(std::make_shared<State>(path, std::move(commands), std::move(sizer))),
      thread_([state = state_] { Run(*state); }) {}

Control::~Control() {
    End();
}

std::vector<DisplayInterface*> Control::Displays() {
    return {&state_->run, &state_->events.Display()};
}

void Control::Describe(const SourceDescription& source) {
    state_->run.Describe(source);
}

void Control::LookAt(const SourceUnit& unit) {
    state_->preview.LookAt(unit);
}

void Control::End(std::chrono::milliseconds patience) {
    state_->socket.Remove();
    state_->ending = true;
    state_->wakeUp->Signal();
    thread_.End(patience);
}

std::optional<std::string> Control::TakeFault() {
    const std::lock_guard lock(state_->mutex);
    return std::exchange(state_->fault, std::nullopt);
}

void Control::Run(State& state) {
    try {
        Serve(state);
    } catch (const std::exception& error) {
        state.Fail(error.what());
    } catch (...) {
        state.Fail("an error without words");
    }
}

void Control::Serve(State& state) {
    LowerPriority();
    while (!state.ending) {
        state.server.Serve();
    }
    state.service.Finish(state.server);
    state.server.Finish(kReaderPatience);
}

}  // namespace receiver
