// SPDX-License-Identifier: GPL-2.0-or-later
#include "notify/thread.h"

#include <pthread.h>

#include <cerrno>
#include <csignal>
#include <system_error>
#include <utility>

#include "notify/log.h"

namespace fileindexd {

bool LooseThread::Start(std::function<void()> body) {
  sigset_t all;
  sigset_t before;
  sigfillset(&all);
  pthread_sigmask(SIG_SETMASK, &all, &before);

  int failure = 0;
  try {
    // What escapes ends the process, which a manager starts again: a thread that is gone in silence
    // would leave its work undone for ever.
    std::packaged_task<void()> task([run = std::move(body)]() noexcept { run(); });
    ended = task.get_future();
    thread = std::thread(std::move(task));
  } catch (const std::system_error& error) {
    failure = error.code().value();
  }

  pthread_sigmask(SIG_SETMASK, &before, nullptr);
  errno = failure;
  return failure == 0;
}

void LooseThread::End(std::chrono::milliseconds patience) {
  if (!thread.joinable()) {
    return;
  }
  if (ended.wait_for(patience) == std::future_status::ready) {
    thread.join();
    return;
  }

  LogError("a thread hangs and is left behind");
  thread.detach();
}

}  // namespace fileindexd
