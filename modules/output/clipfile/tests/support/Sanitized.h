#pragma once

namespace clipfileModule {

/// Under a sanitizer everything takes ten times as long and more, so that what is the same there is tried
/// less often.
#if defined(__SANITIZE_THREAD__)
inline constexpr bool kThreadSanitizer = true;
inline constexpr bool kSanitized = true;
#elif defined(__SANITIZE_ADDRESS__)
inline constexpr bool kThreadSanitizer = false;
inline constexpr bool kSanitized = true;
#else
inline constexpr bool kThreadSanitizer = false;
inline constexpr bool kSanitized = false;
#endif

}  // namespace clipfileModule
