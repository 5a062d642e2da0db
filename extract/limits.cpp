// SPDX-License-Identifier: GPL-2.0-or-later
#include "extract/limits.h"

#include <fcntl.h>
#include <sys/resource.h>
#include <unistd.h>

#include <algorithm>
#include <csignal>

#include "base/scoped_fd.h"
#include "extract/doors.h"
#include "extract/sanitized.h"

namespace fileindexd {

namespace {

constexpr rlim_t STACK = rlim_t{8} << 20;

// A lower limit that is set already stays.
bool Lower(__rlimit_resource resource, rlim_t most) {
  rlimit limit = {};
  if (getrlimit(resource, &limit) != 0) {
    return false;
  }
  limit.rlim_max = std::min(limit.rlim_max, most);
  limit.rlim_cur = std::min(limit.rlim_cur, limit.rlim_max);
  return setrlimit(resource, &limit) == 0;
}

}  // namespace

void GoFirst() {
  const ScopedFd score(open("/proc/self/oom_score_adj", O_WRONLY | O_CLOEXEC));
  (void)!write(score.fd, "1000", 4);  // without /proc it goes by its size, like others
}

bool SetLimits() {
  // A write beyond the bound fails: it need not end the process.
  (void)signal(SIGXFSZ, SIG_IGN);
  return Lower(RLIMIT_CORE, 0) && Lower(RLIMIT_FSIZE, MEMORY_FILE) &&
         Lower(RLIMIT_NOFILE, OPEN_FILES) && Lower(RLIMIT_STACK, STACK) && Lower(RLIMIT_NPROC, 0) &&
         Lower(RLIMIT_CPU, PROCESSOR_SECONDS_OF_ALL) && Lower(RLIMIT_MEMLOCK, 0) &&
         Lower(RLIMIT_MSGQUEUE, 0) && (IS_SANITIZED || Lower(RLIMIT_AS, ADDRESS_SPACE)) &&
         RefreshProcessorTime();
}

bool RefreshProcessorTime() {
  rusage used = {};
  rlimit limit = {};
  if (getrusage(RUSAGE_SELF, &used) != 0 || getrlimit(RLIMIT_CPU, &limit) != 0) {
    return false;
  }
  // The soft one: the next file's share lies higher.
  const auto seconds = static_cast<rlim_t>(used.ru_utime.tv_sec + used.ru_stime.tv_sec + 1);
  limit.rlim_cur = seconds + PROCESSOR_SECONDS;
  return limit.rlim_cur <= limit.rlim_max && setrlimit(RLIMIT_CPU, &limit) == 0;
}

}  // namespace fileindexd
