// SPDX-License-Identifier: GPL-2.0-or-later
#include "platform/log.h"

#include <pthread.h>

#include <cerrno>
#include <cstdarg>
#include <cstdio>
#include <cstdlib>
#include <string>

#include "scripted/script.h"

namespace fileindexd {

namespace TALO::FILEINDEX {

int LOG_LEVEL = LOG_LEVEL_ERROR;

}  // namespace TALO::FILEINDEX

namespace {

// "FILE:LINE text" as the macros write it.
scripted::LogLine Split(const std::string& whole) {
  const size_t blank = whole.find(' ');
  const size_t colon = whole.rfind(':', blank);
  if (blank == std::string::npos || colon == std::string::npos) {
    return {"", 0, whole};
  }
  return {whole.substr(0, colon), std::atoi(whole.substr(colon + 1, blank - colon - 1).c_str()),
          whole.substr(blank + 1)};
}

}  // namespace

void WriteLog(const char* format, ...) {
  const int cause = errno;
  va_list arguments;
  va_start(arguments, format);
  char* formatted = nullptr;
  const int length = vasprintf(&formatted, format, arguments);
  va_end(arguments);
  const std::string whole = length < 0 ? std::string(format) : std::string(formatted);
  free(formatted);

  scripted::TheScript().Record(Split(whole));
  scripted::TheScript().EnterUnrecorded("WriteLog", whole);
  pthread_testcancel();
  errno = cause;
}

}  // namespace fileindexd
