// SPDX-License-Identifier: GPL-2.0-or-later
#include "search/log.h"

#include <syslog.h>

#include <cstdarg>
#include <cstdlib>
#include <string_view>

#include "state/content_service.h"

namespace fileindexd {

namespace {

bool debug = false;

}  // namespace

void OpenServiceLog() {
  const char* level = getenv("FILEINDEXD_LOG_LEVEL");  // NOLINT(concurrency-mt-unsafe): one thread
  debug = level != nullptr && std::string_view(level) == "debug";
  openlog(SERVICE_PROGRAM, LOG_PID, LOG_DAEMON);
}

void ServiceLog(const char* format, ...) {
  va_list arguments;
  va_start(arguments, format);
  vsyslog(LOG_ERR, format, arguments);
  va_end(arguments);
}

void ServiceDebug(const char* format, ...) {
  if (!debug) {
    return;
  }

  va_list arguments;
  va_start(arguments, format);
  vsyslog(LOG_ERR, format, arguments);
  va_end(arguments);
}

}  // namespace fileindexd
