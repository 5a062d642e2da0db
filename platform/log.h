// SPDX-License-Identifier: GPL-2.0-or-later
// Log lines of the daemon.
//
// Every line goes out at priority LOG_ERR, with the source file's path from the project's root and
// the line number in front. The log level decides only whether debug lines are written at all.
#pragma once

namespace fileindexd {

namespace TALO::FILEINDEX {

// Process-wide. 7 means debug, 3 means error. Written by the main thread, read by all, as a whole.
extern int LOG_LEVEL;

}  // namespace TALO::FILEINDEX

constexpr int LOG_LEVEL_DEBUG = 7;
constexpr int LOG_LEVEL_ERROR = 3;

// Formats and writes one line; "%m" tells of errno as it is at the call. A cancellation point.
[[gnu::format(printf, 1, 2)]] void WriteLog(const char* format, ...);

}  // namespace fileindexd

// Nothing may stand between a failing call and its line, or "%m" tells of something else.
#define FI_LOG(format, ...) \
  ::fileindexd::WriteLog("%s:%d " format, __FILE__, __LINE__ __VA_OPT__(, ) __VA_ARGS__)

#define FI_DEBUG(format, ...)                                                        \
  do {                                                                               \
    if (::fileindexd::TALO::FILEINDEX::LOG_LEVEL == ::fileindexd::LOG_LEVEL_DEBUG) { \
      FI_LOG(format __VA_OPT__(, ) __VA_ARGS__);                                     \
    }                                                                                \
  } while (false)
