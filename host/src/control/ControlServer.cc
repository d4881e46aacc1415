#include "control/ControlServer.h"

#include <poll.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <utility>
#include <vector>

#include "control/JsonRpc.h"

namespace receiver {
namespace {

using std::chrono::milliseconds;

/// And how long clients wait where the process has no descriptor left for one.
constexpr milliseconds kLongestWait{1000};

}  // namespace

void ControlServer::Serve() {
    const auto wanted = handler_.OnRound(*this);
    const short accepts = Clock::now() >= acceptsAt_ ? POLLIN : 0;
    std::vector<pollfd> polled{{wakeUp_.Descriptor(), POLLIN, 0}, {socket_.Descriptor(), accepts, 0}};
    std::vector<ClientId> ids;
    for (const auto& [id, connection] : clients_) {
        const int events = (Reads(connection) ? POLLIN : 0) | (connection.client.Waiting() > 0 ? POLLOUT : 0);
        polled.push_back({connection.client.Descriptor(), static_cast<short>(events), 0});
        ids.push_back(id);
    }
    if (poll(polled.data(), polled.size(), TimeoutUntil(wanted)) < 0) {
        return;
    }
    wakeUp_.Take();
    for (std::size_t i = 0; i < ids.size(); ++i) {
        Connection& connection = clients_.at(ids[i]);
        const int happened = polled[i + 2].revents;
        if ((happened & (POLLHUP | POLLERR)) != 0) {
            // Nobody reads answers any more; what was asked before is carried out.
            connection.client.Break();
        }
        if (happened != 0 && Reads(connection)) {
            connection.client.Read();
        }
        TakeInput(ids[i], connection);
        connection.client.Write();
    }
    RemoveGone();
    if ((polled[1].revents & POLLIN) != 0) {
        Accept();
    }
}

void ControlServer::Finish(milliseconds patience) {
    const auto deadline = Clock::now() + patience;
    for (auto& [id, connection] : clients_) {
        connection.leaves = deadline;
    }
    for (;;) {
        for (auto& [id, connection] : clients_) {
            connection.client.Write();
        }
        RemoveGone();
        std::vector<pollfd> polled;
        for (const auto& [id, connection] : clients_) {
            polled.push_back({connection.client.Descriptor(), POLLOUT, 0});
        }
        if (polled.empty()) {
            return;
        }
        poll(polled.data(), polled.size(), TimeoutUntil(std::nullopt));
    }
}

void ControlServer::Send(ClientId client, const std::string& line) {
    const auto found = clients_.find(client);
    if (found != clients_.end()) {
        found->second.client.Send(line);
        found->second.client.Write();
    }
}

bool ControlServer::Tell(ClientId client, const std::string& line, const std::string& last) {
    const auto found = clients_.find(client);
    if (found == clients_.end() || found->second.leaves || found->second.client.Broken()) {
        return false;
    }
    if (found->second.client.Waiting() > kMostWaiting) {
        Send(client, last);
        EndBehindLast(found->second);
        return false;
    }
    Send(client, line);
    return true;
}

bool ControlServer::Reads(const Connection& connection) {
    const ControlClient& client = connection.client;
    return !connection.leaves && !client.InputEnded() && !client.HasLine() &&
           client.Waiting() <= kMostWaiting;
}

void ControlServer::EndBehindLast(Connection& connection) {
    connection.leaves = connection.leaves.value_or(Clock::now() + kFarewell);
}

int ControlServer::TimeoutUntil(std::optional<Clock::time_point> wanted) const {
    Clock::time_point until =
        std::min(Clock::now() + kLongestWait, wanted.value_or(Clock::time_point::max()));
    for (const auto& [id, connection] : clients_) {
        if (connection.leaves) {
            until = std::min(until, *connection.leaves);
        } else if (connection.client.HasLine() && connection.client.Waiting() <= kMostWaiting) {
            return 0;
        }
    }
    const auto wait = std::chrono::ceil<milliseconds>(until - Clock::now());
    return std::max(0, static_cast<int>(std::min(wait, kLongestWait).count()));
}

void ControlServer::Accept() {
    const int descriptor = socket_.Accept();
    if (descriptor < 0) {
        if (errno != EAGAIN && errno != ECONNABORTED && errno != EINTR) {
            acceptsAt_ = Clock::now() + kLongestWait;
        }
        return;
    }
    MakePlace();
    if (clients_.size() >= kMostClients) {
        ControlClient refused(descriptor);
        refused.Send(RpcErrorAnswer(nullptr, {RpcCode::kTooManyClients, "too many clients are connected"}));
        refused.Write();
        return;
    }
    clients_.try_emplace(next_++, descriptor);
}

void ControlServer::MakePlace() {
    if (clients_.size() < kMostClients) {
        return;
    }
    const auto key = [this](const auto& client) {
        return std::pair(handler_.Owes(client.first), client.second.client.LastProgress());
    };
    const auto idle = std::ranges::min_element(clients_, {}, key);
    const auto [waits, progress] = key(*idle);
    if (!waits && Clock::now() - progress >= patience_) {
        handler_.OnGone(idle->first);
        clients_.erase(idle);
    }
}

void ControlServer::TakeInput(ClientId id, Connection& connection) {
    ControlClient& client = connection.client;
    if (connection.leaves || client.Waiting() > kMostWaiting) {
        return;
    }
    const std::optional<std::string> line = client.TakeLine();
    if (client.LineTooLong() || (line && line->size() > ControlClient::kLongestLine)) {
        Send(id, RpcErrorAnswer(nullptr, {RpcCode::kLineTooLong,
                                          "a line has at most " +
                                              std::to_string(ControlClient::kLongestLine) + " bytes"}));
        EndBehindLast(connection);
    } else if (line) {
        handler_.OnLine(id, *line, *this);
    }
    if (client.InputEnded() && !client.HasLine() && !handler_.Owes(id)) {
        EndBehindLast(connection);
    }
}

void ControlServer::RemoveGone() {
    const auto now = Clock::now();
    for (auto next = clients_.begin(); next != clients_.end();) {
        const auto at = next++;
        const Connection& connection = at->second;
        const ControlClient& client = connection.client;
        const bool stalls = client.Stalls() && now - client.LastProgress() >= patience_;
        const bool over = connection.leaves && (client.Waiting() == 0 || now >= *connection.leaves);
        if (stalls || over || (client.Broken() && client.InputEnded() && !client.HasLine())) {
            handler_.OnGone(at->first);
            clients_.erase(at);
        }
    }
}

}  // namespace receiver
