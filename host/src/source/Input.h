#pragma once

#include <atomic>
#include <chrono>
#include <memory>
#include <stdexcept>
#include <string>

#include "source/Interrupt.h"
#include "source/Libav.h"

namespace receiver {

/// The source ended or broke, for the reason that `what()` tells in a few words.
class SourceLost : public std::runtime_error {
 public:
    using std::runtime_error::runtime_error;
};

/// The wait for the source was ended from outside.
class Stopped : public std::runtime_error {
 public:
    Stopped() : std::runtime_error("stopped") {}
};

/// An opened address: what libavformat knows of it, and its packets.
class Input {
 public:
    /// Opens `url` and finds out what it carries. `timeout`: seconds that it may take to answer, and later
    /// seconds that may pass between two calls of `Alive`. `stop` may be null; it is asked until this
    /// returns. Throws `ReceiverError` (`kSourceUnavailable`), and `Stopped`.
    Input(const std::string& url, double timeout, std::shared_ptr<Interrupt> interrupt, bool (*stop)());

    AVFormatContext& Format() { return *format_; }
    /// The next packet. False at the end. Throws `SourceLost`, also when the time without `Alive` is over,
    /// and `Stopped`.
    bool Read(AVPacket& packet);
    /// What the source is opened for has come; starts the time-out anew.
    void Alive() { Expect(timeout_); }
    /// A file, here or on a server, that is paced when it is read; else the source sets the pace.
    bool Recorded() const { return recorded_; }

 private:
    static int OnWait(void* input);
    void Expect(double seconds);
    bool Expired() const;
    void Open();
    /// What `result` of opening or of reading means.
    [[noreturn]] void FailOpening(int result) const;

    const std::string url_;
    const double timeout_;
    const std::shared_ptr<Interrupt> interrupt_;
    /// Null once the source is open.
    bool (*stop_)();
    /// When the present wait is over, on the steady clock. The libraries may ask on threads of their own.
    std::atomic<std::chrono::steady_clock::rep> deadline_{0};
    bool recorded_ = false;
    libav::Owner<AVFormatContext> format_;
};

}  // namespace receiver
