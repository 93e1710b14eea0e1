#pragma once

namespace qivo::test {

/// How many times longer things may take where a sanitizer watches.
#if defined(__SANITIZE_ADDRESS__) || defined(__SANITIZE_THREAD__)
inline constexpr int kSanitizerPatience = 10;
#elif defined(__has_feature)
#if __has_feature(address_sanitizer) || __has_feature(thread_sanitizer)
inline constexpr int kSanitizerPatience = 10;
#else
inline constexpr int kSanitizerPatience = 1;
#endif
#else
inline constexpr int kSanitizerPatience = 1;
#endif

} // namespace qivo::test
