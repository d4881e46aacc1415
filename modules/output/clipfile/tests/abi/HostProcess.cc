#include "HostProcess.h"

#include <dlfcn.h>
#include <gtest/gtest.h>
#include <stdlib.h>

#include <algorithm>
#include <filesystem>
#include <fstream>
#include <iterator>

namespace {

/// The environment of the whole process: settings and log in a folder of its own. Both are read when the
/// libraries first need them.
class ProcessEnvironment : public ::testing::Environment {
 public:
    void SetUp() override {
        folder_ = ::testing::TempDir() + "clipfile_abi_XXXXXX";
        ASSERT_NE(mkdtemp(folder_.data()), nullptr) << folder_;
        std::ofstream(folder_ + "/settings.ini") << "[Qx/Other/MP4FileOut]\n"
                                                    "MP4AuthUserName=operator\n"
                                                    "MP4AuthPassword=a b;c\n"
                                                    "MP4MaxFileSize=60\n";
        setenv("QX_SETTINGS", (folder_ + "/settings.ini").c_str(), 1);
        setenv("QX_LOG", LogPath().c_str(), 1);
        setenv("QX_LOG_PRIORITY", "13", 1);
    }

    void TearDown() override { std::filesystem::remove_all(folder_); }

    std::string LogPath() const { return folder_ + "/log"; }

 private:
    std::string folder_;
};

// Owned by the test framework.
ProcessEnvironment* const processEnvironment = new ProcessEnvironment;
::testing::Environment* const registered = ::testing::AddGlobalTestEnvironment(processEnvironment);

std::string readLog() {
    std::ifstream log(processEnvironment->LogPath(), std::ios::binary);
    return {std::istreambuf_iterator<char>(log), std::istreambuf_iterator<char>()};
}

template <typename Function>
Function symbolOf(void* library, const char* name) {
    return reinterpret_cast<Function>(dlsym(library, name));
}

}  // namespace

LoadedModule::LoadedModule() : library_(dlopen(CLIPFILE_MODULE, RTLD_NOW | RTLD_LOCAL)) {
    EXPECT_NE(library_, nullptr) << dlerror();
}

LoadedModule::~LoadedModule() {
    Unload();
}

GetQxModuleInterfaceFunction LoadedModule::Entry() const {
    return symbolOf<GetQxModuleInterfaceFunction>(library_, "GetQxModuleInterface");
}

QxModuleInterface* LoadedModule::Get() const {
    const GetQxModuleInterfaceFunction entry = Entry();
    QxModuleInterface* module = nullptr;
    if (entry == nullptr || !entry(&module) || module == nullptr) {
        ADD_FAILURE() << "no module object";
    }
    return module;
}

void LoadedModule::StartLog() const {
    using Put = void (*)(int, const char*, const char*, int, const char*, ...);
    const auto put = symbolOf<Put>(library_, "_ZN6Logger3PutE12_LogPriorityPKcS2_iS2_z");
    ASSERT_NE(put, nullptr) << dlerror();
    const LogTail log;
    put(3, nullptr, nullptr, 0, "the host starts");
    ASSERT_TRUE(WaitUntil([&] { return log.Text().find("the host starts") != std::string::npos; }));
}

void LoadedModule::Unload() {
    if (library_ != nullptr) {
        EXPECT_EQ(dlclose(library_), 0) << dlerror();
        library_ = nullptr;
    }
}

bool LoadedModule::IsLoaded() {
    void* const library = dlopen(CLIPFILE_MODULE, RTLD_NOW | RTLD_NOLOAD);
    if (library == nullptr) {
        return false;
    }
    dlclose(library);
    return true;
}

void RecordingHost::SetStatus(int status, int cause) {
    const std::lock_guard lock(mutex_);
    status_ = status;
    statuses_.emplace_back(status, cause);
}

int RecordingHost::GetStatus() {
    const std::lock_guard lock(mutex_);
    return status_;
}

void RecordingHost::GetParameter(std::string key, int& value, int defaultValue) {
    const std::lock_guard lock(mutex_);
    questions_.push_back(key + "=" + std::to_string(defaultValue));
    const auto found = numbers.find(key);
    value = found == numbers.end() ? defaultValue : found->second;
}

