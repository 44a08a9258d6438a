#pragma once

// g++ tells by macros, clang by features.
#if defined(__SANITIZE_THREAD__)
#define PLR_SANITIZED_FOR_THREADS 1
#elif defined(__has_feature)
#define PLR_SANITIZED_FOR_THREADS __has_feature(thread_sanitizer)
#else
#define PLR_SANITIZED_FOR_THREADS 0
#endif

#if defined(__SANITIZE_ADDRESS__)
#define PLR_SANITIZED 1
#elif defined(__has_feature)
#define PLR_SANITIZED (PLR_SANITIZED_FOR_THREADS || __has_feature(address_sanitizer))
#else
#define PLR_SANITIZED PLR_SANITIZED_FOR_THREADS
#endif

namespace plr::test {

// Where everything takes many times as long, and memory is not to be measured.
inline constexpr bool kSanitized = PLR_SANITIZED;
inline constexpr bool kThreadSanitized = PLR_SANITIZED_FOR_THREADS;

}  // namespace plr::test
