// SPDX-License-Identifier: GPL-2.0-or-later
// The process's descriptors run out, for as long as this lives.
#pragma once

#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/resource.h>
#include <unistd.h>

namespace fileindexd::scripted {

// No more than `more` descriptors can be opened from the first free number on.
class FewDescriptors {
 public:
  explicit FewDescriptors(rlim_t more) {
    const int next = open("/dev/null", O_RDONLY | O_CLOEXEC);
    close(next);
    EXPECT_EQ(getrlimit(RLIMIT_NOFILE, &before), 0);
    const rlimit few = {static_cast<rlim_t>(next) + more, before.rlim_max};
    EXPECT_EQ(setrlimit(RLIMIT_NOFILE, &few), 0);
  }
  ~FewDescriptors() { setrlimit(RLIMIT_NOFILE, &before); }
  FewDescriptors(const FewDescriptors&) = delete;
  FewDescriptors& operator=(const FewDescriptors&) = delete;

 private:
  rlimit before{};
};

}  // namespace fileindexd::scripted