void RecordingHost::GetParameter(std::string key, std::string& value, std::string defaultValue) {
    const std::lock_guard lock(mutex_);
    questions_.push_back(key + "=" + defaultValue);
    const auto found = texts.find(key);
    value = found == texts.end() ? defaultValue : found->second;
}

int RecordingHost::SendTransmissionStatus(const StatusMap& status) {
    const std::lock_guard lock(mutex_);
    transmissions_.push_back(status);
    return 0;
}

std::vector<std::pair<int, int>> RecordingHost::Statuses() const {
    const std::lock_guard lock(mutex_);
    return statuses_;
}

std::vector<std::string> RecordingHost::Questions() const {
    const std::lock_guard lock(mutex_);
    return questions_;
}

std::vector<RecordingHost::StatusMap> RecordingHost::Transmissions() const {
    const std::lock_guard lock(mutex_);
    return transmissions_;
}

std::shared_ptr<StreamData> MakeUnit(std::uint64_t rtpTimestamp, std::uint64_t timestamp,
                                     const std::vector<unsigned char>& bytes) {
    auto unit = std::make_shared<StreamData>();
    unit->rtp_timestamp = rtpTimestamp;
    unit->timestamp = timestamp;
    unit->data.reset(new unsigned char[bytes.size()], std::default_delete<unsigned char[]>());
    std::copy(bytes.begin(), bytes.end(), unit->data.get());
    unit->size = bytes.size();
    unit->payload = unit->data.get();
    return unit;
}

std::shared_ptr<StreamData> MakeVideo(std::uint64_t rtpTimestamp, std::uint64_t timestamp) {
    return MakeUnit(
        rtpTimestamp, timestamp,
        {0, 0, 0, 1, 0x67, 0x42, 0xC0, 0x1E, 0xDA, 0x02, 0x80, 0xF6, 0x40,  // sequence parameter set
         0, 0, 0, 1, 0x68, 0xCE, 0x3C, 0x80,                                // picture parameter set
         0, 0, 0, 1, 0x65, 0x88, 0x84, 0x21, 0xA0});                        // slice of an IDR picture
}

std::shared_ptr<StreamData> MakeAudio(std::uint64_t rtpTimestamp, std::uint64_t timestamp) {
    return MakeUnit(rtpTimestamp, timestamp, {0x21, 0x10, 0x04, 0x60, 0x8C, 0x1C});
}

std::shared_ptr<StreamData> MakeMeta(std::uint64_t rtpTimestamp, std::uint64_t timestamp, bool recFlag) {
    return MakeUnit(rtpTimestamp, timestamp,
                    {0x01,  // one packet
                     0x06, 0x0E, 0x2B, 0x34, 0x02,
                     0x53, 0x01, 0x01,  // label of a local set
                     0x0C, 0x02, 0x01, 0x01, 0x7F,
                     0x01, 0x00, 0x00,        //
                     34,                      // length of the set
                     0xE0, 0x00, 0x00, 0x10,  // its identifier
                     0x9B, 0x1F, 0x5C, 0x2E, 0x4D,
                     0x60, 0x4A, 0x17,  //
                     0xA6, 0x3B, 0x0E, 0x72, 0xD8,
                     0x41, 0xC5, 0x93,                                                     //
                     0xE1, 0x01, 0x00, 0x01, static_cast<unsigned char>(recFlag ? 1 : 0),  // record flag
                     0xE1, 0x02, 0x00, 0x05, 10,
                     11,   12,   13,   0x00});  // timecode, no drop frame
}

int CountThreads() {
    int count = 0;
    for (const auto& task : std::filesystem::directory_iterator("/proc/self/task")) {
        // A thread that has just ended has no name any more.
        std::ifstream file(task.path() / "comm");
        std::string name;
        if (std::getline(file, name) && name != "qx-log") {
            ++count;
        }
    }
    return count;
}

LogTail::LogTail() : begin_(readLog().size()) {}

std::string LogTail::Text() const {
    return readLog().substr(begin_);
}
