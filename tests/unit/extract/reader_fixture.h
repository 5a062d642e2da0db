// SPDX-License-Identifier: GPL-2.0-or-later
// Gives a reader bytes, in this process.
#pragma once

#include <gtest/gtest.h>
#include <sys/mman.h>
#include <unistd.h>

#include <string>
#include <string_view>

#include "base/scoped_fd.h"
#include "extract/format.h"

namespace fileindexd {

struct Found {
  bool is_read = false;
  std::string why;
  Content content;
};

inline Found Read(FormatReader reader, std::string_view bytes, size_t cap = 100'000,
                  const char* name = "test") {
  const ScopedFd file(memfd_create("test", MFD_CLOEXEC));
  EXPECT_EQ(write(file.fd, bytes.data(), bytes.size()), static_cast<ssize_t>(bytes.size()));
  ContentSink sink(cap);
  Found found;
  found.is_read = reader({file.fd, name, static_cast<int64_t>(bytes.size()), 0}, sink, found.why);
  found.content = sink.content;
  return found;
}

}  // namespace fileindexd
