// SPDX-License-Identifier: GPL-2.0-or-later
// bare_reader PATH: marks the file system of PATH as the notification service does, and reads the
// events without a look at them: what watching costs by itself. Writes a line when it has begun.
#include <fcntl.h>
#include <sys/fanotify.h>
#include <unistd.h>

#include <cstdio>

int main(int argc, char** argv) {
  if (argc != 2) {
    (void)fprintf(stderr, "usage: bare_reader PATH\n");
    return 2;
  }
  const int group = fanotify_init(FAN_CLASS_NOTIF | FAN_REPORT_DFID_NAME_TARGET | FAN_CLOEXEC, 0);
  constexpr uint64_t MASK =
      FAN_CREATE | FAN_CLOSE_WRITE | FAN_MODIFY | FAN_ATTRIB | FAN_DELETE | FAN_RENAME | FAN_ONDIR;
  if (group < 0 ||
      fanotify_mark(group, FAN_MARK_ADD | FAN_MARK_FILESYSTEM, MASK, AT_FDCWD, argv[1]) != 0) {
    perror("bare_reader: fanotify");
    return 1;
  }
  (void)puts("reads");
  (void)fflush(stdout);

  static char buffer[65536];
  while (read(group, buffer, sizeof buffer) > 0) {
  }
  return 0;
}
