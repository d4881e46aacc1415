#pragma once

// The parts of a host process around the module: the loaded library, the host's own interface, units as they
// come from the network, and what the process can see of the module from outside.

#include <chrono>
#include <cstddef>
#include <cstdint>
#include <map>
#include <memory>
#include <mutex>
#include <string>
#include <thread>
#include <utility>
#include <vector>

#include "HostView.h"

/// libclipfile.so as the host loads it. Unloaded in the destructor at the latest.
class LoadedModule {
 public:
    LoadedModule();
    ~LoadedModule();
    LoadedModule(const LoadedModule&) = delete;
    LoadedModule& operator=(const LoadedModule&) = delete;

    /// The module object; null, and a failed test, when it cannot be had.
    QxModuleInterface* Get() const;
    /// The exported function itself.
    GetQxModuleInterfaceFunction Entry() const;
    /// Starts the thread of the log, which belongs to the host system and not to the module, so that it
    /// cannot be mistaken for one of the module's.
    void StartLog() const;
    void Unload();
    /// True while the library is in the process, whoever loaded it.
    static bool IsLoaded();

 private:
    void* library_ = nullptr;
};

/// The host's side of the contract. Records what the module asks and says.
class RecordingHost final : public QxModuleHostInterface {
 public:
    using StatusMap = std::map<std::string, std::string>;

    /// Start parameters of the module. To be filled before `Initialize`.
    std::map<std::string, std::string> texts;
    std::map<std::string, int> numbers;

    void SetStatus(int status, int cause) override;
    int GetStatus() override;
    void GetParameter(std::string key, int& value, int defaultValue) override;
    void GetParameter(std::string key, std::string& value, std::string defaultValue) override;
    int SendTransmissionStatus(const StatusMap& status) override;

    /// Every status and cause so far, in order.
    std::vector<std::pair<int, int>> Statuses() const;
    /// "KEY=DEFAULT" of every parameter that the module has asked for, in order.
    std::vector<std::string> Questions() const;
    std::vector<StatusMap> Transmissions() const;

 private:
    mutable std::mutex mutex_;
    int status_ = 0;
    std::vector<std::pair<int, int>> statuses_;
    std::vector<std::string> questions_;
    std::vector<StatusMap> transmissions_;
};

/// A unit whose payload is a copy of `bytes`.
std::shared_ptr<StreamData> MakeUnit(std::uint64_t rtpTimestamp, std::uint64_t timestamp,
                                     const std::vector<unsigned char>& bytes);
/// An access unit with an IDR picture and its parameter sets, as Annex B byte stream.
std::shared_ptr<StreamData> MakeVideo(std::uint64_t rtpTimestamp, std::uint64_t timestamp);
/// One AAC frame.
std::shared_ptr<StreamData> MakeAudio(std::uint64_t rtpTimestamp, std::uint64_t timestamp);
/// A metadata unit with record flag and timecode 10:11:12:13.
std::shared_ptr<StreamData> MakeMeta(std::uint64_t rtpTimestamp, std::uint64_t timestamp, bool recFlag);

/// Threads of this process but for the one of the log.
int CountThreads();

/// The text that the log has got since this object was made.
class LogTail {
 public:
    LogTail();
    std::string Text() const;

 private:
    std::size_t begin_;
};

/// Calls `condition` until it is true. False when it was not within 20 seconds.
template <typename Condition>
bool WaitUntil(Condition condition) {
    const auto deadline = std::chrono::steady_clock::now() + std::chrono::seconds(20);
    while (!condition()) {
        if (std::chrono::steady_clock::now() > deadline) {
            return false;
        }
        std::this_thread::sleep_for(std::chrono::milliseconds(1));
    }
    return true;
}
