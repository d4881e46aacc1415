// What the file output thread does to get a place to write.

#include <array>
#include <cstdio>
#include <string>

#include "QxModuleStatus.h"
#include "common/Log.h"
#include "common/LogScope.h"
#include "fileout/FileOutput.h"
#include "fileout/FileOutputWork.h"
#include "mp4/Mp4MuxerFactory.h"
#include "platform/SharePath.h"

namespace clipfileModule {

bool FileOutput::newFile(Work& work, const std::shared_ptr<ChunkData>& chunk) {
    CLIPFILE_LOG_SCOPE(scope, LOG_PRIORITY_DETAIL);
    const auto fail = [&](int cause) {
        work.owner.SetStatus(QxStatus::kFailed, cause);
        return scope.Return("result", false);
    };
    const auto giveUp = [&] {
        scope.Dismiss();
        return false;
    };

    const bool closed = !work.IsFileOpen() || work.CloseFile();
    if (work.owner.IsCut()) {
        return giveUp();
    }
    if (!closed) {
        CLIPFILE_LOG(LOG_PRIORITY_ERROR, "mp4 file close error.");
        return fail(QxFailure::kFileClose);
    }

    // Contract: free-space-of-the-root. The directory for today need not exist yet.
    std::uint64_t freeSpace = 0;
    const int error = GetPlatform().AvailableSpace(work.settings.outputPath, freeSpace);
    if (work.owner.IsCut()) {
        return giveUp();
    }
    if (error != 0) {
        CLIPFILE_LOG(LOG_PRIORITY_ERROR, "disk size could not be obtained. error = %d.", error);
        return fail(QxFailure::kFreeSpaceUnknown);
    }
    if (freeSpace < Work::minFreeSpaceOpen) {
        // Contract: free-space-two-spellings. Two words here.
        CLIPFILE_LOG(LOG_PRIORITY_ERROR, "no disk free space. %llu.",
                     static_cast<unsigned long long>(freeSpace));
        return fail(QxFailure::kDiskFull);
    }

    OutputSettings local = work.settings;
    const bool made = makeOutputPath(work, local, local.outputPath);
    if (work.owner.IsCut()) {
        return giveUp();
    }
    if (!made) {
        CLIPFILE_LOG(LOG_PRIORITY_ERROR, "mp4 mkdir error. %s.", local.outputPath.c_str());
        return fail(QxFailure::kDirectory);
    }
    CLIPFILE_LOG(LOG_PRIORITY_TRACE, "output path = \"%s\".", local.outputPath.c_str());

    std::array<unsigned char, 4> timecode = {};
    bool dropFrame = false;
    bool hasTimecode = work.owner.MakeFileTimecode(chunk);
    if (hasTimecode) {
        hasTimecode = work.owner.GetFileTimecode(timecode.data(), &dropFrame);
    } else {
        CLIPFILE_LOG(LOG_PRIORITY_TRACE, "no tc.");
    }

    if (!createMp4FileObject(work)) {
        CLIPFILE_LOG(LOG_PRIORITY_ERROR, "create mp4 file object failed.");
        return fail(QxFailure::kFileOpen);
    }
    const bool opened = work.muxer->Open(local, hasTimecode ? timecode.data() : nullptr, dropFrame);
    if (work.owner.IsCut()) {
        return giveUp();
    }
    if (!opened) {
        CLIPFILE_LOG(LOG_PRIORITY_ERROR, "mp4 file open error.");
        return fail(QxFailure::kFileOpen);
    }
    return scope.Return("result", true);
}

bool FileOutput::makeOutputPath(Work& work, const OutputSettings& settings, std::string& path) {
    const PlatformInterface& platform = GetPlatform();
    const LocalTime now = platform.ToLocalTime(platform.Now());
    std::array<char, 40> date = {};
    std::snprintf(date.data(), date.size(), "%04d%02d%02d", now.year, now.month, now.day);
    std::string made = settings.outputPath;
    if (made.empty() || made.back() != '\\') {
        made += '\\';
    }
    made += date.data();
    made += '\\';
    // Contract: empty-prefix-ends-in-backslash. The directory is then that of the date.
    made += settings.filePrefix;
    if (!createOutputDirectory(work, made)) {
        return false;
    }
    path = made;
    return true;
}

bool FileOutput::createOutputDirectory(Work& work, const std::string& path) {
    const PlatformInterface& platform = GetPlatform();
    // Contract: anything-counts-as-directory. A file too.
    // Contract: directory-errors-end-the-process. What looking throws is not caught. With exact rules it is a
    // fault like any other: making the directory fails too.
    const bool exact = work.settings.recordRules == RecordRules::kExact;
    if (exact ? platform.TestExistence(path) == 0 : platform.Exists(path)) {
        return true;
    }
    boost::system::error_code error;
    if (!work.owner.IsCut() && platform.CreateDirectories(path, error) && !error) {
        return true;
    }
    if (work.owner.IsCut()) {
        return false;
    }
    CLIPFILE_LOG(LOG_PRIORITY_ERROR, "filename: %s, %s.", error.message().c_str(), path.c_str());
    return false;
}

LogonToken FileOutput::useNetDrive(Work& work) {
    const OutputSettings& settings = work.settings;
    // Contract: remote-by-two-backslashes. A mapped drive or a mount is local.
    if (!IsSharePath(settings.outputPath)) {
        CLIPFILE_LOG(LOG_PRIORITY_TRACE, "is local drive.");
        return kNoLogon;
    }
    CLIPFILE_LOG(LOG_PRIORITY_TRACE, "is remote drive.");
    LogonToken token = kNoLogon;
    std::string reason;
    int logonError = GetPlatform().ShareSupport(reason);
    if (logonError != 0) {
        CLIPFILE_LOG(LOG_PRIORITY_WARNING, "no network shares: %s.", reason.c_str());
    } else if (settings.userName.empty()) {
        return kNoLogon;
    } else {
        // Contract: path-as-domain. The whole output path stands in the domain's place.
        logonError = GetPlatform().Logon(settings.userName, settings.outputPath, settings.password, token);
    }
    if (work.owner.IsCut()) {
        return token;
    }
    if (logonError != 0) {
        // Contract: password-in-the-log. In clear.
        CLIPFILE_LOG(LOG_PRIORITY_ERROR, "LogonUser call failed. %d, %x, %s, %s, %s", 0,
                     static_cast<unsigned int>(logonError), settings.outputPath.c_str(),
                     settings.userName.c_str(), settings.password.c_str());
        // Contract: logon-failure-goes-on. Later faults decide.
        work.owner.SetStatus(QxStatus::kFailed, QxFailure::kLogon);
        return token;
    }
    if (const int error = GetPlatform().Impersonate(token)) {
        CLIPFILE_LOG(LOG_PRIORITY_ERROR, "ImpersonateLoggedOnUser call failed. %d, %x.", 0,
                     static_cast<unsigned int>(error));
        work.owner.SetStatus(QxStatus::kFailed, QxFailure::kLogon);
    }
    return token;
}

bool FileOutput::createMp4FileObject(Work& work) {
    CLIPFILE_LOG_SCOPE(scope, LOG_PRIORITY_DETAIL);
    if (work.muxer != nullptr) {
        deleteMp4FileObject(work);
    }
    const Mp4MuxerFactory factory;
    if (!factory.Create(work.type, work.muxer)) {
        // Contract: unknown-type-is-normal. Told once a muxer.
        CLIPFILE_LOG(LOG_PRIORITY_WARNING, "mp4 file create error. type = %s.", work.type.c_str());
        factory.Create("normal", work.muxer);
    }
    const bool result = work.muxer != nullptr && work.muxer->Initialize();
    if (!result) {
        CLIPFILE_LOG(LOG_PRIORITY_ERROR, "mp4 file initialize error.");
        work.owner.SetStatus(QxStatus::kFailed, QxFailure::kInitialize);
    }
    return scope.Return("func_result", result);
}

bool FileOutput::deleteMp4FileObject(Work& work) {
    CLIPFILE_LOG_SCOPE(scope, LOG_PRIORITY_DETAIL);
    // There is none after a thread was given up: its muxer is its own.
    if (work.muxer != nullptr) {
        if (!work.muxer->Uninitialize()) {
            // Contract: wrong-word-at-the-end. It is the release that failed, which never happens.
            CLIPFILE_LOG(LOG_PRIORITY_WARNING, "mp4 file initialize failed.");
        }
        work.muxer.reset();
    }
    return scope.Return("func_result", true);
}

}  // namespace clipfileModule
