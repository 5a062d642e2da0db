// SPDX-License-Identifier: GPL-2.0-or-later
#include "platform/log.h"

#include <syslog.h>

#include <cstdarg>
#include <cstdlib>
#include <string_view>

namespace fileindexd {

namespace {

int InitialLogLevel() {
  const char* level =
      getenv("FILEINDEXD_LOG_LEVEL");  // NOLINT(concurrency-mt-unsafe): no threads yet
  return level != nullptr && std::string_view(level) == "debug" ? LOG_LEVEL_DEBUG : LOG_LEVEL_ERROR;
}

}  // namespace

int TALO::FILEINDEX::LOG_LEVEL = InitialLogLevel();

void WriteLog(const char* format, ...) {
  va_list arguments;
  va_start(arguments, format);
  vsyslog(LOG_ERR, format, arguments);
  va_end(arguments);
}

}  // namespace fileindexd
