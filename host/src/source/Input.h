#pragma once

#include <atomic>
#include <chrono>
#include <deque>
#include <limits>
#include <memory>
#include <set>
#include <stdexcept>
#include <string>
#include <thread>

#include "common/ReceiverError.h"
#include "source/Interrupt.h"
#include "source/Libav.h"
#include "source/StopCheck.h"

namespace receiver {

using Packets = std::deque<libav::Owner<AVPacket>>;

/// The source ended or broke, for the reason that `what()` tells in a few words.
class SourceLost : public std::runtime_error {
 public:
    using std::runtime_error::runtime_error;
};

/// A live source is not there, and may be later.
class SourceAbsent : public ReceiverError {
 public:
    explicit SourceAbsent(const std::string& sentence)
        : ReceiverError(ExitCode::kSourceUnavailable, sentence) {}
};

/// The wait for the source was ended from outside.
class Stopped : public std::runtime_error {
 public:
    Stopped() : std::runtime_error("stopped") {}
};

/// An opened address: what libavformat knows of it, and its packets.
class Input {
 public:
    /// Opens `url` and finds out what it carries. `patience`: seconds that it may take to answer. `timeout`:
    /// seconds that may pass later between two calls of `Alive`, 30 at the least for HLS. `stop` is
    /// asked until this returns, on the calling thread alone. Throws `ReceiverError`
    /// (`kSourceUnavailable`), of it `SourceAbsent` where a later attempt may succeed, and `Stopped`.
    Input(const std::string& url, double timeout, double patience, std::shared_ptr<Interrupt> interrupt,
          const StopCheck& stop);

    AVFormatContext& Format() { return *format_; }
    /// Finds out anew what the source carries. A transport stream goes on from byte `position` of the
    /// connection where that can still be had (-1: where it is), another file with `unread`, of which the
    /// first is the packet that showed the change; all else is opened again. Streams of before are gone.
    /// False for a file of which that packet tells nothing. Throws like the constructor, and `SourceLost`.
    bool Renew(std::int64_t position, Packets unread);
    /// True the first time that somebody asks for the stream with that number of the container, also after
    /// `Renew`: what is still not understood then never will be.
    bool AskFor(int stream) { return asked_.insert(stream).second; }
    /// The next packet. False at the end, also when the other side closed the connection. Throws
    /// `SourceLost`, also when the time without `Alive` is over, and `Stopped`.
    bool Read(AVPacket& packet);
    /// What the source is opened for has come; starts the time-out anew.
    void Alive() { Expect(timeout_); }
    /// A file, here or on a server, that is paced when it is read; else the source sets the pace.
    bool Recorded() const { return recorded_; }
    /// A wait was over: what `Read` still gives came before.
    bool TimedOut() const { return timedOut_; }
    /// When the address answered.
    std::chrono::steady_clock::time_point Opened() const { return opened_; }
    /// Packets come by RTP, which stamps pictures with the time when they are shown and nothing else.
    bool Rtp() const { return rtp_; }
    /// Packets come by a transport stream.
    bool Transport() const { return transport_; }

 private:
    struct CloseConnection {
        void operator()(AVIOContext* connection) const { avio_closep(&connection); }
    };

    /// Asked by the libraries while they wait. Not 0 ends the wait.
    static int OnWait(void* input);
    bool StopAsked() const;
    void Expect(double seconds);
    bool Expired();
    AVFormatContext* NewFormat();
    void Open();
    /// Finds out what kind of source this is, from what the address and its first bytes tell.
    void Classify();
    void FindStreams();
    void CarryOn(std::int64_t position);
    bool GoOnWith(Packets unread);
    int ReadFrame(AVPacket& packet);
    /// Moves the mark of a damaged packet to the picture that it is for.
    void MarkDamage(AVPacket& packet);
    void Reach(const AVPacket& packet);
    /// Throws `SourceLost` where a file has ended too early.
    void CheckLength() const;
    /// Throws what `result` of opening means.
    [[noreturn]] void FailOpening(int result);

    const std::string url_;
    double timeout_;
    const double patience_;
    const std::shared_ptr<Interrupt> interrupt_;
    /// The thread of the constructor. The libraries may ask on threads of their own, and `stop_` is not for
    /// these.
    const std::thread::id opener_;
    /// Null once the source is open.
    StopCheck stop_;
    /// When the present wait is over, on the steady clock.
    std::atomic<std::chrono::steady_clock::rep> deadline_{0};
    /// A wait was over. The libraries may give out what they still hold before they tell.
    std::atomic<bool> timedOut_{false};
    int drained_ = 0;
    std::chrono::steady_clock::time_point opened_;
    std::set<int> asked_;
    bool recorded_ = false;
    bool rtp_ = false;
    bool transport_ = false;
    /// Streams whose next picture is damaged.
    std::set<int> damagedNext_;
    /// Where the last unit of any stream ends, in microseconds.
    std::int64_t reached_ = std::numeric_limits<std::int64_t>::min();
    /// Of a connection that has been taken over from an earlier context.
    std::unique_ptr<AVIOContext, CloseConnection> connection_;
    libav::Owner<AVFormatContext> format_;
    /// Packets that `Read` gives once more.
    Packets unread_;
};

}  // namespace receiver
