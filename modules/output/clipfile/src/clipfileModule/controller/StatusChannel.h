#pragma once

#include <atomic>
#include <deque>
#include <memory>
#include <thread>
#include <vector>

#include "QxModuleHostInterface.h"
#include "common/Mutex.h"

namespace clipfileModule {

/// The one road of status numbers from the module to the host, for one life of the module. Statuses are
/// delivered one at a time, in the order in which they were accepted, and none is accepted behind a 7.
///
/// No lock is held during a call of the host. The first thread that sets a status delivers; what others set
/// meanwhile it delivers too, and they do not wait. So a host may set off further statuses from inside its
/// `SetStatus`, and may call the module with a lock that its `SetStatus` takes.
///
/// Always held by `shared_ptr`, which whoever delivers holds as well: a thread that was given up inside a
/// call of the host keeps the channel of its own life busy, and no other. Any thread may call any operation.
class StatusChannel {
 public:
    /// `moduleHost` is not owned and lives until `Close`.
    explicit StatusChannel(QxModuleHostInterface* moduleHost) : host_(moduleHost) {}
    StatusChannel(const StatusChannel&) = delete;
    StatusChannel& operator=(const StatusChannel&) = delete;

    /// Accepts a status, unless a 7 or the end came before, and delivers it, unless another thread is about
    /// to. A host that holds status 7 when its turn comes is told nothing. When the host throws, the others
    /// are delivered all the same, and the first exception leaves here then.
    void Set(int status, int cause) EXCLUDES(mutex_);
    /// True once a 7 was accepted: nothing follows it, and no unit is taken any more.
    bool IsFinal() const { return final_; }
    /// Ends the traffic: the host is not called any more, but for a call that has begun.
    void Close() EXCLUDES(mutex_);

    /// While it lives, its thread delivers nothing; when it goes, the thread delivers what waits. For
    /// commands that hold locks which a host, from inside its `SetStatus`, may want. What the host throws
    /// then is logged and dropped.
    class Hold {
     public:
        explicit Hold(std::shared_ptr<StatusChannel> channel);
        ~Hold();
        Hold(const Hold&) = delete;
        Hold& operator=(const Hold&) = delete;

     private:
        const std::shared_ptr<StatusChannel> channel_;
    };

 private:
    struct Status {
        int status;
        int cause;
    };

    /// True when the caller has to deliver now.
    bool becomeDeliverer() REQUIRES(mutex_);
    bool takeNext(Status& next) EXCLUDES(mutex_);
    void deliver() EXCLUDES(mutex_);
    void holdBack() EXCLUDES(mutex_);
    void release() EXCLUDES(mutex_);

    QxModuleHostInterface* const host_;
    std::atomic<bool> final_ = false;
    Mutex mutex_;
    std::deque<Status> waiting_ GUARDED_BY(mutex_);
    bool delivering_ GUARDED_BY(mutex_) = false;
    bool closed_ GUARDED_BY(mutex_) = false;
    /// Threads with a `Hold`, once for each.
    std::vector<std::thread::id> holders_ GUARDED_BY(mutex_);
};

}  // namespace clipfileModule
