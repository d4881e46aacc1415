#pragma once

/// What the module tells the host of itself: the numbers that it passes to
/// `QxModuleHostInterface::SetStatus`, and the status map of `SendTransmissionStatus`. docs/operation.md
/// tells an operator what to do about each.

/// Statuses.
namespace QxStatus {
/// Nothing was told so far.
inline constexpr int kNone = 0;
/// Buffering has stopped, with `kNoCause`.
inline constexpr int kBufferingStopped = 3;
/// Buffering has started, with `kNoCause`.
inline constexpr int kBufferingStarted = 4;
/// The stream has a fault: a cause of `QxStreamFault`. The recording begins a new file where it can.
inline constexpr int kStreamFault = 6;
/// The module or its file output has failed: a cause of `QxFailure`. Final: no status follows in this life of
/// the module, and it ignores pushed units.
inline constexpr int kFailed = 7;

inline constexpr int kNoCause = 0;
}  // namespace QxStatus

// Contract: causes-reused. A cause means something only together with its status.
/// Causes of status 6.
namespace QxStreamFault {
/// More than 48 chunks wait for the disk.
inline constexpr int kFileTooSlow = 22;
/// More than 600 video units wait for the other media.
inline constexpr int kVideoBufferFull = 23;
/// More than 900 audio units wait for the other media.
inline constexpr int kAudioBufferFull = 24;
/// More than 600 metadata units wait for the other media.
inline constexpr int kMetaBufferFull = 25;
/// Cause 26 of status 6: the host went offline while file output ran.
inline constexpr int kOffline = 26;
}  // namespace QxStreamFault

/// Causes of status 7.
namespace QxFailure {
/// No output path is known, or there is no memory for a file; with exact record rules also no thread.
inline constexpr int kInitialize = 2;
/// The logon for a share failed.
inline constexpr int kLogon = 21;
/// The free space cannot be told.
inline constexpr int kFreeSpaceUnknown = 22;
/// There is not enough of it: 150 MiB, for a chunk with the file's closing boxes.
inline constexpr int kDiskFull = 23;
/// The dated directory cannot be made.
inline constexpr int kDirectory = 24;
/// A file cannot be created.
inline constexpr int kFileOpen = 25;
/// Cause 26 of status 7: a chunk could not be written.
inline constexpr int kFileWrite = 26;
/// The same number: a recording failed before its first chunk, for the cause of the status 6 before it.
inline constexpr int kNoFirstChunk = 26;
/// A file could not be completed.
inline constexpr int kFileClose = 27;
/// The same number: the writer did not end within 3500 ms of the command to stop.
inline constexpr int kWriterHangs = 27;
}  // namespace QxFailure

/// The status map: its one key, and the values of that.
namespace QxStatusMap {
inline constexpr const char* kFileOutput = "file_output_status";
/// The writer of a recording has begun.
inline constexpr const char* kOutput = "output";
/// The module has been started, or the writer of a recording has ended.
inline constexpr const char* kStandby = "standby";
}  // namespace QxStatusMap
