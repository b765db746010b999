#pragma once

/// Defines `RT_TEST_THREAD_SANITIZER` and `RT_TEST_ADDRESS_SANITIZER`: 1 if the program is compiled with that
/// sanitizer, else 0. They are for tests that a sanitizer's own threads, locks or memory would disturb.
///
///     if (RT_TEST_THREAD_SANITIZER) GTEST_SKIP() << "the sanitizer has a thread of its own";
///
/// They are macros because some code must not even be compiled.

#if defined(__has_feature)
#if __has_feature(thread_sanitizer)
#define RT_TEST_THREAD_SANITIZER 1
#endif
#if __has_feature(address_sanitizer)
#define RT_TEST_ADDRESS_SANITIZER 1
#endif
#elif defined(__SANITIZE_THREAD__)
#define RT_TEST_THREAD_SANITIZER 1
#elif defined(__SANITIZE_ADDRESS__)
#define RT_TEST_ADDRESS_SANITIZER 1
#endif

#ifndef RT_TEST_THREAD_SANITIZER
#define RT_TEST_THREAD_SANITIZER 0
#endif
#ifndef RT_TEST_ADDRESS_SANITIZER
#define RT_TEST_ADDRESS_SANITIZER 0
#endif
