#pragma once

#include <chrono>
#include <cstdint>
#include <map>
#include <optional>
#include <string>

#include "control/ControlClient.h"
#include "control/ControlSocket.h"
#include "control/WakeUp.h"

namespace receiver {

using ClientId = std::uint64_t;

/// Where a handler sends its lines.
class LineSenderInterface {
 public:
    /// An answer. A client that is gone gets none.
    virtual void Send(ClientId client, const std::string& line) = 0;
    /// Something that the client has not asked for at this moment. False when too much waits for it to be
    /// read: then `last` is sent in its place, and the connection ends.
    virtual bool Tell(ClientId client, const std::string& line, const std::string& last) = 0;

 protected:
    ~LineSenderInterface() = default;
};

/// What becomes of lines. Called on the thread of the server.
class LineHandlerInterface {
 public:
    using Clock = std::chrono::steady_clock;

    virtual void OnLine(ClientId client, const std::string& line, LineSenderInterface& sender) = 0;
    /// Before each wait. Gives when it is to be called again though nothing happens.
    virtual std::optional<Clock::time_point> OnRound(LineSenderInterface& sender) = 0;
    /// A client has sent its last line: whether something is still to be sent to it.
    virtual bool Owes(ClientId client) const = 0;
    virtual void OnGone(ClientId client) = 0;

 protected:
    ~LineHandlerInterface() = default;
};

/// Serves the clients of a socket on one thread, which waits in poll(2) alone. What a client may cost is
/// bounded: so many clients, a line of input and `kMostWaiting` of output for each, and one line of each
/// client a round.
class ControlServer final : public LineSenderInterface {
 public:
    static constexpr std::size_t kMostClients = 32;
    /// Bytes that may wait for a client: beyond it none of its lines is read, and events end. One answer may
    /// stand above it.
    static constexpr std::size_t kMostWaiting = 262144;
    /// So long a client that is to go may take to read its last lines.
    static constexpr std::chrono::milliseconds kFarewell{5000};

    /// So long a client may leave a line without its end, or what is sent to it unread. Who neither waits for
    /// something nor has asked for so long makes place for a new client where there is no other.
    static constexpr std::chrono::milliseconds kPatience{60000};

    /// The references must outlive the server.
    ControlServer(ControlSocket& socket, const WakeUp& wakeUp, LineHandlerInterface& handler,
                  std::chrono::milliseconds patience = kPatience)
        : socket_(socket), wakeUp_(wakeUp), handler_(handler), patience_(patience) {}

    /// One round: waits until there is something to do, and does it.
    void Serve();
    /// Sends what waits for clients that read it within `patience`.
    void Finish(std::chrono::milliseconds patience);
    /// Drops all clients at once.
    void Close() { clients_.clear(); }

    std::size_t Clients() const { return clients_.size(); }

    // LineSenderInterface
    void Send(ClientId client, const std::string& line) override;
    bool Tell(ClientId client, const std::string& line, const std::string& last) override;

 private:
    using Clock = std::chrono::steady_clock;

    struct Connection {
        explicit Connection(int descriptor) : client(descriptor) {}

        ControlClient client;
        /// Set: no line is read any more, and it ends when all is sent, or then.
        std::optional<Clock::time_point> leaves;
    };

    static bool Reads(const Connection& connection);
    void EndBehindLast(Connection& connection);
    int TimeoutUntil(std::optional<Clock::time_point> wanted) const;
    void Accept();
    void MakePlace();
    void TakeInput(ClientId id, Connection& connection);
    void RemoveGone();

    ControlSocket& socket_;
    const WakeUp& wakeUp_;
    LineHandlerInterface& handler_;
    const std::chrono::milliseconds patience_;
    std::map<ClientId, Connection> clients_;
    ClientId next_ = 1;
    /// Nobody is accepted before: no descriptor was left.
    Clock::time_point acceptsAt_{};
};

}  // namespace receiver
