// SPDX-License-Identifier: GPL-2.0-or-later
// Whether this build is watched by a sanitizer: its shadow needs more address space than a limit
// allows, and its reports need somewhere to go.
#pragma once

namespace fileindexd {

#if defined(__SANITIZE_ADDRESS__) || defined(__SANITIZE_THREAD__)
constexpr bool IS_SANITIZED = true;
#elif defined(__has_feature)
#if __has_feature(address_sanitizer) || __has_feature(thread_sanitizer)
constexpr bool IS_SANITIZED = true;
#else
constexpr bool IS_SANITIZED = false;
#endif
#else
constexpr bool IS_SANITIZED = false;
#endif

}  // namespace fileindexd
