// SPDX-License-Identifier: GPL-2.0-or-later
#include "platform/log.h"

#include <syslog.h>

#include <array>
#include <cstdarg>
#include <cstdio>
#include <cstdlib>
#include <string_view>

namespace fileindexd {

namespace {

int InitialLogLevel() {
  const char* level =
      getenv("FILEINDEXD_LOG_LEVEL");  // NOLINT(concurrency-mt-unsafe): no threads yet
  return level != nullptr && std::string_view(level) == "debug" ? LOG_LEVEL_DEBUG : LOG_LEVEL_ERROR;
}

// What is much longer goes to nobody: the system log takes a line as one datagram, which by default
// may have some 160 KiB, or 200 on a host of 64 bits.
constexpr size_t LONGEST_LINE = size_t{128} << 10;
constexpr std::string_view CUT_MARK = " [cut]";
constexpr size_t LONGEST_CHARACTER = 4;  // bytes

// Puts the mark over the end of a line that fills the buffer, not into a character.
void MarkCut(std::array<char, LONGEST_LINE + 1>& line) {
  const size_t last = LONGEST_LINE - CUT_MARK.size();
  size_t end = last;
  while (end > last - LONGEST_CHARACTER && (static_cast<unsigned char>(line[end]) & 0xc0) == 0x80) {
    --end;
  }
  line[end + CUT_MARK.copy(&line[end], CUT_MARK.size())] = '\0';
}

}  // namespace

int TALO::FILEINDEX::LOG_LEVEL = InitialLogLevel();

void WriteLog(const char* format, ...) {
  std::array<char, LONGEST_LINE + 1> line;  // on the stack: a thread can be cancelled in syslog
  va_list arguments;
  va_start(arguments, format);
  const int length = vsnprintf(line.data(), line.size(), format, arguments);
  va_end(arguments);
  if (length > 0 && static_cast<size_t>(length) >= line.size()) {
    MarkCut(line);
  }
  syslog(LOG_ERR, "%s", length < 0 ? format : line.data());
}

}  // namespace fileindexd
