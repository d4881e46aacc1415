// A module that records nothing but the calls that it gets. The environment variable FAKE_MODULE makes it
// misbehave: "none" gives no object, "refuse" fails its initialisation, "fail" sets status 7 with the first
// video unit, "overflow" reports the first video unit as lost, "fault" sets status 6 with it, "hang" carries
// out no command, "crowded" has room for one mark among the video and reports the second one as lost.

#include <cstdlib>
#include <string>

#include "Logger.h"
#include "QxModuleInterface.h"
#include "QxModuleStatus.h"

namespace {

std::string& Calls() {
    static std::string calls;
    return calls;
}

bool Behaves(const char* how) {
    const char* const set = std::getenv("FAKE_MODULE");
    return set != nullptr && std::string(set) == how;
}

class FakeModule final : public QxModuleInterface,
                         public QxModuleStreamInterface,
                         public QxModuleNotifyInterface {
 public:
    bool Initialize(QxModuleHostInterface* host) override {
        host_ = host;
        std::string mode;
        int rate = 0;
        host->GetParameter("-outputMode", mode, "on");
        host->GetParameter("-encodedFPS", rate, 0);
        Calls() = "Initialize(" + mode + "," + std::to_string(rate) + ")";
        pushed_ = false;
        if (Behaves("refuse")) {
            host->SetStatus(QxStatus::kFailed, QxFailure::kInitialize);
            return false;
        }
        return true;
    }
    bool Uninitialize() override { return Called("Uninitialize"); }
    bool Execute() override {
        host_->SendTransmissionStatus({{"file_output_status", "standby"}});
        return Called("Execute");
    }
    bool GetModuleInterval(unsigned int* value) override {
        *value = 10000;
        return true;
    }
    bool ReservedOperationA() override { return true; }
    bool ReservedOperationB() override { return true; }
    bool GetStreamInterface(QxModuleStreamInterface** out) override {
        *out = this;
        return Called("GetStreamInterface");
    }
    bool GetNotifyInterface(QxModuleNotifyInterface** out) override {
        *out = this;
        return Called("GetNotifyInterface");
    }
    int ReservedOperationC() override { return 0; }

    void PushReserved(const std::shared_ptr<StreamData>&) override {}
    void PushVideo(const std::shared_ptr<StreamData>& unit) override {
        if (unit->payload == nullptr && Behaves("crowded")) {
            TakeMark(unit);
        }
        if (pushed_ || unit->payload == nullptr) {
            return;
        }
        pushed_ = true;
        Called("PushVideo");
        if (Behaves("fail")) {
            host_->SetStatus(QxStatus::kFailed, QxFailure::kFileWrite);
        } else if (Behaves("fault")) {
            host_->SetStatus(QxStatus::kStreamFault, QxStreamFault::kFileTooSlow);
        } else if (Behaves("overflow")) {
            Logger::Put(LOG_PRIORITY_WARNING, nullptr, nullptr, 0, "queue overflow (video)");
        }
    }
    void PushAudio(const std::shared_ptr<StreamData>&) override {}
    void PushMeta(const std::shared_ptr<StreamData>&) override {}

    std::uint32_t NotifyInputOutputConnectRequest(const QxInputOutputConnectRequest*) override {
        Called("Connect");
        return 0;
    }
    std::uint32_t NotifyModuleConnectionRequestReply(const void*) override { return 0; }
    std::uint32_t NotifyInputOutputDisconnectionRequest(const QxInputOutputDisconnectionRequest*) override {
        return 0;
    }
    std::uint32_t NotifySetPropertiesRequest(const void*) override { return 0; }
    void NotifyOnlineStatus() override {
        Called("Online");
        host_->SetStatus(QxStatus::kBufferingStarted, QxStatus::kNoCause);
    }
    void NotifyOfflineStatus() override {
        Called("Offline");
        if (host_->GetStatus() != QxStatus::kFailed) {
            host_->SetStatus(QxStatus::kStreamFault, QxStreamFault::kOffline);
            host_->SetStatus(QxStatus::kBufferingStopped, QxStatus::kNoCause);
        }
    }

 private:
    static bool Called(const char* name) {
        Calls().append(" ").append(name);
        return true;
    }

    void TakeMark(const std::shared_ptr<StreamData>& mark) {
        if (marks_++ == 0) {
            mark_ = mark;
        } else if (marks_ == 2) {
            Logger::Put(LOG_PRIORITY_WARNING, nullptr, nullptr, 0, "queue overflow (video)");
        } else {
            mark_.reset();
        }
    }

    QxModuleHostInterface* host_ = nullptr;
    bool pushed_ = false;
    /// Of "crowded": how many came, and the one that is held until the third.
    int marks_ = 0;
    std::shared_ptr<StreamData> mark_;
};

FakeModule fakeModule;

}  // namespace

extern "C" bool GetQxModuleInterface(QxModuleInterface** out) {
    if (Behaves("none")) {
        return false;
    }
    *out = &fakeModule;
    return true;
}

/// The calls since `Initialize`, with blanks between them.
extern "C" const char* FakeModuleCalls() {
    return Calls().c_str();
}
