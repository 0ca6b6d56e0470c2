// SPDX-License-Identifier: Apache-2.0
#pragma once

/// 1 in a build with AddressSanitizer or ThreadSanitizer, else 0. For what a sanitizer cannot stand, or
/// cannot bear to share.
#if defined(__SANITIZE_ADDRESS__) || defined(__SANITIZE_THREAD__)
#define SCREENSHARE_TEST_SANITIZED 1
#elif defined(__has_feature)
#if __has_feature(address_sanitizer) || __has_feature(thread_sanitizer)
#define SCREENSHARE_TEST_SANITIZED 1
#endif
#endif

#ifndef SCREENSHARE_TEST_SANITIZED
#define SCREENSHARE_TEST_SANITIZED 0
#endif
