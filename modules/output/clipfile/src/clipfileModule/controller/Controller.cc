#include "controller/Controller.h"

#include <algorithm>
#include <system_error>
#include <utility>

#include "QxModuleStatus.h"
#include "QxRegistry.h"
#include "buffer/StreamBuffer.h"
#include "common/Log.h"
#include "common/LogScope.h"

namespace clipfileModule {

namespace {

// Keys of the settings store.
const std::string kSettingsSection = std::string("Qx") + "/" + "Other" + "/" + "MP4FileOut";
const std::string kKeyOutputPath = "MP4OutputPath";
const std::string kKeyMaxFileSize = "MP4MaxFileSize";
const std::string kKeyUserName = "MP4AuthUserName";
const std::string kKeyPassword = "MP4AuthPassword";

// Names of the start parameters.
const std::string kParameterFilePrefix = "-filePrefix";
const std::string kParameterOutputPath = "-outputPath";
const std::string kParameterUserName = "-userName";
const std::string kParameterPassword = "-password";
const std::string kParameterFileType = "-fileType";
const std::string kParameterNaluType = "-naluType";
const std::string kParameterOutputMode = "-outputMode";
const std::string kParameterHeight = "-encodedHeight";
const std::string kParameterWidth = "-encodedWidth";
const std::string kParameterFramerate = "-encodedFPS";
const std::string kParameterBitrate = "-encodedBPS";
const std::string kParameterRecordRules = "-recordRules";
const std::string kParameterPictureOrder = "-pictureOrder";

// Contract: output-path-none. A path of this name cannot be given as start parameter.
constexpr const char* kNoOutputPath = "none";

constexpr const char* kRecordRulesKept = "kept";
constexpr const char* kRecordRulesExact = "exact";

constexpr const char* kPictureOrderPresentation = "presentation";
constexpr const char* kPictureOrderDecoding = "decoding";

// Contract: text-ends-at-zero. A host may give a padded buffer; a path would be cut there by the system.
std::string upToFirstZero(const std::string& text) {
    return text.substr(0, text.find('\0'));
}

std::string readText(QxModuleHostInterface& host, const std::string& key, const std::string& defaultValue) {
    std::string value;
    host.GetParameter(key, value, defaultValue);
    return upToFirstZero(value);
}

std::uint32_t readNumber(QxModuleHostInterface& host, const std::string& key, std::uint32_t defaultValue) {
    int value = 0;
    host.GetParameter(key, value, static_cast<int>(defaultValue));
    return static_cast<std::uint32_t>(value);
}

/// Anything but the two names counts as "kept", which is what a host gets that never heard of the parameter.
RecordRules readRecordRules(QxModuleHostInterface& host) {
    const std::string rules = readText(host, kParameterRecordRules, kRecordRulesKept);
    if (rules == kRecordRulesExact) {
        return RecordRules::kExact;
    }
    if (rules != kRecordRulesKept) {
        CLIPFILE_LOG(LOG_PRIORITY_WARNING, "unknown record rules \"%s\", \"kept\" is used.", rules.c_str());
    }
    return RecordRules::kKept;
}

/// Anything but the two names counts as "presentation", which hosts push that never heard of the parameter.
PictureOrder readPictureOrder(QxModuleHostInterface& host) {
    const std::string order = readText(host, kParameterPictureOrder, kPictureOrderPresentation);
    if (order == kPictureOrderDecoding) {
        return PictureOrder::kDecoding;
    }
    // A host may answer with nothing where it has no such parameter.
    if (!order.empty() && order != kPictureOrderPresentation) {
        CLIPFILE_LOG(LOG_PRIORITY_WARNING, "unknown picture order \"%s\", \"presentation\" is used.",
                     order.c_str());
    }
    return PictureOrder::kPresentation;
}

}  // namespace

Controller::Controller() = default;

Controller::~Controller() = default;

bool Controller::Initialize(QxModuleHostInterface* moduleHost) {
    if (IsRunning()) {
        CLIPFILE_LOG(LOG_PRIORITY_WARNING, "initialize is called twice.");
        return true;
    }
    CLIPFILE_LOG_SCOPE(scope, LOG_PRIORITY_TRACE);
    recFlag = -1;
    strayUnitNoted = false;
    host = moduleHost;
    eventPending = false;
    terminated = false;
    const auto channel = std::make_shared<StatusChannel>(moduleHost);
    {
        MutexLock lock(statusMutex);
        statusChannel = channel;
    }
    // Contract: static-config-never-fails. A guard that nothing reaches.
    if (!getStaticConfig()) {
        scope.EndAs(LOG_PRIORITY_ERROR, "end. static config error.");
        SetStatus(QxStatus::kFailed, QxFailure::kInitialize);
        endStatusChannel();
        return false;
    }
    {
        MutexLock lock(analyzerMutex);
        analyzer = std::make_shared<nal_access::StreamAnalyzer>();
    }
    if (!getStartParameters()) {
        scope.EndAs(LOG_PRIORITY_ERROR, "end. file output path is none.");
        SetStatus(QxStatus::kFailed, QxFailure::kInitialize);
        endStatusChannel();
        return false;
    }
    const OutputSettings now = getSettings();
    isExact = now.recordRules == RecordRules::kExact;
    isSync = isOutputMode(kOutputModeSync);
    inDecodingOrder = now.pictureOrder == PictureOrder::kDecoding;
    presentationNoted = false;
    CLIPFILE_LOG(LOG_PRIORITY_TRACE, "file output path = %s.", now.outputPath.c_str());
    CLIPFILE_LOG(LOG_PRIORITY_TRACE, "fileType   = %s.", now.fileType.c_str());
    CLIPFILE_LOG(LOG_PRIORITY_TRACE, "naluType   = %s.", now.naluType.c_str());
    CLIPFILE_LOG(LOG_PRIORITY_TRACE, "outputMode = %s.", now.outputMode.c_str());
    if (now.recordRules == RecordRules::kExact) {
        CLIPFILE_LOG(LOG_PRIORITY_TRACE, "recordRules = exact.");
    }
    if (inDecodingOrder) {
        CLIPFILE_LOG(LOG_PRIORITY_TRACE, "pictureOrder = decoding.");
    }
    {
        MutexLock lock(streamBuffersMutex);
        preRoll.SetPictureOrder(now.pictureOrder);
    }

    eventHandlers = {
        {kChangeInStreamInfo, [this](std::shared_ptr<Event> event) { OnChangeInStreamInfo(event); }},
        {kStartStreaming, [this](std::shared_ptr<Event> event) { OnStartStream(event); }},
        {kStopStreaming, [this](std::shared_ptr<Event> event) { OnStopStream(event); }},
        {kRestartStreaming, [this](std::shared_ptr<Event> event) { OnRetartStream(event); }},
        {kRemoveStreaming, [this](std::shared_ptr<Event> event) { OnRemoveStreaming(event); }},
        {kTransferStatusNotify, [this](std::shared_ptr<Event> event) { OnTransferStatusNotify(event); }},
        {kTerminate, [this](std::shared_ptr<Event> event) { OnTerminate(event); }},
    };
    try {
        eventThread = std::make_shared<std::thread>(&Controller::EventLoop, this);

        queueThreads.resize(kQueueCount);
        queues.resize(kQueueCount);
        const UnitConsumer consumers[kQueueCount] = {
            [this](const std::shared_ptr<StreamData>& unit) { pushToBuffers(Medium::kVideo, unit); },
            [this](const std::shared_ptr<StreamData>& unit) { pushToBuffers(Medium::kAudio, unit); },
            [this](const std::shared_ptr<StreamData>& unit) { processMeta(unit); },
        };
        for (std::size_t i = 0; i < kQueueCount; ++i) {
            startQueueThread(i, consumers[i]);
            CLIPFILE_LOG(LOG_PRIORITY_TRACE, "count = %d.", static_cast<int>(i));
        }
    } catch (const std::system_error& error) {
        if (!isExact) {
            throw;
        }
        CLIPFILE_LOG(LOG_PRIORITY_ERROR, "end. threads cannot be started. %s.", error.what());
        scope.Dismiss();
        SetStatus(QxStatus::kFailed, QxFailure::kInitialize);
        endFailedStart();
        return false;
    }
    intake = channel.get();
    return true;
}

void Controller::endFailedStart() {
    terminated = true;
    if (eventThread != nullptr) {
        PostEvent(std::make_shared<TerminateEvent>());
        eventThread->join();
        eventThread.reset();
    }
    endLife();
}

bool Controller::getStaticConfig() {
    QxRegistry* const registry = QxRegistry::GetInstance();
    bool result = false;
    {
        MutexLock lock(settingsMutex);
        const std::map<std::string, std::string*> fields = {
            {kKeyOutputPath, &settings.outputPath},
            {kKeyUserName, &settings.userName},
            {kKeyPassword, &settings.password},
        };
        for (const auto& [key, field] : fields) {
            std::string value;
            if (!registry->getValue(kSettingsSection, key, value)) {
                // Contract: missing-text-is-empty. Only a missing number is logged.
                value.clear();
            }
            *field = upToFirstZero(value);
        }
        unsigned int maxFileSize = 0;
        if (!registry->getValue(kSettingsSection, kKeyMaxFileSize, maxFileSize)) {
            maxFileSize = defaultMaxFileSize;
            CLIPFILE_LOG(LOG_PRIORITY_WARNING, "get max file size failed.");
        }
        settings.maxFileSize = maxFileSize;
        CLIPFILE_LOG(LOG_PRIORITY_TRACE, "max filesize = %lld.",
                     static_cast<long long>(settings.maxFileSize));
        result = true;
    }
    CLIPFILE_LOG(LOG_PRIORITY_TRACE, "end. result = %d.", result);
    return result;
}

bool Controller::getStartParameters() {
    const OutputSettings stored = getSettings();
    const std::string filePrefix = readText(*host, kParameterFilePrefix, "Unknown-Model");
    std::string outputPath = readText(*host, kParameterOutputPath, kNoOutputPath);
    const std::string userName = readText(*host, kParameterUserName, stored.userName);
    const std::string password = readText(*host, kParameterPassword, stored.password);
    const std::string fileType = readText(*host, kParameterFileType, "normal");
    const std::string naluType = readText(*host, kParameterNaluType, "normal");
    const std::string outputMode = readText(*host, kParameterOutputMode, "on");
    const std::uint32_t height = readNumber(*host, kParameterHeight, defaultHeight);
    const std::uint32_t width = readNumber(*host, kParameterWidth, defaultWidth);
    const std::uint32_t framerate = readNumber(*host, kParameterFramerate, defaultFramerate);
    const std::uint32_t bitrate = readNumber(*host, kParameterBitrate, defaultBitrate);
    const RecordRules recordRules = readRecordRules(*host);
    const PictureOrder pictureOrder = readPictureOrder(*host);

    MutexLock lock(settingsMutex);
    settings.filePrefix = filePrefix;
    if (outputPath != kNoOutputPath) {
        // Contract: settings-path-keeps-slashes. A path of the settings store stands as it was written.
        std::replace(outputPath.begin(), outputPath.end(), '/', '\\');
        settings.outputPath = outputPath;
    }
    if (settings.outputPath.empty()) {
        return false;
    }
    settings.userName = userName;
    settings.password = password;
    settings.fileType = fileType;
    settings.naluType = naluType;
    settings.outputMode = outputMode;
    settings.recordRules = recordRules;
    settings.pictureOrder = pictureOrder;
    // Contract: stream-start-is-0. Nothing else sets it.
    settings.streamStart = 0;
    settings.bitrate = bitrate;
    settings.framerate = framerate;
    settings.width = width;
    settings.height = height;
    return true;
}

void Controller::startQueueThread(std::size_t index, const UnitConsumer& consumer) {
    MutexLock lock(queueStartMutex);
    queueThreadStarted = false;
    queues[index] = std::make_shared<StreamDataQueue>(queueCapacity, dropWhenFull);
    if (isExact) {
        queues[index]->SetFlushPredicate([this, index](const std::shared_ptr<StreamData>& unit) {
            noteFlushed(static_cast<Medium>(index), unit);
            return true;
        });
    }
    queueThreads[index] = std::make_shared<std::thread>(&Controller::queueing, this, queues[index], consumer);
    while (!queueThreadStarted) {
        lock.Wait(queueStartCondition);
    }
}

OutputSettings Controller::getSettings() const {
    MutexLock lock(settingsMutex);
    return settings;
}

// Contract: unknown-output-mode. Any other mode records nothing, without a word.
bool Controller::isOutputMode(const char* mode) const {
    MutexLock lock(settingsMutex);
    return settings.outputMode == mode;
}

void Controller::Uninitialize() {
    if (intake.exchange(nullptr) == nullptr) {
        CLIPFILE_LOG(LOG_PRIORITY_WARNING, "uninitialize is called without initialize.");
        return;
    }
    CLIPFILE_LOG_SCOPE(scope, LOG_PRIORITY_TRACE);
    terminated = true;
    if (eventThread->joinable()) {
        PostEvent(std::make_shared<TerminateEvent>());
        CLIPFILE_LOG(LOG_PRIORITY_TRACE, "start join...");
        eventThread->join();
        CLIPFILE_LOG(LOG_PRIORITY_TRACE, "end join");
    }
    eventThread.reset();
    endLife();
}

/// What is left behind the event thread. Not all of the others need have been started.
void Controller::endLife() {
    stopAndRemoveBuffers();
    for (std::size_t i = 0; i < queueThreads.size() && queues[i] != nullptr; ++i) {
        queues[i]->Clear();
        // Contract: closed-queues. Closing wakes the thread, which then finds `terminated`.
        queues[i]->Close();
        if (queueThreads[i] != nullptr && queueThreads[i]->joinable()) {
            queueThreads[i]->join();
        }
    }
    // Contract: last-start-is-ended. The metadata thread may have been in StartStream with its last unit.
    stopAndRemoveBuffers();
    {
        MutexLock lock(streamBuffersMutex);
        forgetPreRoll();
        preRoll = PreRoll();
    }
    queueThreads.clear();
    queues.clear();
    eventHandlers.clear();
    // Contract: undelivered-events-dropped. The TerminateEvent above all must not end a later run. They go
    // without the lock, since one may hold the last reference to a recording whose writer has a post to make.
    std::deque<std::shared_ptr<Event>> undelivered;
    {
        MutexLock lock(eventQueueMutex);
        undelivered.swap(eventQueue);
    }
    undelivered.clear();
    endStatusChannel();
}

void Controller::Execute() {
    if (!IsRunning()) {
        CLIPFILE_LOG(LOG_PRIORITY_WARNING, "execute is called without initialize.");
        return;
    }
    CLIPFILE_LOG_SCOPE(scope, LOG_PRIORITY_TRACE);
    PostEvent(std::make_shared<TransferStatusNotifyEvent>(
        std::map<std::string, std::string>{{QxStatusMap::kFileOutput, QxStatusMap::kStandby}}));
}

void Controller::SetStatus(int status, int cause) {
    if (const std::shared_ptr<StatusChannel> channel = getStatusChannel(); channel != nullptr) {
        channel->Set(status, cause);
    }
}

std::shared_ptr<StatusChannel> Controller::getStatusChannel() const {
    MutexLock lock(statusMutex);
    return statusChannel;
}

void Controller::endStatusChannel() {
    std::shared_ptr<StatusChannel> ended;
    {
        MutexLock lock(statusMutex);
        ended.swap(statusChannel);
    }
    ended->Close();
    host = nullptr;
}

}  // namespace clipfileModule
