#pragma once

namespace receiver {

/// Wakes a thread that waits in poll(2). From any thread.
class WakeUp {
 public:
    /// Throws `std::system_error`.
    WakeUp();
    ~WakeUp();
    WakeUp(const WakeUp&) = delete;
    WakeUp& operator=(const WakeUp&) = delete;

    /// Readable from the next `Signal` until `Take`.
    int Descriptor() const { return descriptor_; }
    void Signal() const;
    void Take() const;

 private:
    const int descriptor_;
};

}  // namespace receiver
