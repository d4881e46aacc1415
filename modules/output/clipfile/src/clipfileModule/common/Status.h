#pragma once

namespace clipfileModule {

/// Status numbers that the module passes to the host.
constexpr int kStatusBufferingStopped = 3;
constexpr int kStatusBufferingStarted = 4;
/// The stream has a fault; the cause tells which.
constexpr int kStatusStreamFault = 6;
/// Final: afterwards the module sets no status and ignores pushed units.
constexpr int kStatusFailed = 7;

// Contract: causes-reused. A cause means something only together with its status.
/// Causes that go with status 7 when the module cannot be initialised, and with status 6 when the host goes
/// offline while file output runs.
constexpr int kCauseNone = 0;
constexpr int kCauseInitialize = 2;
constexpr int kCauseOffline = 26;

/// The one key of the status map and its values.
constexpr const char* kFileOutputStatusKey = "file_output_status";
constexpr const char* kFileOutputStatusOutput = "output";
constexpr const char* kFileOutputStatusStandby = "standby";

}  // namespace clipfileModule
