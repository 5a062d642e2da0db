// SPDX-License-Identifier: GPL-2.0-or-later
#include "ctl/terminal/screen.h"

#include <sys/ioctl.h>
#include <unistd.h>

#include <cstdlib>
#include <string_view>

#include "ctl/values.h"

namespace fileindexd {

namespace {

std::string_view Variable(const char* name) {
  const char* value = getenv(name);  // NOLINT(concurrency-mt-unsafe): one thread
  return value == nullptr ? "" : value;
}

size_t Columns() {
  constexpr size_t USUAL = 80;
  constexpr uint64_t MOST = 10000;
  struct winsize size {};
  if (ioctl(STDOUT_FILENO, TIOCGWINSZ, &size) == 0 && size.ws_col > 0) {
    return size.ws_col;
  }

  const std::optional<uint64_t> given = ParseCount(Variable("COLUMNS"));
  return given.has_value() && *given > 0 && *given <= MOST ? static_cast<size_t>(*given) : USUAL;
}

}  // namespace

std::optional<Screen> FindScreen() {
  if (isatty(STDOUT_FILENO) != 1) {
    return std::nullopt;
  }

  const std::string_view type = Variable("TERM");
  const bool has_colours = Variable("NO_COLOR").empty() && !type.empty() && type != "dumb";
  return Screen{Columns(), has_colours};
}

}  // namespace fileindexd
