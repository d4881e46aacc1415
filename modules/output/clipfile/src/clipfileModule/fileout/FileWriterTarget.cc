// What a writer does to get a place to write.

#include <array>
#include <cstdio>
#include <string>

#include "QxModuleStatus.h"
#include "common/Log.h"
#include "common/LogScope.h"
#include "fileout/FileWriter.h"
#include "mp4/Mp4MuxerFactory.h"
#include "platform/SharePath.h"

namespace clipfileModule {

bool FileWriter::newFile(const std::shared_ptr<ChunkData>& chunk) {
    CLIPFILE_LOG_SCOPE(scope, LOG_PRIORITY_DETAIL);
    const auto end = [&](bool result) {
        if (IsGivenUp()) {
            scope.Dismiss();
        }
        return scope.Return("result", result);
    };

    if (failed(!isFileOpen() || closeFile(), QxFailure::kFileClose,
               [] { CLIPFILE_LOG(LOG_PRIORITY_ERROR, "mp4 file close error."); })) {
        return end(false);
    }

    // Contract: free-space-of-the-root. The directory for today need not exist yet.
    std::uint64_t freeSpace = 0;
    const int error = GetPlatform().AvailableSpace(settings_.outputPath, freeSpace);
    if (failed(error == 0, QxFailure::kFreeSpaceUnknown, [&] {
            CLIPFILE_LOG(LOG_PRIORITY_ERROR, "disk size could not be obtained. error = %d.", error);
        })) {
        return end(false);
    }
    if (failed(freeSpace >= minFreeSpaceOpen, QxFailure::kDiskFull, [&] {
            // Contract: free-space-two-spellings. Two words here.
            CLIPFILE_LOG(LOG_PRIORITY_ERROR, "no disk free space. %llu.",
                         static_cast<unsigned long long>(freeSpace));
        })) {
        return end(false);
    }

    OutputSettings local = settings_;
    if (failed(makeOutputPath(local.outputPath), QxFailure::kDirectory,
               [&] { CLIPFILE_LOG(LOG_PRIORITY_ERROR, "mp4 mkdir error. %s.", local.outputPath.c_str()); })) {
        return end(false);
    }
    CLIPFILE_LOG(LOG_PRIORITY_TRACE, "output path = \"%s\".", local.outputPath.c_str());

    std::array<unsigned char, 4> timecode = {};
    bool dropFrame = false;
    bool hasTimecode = owner_.MakeFileTimecode(chunk);
    if (hasTimecode) {
        hasTimecode = owner_.GetFileTimecode(timecode.data(), &dropFrame);
    } else {
        CLIPFILE_LOG(LOG_PRIORITY_TRACE, "no tc.");
    }

    if (failed(createMp4FileObject(), QxFailure::kFileOpen,
               [] { CLIPFILE_LOG(LOG_PRIORITY_ERROR, "create mp4 file object failed."); })) {
        return end(false);
    }
    return end(!failed(muxer_->Open(local, hasTimecode ? timecode.data() : nullptr, dropFrame),
                       QxFailure::kFileOpen,
                       [] { CLIPFILE_LOG(LOG_PRIORITY_ERROR, "mp4 file open error."); }));
}

bool FileWriter::makeOutputPath(std::string& path) {
    const PlatformInterface& platform = GetPlatform();
    const LocalTime now = platform.ToLocalTime(platform.Now());
    std::array<char, 40> date = {};
    std::snprintf(date.data(), date.size(), "%04d%02d%02d", now.year, now.month, now.day);
    std::string made = settings_.outputPath;
    if (made.empty() || made.back() != '\\') {
        made += '\\';
    }
    made += date.data();
    made += '\\';
    // Contract: empty-prefix-ends-in-backslash. The directory is then that of the date.
    made += settings_.filePrefix;
    if (!createOutputDirectory(made)) {
        return false;
    }
    path = made;
    return true;
}

bool FileWriter::createOutputDirectory(const std::string& path) {
    const PlatformInterface& platform = GetPlatform();
    // Contract: anything-counts-as-directory. A file too.
    // Contract: directory-errors-end-the-process. What looking throws is not caught. With exact rules it is a
    // fault like any other: making the directory fails too.
    const bool exact = settings_.recordRules == RecordRules::kExact;
    if (exact ? platform.TestExistence(path) == 0 : platform.Exists(path)) {
        return true;
    }
    boost::system::error_code error;
    if (IsGivenUp()) {
        return false;
    }
    if (platform.CreateDirectories(path, error) && !error) {
        return true;
    }
    if (!IsGivenUp()) {
        CLIPFILE_LOG(LOG_PRIORITY_ERROR, "filename: %s, %s.", error.message().c_str(), path.c_str());
    }
    return false;
}

LogonToken FileWriter::useNetDrive() {
    // Contract: remote-by-two-backslashes. A mapped drive or a mount is local.
    if (!IsSharePath(settings_.outputPath)) {
        CLIPFILE_LOG(LOG_PRIORITY_TRACE, "is local drive.");
        return kNoLogon;
    }
    CLIPFILE_LOG(LOG_PRIORITY_TRACE, "is remote drive.");
    LogonToken token = kNoLogon;
    std::string reason;
    int logonError = GetPlatform().ShareSupport(reason);
    if (logonError != 0) {
        CLIPFILE_LOG(LOG_PRIORITY_WARNING, "no network shares: %s.", reason.c_str());
    } else if (settings_.userName.empty()) {
        return kNoLogon;
    } else {
        // Contract: path-as-domain. The whole output path stands in the domain's place.
        logonError = GetPlatform().Logon(settings_.userName, settings_.outputPath, settings_.password, token);
    }
    // Contract: logon-failure-goes-on. Later faults decide.
    if (failed(logonError == 0, QxFailure::kLogon, [&] {
            // Contract: password-in-the-log. In clear.
            CLIPFILE_LOG(LOG_PRIORITY_ERROR, "LogonUser call failed. %d, %x, %s, %s, %s", 0,
                         static_cast<unsigned int>(logonError), settings_.outputPath.c_str(),
                         settings_.userName.c_str(), settings_.password.c_str());
        })) {
        return token;
    }
    const int error = GetPlatform().Impersonate(token);
    failed(error == 0, QxFailure::kLogon, [&] {
        CLIPFILE_LOG(LOG_PRIORITY_ERROR, "ImpersonateLoggedOnUser call failed. %d, %x.", 0,
                     static_cast<unsigned int>(error));
    });
    return token;
}

bool FileWriter::createMp4FileObject() {
    CLIPFILE_LOG_SCOPE(scope, LOG_PRIORITY_DETAIL);
    if (muxer_ != nullptr) {
        deleteMp4FileObject();
    }
    const Mp4MuxerFactory factory;
    if (!factory.Create(type_, muxer_)) {
        // Contract: unknown-type-is-normal. Told once a muxer.
        CLIPFILE_LOG(LOG_PRIORITY_WARNING, "mp4 file create error. type = %s.", type_.c_str());
        factory.Create("normal", muxer_);
    }
    const bool result = muxer_ != nullptr && muxer_->Initialize();
    if (!result) {
        CLIPFILE_LOG(LOG_PRIORITY_ERROR, "mp4 file initialize error.");
        owner_.SetStatus(QxStatus::kFailed, QxFailure::kInitialize);
    }
    return scope.Return("func_result", result);
}

bool FileWriter::deleteMp4FileObject() {
    CLIPFILE_LOG_SCOPE(scope, LOG_PRIORITY_DETAIL);
    // There is none after a thread was given up: its muxer is its own.
    if (muxer_ != nullptr) {
        if (!muxer_->Uninitialize()) {
            // Contract: wrong-word-at-the-end. It is the release that failed, which never happens.
            CLIPFILE_LOG(LOG_PRIORITY_WARNING, "mp4 file initialize failed.");
        }
        muxer_.reset();
    }
    return scope.Return("func_result", true);
}

}  // namespace clipfileModule
