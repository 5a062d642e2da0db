// SPDX-License-Identifier: GPL-2.0-or-later
// Each file begins with such a line:
//
//   some avg10=0.29 avg60=0.25 avg300=0.18 total=132134561
#include "notify/pressure.h"

#include <fcntl.h>
#include <unistd.h>

#include <algorithm>
#include <charconv>
#include <cstring>
#include <string_view>

#include "base/scoped_fd.h"

namespace fileindexd {

namespace {

constexpr std::string_view BEFORE_NUMBER = "some avg10=";

double ReadOne(const std::string& path) {
  const ScopedFd file(open(path.c_str(), O_RDONLY | O_CLOEXEC));
  char text[128];
  const ssize_t length = file.fd < 0 ? -1 : read(file.fd, text, sizeof(text));
  if (length < 0 ||
      !std::string_view(text, static_cast<size_t>(length)).starts_with(BEFORE_NUMBER)) {
    return 0;
  }

  double percent = 0;
  const auto parsed = std::from_chars(text + BEFORE_NUMBER.size(), text + length, percent);
  return parsed.ec == std::errc() ? percent : 0;
}

}  // namespace

double ReadPressure(const std::string& folder) {
  double highest = 0;
  for (const char* resource : {"cpu", "io", "memory"}) {
    highest = std::max(highest, ReadOne(folder + "/" + resource));
  }
  return highest;
}

}  // namespace fileindexd
