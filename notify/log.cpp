// SPDX-License-Identifier: GPL-2.0-or-later
#include "notify/log.h"

#include <syslog.h>

#include <cerrno>
#include <cstdarg>
#include <cstdio>
#include <cstdlib>
#include <string>
#include <string_view>

#include "state/notifier.h"

namespace fileindexd {

namespace {

bool debug = false;
bool to_syslog = false;
bool to_journal = false;  // which reads a priority from the beginning of each line

void Write(int priority, const char* format, va_list arguments) {
  if (to_syslog) {
    vsyslog(priority, format, arguments);
    return;
  }

  // One call a line, so that lines of several threads stay whole.
  char line[4096];
  const int told = vsnprintf(line, sizeof line, format, arguments);
  if (told < 0) {
    return;
  }
  if (to_journal) {
    (void)fprintf(stderr, "<%d>%s\n", priority, line);
  } else {
    (void)fprintf(stderr, "%s: %s\n", NOTIFIER_PROGRAM, line);
  }
}

}  // namespace

void OpenLog(LogTarget target) {
  const char* level = getenv("FILEINDEXD_LOG_LEVEL");  // NOLINT(concurrency-mt-unsafe): one thread
  debug = level != nullptr && std::string_view(level) == "debug";
  to_syslog = target == LogTarget::SYSLOG;
  to_journal = getenv("JOURNAL_STREAM") != nullptr;  // NOLINT(concurrency-mt-unsafe): the same
  if (to_syslog) {
    openlog(NOTIFIER_PROGRAM, LOG_PID, LOG_DAEMON);
  }
}

void LogError(const char* format, ...) {
  va_list arguments;
  va_start(arguments, format);
  Write(LOG_ERR, format, arguments);
  va_end(arguments);
}

void LogInfo(const char* format, ...) {
  va_list arguments;
  va_start(arguments, format);
  Write(LOG_INFO, format, arguments);
  va_end(arguments);
}

void LogDebug(const char* format, ...) {
  if (!debug) {
    return;
  }

  va_list arguments;
  va_start(arguments, format);
  Write(LOG_DEBUG, format, arguments);
  va_end(arguments);
}

}  // namespace fileindexd
