// SPDX-License-Identifier: Apache-2.0
#pragma once

/// Put before a function with loops that the compiler can vectorise: it is compiled once for the
/// baseline and once for each wider instruction set, and the best one is chosen when the program is
/// loaded. All give the same bits, because the build forbids contraction of operations.
///
/// Sanitizers do not stand the choice at load time.
#if defined(__has_feature)
#if __has_feature(address_sanitizer) || __has_feature(thread_sanitizer)
#define ZARN_SANITIZED 1
#endif
#endif
#if ZARN_SIMD && defined(__x86_64__) && !defined(__SANITIZE_ADDRESS__) && \
    !defined(__SANITIZE_THREAD__) && !defined(ZARN_SANITIZED)
#define ZARN_VECTORISED __attribute__((target_clones("default", "avx2", "avx512f")))
#else
#define ZARN_VECTORISED
#endif
